"""Incremental decoders: bytes as they arrive in, frames, acknowledgements and text out.

A decoder never loses its place for good: when a frame turns out damaged, the search goes on one
byte after its beginning, so that a whole frame behind or even inside the damage still comes out.
What could not be read comes out too, with the reason. The items do not depend on how the stream
was cut into pieces (a run of text may come in several pieces).
"""

from __future__ import annotations

import re
from abc import ABC, abstractmethod
from dataclasses import dataclass
from typing import Callable, TypeVar, Union

from amt_station.wire.atoms import ATOM_HEAD
from amt_station.wire.envelope import (ACKNOWLEDGEMENT, HEAD_SIZE, LENGTH_OFFSET_SIZE, MAGIC,
                                       check_envelope_packet, decode_envelope, envelope_size)
from amt_station.wire.errors import StrayBytesError, TruncatedError, WireError
from amt_station.wire.packet import PACKET_HEAD, PACKET_HEADER_SIZE, Packet, check_packet_header


@dataclass(frozen=True)
class Frame:
    """A whole packet, with the bytes that carried it."""

    packet: Packet
    raw: bytes


@dataclass(frozen=True)
class Acknowledgement:
    """The frame that says a request was taken."""

    raw: bytes = ACKNOWLEDGEMENT


@dataclass(frozen=True)
class Text:
    """Text between frames: AT answers."""

    raw: bytes

    @property
    def text(self) -> str:
        """The characters; bytes that are none survive as surrogates."""
        return self.raw.decode("utf-8", "surrogateescape")


@dataclass(frozen=True)
class Skipped:
    """Bytes that are neither a frame nor text, and why."""

    raw: bytes
    error: WireError


Item = Union[Frame, Acknowledgement, Text, Skipped]

_TEXT = re.compile(rb"(?:[\t\r\n\x20-\x7E]|[\xC2-\xDF][\x80-\xBF]|[\xE0-\xEF][\x80-\xBF]{2}"
                   rb"|[\xF0-\xF4][\x80-\xBF]{3})+")
_CUT_CHARACTER = re.compile(rb"(?:[\xC2-\xDF]|[\xE0-\xEF][\x80-\xBF]?|[\xF0-\xF4][\x80-\xBF]{0,2})"
                            rb"\Z")


_STRAY = StrayBytesError("bytes that are neither a frame nor text")
_HEADERS = HEAD_SIZE + PACKET_HEADER_SIZE


class _Damaged(Exception):
    """A candidate is no frame: the reason, and how many bytes belong to the damage."""

    def __init__(self, error: WireError, extent: int) -> None:
        super().__init__(str(error))
        self.error = error
        self.extent = extent


_Result = TypeVar("_Result")


def _attempt(extent: int, read: Callable[[bytes], _Result], data: bytes) -> _Result:
    """Read something of a candidate; a failure damages ``extent`` bytes."""
    try:
        return read(data)
    except WireError as error:
        raise _Damaged(error, extent) from error


