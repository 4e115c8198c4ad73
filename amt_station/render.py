"""Exchanges as JSON and as lines of text."""

from __future__ import annotations

from typing import Any, Iterable, Sequence

from amt_station.exchange import AtReply, Exchange, Transcript
from amt_station.requests.model import RESULT, Field
from amt_station.requests.operations import NamedValue, read_answer
from amt_station.requests.table import display_name, requests_by_id
from amt_station.text import plain, printable
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Acknowledgement, Frame, Item, Skipped, Text
from amt_station.wire.packet import Packet

Json = dict[str, Any]


def _fields(packet: Packet, request: int | None) -> dict[int, Field]:
    """Atom id to field of an answer to ``request``, or else of whatever the packet's id says."""
    row = requests_by_id().get(packet.command)
    answered = requests_by_id().get(packet.command - 1 if request is None else request)
    if request is None and row is not None:
        fields = row.fields
    else:
        fields = answered.answer_fields if answered else (RESULT,)
    return {field.atom: field for field in fields}


def atom_json(atom: Atom, field: Field | None) -> Json:
    """An atom: bytes values are hexadecimal, with their text when they hold some."""
    value = atom.value.hex() if isinstance(atom.value, bytes) else atom.value
    shown: Json = {"id": atom.id, "name": field.name if field else None,
                   "type": atom.type.label,
                   "value": plain(value) if isinstance(value, str) else value}
    if field is not None and field.text:
        shown["text"] = plain(str(field.read(atom)))
    return shown


def packet_json(packet: Packet, request: int | None = None) -> Json:
    """A packet with its names; ``request`` is the id of the request that it answers."""
    fields = _fields(packet, request)
    return {"id": packet.command, "name": display_name(packet.command),
            "atoms": [atom_json(atom, fields.get(atom.id)) for atom in packet.atoms]}


def item_json(item: Item) -> Json:
    """Anything that can arrive."""
    if isinstance(item, Frame):
        return {"kind": "packet", "packet": packet_json(item.packet)}
    if isinstance(item, Acknowledgement):
        return {"kind": "acknowledgement"}
    if isinstance(item, Text):
        return {"kind": "text", "text": plain(item.text)}
    return {"kind": "skipped", "bytes": item.raw.hex(), "why": str(item.error)}


def values_json(values: Iterable[NamedValue]) -> Json:
    """Name to value, in its unit."""
    return {value.name: plain(shown) if isinstance(shown := value.shown, str) else shown
            for value in values}


def exchange_json(exchange: Exchange) -> Json:
    """A request and everything that came back."""
    answers, command = exchange.answers, exchange.request.command
    values = read_answer(command, answers[-1]) if answers else []
    return {"channel": exchange.channel.value, "request": packet_json(exchange.request),
            "acknowledged": exchange.acknowledged,
            "answers": [packet_json(answer, command) for answer in answers],
            "result": answers[-1].result if answers else None,
            "values": values_json(values),
            "stray": [item_json(item) for item in exchange.stray],
            "seconds": round(exchange.seconds, 6)}


def transcript_json(transcript: Transcript) -> Json:
    """Every byte of one exchange in hexadecimal, decoded, with its time in seconds."""
    def shown(item: Item) -> Json:
        return {"bytes": item.raw.hex(), **item_json(item)}

    return {"purpose": transcript.purpose.value, "channel": transcript.channel.value,
            "what": plain(transcript.what), "start": transcript.start.isoformat(),
            "sent": transcript.sent.hex(), "late": [shown(item) for item in transcript.late],
            "received": [{"seconds": round(timed.seconds, 6), **shown(timed.item)}
                         for timed in transcript.items],
            "seconds": round(transcript.seconds, 6), "error": transcript.error or None,
            "unkept_bytes": transcript.unkept}


def at_json(reply: AtReply) -> Json:
    """An AT text and its reply."""
    return {"sent": reply.sent, "lines": [plain(line) for line in reply.lines],
            "final": reply.final, "stray": [item_json(item) for item in reply.stray],
            "seconds": round(reply.seconds, 6)}


def value_line(value: NamedValue) -> str:
    """``name: value (word) unit``; a unit that takes more than a word is left to the documents."""
    text = printable(value.value.strip()) if isinstance(value.value, str) else str(value.shown)
    word = f" ({value.word})" if value.word else ""
    unit = f" {value.unit}" if value.unit and " " not in value.unit else ""
    return f"{value.name}: {text}{word}{unit}"


def packet_lines(packet: Packet, request: int | None = None) -> list[str]:
    """A packet: its name, then an atom a line; ``request`` as for ``packet_json``."""
    fields = _fields(packet, request)
    rows = [(str(atom.id), fields[atom.id].name if atom.id in fields else "", atom.type.label,
             _atom_text(atom, fields.get(atom.id))) for atom in packet.atoms]
    title = f"{packet.command} (0x{packet.command:02X}) {display_name(packet.command)}"
    return [title, *("  " + line for line in columns(rows))]


def _atom_text(atom: Atom, field: Field | None) -> str:
    if isinstance(atom.value, str):
        return printable(atom.value)
    if isinstance(atom.value, int):
        return str(atom.value)
    if field is not None and (field.text or field.width):
        return f"{atom.value.hex()} {printable(str(field.read(atom)).strip())}"
    return atom.value.hex()


def item_line(item: Item) -> str:
    """Anything that can arrive, on one line."""
    if isinstance(item, Frame):
        return "; ".join(line.strip() for line in packet_lines(item.packet))
    if isinstance(item, Acknowledgement):
        return "acknowledgement"
    if isinstance(item, Skipped):
        return f"{len(item.raw)} bytes skipped: {item.error}"
    return f"text {printable(item.text)}"


def columns(rows: Sequence[Sequence[str]]) -> list[str]:
    """Rows with their cells aligned."""
    if not rows:
        return []
    widths = [max(len(row[index]) for row in rows) for index in range(len(rows[0]))]
    return ["  ".join(cell.ljust(width) for cell, width in zip(row, widths)).rstrip()
            for row in rows]
