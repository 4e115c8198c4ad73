"""The typed commands, made from the request table."""

from __future__ import annotations

from typing import Any

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_parameters
from amt_station.cli.outcome import outcome_json, show_exchange
from amt_station.perform import perform
from amt_station.render import value_line
from amt_station.requests.model import Field, Operation, Request
from amt_station.requests.operations import prepare
from amt_station.requests.table import operations


def _parameters(row: Request, operation: Operation) -> list[click.Parameter]:
    parameters: list[click.Parameter] = []
    for name in (*operation.takes, *operation.may_take):
        parameters += _field_parameters(row.field(name))
    if parameters:
        parameters.append(click.Option(["--force"], is_flag=True,
                                       help="Send values that have not their format"))
    return parameters


def _field_parameters(field: Field) -> list[click.Parameter]:
    # Values are parsed by the field itself, so that every way in has the same limits.
    if field.positional:
        return [click.Argument([field.name], metavar=field.name.upper())]
    if field.flags:
        return [click.Option([f"--{word}", field.name], flag_value=word,
                             help=f"{field.name.capitalize()}: {word}")
                for word in reversed(list(field.choices))]
    metavar = "|".join(field.choices) or ("NUMBER" if field.numeric else "TEXT")
    unit = f" ({field.unit})" if field.unit else ""
    return [click.Option([f"--{field.name}", _variable(field)], metavar=metavar,
                         help=field.meaning + unit)]


def _variable(field: Field) -> str:
    return field.name.replace("-", "_")


def _run(row: Request, operation: Operation, given: dict[str, Any]) -> None:
    force = bool(given.pop("force", False))
    settings = click.get_current_context().ensure_object(Settings)
    fields = {_variable(field): field for field in row.fields}
    values = {fields[variable].name: fields[variable].parse(text)
              for variable, text in given.items() if text is not None}
    # Everything that can be wrong with the request is found before the port is touched.
    prepared = prepare(operation.path, values, settings.chosen_channel, force)
    for problem in prepared.forced:
        console.talk(f"forced: {problem}")
    with settings.open_link() as link, console.waiting(operation.name):
        outcome = perform(link, prepared)
    if settings.json:
        console.data_json({"ok": True, "command": operation.name, **outcome_json(outcome)})
        return
    for value in outcome.values:
        if value.name != "result":
            console.data(value_line(value))
    show_exchange(outcome.exchange)


def _help(row: Request, operation: Operation) -> str:
    where = " and ".join(channel.value for channel in operation.channels
                         if row.service(channel) is not None)
    notes = "".join(f"\n\n{note}" for note in row.notes)
    return (f"{operation.summary.capitalize()}.\n\nRequest {row.id} ({row.name}), "
            f"channels: {where}.{notes}")


def _leaf(row: Request, operation: Operation) -> click.Command:
    def callback(**given: Any) -> None:
        _run(row, operation, given)

    return click.Command(operation.path[-1], callback=callback, help=_help(row, operation),
                         short_help=operation.summary,
                         params=[*_parameters(row, operation), *common_parameters()])


def add_typed_commands(root: click.Group) -> None:
    """Hang every typed command into the tree of groups that its path names."""
    for row, operation in operations():
        group = root
        for depth, word in enumerate(operation.path[:-1], start=1):
            group = _subgroup(group, word, " ".join(operation.path[:depth]))
        group.add_command(_leaf(row, operation))


def _subgroup(parent: click.Group, word: str, title: str) -> click.Group:
    existing = parent.commands.get(word)
    if isinstance(existing, click.Group):
        return existing
    group = click.Group(word, help=f"Requests: {title}.")
    parent.add_command(group)
    return group
