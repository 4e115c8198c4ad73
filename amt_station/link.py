"""One end of the line: send a request or an AT text and wait for what comes back.

A link is in step when everything that was sent has been answered. An exchange that ends without its
answer leaves it out of step: the answer may still come, and would then pass for another's. Before
the next exchange such a link finds its place again by itself, or raises ``OutOfStep``.

One link has one user at a time: threads that share one take turns, an exchange being one turn.
``Link.turn`` holds the turn over several exchanges.
"""

from __future__ import annotations

import time
from contextlib import contextmanager
from typing import Callable, Iterator

from amt_station import diagnosis, judge
from amt_station.errors import BadFrame, OutOfStep, StationError, UsageProblem
from amt_station.exchange import AtReply, Exchange, Purpose, ReplyReader, Transcript
from amt_station.line import Deadline, Line, Observer, checked_seconds
from amt_station.place import Place, Recovery, Search, search
from amt_station.port import Port, SerialPort
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name, requests_by_id
from amt_station.text import printable
from amt_station.wire.decoder import Frame, Item, Text
from amt_station.wire.envelope import LARGEST_REQUEST, encode_request
from amt_station.wire.errors import WireError
from amt_station.wire.packet import Packet

__all__ = ["DEFAULT_TIMEOUT", "RECOVER_TIMEOUT", "Link", "Observer", "Place", "Recovery"]

DEFAULT_TIMEOUT = 10.0
RECOVER_TIMEOUT = 3.0

# Behind the answer to a search the line has to be silent for so long.
_QUIET = 0.05
_LONGEST_UNREST = 3.0

# After something that speaks against an answer, it comes within this time or not at all.
_DOUBT_SECONDS = 0.5