class Decoder(ABC):
    """What both decoders share: the buffer, the runs between frames, and the resynchronisation."""

    def __init__(self) -> None:
        self._buffer = bytearray()
        self._damage_error: WireError | None = None
        self._damage_left = 0

    @property
    def pending(self) -> int:
        """Bytes held back because a frame or a character may still be completed."""
        return len(self._buffer)

    def feed(self, data: bytes) -> list[Item]:
        """Take the next bytes of the stream and return what they complete."""
        self._buffer += data
        return self._scan(final=False)

    def give_up(self) -> list[Item]:
        """Stop waiting for the rest of a frame, after a silence: return what the held bytes are."""
        return self._scan(final=True)

    @abstractmethod
    def _find(self, position: int, final: bool) -> int:
        """The index, from ``position``, where a frame may begin; the buffer's length if nowhere."""

    @abstractmethod
    def _judge(self, position: int) -> Frame | Acknowledgement | None:
        """The frame that begins here, None while bytes are missing; raises ``_Damaged``."""

    def _scan(self, final: bool) -> list[Item]:
        items: list[Item] = []
        position = 0
        while True:
            start = self._find(position, final)
            position += self._take_run(items, position, start, final)
            if start == len(self._buffer) or position < start:
                break
            try:
                item = self._judge(start)
                if item is None and final:
                    raise _Damaged(TruncatedError("the frame was not completed"),
                                   min(len(self._buffer) - start, _HEADERS))
            except _Damaged as damage:
                self._note_damage(damage)
                position += self._take_damaged(items, start, 1)
                continue
            if item is None:
                break
            items.append(item)
            position += len(item.raw)
            self._damage_left = 0
        del self._buffer[:position]
        return items

    def _note_damage(self, damage: _Damaged) -> None:
        if self._damage_left == 0:
            self._damage_error = damage.error
        self._damage_left = max(self._damage_left, damage.extent)

    def _take_damaged(self, items: list[Item], start: int, length: int) -> int:
        """Report ``length`` bytes as part of the damage that is being passed."""
        assert self._damage_error is not None
        self._damage_left -= length
        _append_skipped(items, bytes(self._buffer[start:start + length]), self._damage_error)
        return length

    def _take_run(self, items: list[Item], start: int, end: int, final: bool) -> int:
        """Report the bytes between two candidates; return how many were taken."""
        taken = 0
        if self._damage_left and end > start:
            taken = self._take_damaged(items, start, min(self._damage_left, end - start))
        run = bytes(self._buffer[start + taken:end])
        if len(self._buffer) - end < len(MAGIC) and not final:
            cut = _CUT_CHARACTER.search(run)
            run = run[:cut.start()] if cut else run
        _append_run(items, run)
        return taken + len(run)


def _append_run(items: list[Item], run: bytes) -> None:
    position = 0
    for text in _TEXT.finditer(run):
        _append_stray(items, run[position:text.start()])
        items.append(Text(text[0]))
        position = text.end()
    _append_stray(items, run[position:])


def _append_stray(items: list[Item], run: bytes) -> None:
    if run:
        _append_skipped(items, run, _STRAY)


def _append_skipped(items: list[Item], raw: bytes, error: WireError) -> None:
    last = items[-1] if items else None
    if isinstance(last, Skipped) and last.error is error:
        items[-1] = Skipped(last.raw + raw, last.error)
    else:
        items.append(Skipped(raw, error))


class EnvelopeDecoder(Decoder):
    """For the PC line: frames in envelopes, acknowledgements and AT text."""

    def _find(self, position: int, final: bool) -> int:
        start = self._buffer.find(MAGIC, position)
        if start >= 0:
            return start
        end = len(self._buffer)
        for size in (3, 2, 1):
            if end - size >= position and self._buffer.endswith(MAGIC[:size]):
                return end - size
        return end

    def _judge(self, position: int) -> Frame | Acknowledgement | None:
        head = bytes(self._buffer[position:position + _HEADERS])
        if len(head) < LENGTH_OFFSET_SIZE:
            return None
        size = _attempt(len(MAGIC), envelope_size, head)
        if size > len(ACKNOWLEDGEMENT) and len(head) == _HEADERS:
            _attempt(len(head), check_envelope_packet, head)
        raw = bytes(self._buffer[position:position + size])
        if len(raw) < size:
            return None
        if raw == ACKNOWLEDGEMENT:
            return Acknowledgement()
        return Frame(_attempt(size, decode_envelope, raw), raw)


class BareDecoder(Decoder):
    """For the app channel: packets without envelope."""

    def _find(self, position: int, final: bool) -> int:
        head = self._buffer.find(PACKET_HEAD, position + 2)
        if head >= 0:
            return head - 2
        return len(self._buffer) if final else max(position, len(self._buffer) - 2)

    def _judge(self, position: int) -> Frame | None:
        head = bytes(self._buffer[position:position + PACKET_HEADER_SIZE + 1])
        if len(head) < PACKET_HEADER_SIZE:
            return None
        try:
            size = check_packet_header(head)
        except WireError as error:
            raise _Damaged(_STRAY, 1) from error
        if len(head) > PACKET_HEADER_SIZE and size > PACKET_HEADER_SIZE and head[-1] != ATOM_HEAD:
            raise _Damaged(_STRAY, 1)
        raw = bytes(self._buffer[position:position + size])
        if len(raw) < size:
            return None
        return Frame(_attempt(size, Packet.decode, raw), raw)
