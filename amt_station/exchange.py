"""What came of one exchange with the handset."""

from __future__ import annotations

from dataclasses import dataclass, field
from datetime import datetime, timezone
from enum import Enum

from amt_station.requests.model import Channel
from amt_station.wire.decoder import Acknowledgement, Frame, Item, Text
from amt_station.wire.packet import Packet

# What one exchange keeps of a line that never falls silent.
MOST_BYTES = 1 << 18
MOST_ITEMS = 4096
LONGEST_REPLY = 1 << 16


@dataclass(frozen=True)
class TimedItem:
    """Something that arrived, with the seconds since the request was written."""

    seconds: float
    item: Item


class Purpose(str, Enum):
    """What an exchange is for."""

    REQUEST = "request"
    TEXT = "text"
    PLACE = "place"


def _now() -> datetime:
    return datetime.now(timezone.utc)


@dataclass
class Transcript:
    """Every byte of one exchange, with its time; kept for failed exchanges too.

    ``what`` names what was sent, ``late`` is what had arrived before it and was dropped, ``items``
    what arrived behind it, the answer among it, and ``error`` says why the exchange failed.
    ``unkept`` counts the bytes that a line that never falls silent sent beyond what is kept.
    """

    purpose: Purpose
    channel: Channel
    what: str
    sent: bytes
    start: datetime = field(default_factory=_now)
    late: list[Item] = field(default_factory=list)
    items: list[TimedItem] = field(default_factory=list)
    seconds: float = 0.0
    error: str = ""
    unkept: int = 0
    _kept: int = field(default=0, repr=False)

    def add(self, seconds: float, item: Item) -> None:
        """Keep an item that arrived, within bounds."""
        if self._kept + len(item.raw) > MOST_BYTES or len(self.items) >= MOST_ITEMS:
            self.unkept += len(item.raw)
            return
        self._kept += len(item.raw)
        self.items.append(TimedItem(seconds, item))


@dataclass
class Exchange:
    """A request and everything that came back for it."""

    channel: Channel
    request: Packet
    sent: bytes
    transcript: Transcript
    answers: list[Packet] = field(default_factory=list)
    seconds: float = 0.0
    final: str = ""

    @property
    def items(self) -> list[TimedItem]:
        """Everything that arrived, in order."""
        return self.transcript.items

    @property
    def answer(self) -> Packet:
        """The last answer: the outcome."""
        return self.answers[-1]

    @property
    def acknowledged(self) -> bool:
        """Whether the handset said that it took the request."""
        return any(isinstance(timed.item, Acknowledgement) for timed in self.items)

    @property
    def stray(self) -> list[Item]:
        """What arrived in between and belongs to something else; a doubled answer is stray."""
        answers = list(self.answers)
        stray: list[Item] = []
        for item in (timed.item for timed in self.items):
            if isinstance(item, Frame) and item.packet in answers:
                answers.remove(item.packet)
            elif not isinstance(item, Acknowledgement):
                stray.append(item)
        return stray

    @property
    def text(self) -> str:
        """All text that arrived."""
        return "".join(timed.item.text for timed in self.items if isinstance(timed.item, Text))


@dataclass
class AtReply:
    """An AT text and its reply up to the final result."""

    sent: str
    transcript: Transcript
    raw: str = ""
    lines: list[str] = field(default_factory=list)
    final: str = ""
    seconds: float = 0.0
    stray: list[Item] = field(default_factory=list)

    @property
    def ok(self) -> bool:
        """Whether the final result is OK."""
        return self.final == "OK"


_FINAL_ERRORS = ("+CME ERROR", "+CMS ERROR")


def is_final(line: str) -> bool:
    """Whether a reply line is a final result."""
    return line in ("OK", "ERROR") or line.startswith(_FINAL_ERRORS)


class ReplyReader:
    """Takes text as it arrives and finds the lines of a reply and its final result.

    ``rest`` is what came behind the final result in the same piece.
    One echo of the command is left out, even when it looks like a final result itself.
    """

    def __init__(self, echo: str = "") -> None:
        self.lines: list[str] = []
        self.final = ""
        self.rest = ""
        self.echoed = False
        self.size = 0
        self._echo = echo
        self._tail = ""

    @property
    def overflowed(self) -> bool:
        """Whether more has come than any reply holds; what comes behind is no longer read."""
        return self.size > LONGEST_REPLY

    def feed(self, text: str) -> str:
        """Take the next text; returns the final result once it is there."""
        self.size += len(text)
        if self.overflowed or self.final:
            return self.final
        *complete, self._tail = (self._tail + text).replace("\r", "\n").split("\n")
        for number, line in enumerate(complete, start=1):
            self._take(line)
            if self.final:
                self.rest = "\n".join([*complete[number:], self._tail])
                break
        return self.final

    def _take(self, line: str) -> None:
        if line and line == self._echo and not self.echoed:
            self.echoed = True
        elif is_final(line):
            self.final = line
        elif line:
            self.lines.append(line)