class Link(Line):
    """A line to the handset; a context manager that closes its port.

    Threads that share a link take turns, an exchange being one turn.
    """

    _lost_searches = 0
    _searches = 0

    def __init__(self, port: Port, channel: Channel = Channel.PC, timeout: float | None = None,
                 reopen: Callable[[], Port] | None = None) -> None:
        super().__init__(port, channel, timeout, reopen)
        # What an earlier process still waited for may be anything.
        self._others_are_due = not self._in_step

    @classmethod
    def open(cls, url: str, channel: Channel = Channel.PC, timeout: float | None = None,
             baud: int = 115200) -> Link:
        """Open a port by its pySerial URL, for this process alone."""
        def reopen() -> Port:
            return SerialPort(url, baud)

        return cls(reopen(), channel, timeout, reopen)

    @property
    def in_step(self) -> bool:
        """Whether everything that was sent has been answered."""
        return self._in_step

    def doubt(self) -> None:
        """What came last may be the answer to something else: find the place before the next."""
        self._in_step = False

    # requests

    def request(self, packet: Packet, timeout: float | None = None) -> Exchange:
        """Send ``packet`` and wait for its answer; raises ``Refused`` when that is a no."""
        exchange = self.converse(packet, timeout)
        judge.judge(exchange)
        return exchange

    def converse(self, packet: Packet, timeout: float | None = None) -> Exchange:
        """Send ``packet`` and wait for its answer, whatever that says.

        Only a missing or unreadable answer raises. An exchange without answers was ended by an
        AT error of the modem, to which the handset had passed the packet on.
        """
        row = requests_by_id().get(packet.command)
        limit = self._limit(timeout, row.timeout if row else None)
        data = _encode(packet, self.channel)
        wanted = row.answers if row else 1
        with self._turn:
            self._get_in_step()
            transcript = Transcript(Purpose.REQUEST, self.channel, display_name(packet.command),
                                    data)
            exchange = Exchange(self.channel, packet, data, transcript)
            with self._conversation(transcript), self._overtaken_when_lost(
                    judge.is_overtaken(packet, self.channel)):
                self._converse(exchange, limit, wanted)
        return exchange

    @contextmanager
    def _overtaken_when_lost(self, may_be: bool) -> Iterator[None]:
        """An answer that is not the handset's own may come behind that of a search."""
        try:
            yield
        finally:
            if may_be and not self._in_step:
                self._others_are_due = True

    def _converse(self, exchange: Exchange, limit: float, wanted: int) -> None:
        reader = ReplyReader()
        for timed in self._arrivals(exchange.transcript, Deadline(limit)):
            exchange.seconds = timed.seconds
            if self._completes(exchange, timed.item, wanted, reader):
                # The answer to another request says that its own has not come.
                self._in_step = judge.is_own_answer(exchange)
                return
        if not any(answer.result for answer in exchange.answers):
            raise diagnosis.unanswered(exchange, limit)
        self._in_step = judge.is_own_answer(exchange)

    def _completes(self, exchange: Exchange, item: Item, wanted: int,
                   reader: ReplyReader) -> bool:
        if isinstance(item, Frame) and judge.is_answer(exchange.request, item.packet, self.channel):
            exchange.answers.append(item.packet)
            return len(exchange.answers) == wanted
        if not isinstance(item, Text) or not judge.passed_on(exchange.request, self.channel):
            return False
        text = item.text
        while final := reader.feed(text):
            if final != "OK":
                exchange.final = final
                return True
            text, reader.rest, reader.final = reader.rest, "", ""
        return False

    # texts

    def at(self, text: str, timeout: float | None = None) -> AtReply:
        """Send an AT text and return its reply; an error packet raises ``Refused``."""
        command = text.rstrip("\r\n")
        data = self._encode_text(command)
        limit = self._limit(timeout)
        with self._turn:
            self._get_in_step()
            transcript = Transcript(Purpose.TEXT, self.channel, printable(command), data)
            reply = AtReply(command, transcript)
            with self._conversation(transcript), self._overtaken_when_lost(True):
                self._hear(reply, limit)
        return reply

    def _hear(self, reply: AtReply, limit: float) -> None:
        reader = ReplyReader(reply.sent)
        for timed in self._arrivals(reply.transcript, Deadline(limit)):
            item, reply.seconds = timed.item, timed.seconds
            if isinstance(item, Text):
                reply.final = reader.feed(item.text)
                reply.lines = reader.lines
                reply.raw += item.text
                if reader.overflowed:
                    raise BadFrame(f"the reply to {printable(reply.sent)} has no end: "
                                   f"{reader.size} characters without a final result")
                if reply.final:
                    # A second final result is not this text's, and more may come.
                    self._in_step = not ReplyReader().feed(reader.rest)
                    return
            else:
                reply.stray.append(item)
            if isinstance(item, Frame) and judge.is_refusal(item.packet, self.channel):
                refusal = judge.refusal_of_text(reply.sent, item.packet)
                self._in_step = judge.is_of_text(item.packet)
                raise refusal
        raise diagnosis.no_final_result(reply, reader.echoed, limit)

    def _encode_text(self, command: str) -> bytes:
        if self.channel is not Channel.PC:
            raise UsageProblem("AT text is understood on the PC line only")
        data = command.encode("utf-8", "surrogateescape") + b"\r"
        if len(data) > LARGEST_REQUEST:
            raise UsageProblem(f"an AT text of {len(data)} bytes; the handset takes "
                               f"{LARGEST_REQUEST}")
        return data

    # the place

    def find_place(self, timeout: float = RECOVER_TIMEOUT) -> Place:
        """Make sure that what comes next is the answer to what is sent next.

        A run begins with this, because an earlier process may have left something behind. On the
        PC line it flushes a text that the handset holds; a packet that is held and refused again
        raises ``Refused`` with the advice. Without an answer it raises ``OutOfStep``.
        """
        limit = checked_seconds(timeout)
        with self._turn:
            dropped: list[Item] = []
            for attempt in (1, 2):
                try:
                    items, problem = self._search(limit)
                except OutOfStep as error:
                    # A held request that the handset now carries out swallows the question.
                    answers = [item for item in error.arrived if isinstance(item, Frame)]
                    if attempt == 2 or not answers:
                        raise
                    dropped += error.arrived
                    continue
                dropped += items
                if problem is not None and attempt == 1:
                    # What was refused is late or held: when it is held it will be refused again.
                    continue
                if problem is not None:
                    raise problem
                self._others_are_due, self._lost_searches = False, 0
                self._in_step = True
                return Place(attempt, tuple(dropped))
        raise AssertionError("the second attempt returns or raises")

    def _search(self, limit: float) -> tuple[list[Item], StationError | None]:
        """One question and its answer: what came before that, and what speaks against it."""
        self._searches += 1
        question = search(self.channel, self._searches)
        transcript = Transcript(Purpose.PLACE, self.channel, question.what, question.data)
        with self._conversation(transcript):
            if not self._is_answered(question, transcript, limit):
                self._lost_searches += 1
                if question.doubt is not None:
                    raise question.doubt
                raise OutOfStep(diagnosis.no_place(transcript, limit),
                                [timed.item for timed in transcript.items])
            answered = len(transcript.items)
            self._settle(question, transcript, limit)
        items = [*transcript.late, *(timed.item for timed in transcript.items[:answered])]
        return items, question.doubt if question.held else None

    def _is_answered(self, question: Search, transcript: Transcript, limit: float) -> bool:
        deadline = Deadline(limit)
        for timed in self._arrivals(transcript, deadline):
            if question.take(timed.item):
                return True
            if question.doubt is not None:
                deadline.seconds = min(deadline.seconds, timed.seconds + _DOUBT_SECONDS)
        return False

    def _settle(self, question: Search, transcript: Transcript, limit: float) -> None:
        """Wait until nothing that is not wanted can come behind the answer to a search.

        What was taken for the answer may have been a late one, of a lost text or of an earlier
        search, and what the handset asks others for comes in an order of its own. How many answers
        have come says nothing: one may come twice. So time has to pass without any.
        """
        patience = 2 * limit if self._lost_searches else limit if self._others_are_due else 0.0
        start = last = time.monotonic()
        while True:
            now = time.monotonic()
            piece = self.port.read(max(last + patience - now, _QUIET))
            known = question.answers
            for item in self._decode(piece):
                question.take(item)
                transcript.add(transcript.seconds + time.monotonic() - start, item)
            if question.answers > known:
                last = time.monotonic()
            elif not piece and not self._decoder.pending:
                return
            if time.monotonic() - start > patience + _LONGEST_UNREST:
                self._lost_searches += 1
                raise OutOfStep(f"the line is out of step and does not fall silent within "
                                f"{patience + _LONGEST_UNREST:g} s; nothing else was sent")

    def _get_in_step(self) -> None:
        if not self._in_step:
            self.find_place()

    def recover(self, timeout: float = RECOVER_TIMEOUT) -> Recovery:
        """Flush a text that the handset holds, and make sure that it holds nothing any more.

        A packet that is held and refused again raises ``Refused`` with the advice. One that the
        handset now carries out answers instead and is gone with that; the flush is then repeated.
        """
        if self.channel is not Channel.PC:
            raise UsageProblem("only on the PC line does the handset hold what it has refused")
        place = self.find_place(timeout)
        return Recovery(place.attempts, place.late_answers)

    def _limit(self, timeout: float | None, own: float | None = None) -> float:
        if timeout is not None:
            return checked_seconds(timeout)
        return self.timeout or own or DEFAULT_TIMEOUT


def _encode(packet: Packet, channel: Channel) -> bytes:
    try:
        return encode_request(packet, enveloped=channel is Channel.PC)
    except WireError as error:
        raise UsageProblem(str(error)) from error
