"""The typed commands, made from the request table when one is used."""

from __future__ import annotations

from functools import lru_cache
from typing import Any

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_parameters
from amt_station.cli.outcome import outcome_json, show_exchange
from amt_station.errors import UsageProblem
from amt_station.perform import perform
from amt_station.render import value_line
from amt_station.requests.model import Field, Operation, Request
from amt_station.requests.operations import prepare
from amt_station.requests.table import operations


@lru_cache(maxsize=1)
def group_names() -> tuple[str, ...]:
    """The first word of every typed command, once."""
    return tuple(sorted({operation.path[0] for _, operation in operations()}))


def _below(word: str) -> list[tuple[Request, Operation]]:
    return [(row, operation) for row, operation in operations() if operation.path[0] == word]


def group_summary(word: str) -> str:
    """What the typed commands that begin with ``word`` do."""
    found = _below(word)
    if len(found) == 1 and len(found[0][1].path) == 1:
        return found[0][1].summary.capitalize()
    names = sorted({operation.path[1] for _, operation in found if len(operation.path) > 1})
    return ", ".join(names)


def typed_command(word: str) -> click.Command | None:
    """The command or the group of commands whose first word this is."""
    root = click.Group()
    for row, operation in _below(word):
        group = root
        for depth, part in enumerate(operation.path[:-1], start=1):
            group = _subgroup(group, part, " ".join(operation.path[:depth]))
        group.add_command(_leaf(row, operation))
    return root.commands.get(word)


def _subgroup(parent: click.Group, word: str, title: str) -> click.Group:
    existing = parent.commands.get(word)
    if isinstance(existing, click.Group):
        return existing
    group = click.Group(word, help=f"Requests: {title}.", no_args_is_help=False)
    parent.add_command(group)
    return group


def _leaf(row: Request, operation: Operation) -> click.Command:
    def callback(**given: Any) -> None:
        _run(row, operation, given)

    return click.Command(operation.path[-1], callback=callback, help=_help(row, operation),
                         short_help=operation.summary,
                         params=[*_parameters(row, operation), *common_parameters()])


def _help(row: Request, operation: Operation) -> str:
    where = " and ".join(channel.value for channel in operation.channels
                         if row.service(channel) is not None)
    notes = "".join(f"\n\n{note}" for note in row.notes)
    return (f"{operation.summary.capitalize()}.\n\nRequest {row.id} ({row.name}), "
            f"channels: {where}.{notes}")


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
        return [click.Option([f"--{word}", _flag(field, word)], is_flag=True,
                             help=f"{field.name.capitalize()}: {word}")
                for word in reversed(list(field.choices))]
    metavar = "|".join(field.choices) or ("NUMBER" if field.numeric else "TEXT")
    unit = f" ({field.unit})" if field.unit else ""
    return [click.Option([f"--{field.name}", _variable(field)], metavar=metavar, multiple=True,
                         help=field.meaning + unit)]


def _variable(field: Field) -> str:
    return field.name.replace("-", "_")


def _flag(field: Field, word: str) -> str:
    return f"{_variable(field)}_is_{word}"


def _given(field: Field, given: dict[str, Any]) -> str | None:
    """What was said about one field; contradictions are refused."""
    if field.flags:
        said = [word for word in field.choices if given.get(_flag(field, word))]
    else:
        value = given.get(_variable(field))
        said = sorted(set(value)) if isinstance(value, tuple) else [value] if value else []
        said = [""] if value == "" else said
    if len(said) > 1:
        raise UsageProblem(f"{field.name}: {' and '.join(said)} contradict each other")
    return said[0] if said else None


def _run(row: Request, operation: Operation, given: dict[str, Any]) -> None:
    settings = click.get_current_context().ensure_object(Settings)
    names = (*operation.takes, *operation.may_take)
    said = {name: _given(row.field(name), given) for name in names}
    values = {name: row.field(name).parse(text) for name, text in said.items() if text is not None}
    # Everything that can be wrong with the request is found before the port is touched.
    prepared = prepare(operation.path, values, settings.chosen_channel, bool(given.get("force")))
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
