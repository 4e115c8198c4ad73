"""The command that sends an AT text."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.cli.outcome import raise_reported, refusal_json
from amt_station.errors import Refused, UsageProblem
from amt_station.render import at_json, item_line
from amt_station.requests.at_commands import known_refusal
from amt_station.requests.model import Channel


@click.command()
@click.argument("text")
@click.option("--force", is_flag=True, help="Send a text that the handset is known to refuse")
@common_options
@click.pass_obj
def at(settings: Settings, text: str, force: bool) -> None:
    """Send an AT text on the PC line and show its reply; the line end is added."""
    if settings.chosen_channel is not Channel.PC:
        raise UsageProblem("AT text is understood on the PC line only")
    why = known_refusal(text)
    if why and not force:
        raise UsageProblem(f"the handset is known to refuse {text}: {why}; it would keep the "
                           "text and read it again with what follows (--force sends it)")
    with settings.open_link() as link, console.waiting(text):
        reply = link.at(text)
    refusal = None if reply.ok else Refused(f"{reply.sent} was answered with {reply.final}")
    if settings.json:
        console.data_json({"ok": reply.ok, **at_json(reply), **refusal_json(refusal)})
    else:
        for line in (*reply.lines, reply.final):
            console.data(line)
        for item in reply.stray:
            console.talk(f"also arrived: {item_line(item)}")
    raise_reported(refusal)
