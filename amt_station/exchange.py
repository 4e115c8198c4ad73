"""What came of one exchange with the handset."""

from __future__ import annotations

from dataclasses import dataclass, field

from amt_station.requests.model import Channel
from amt_station.wire.decoder import Acknowledgement, Frame, Item, Text
from amt_station.wire.packet import Packet


@dataclass(frozen=True)
class TimedItem:
    """Something that arrived, with the seconds since the request was written."""

    seconds: float
    item: Item


@dataclass
class Exchange:
    """A request and everything that came back for it."""

    channel: Channel
    request: Packet
    sent: bytes
    items: list[TimedItem] = field(default_factory=list)
    answers: list[Packet] = field(default_factory=list)
    seconds: float = 0.0

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
        """What arrived in between and belongs to something else."""
        return [timed.item for timed in self.items
                if not isinstance(timed.item, Acknowledgement)
                and not (isinstance(timed.item, Frame) and timed.item.packet in self.answers)]

    @property
    def text(self) -> str:
        """All text that arrived."""
        return "".join(timed.item.text for timed in self.items if isinstance(timed.item, Text))


@dataclass
class AtReply:
    """An AT text and its reply up to the final result."""

    sent: str
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


def split_reply(raw: str, echo: str = "") -> tuple[list[str], str]:
    """The lines of a reply without its final result, and that result; empty while it is missing.

    An echo of the command is left out.
    """
    complete = raw[:max(raw.rfind("\r"), raw.rfind("\n")) + 1]
    lines: list[str] = []
    for line in (part.strip("\r\n") for part in complete.replace("\r", "\n").split("\n")):
        if is_final(line):
            return lines, line
        if line and line != echo:
            lines.append(line)
    return lines, ""
