"""Atoms: the typed values that every request and response is made of."""

from __future__ import annotations

import struct
from dataclasses import dataclass
from enum import IntEnum
from typing import Union

from amt_station.wire.errors import AtomTypeError, HeadError, TruncatedError, ValueRangeError

ATOM_HEAD = 0xEE
ATOM_HEADER_SIZE = 5
RESULT_ATOM = 1

_ATOM_HEADER = struct.Struct("<BBBH")
_INTEGER = struct.Struct("<i")

AtomValue = Union[int, str, bytes]


class AtomType(IntEnum):
    """The four value types."""

    INT = 1
    STRING = 2
    BYTES = 3
    BOOL = 4

    @property
    def label(self) -> str:
        """The word for it on the command line and in documents."""
        return _LABELS[self]


_LABELS = {AtomType.INT: "int", AtomType.STRING: "str", AtomType.BYTES: "bytes",
           AtomType.BOOL: "bool"}
_FIXED_LENGTHS = {AtomType.INT: 4, AtomType.BOOL: 1}


def check_byte(value: int, what: str) -> None:
    """Raise unless ``value`` is one."""
    if not 0 <= value <= 255:
        raise ValueRangeError(f"{what} {value} is not a byte")


@dataclass(frozen=True)
class Atom:
    """One value: its id, its type and its content as it travels."""

    id: int
    type: AtomType
    content: bytes

    def __post_init__(self) -> None:
        check_byte(self.id, "atom id")
        wanted = _FIXED_LENGTHS.get(self.type, len(self.content))
        if len(self.content) != wanted:
            raise AtomTypeError(f"atom {self.id} of type {self.type.label} holds "
                                f"{len(self.content)} bytes instead of {wanted}")
        if len(self.content) > 0xFFFF:
            raise ValueRangeError(f"atom {self.id} holds {len(self.content)} bytes, "
                                  "its length field has 16 bits")

    @classmethod
    def integer(cls, atom_id: int, value: int) -> Atom:
        """An integer atom; ``value`` is a signed 32-bit number."""
        if not -0x80000000 <= value <= 0x7FFFFFFF:
            raise ValueRangeError(f"atom {atom_id}: {value} is not a signed 32-bit number")
        return cls(atom_id, AtomType.INT, _INTEGER.pack(value))

    @classmethod
    def string(cls, atom_id: int, text: str) -> Atom:
        """A string atom; the text travels as UTF-8 without a terminating zero."""
        return cls(atom_id, AtomType.STRING, text.encode("utf-8", "surrogateescape"))

    @classmethod
    def raw(cls, atom_id: int, content: bytes) -> Atom:
        """A bytes atom."""
        return cls(atom_id, AtomType.BYTES, bytes(content))

    @classmethod
    def boolean(cls, atom_id: int, value: int) -> Atom:
        """A one-byte atom: 0 or 1 as a switch, but any byte is allowed."""
        check_byte(value, f"atom {atom_id}: value")
        return cls(atom_id, AtomType.BOOL, bytes((value,)))

    @property
    def value(self) -> AtomValue:
        """The value as a Python one; a one-byte atom gives its number."""
        if self.type is AtomType.INT:
            return int(_INTEGER.unpack(self.content)[0])
        if self.type is AtomType.STRING:
            return self.content.decode("utf-8", "surrogateescape")
        if self.type is AtomType.BOOL:
            return self.content[0]
        return self.content

    def encode(self) -> bytes:
        """The atom's bytes."""
        return _ATOM_HEADER.pack(ATOM_HEAD, self.id, self.type, len(self.content)) + self.content


def decode_atom(data: bytes, offset: int) -> Atom:
    """The atom whose header begins at ``offset``."""
    where = f"atom at byte {offset}"
    if data[offset] != ATOM_HEAD:
        raise HeadError(f"{where} begins with 0x{data[offset]:02X} instead of 0xEE")
    if len(data) - offset < ATOM_HEADER_SIZE:
        raise TruncatedError(f"{where} has no room for its header")
    _, atom_id, type_code, length = _ATOM_HEADER.unpack_from(data, offset)
    if type_code not in _LABELS:
        raise AtomTypeError(f"{where} has the unknown value type {type_code}")
    content = data[offset + ATOM_HEADER_SIZE:offset + ATOM_HEADER_SIZE + length]
    if len(content) != length:
        raise TruncatedError(f"{where} announces {length} bytes, {len(content)} are left")
    return Atom(atom_id, AtomType(type_code), content)
