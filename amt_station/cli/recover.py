"""The command that clears the handset's request buffer."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Seconds, Settings, common_options
from amt_station.errors import Held, NoPort, Refused
from amt_station.link import RECOVER_TIMEOUT, Link, Recovery
from amt_station.render import packet_json, packet_lines
from amt_station.replug import wait_for_replug

PLUG_TIMEOUT = 120.0


@click.command()
@click.option("--wait", is_flag=True,
              help="For a refused packet: wait until the cable is unplugged and plugged in again")
@click.option("--plug-timeout", type=Seconds(), default=PLUG_TIMEOUT, show_default=True,
              metavar="SECONDS", help="How long --wait waits for the cable")
@common_options
@click.pass_obj
def recover(settings: Settings, wait: bool, plug_timeout: float) -> None:
    """Clear a refused AT text out of the handset's request buffer, and check that it is clear.

    A refused packet cannot be cleared over the line: then this says what to do, and with --wait
    waits until it is done.
    """
    with settings.open_link() as link, console.waiting("the handset"):
        recovery = _recover(link, plug_timeout if wait else None)
    late = [packet_json(packet) for packet in recovery.late_answers]
    if settings.json:
        console.data_json({"ok": True, "attempts": recovery.attempts, "late_answers": late})
        return
    for packet in recovery.late_answers:
        console.talk(f"the handset carried out what it held: {packet_lines(packet)[0]}")
    console.data("clear")


def _recover(link: Link, plug_timeout: float | None) -> Recovery:
    limit = link.timeout or RECOVER_TIMEOUT
    try:
        return link.recover(limit)
    except (Refused, NoPort) as problem:
        if plug_timeout is None or isinstance(problem, Refused) and problem.held is Held.NOTHING:
            raise
    wait_for_replug(link, plug_timeout, console.talk)
    return link.recover(limit)
