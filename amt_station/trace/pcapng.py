"""A trace as a capture file: a frame or a text a packet, behind a head that says who said it.

The head has four bytes: its version 1, the direction (0: the station says, 1: it hears), the
channel (0: PC line, 1: app channel), and 0. The link type is the first one left to users.
"""

from __future__ import annotations

import struct
from typing import Iterable, Iterator, NamedTuple

from amt_station import __version__
from amt_station.requests.model import Channel
from amt_station.trace.conversation import Spoken, events
from amt_station.trace.dialogue import Dialogue

LINK_TYPE = 147
HEAD_VERSION = 1

_SECTION, _INTERFACE, _PACKET = 0x0A0D0D0A, 1, 6
_BYTE_ORDER = 0x1A2B3C4D
_COMMENT, _NAME, _PROGRAM, _FLAGS = 1, 2, 4, 2
_INBOUND, _OUTBOUND = 1, 2
_MICROSECONDS = 1_000_000
# Readers refuse packets that are much larger.
_LONGEST = 1 << 16


class Piece(NamedTuple):
    """One packet of a capture; ``moment`` is in seconds since 1970."""

    moment: float
    said: bool
    data: bytes
    comments: tuple[bytes, ...] = ()


def capture(trace: Dialogue) -> bytes:
    """The capture file of a trace; what is no traffic becomes comments on what follows."""
    return written(trace.line_channel, _pieces(trace))


def written(channel: Channel, pieces: Iterable[Piece]) -> bytes:
    """The capture file of these pieces."""
    return b"".join(_blocks(channel, pieces))


def _blocks(channel: Channel, pieces: Iterable[Piece]) -> Iterator[bytes]:
    yield _block(_SECTION, struct.pack("<IHHq", _BYTE_ORDER, 1, 0, -1)
                 + _options((_PROGRAM, f"amt-station {__version__}".encode())))
    yield _block(_INTERFACE, struct.pack("<HHI", LINK_TYPE, 0, 0)
                 + _options((_NAME, channel.value.encode())))
    for piece in pieces:
        yield _packet(piece, bytes((HEAD_VERSION, not piece.said, channel is Channel.APP, 0)))


def _pieces(trace: Dialogue) -> Iterator[Piece]:
    begun = trace.begun.timestamp() if trace.begun else 0.0
    comments: tuple[bytes, ...] = ()
    last = 0.0
    for event in events(trace):
        last = last if event.seconds is None else event.seconds
        if not isinstance(event, Spoken):
            comments += (trace.lines[event.line - 1].strip().encode(),)
            continue
        for begin in range(0, len(event.item.raw), _LONGEST):
            yield Piece(begun + last, event.said, event.item.raw[begin:begin + _LONGEST],
                        comments)
            comments = ()


def _packet(piece: Piece, head: bytes) -> bytes:
    moment = max(0, round(piece.moment * _MICROSECONDS))
    direction = _OUTBOUND if piece.said else _INBOUND
    data = head + piece.data
    body = struct.pack("<IIIII", 0, moment >> 32, moment & 0xFFFFFFFF, len(data), len(data))
    options = [(_COMMENT, comment[:_LONGEST - 1]) for comment in piece.comments]
    return _block(_PACKET, body + _padded(data)
                  + _options((_FLAGS, struct.pack("<I", direction)), *options))


def _block(kind: int, body: bytes) -> bytes:
    size = struct.pack("<I", len(body) + 12)
    return struct.pack("<I", kind) + size + body + size


def _options(*options: tuple[int, bytes]) -> bytes:
    coded = [struct.pack("<HH", code, len(value)) + _padded(value) for code, value in options]
    return b"".join([*coded, bytes(4)])


def _padded(data: bytes) -> bytes:
    return data + bytes(-len(data) % 4)
