"""Typed commands at work: packets from named values, named values from answers."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Mapping

from amt_station.errors import UsageProblem
from amt_station.requests.model import Channel, Field, Operation, Request
from amt_station.requests.table import requests_by_id
from amt_station.wire.atoms import RESULT_ATOM, Atom
from amt_station.wire.packet import Packet

Value = int | str


@dataclass(frozen=True)
class NamedValue:
    """One atom of an answer with its name; ``word`` is what a number stands for."""

    name: str
    value: Value
    word: str = ""
    unit: str = ""


def build_packet(row: Request, values: Mapping[str, Value]) -> Packet:
    """The request packet for these values, its atoms in the row's order."""
    for name in values:
        row.field(name)
    return Packet(row.id, tuple(atom for field in row.fields
                                if (atom := _field_atom(row, field, values)) is not None))


def _field_atom(row: Request, field: Field, values: Mapping[str, Value]) -> Atom | None:
    if field.name in values:
        return field.encode(values[field.name])
    if field.length_of in values:
        measured = row.field(field.length_of).encode(values[field.length_of])
        return field.encode(len(measured.content))
    return None


def operation_packet(row: Request, operation: Operation,
                     values: Mapping[str, Value] | None = None) -> Packet:
    """The packet of a typed command."""
    given = {name: value for name, value in (values or {}).items() if value is not None}
    missing = [name for name in operation.takes if name not in given]
    if missing:
        raise UsageProblem(f"{operation.name} needs {', '.join(missing)}")
    return build_packet(row, {**operation.fixed, **given})


def check_channel(row: Request, operation: Operation, channel: Channel) -> None:
    """Refuse what the handset is known to refuse, or to do otherwise, on this channel."""
    if channel not in operation.channels or row.service(channel) is None:
        served = " and ".join(name.value for name in operation.channels
                              if row.service(name) is not None)
        raise UsageProblem(f"{operation.name} is served on the {served} channel only")


def read_answer(command: int, answer: Packet) -> list[NamedValue]:
    """The values of an answer to request ``command``, with their names."""
    row = requests_by_id().get(command)
    return [_named_value(row, atom) for atom in answer.atoms]


def _named_value(row: Request | None, atom: Atom) -> NamedValue:
    field = row.answer_field(atom.id) if row else None
    if field is None:
        plain = atom.value.hex() if isinstance(atom.value, bytes) else atom.value
        return NamedValue("result" if atom.id == RESULT_ATOM else f"atom {atom.id}", plain)
    value = field.read(atom)
    return NamedValue(field.name, value, field.word(value), field.unit)
