"""The command that clears the handset's request buffer."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.render import packet_json, packet_lines


@click.command()
@common_options
@click.pass_obj
def recover(settings: Settings) -> None:
    """Clear a refused AT text out of the handset's request buffer, and check that it is clear.

    A refused packet cannot be cleared over the line: then this says what to do.
    """
    with settings.open_link() as link, console.waiting("the handset"):
        recovery = link.recover(*([link.timeout] if link.timeout else []))
    late = [packet_json(packet) for packet in recovery.late_answers]
    if settings.json:
        console.data_json({"ok": True, "attempts": recovery.attempts, "late_answers": late})
        return
    for packet in recovery.late_answers:
        console.talk(f"the handset carried out what it held: {packet_lines(packet)[0]}")
    console.data("clear")
