"""The envelope around every packet on the PC line, and the acknowledgement frame."""

from __future__ import annotations

import struct

from amt_station.wire.checksum import checksum
from amt_station.wire.errors import (ChecksumError, LengthError, MagicError, TruncatedError,
                                     ValueRangeError)
from amt_station.wire.packet import PACKET_HEADER_SIZE, PACKET_SIZE, Packet, check_packet_header

MAGIC = bytes.fromhex("AABBCCDD")
HEAD_SIZE = 12
CHECKSUM_SIZE = 4
OVERHEAD = HEAD_SIZE + CHECKSUM_SIZE
LENGTH_OFFSET_SIZE = 8

# The handset collects a request in a buffer that takes at most this many bytes.
LARGEST_REQUEST = 4095

# An acknowledgement carries no packet; the handset sends it before its answer, always these bytes.
ACKNOWLEDGEMENT = bytes.fromhex("AABBCCDD 08000000 02020000 764AEE1D")

_HEAD = struct.Struct("<4sIBBH")
_U32 = struct.Struct("<I")
_FLAG = 2


def envelope_size(data: bytes) -> int:
    """The whole size of the frame that begins with these 8 bytes or more."""
    if len(data) < LENGTH_OFFSET_SIZE:
        raise TruncatedError(f"a frame of {len(data)} bytes has no room for its length")
    if bytes(data[:4]) != MAGIC:
        raise MagicError(f"a frame cannot begin with {bytes(data[:4]).hex(' ').upper()}")
    length = _U32.unpack_from(data, 4)[0]
    if length != 8 and not PACKET_HEADER_SIZE + 8 <= length <= PACKET_SIZE + 8:
        raise LengthError(f"a frame cannot have the length field {length}")
    return int(length) + LENGTH_OFFSET_SIZE


def wrap(packet: bytes) -> bytes:
    """Put the envelope around a bare packet."""
    head = _HEAD.pack(MAGIC, len(packet) + 8, _FLAG, 0, 0)
    return head + packet + _U32.pack(checksum(head + packet))


def encode_envelope(packet: Packet) -> bytes:
    """The frame that carries ``packet`` on the PC line."""
    return wrap(packet.encode())


def check_envelope_packet(data: bytes) -> None:
    """Raise unless the frame's length and its packet's header, 18 bytes in all, agree."""
    inner = envelope_size(data) - OVERHEAD
    total = check_packet_header(data[HEAD_SIZE:HEAD_SIZE + PACKET_HEADER_SIZE])
    if total != inner:
        raise LengthError(f"a packet of {total} bytes in a frame for {inner}")


def unwrap(data: bytes) -> bytes:
    """The bare packet of a complete frame whose checksum is right."""
    size = envelope_size(data)
    if size > len(data):
        raise TruncatedError(f"the frame announces {size} bytes, {len(data)} are there")
    if size < len(data):
        raise LengthError(f"{len(data) - size} bytes follow the frame's end")
    stated = _U32.unpack_from(data, size - CHECKSUM_SIZE)[0]
    computed = checksum(data[:size - CHECKSUM_SIZE])
    if stated != computed:
        raise ChecksumError(f"the frame's checksum is 0x{stated:08X} instead of 0x{computed:08X}")
    if size == len(ACKNOWLEDGEMENT):
        raise LengthError("the frame carries no packet")
    return bytes(data[HEAD_SIZE:size - CHECKSUM_SIZE])


def decode_envelope(data: bytes) -> Packet:
    """Read the packet of a complete frame."""
    return Packet.decode(unwrap(data))


def encode_request(packet: Packet, enveloped: bool) -> bytes:
    """The bytes of a request for one of the channels, refused when the handset cannot take it."""
    data = encode_envelope(packet) if enveloped else packet.encode()
    if len(data) > LARGEST_REQUEST:
        raise ValueRangeError(f"a request of {len(data)} bytes; the handset takes "
                              f"{LARGEST_REQUEST}")
    return data
