"""How a link finds its place again: something is asked that only one thing can be the answer to.

Everything that comes before that answer belongs to earlier exchanges and is dropped.
"""

from __future__ import annotations

import os
from dataclasses import dataclass, field
from functools import lru_cache
from typing import Protocol

from amt_station import judge
from amt_station.errors import Refused, StationError
from amt_station.exchange import ReplyReader
from amt_station.requests.at_commands import FLUSH_COMMAND
from amt_station.requests.catalogue import command_names
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name, requests_by_id
from amt_station.text import printable
from amt_station.wire.atoms import RESULT_ATOM
from amt_station.wire.decoder import Acknowledgement, Frame, Item, Text
from amt_station.wire.envelope import encode_request
from amt_station.wire.packet import Packet

_REFUSED = 1


@dataclass(frozen=True)
class Place:
    """A link that is in step: how often it asked, and what it dropped on the way."""

    attempts: int = 1
    dropped: tuple[Item, ...] = ()

    @property
    def late_answers(self) -> tuple[Packet, ...]:
        """The packets among what was dropped."""
        return tuple(item.packet for item in self.dropped if isinstance(item, Frame))


@dataclass(frozen=True)
class Recovery:
    """A cleared request buffer: how often it was flushed, and what came for held requests."""

    attempts: int
    late_answers: tuple[Packet, ...]


class Search(Protocol):
    """One question and the recognition of its answer.

    ``doubt`` will be the error unless the answer comes soon: something came that speaks against it.
    ``held`` says that a request was refused meanwhile, which the handset may still hold.
    ``answers`` counts what came that answers anything.
    """

    what: str
    data: bytes
    doubt: StationError | None
    held: bool
    answers: int

    def take(self, item: Item) -> bool:
        """Look at the next item; whether it completes the answer."""


@dataclass
class TextSearch:
    """On the PC line: a text that changes nothing, which the handset answers itself with OK.

    It also flushes a refused text that the handset holds. An error in between may be late as well
    as the answer, so it only counts when no OK follows.
    """

    what: str = FLUSH_COMMAND
    data: bytes = FLUSH_COMMAND.encode() + b"\r"
    doubt: StationError | None = None
    held: bool = False
    answers: int = 0
    reader: ReplyReader = field(default_factory=lambda: ReplyReader(FLUSH_COMMAND))

    def take(self, item: Item) -> bool:
        """As in ``Search``."""
        self.answers += isinstance(item, (Frame, Acknowledgement))
        if isinstance(item, Frame) and judge.is_refusal(item.packet, Channel.PC):
            self.held = True
            self.doubt = judge.refusal_of_text(FLUSH_COMMAND, item.packet)
        return isinstance(item, Text) and self._take_text(item.text)

    def _take_text(self, text: str) -> bool:
        answered = False
        while final := self.reader.feed(text):
            text, self.reader = self.reader.rest, ReplyReader(FLUSH_COMMAND)
            self.answers += 1
            if final == "OK":
                answered = True
            else:
                self.doubt = Refused(f"{FLUSH_COMMAND} was answered with {printable(final)}")
        return answered


@lru_cache(maxsize=1)
def _free_ids() -> tuple[int, ...]:
    return tuple(number for number in range(2, 255) if number not in command_names()
                 and not {number, number - 1, number + 1} & set(requests_by_id()))


def is_searched(command: int) -> bool:
    """Whether a search on the app channel may ask this id."""
    return command in _free_ids()


class PacketSearch:
    """On the app channel: an id that nobody serves, another one each time, and its refusal."""

    def __init__(self, turn: int) -> None:
        """``turn`` counts the searches."""
        free = _free_ids()
        self._packet = Packet(free[turn % len(free)])
        self.what = display_name(self._packet.command)
        self.data = encode_request(self._packet, enveloped=False)
        self.doubt: StationError | None = None
        self.held = False
        self.answers = 0

    def take(self, item: Item) -> bool:
        """As in ``Search``."""
        self.answers += isinstance(item, Frame)
        return (isinstance(item, Frame) and item.packet.command == self._packet.command + 1
                and item.packet.result == _REFUSED and len(item.packet.atoms) == 1
                and item.packet.atoms[0].id == RESULT_ATOM)


def search(channel: Channel, turn: int) -> Search:
    """The search for a channel; ``turn`` is another number each time."""
    if channel is Channel.PC:
        return TextSearch()
    return PacketSearch(turn + os.getpid())
