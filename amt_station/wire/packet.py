"""Packets: a command id and its atoms in order."""

from __future__ import annotations

import struct
from dataclasses import dataclass, field
from typing import Iterator

from amt_station.wire.atoms import ATOM_HEADER_SIZE, RESULT_ATOM, Atom, check_byte, decode_atom
from amt_station.wire.errors import (HeadError, LengthError, MissingAtomError, TruncatedError,
                                     ValueRangeError)

PACKET_SIZE = 4096
PACKET_HEAD = 0xBB
PACKET_HEADER_SIZE = 6

_PACKET_HEADER = struct.Struct("<HBBH")


def _iterate_atoms(data: bytes) -> Iterator[Atom]:
    offset = PACKET_HEADER_SIZE
    while offset < len(data):
        atom = decode_atom(data, offset)
        offset += ATOM_HEADER_SIZE + len(atom.content)
        yield atom


def check_packet_header(data: bytes) -> int:
    """Return the total length that the first 6 bytes announce, or raise what is wrong in them."""
    if len(data) < PACKET_HEADER_SIZE:
        raise TruncatedError(f"a packet of {len(data)} bytes has no room for its header")
    total, head, _, atom_length = _PACKET_HEADER.unpack_from(data)
    if head != PACKET_HEAD:
        raise HeadError(f"the packet's head is 0x{head:02X} instead of 0xBB")
    if not PACKET_HEADER_SIZE <= total <= PACKET_SIZE:
        raise LengthError(f"a packet cannot be {total} bytes long")
    if atom_length != total - PACKET_HEADER_SIZE:
        raise LengthError(f"the packet's atom length is {atom_length} in {total} bytes")
    return int(total)


@dataclass(frozen=True)
class Packet:
    """A request or a response: a command id and its atoms in order."""

    command: int
    atoms: tuple[Atom, ...] = field(default=())

    def __post_init__(self) -> None:
        check_byte(self.command, "command id")
        object.__setattr__(self, "atoms", tuple(self.atoms))

    def encode(self) -> bytes:
        """The bare packet, as it travels on the app channel."""
        body = b"".join(atom.encode() for atom in self.atoms)
        total = PACKET_HEADER_SIZE + len(body)
        if total > PACKET_SIZE:
            raise ValueRangeError(f"a packet of {total} bytes exceeds {PACKET_SIZE}")
        return _PACKET_HEADER.pack(total, PACKET_HEAD, self.command, len(body)) + body

    @classmethod
    def decode(cls, data: bytes) -> Packet:
        """Read a bare packet that fills ``data`` exactly."""
        data = bytes(data)
        total = check_packet_header(data)
        if total > len(data):
            raise TruncatedError(f"the packet announces {total} bytes, {len(data)} are there")
        if total < len(data):
            raise LengthError(f"{len(data) - total} bytes follow the packet's end")
        return cls(data[3], tuple(_iterate_atoms(data)))

    def find(self, atom_id: int) -> Atom | None:
        """The first atom with this id."""
        return next((atom for atom in self.atoms if atom.id == atom_id), None)

    def get_int(self, atom_id: int, default: int | None = None) -> int:
        """The number in an integer or one-byte atom.

        For any other atom or none it is ``default``, without which ``MissingAtomError`` is raised.
        """
        atom = self.find(atom_id)
        if atom is not None and isinstance(atom.value, int):
            return atom.value
        if default is None:
            raise MissingAtomError(f"packet {self.command} holds no number in an atom {atom_id}")
        return default

    @property
    def result(self) -> int | None:
        """The result code, or None when the packet carries none."""
        atom = self.find(RESULT_ATOM)
        return atom.value if atom is not None and isinstance(atom.value, int) else None
