"""The command that sends any request."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.cli.outcome import judged, raise_reported, refusal_json, show_exchange
from amt_station.errors import IncompleteAnswer
from amt_station.exchange import Exchange
from amt_station.render import exchange_json, packet_lines
from amt_station.requests.atom_text import parse_atom
from amt_station.requests.operations import Prepared, misfits, prepare_packet
from amt_station.requests.table import display_name, find_command, requests_by_id
from amt_station.wire.packet import Packet


def _misfit(prepared: Prepared, exchange: Exchange) -> IncompleteAnswer | None:
    found = misfits(prepared, exchange.answer)
    return IncompleteAnswer(f"{prepared.name}: {'; '.join(found)}") if found else None


@click.command()
@click.argument("command")
@click.argument("atoms", nargs=-1, metavar="[ATOM=TYPE:VALUE]...")
@click.option("--raw", is_flag=True, help="Send atoms of another type than the request's")
@common_options
@click.pass_obj
def send(settings: Settings, command: str, atoms: tuple[str, ...], raw: bool) -> None:
    """Send any request and show its answer.

    COMMAND is an id (decimal or 0x...), a name of the catalogue or of `amt-station commands`.
    ATOM is a number or a name, TYPE one of int, str, bytes (hexadecimal) and bool; a named atom
    may leave TYPE out. An atom that the request knows has to be of its type.
    """
    number = find_command(command)
    row = requests_by_id().get(number)
    packet = Packet(number, tuple(parse_atom(row, atom, raw) for atom in atoms))
    prepared = prepare_packet(packet, settings.chosen_channel)
    with settings.open_link() as link, console.waiting(display_name(number)):
        exchange = link.converse(packet)
        refusal = judged(exchange) or (None if raw else _misfit(prepared, exchange))
        if isinstance(refusal, IncompleteAnswer):
            link.doubt()
    if settings.json:
        console.data_json({"ok": refusal is None, **exchange_json(exchange),
                           **refusal_json(refusal)})
    else:
        for answer in exchange.answers:
            for line in packet_lines(answer, number):
                console.data(line)
        show_exchange(exchange)
    raise_reported(refusal)
