"""Where each command is: a name stands for a module that is imported when the command is used.

The commands for plans, records and lines belong to ``amt_line``, which builds on this package; they
are named here as text only, so that nothing of it is imported before it is wanted.
"""

from __future__ import annotations

import importlib
from dataclasses import dataclass
from typing import Any, Iterable, Mapping

import click


@dataclass(frozen=True)
class Place:
    """Where a command is, and what it does in a few words."""

    target: str
    summary: str


COMMANDS: Mapping[str, Place] = {
    "at": Place("amt_station.cli.at:at", "Send an AT text and show its reply"),
    "commands": Place("amt_station.cli.commands:commands", "List requests and typed commands"),
    "check": Place("amt_line.cli.check:check", "Check a test plan; nothing is sent"),
    "doctor": Place("amt_station.cli.doctor:doctor", "Look for what goes wrong on this PC"),
    "line": Place("amt_line.cli.line:line", "Carry out a plan with many handsets at once"),
    "ports": Place("amt_station.cli.ports:ports", "List the serial ports and who holds one"),
    "recover": Place("amt_station.cli.recover:recover", "Clear what the handset has refused"),
    "report": Place("amt_line.cli.report:report", "Make JUnit, CSV and HTML of records"),
    "run": Place("amt_line.cli.run:run", "Carry out a test plan and keep a record"),
    "schema": Place("amt_line.cli.schema:schema", "Print the schema of plans or records"),
    "send": Place("amt_station.cli.send:send", "Send any request and show its answer"),
    "serve": Place("amt_line.cli.serve:serve", "Serve runs and statistics as web pages"),
    "show": Place("amt_line.cli.show:show", "Print the record of a run"),
    "stats": Place("amt_line.cli.stats:stats", "Show yields, failures, values and times"),
    "store": Place("amt_line.cli.store:store", "Deliver records to the database, compare both"),
    "trace": Place("amt_station.cli.trace:trace", "Show, compare, replay and record traces"),
    "wait": Place("amt_station.cli.ports:wait", "Wait for a port to appear"),
}


def load(place: Place) -> click.Command:
    """Import a command."""
    module, _, name = place.target.partition(":")
    command = getattr(importlib.import_module(module), name)
    assert isinstance(command, click.Command)
    return command


class Root(click.Group):
    """The commands of the table above, and the typed commands made from the request table."""

    def __init__(self, **attributes: Any) -> None:
        super().__init__(no_args_is_help=False, **attributes)

    def list_commands(self, ctx: click.Context) -> list[str]:
        """Every name, for help and completion."""
        from amt_station.cli.typed import group_names

        return sorted([*COMMANDS, *group_names()])

    def get_command(self, ctx: click.Context, cmd_name: str) -> click.Command | None:
        """The command of this name, imported or made now."""
        if cmd_name in COMMANDS:
            return load(COMMANDS[cmd_name])
        from amt_station.cli.typed import typed_command

        return typed_command(cmd_name)

    def format_commands(self, ctx: click.Context, formatter: click.HelpFormatter) -> None:
        """Two lists for the help, without importing a command."""
        from amt_station.cli.typed import group_names, group_summary

        _write_list(formatter, "Commands",
                    [(name, place.summary) for name, place in sorted(COMMANDS.items())])
        _write_list(formatter, "Typed commands",
                    [(name, group_summary(name)) for name in group_names()])


def _write_list(formatter: click.HelpFormatter, title: str,
                rows: Iterable[tuple[str, str]]) -> None:
    with formatter.section(title):
        formatter.write_dl(list(rows))
