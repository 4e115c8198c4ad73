"""The command that sends an AT text."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.cli.outcome import raise_reported, refusal_json
from amt_station.perform import reply_problem
from amt_station.render import at_json, item_line
from amt_station.requests.operations import prepare_text


@click.command()
@click.argument("text")
@click.option("--force", is_flag=True, help="Send a text that the handset is known to refuse")
@common_options
@click.pass_obj
def at(settings: Settings, text: str, force: bool) -> None:
    """Send an AT text on the PC line and show its reply; the line end is added."""
    prepared = prepare_text(text, settings.chosen_channel, force)
    for problem in prepared.forced:
        console.talk(f"forced: {problem}")
    with settings.open_link() as link, console.waiting(text):
        reply = link.at(text)
    refusal = reply_problem(reply)
    if settings.json:
        console.data_json({"ok": reply.ok, **at_json(reply), **refusal_json(refusal)})
    else:
        for line in (*reply.lines, reply.final):
            console.data(line)
        for item in reply.stray:
            console.talk(f"also arrived: {item_line(item)}")
    raise_reported(refusal)
