"""The commands that take what they are given: send, at, commands, recover."""

from __future__ import annotations

import click

from amt_station import console, judge
from amt_station.at_commands import AT_COMMANDS, WATCHED, known_refusal
from amt_station.atom_text import parse_atom
from amt_station.cli_options import Settings, common_options
from amt_station.errors import Refused, UsageProblem
from amt_station.exchange import Exchange
from amt_station.packet import Packet
from amt_station.render import at_json, columns, exchange_json, item_line, packet_json, packet_lines
from amt_station.requests import Channel, Request, Service
from amt_station.table import REQUESTS, display_name, find_command, operations, requests_by_id


@click.command()
@click.argument("command")
@click.argument("atoms", nargs=-1, metavar="[ATOM=TYPE:VALUE]...")
@common_options
@click.pass_obj
def send(settings: Settings, command: str, atoms: tuple[str, ...]) -> None:
    """Send any request and show its answer.

    COMMAND is an id (decimal or 0x...), a name of the catalogue or of `amt-station commands`.
    ATOM is a number or a name, TYPE one of int, str, bytes (hexadecimal) and bool; a named atom
    may leave TYPE out.
    """
    number = find_command(command)
    row = requests_by_id().get(number)
    packet = Packet(number, tuple(parse_atom(row, atom) for atom in atoms))
    with settings.open_link() as link, console.waiting(display_name(number)):
        exchange = link.converse(packet)
    refusal = judged(exchange)
    if settings.json:
        console.data_json({"ok": refusal is None, **exchange_json(exchange), **_outcome(refusal)})
    else:
        for answer in exchange.answers:
            for line in packet_lines(answer, number):
                console.data(line)
        show_exchange(exchange)
    _raise_reported(refusal)


def _outcome(refusal: Refused | None) -> dict[str, object]:
    return {"error": refusal.details()} if refusal else {}


def _raise_reported(refusal: Refused | None) -> None:
    """Let a refusal end the command, after its JSON document was printed."""
    if refusal is not None:
        refusal.reported = True
        raise refusal


def judged(exchange: Exchange) -> Refused | None:
    """The refusal in an exchange, if there is one."""
    try:
        judge.judge(exchange)
    except Refused as refusal:
        return refusal
    return None


def show_exchange(exchange: Exchange) -> None:
    """Say how an exchange went, for the person."""
    how = "acknowledged, " if exchange.acknowledged else ""
    console.talk(f"{display_name(exchange.request.command)}: {how}answered after "
                 f"{exchange.seconds * 1000:.1f} ms")
    for item in exchange.stray:
        console.talk(f"also arrived: {item_line(item)}")


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
        console.data_json({"ok": reply.ok, **at_json(reply), **_outcome(refusal)})
    else:
        for line in (*reply.lines, reply.final):
            console.data(line)
        for item in reply.stray:
            console.talk(f"also arrived: {item_line(item)}")
    _raise_reported(refusal)


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


def _who(service: Service | None) -> str:
    return service.by if service else "-"


@click.command()
@click.option("--at", "at_texts", is_flag=True, help="List the AT commands instead")
@common_options
@click.pass_obj
def commands(settings: Settings, at_texts: bool) -> None:
    """List the requests, who serves them on each channel, and the typed commands."""
    if at_texts:
        _list_at(settings)
    elif settings.json:
        console.data_json([_request_json(row) for row in REQUESTS])
    else:
        header = ("id", "hex", "command", "name", "pc", "app", "what")
        rows = [(str(row.id), f"0x{row.id:02X}", row.name, row.catalogue_name, _who(row.pc),
                 _who(row.app), row.summary) for row in REQUESTS]
        for line in columns([header, *rows]):
            console.data(line)
        console.data("")
        for line in columns([(operation.name, operation.summary)
                             for _, operation in operations()]):
            console.data(line)


def _request_json(row: Request) -> dict[str, object]:
    return {"id": row.id, "name": row.catalogue_name, "command": row.name,
            "summary": row.summary, "pc": _who(row.pc), "app": _who(row.app),
            "acknowledged": bool(row.pc and row.pc.acknowledged), "answer": row.answer_id,
            "atoms": [{"id": field.atom, "name": field.name, "type": field.type.label,
                       "unit": field.unit or None, "meaning": field.meaning}
                      for field in row.fields],
            "operations": [operation.name for operation in row.operations]}


def _list_at(settings: Settings) -> None:
    rows = [(row.text, row.does, row.reply) for row in AT_COMMANDS]
    rows += [(watched.text, watched.does, "the modem's") for watched in WATCHED]
    if settings.json:
        console.data_json([{"text": text, "does": does, "reply": reply}
                           for text, does, reply in rows])
        return
    for line in columns([row[:2] for row in rows]):
        console.data(line)
