"""The binary blocks of the modem's tunnel: a request's values, and what an answer turns into."""

from __future__ import annotations

import struct
from dataclasses import dataclass
from typing import Mapping

from amt_station import wire
from tools.stateful.phone import integer

LENGTHS_SENT = 0x97

# What follows the result of an answer: atom id and kind of each value, by the answer's command.
NUMBER, FLAG, LONG, SHORT = "number", "flag", "long", "short"
Field = tuple[int, "str | int"]
FIELDS: Mapping[int, tuple[Field, ...]] = {
    0x08: ((21, 15),),
    0x18: ((12, NUMBER), (4, LONG)),
    0x1A: ((13, NUMBER),),
    0x2E: ((19, NUMBER), (18, 64)),
    **{command: ((4, LONG),) for command in (0x30, 0x3E, 0x72)},
    0x3C: ((24, NUMBER),),
    0x4E: ((34, LONG),),
    0x64: ((41, FLAG),),
    0x6A: ((43, LONG),),
    0x6E: ((44, FLAG),),
    **{command: ((62, SHORT),) for command in (0x98, 0xDD)},
}


def from_request(packet: wire.Packet) -> bytes:
    """The values of a request's atoms behind its command."""
    block = bytes([packet.command])
    for atom in packet.atoms:
        if packet.command == LENGTHS_SENT:
            block += struct.pack("<H", len(atom.content))
        block += atom.content
    return block


@dataclass
class _Cursor:
    data: bytes
    place: int = 0

    def take(self, count: int) -> bytes:
        """The next bytes; an area behind the block is zero."""
        taken = self.data[self.place:self.place + count]
        self.place += count
        return taken.ljust(count, b"\0")


def _read(cursor: _Cursor, atom: int, kind: "str | int") -> wire.Atom | None:
    if kind == NUMBER:
        return integer(atom, int.from_bytes(cursor.take(4), "big"))
    if kind == FLAG:
        return wire.Atom.boolean(atom, cursor.take(1)[0])
    if kind in (LONG, SHORT):
        count = int.from_bytes(cursor.take(4 if kind == LONG else 2), "little")
    else:
        assert isinstance(kind, int)
        count = kind
    return wire.Atom.raw(atom, cursor.take(count)) if count else None


def to_answer(block: bytes) -> wire.Packet | None:
    """The packet that a block turns into; None when its last value is empty."""
    cursor = _Cursor(block)
    command = cursor.take(1)[0]
    atoms: list[wire.Atom | None] = [
        integer(wire.RESULT_ATOM, int.from_bytes(cursor.take(4), "big"))]
    if cursor.place != len(block):
        atoms += [_read(cursor, atom, kind) for atom, kind in FIELDS.get(command, ())]
    if atoms[-1] is None:
        return None
    return wire.Packet(command, tuple(atom for atom in atoms if atom is not None))


def from_hex(line: str, count: int) -> bytes:
    """COUNT bytes from digit pairs; a character that is no digit counts as 0."""
    def nibble(place: int) -> int:
        character = line[place:place + 1]
        return int(character, 16) if character and character in "0123456789ABCDEFabcdef" else 0

    return bytes(nibble(2 * k) << 4 | nibble(2 * k + 1) for k in range(count))
