"""One end of the line: send a request or an AT text and wait for what comes back."""

from __future__ import annotations

import time
from dataclasses import dataclass
from types import TracebackType
from typing import Iterator

from amt_station import judge
from amt_station.errors import BadFrame, NoAnswer, Refused, StationError, UsageProblem
from amt_station.exchange import AtReply, Exchange, TimedItem, split_reply
from amt_station.port import Port, SerialPort
from amt_station.requests.at_commands import FLUSH_COMMAND
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name, requests_by_id
from amt_station.wire.decoder import (Acknowledgement, BareDecoder, Decoder, EnvelopeDecoder, Frame,
                                      Item, Skipped, Text)
from amt_station.wire.envelope import LARGEST_REQUEST, encode_request
from amt_station.wire.errors import WireError
from amt_station.wire.packet import Packet

DEFAULT_TIMEOUT = 10.0
RECOVER_TIMEOUT = 3.0

# A frame's bytes follow each other closely; after so long a silence its rest will not come.
_SILENCE = 0.3
_DRAIN_SECONDS = 1.0


@dataclass(frozen=True)
class Recovery:
    """A cleared request buffer: how often it was flushed, and what came for held requests."""

    attempts: int
    late_answers: tuple[Packet, ...]


class Link:
    """A line to the handset; a context manager that closes its port."""

    def __init__(self, port: Port, channel: Channel = Channel.PC,
                 timeout: float | None = None) -> None:
        """``timeout`` in seconds overrides the time that each request is given by itself."""
        self.port = port
        self.channel = channel
        self.timeout = timeout
        self._decoder: Decoder = EnvelopeDecoder() if channel is Channel.PC else BareDecoder()

    @classmethod
    def open(cls, url: str, channel: Channel = Channel.PC, timeout: float | None = None,
             baud: int = 115200) -> Link:
        """Open a port by its pySerial URL, for this process alone."""
        return cls(SerialPort(url, baud), channel, timeout)

    def __enter__(self) -> Link:
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.close()

    def close(self) -> None:
        """Give the port back."""
        self.port.close()

    def drain(self) -> list[Item]:
        """Take what has arrived unasked, for a second at most where that never ends."""
        items: list[Item] = []
        end = time.monotonic() + _DRAIN_SECONDS
        while time.monotonic() < end and (data := self.port.read(0.0)):
            items += self._decoder.feed(data)
        return items + self._decoder.give_up()

    def _arrivals(self, data: bytes, timeout: float) -> Iterator[TimedItem]:
        """Send ``data``; everything that arrives within ``timeout`` seconds from then.

        What arrived before is taken away first: it cannot be an answer.
        """
        self.drain()
        start = time.monotonic()
        self.port.write(data)
        seconds = 0.0
        while seconds < timeout:
            left = timeout - seconds
            piece = self.port.read(min(left, _SILENCE) if self._decoder.pending else left)
            items = self._decoder.feed(piece) if piece else self._decoder.give_up()
            seconds = time.monotonic() - start
            for item in items:
                yield TimedItem(seconds, item)

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
        limit = timeout or self.timeout or (row.timeout if row else None) or DEFAULT_TIMEOUT
        exchange = Exchange(self.channel, packet, _encode(packet, self.channel))
        for timed in self._arrivals(exchange.sent, limit):
            exchange.items.append(timed)
            exchange.seconds = timed.seconds
            if self._completes(exchange, timed.item, row.answers if row else 1):
                return exchange
        if any(answer.result for answer in exchange.answers):
            return exchange
        raise _unanswered(exchange, limit)

    def _completes(self, exchange: Exchange, item: Item, wanted: int) -> bool:
        request = exchange.request
        if isinstance(item, Frame) and judge.is_answer(request, item.packet, self.channel):
            exchange.answers.append(item.packet)
            return len(exchange.answers) == wanted
        return (isinstance(item, Text) and judge.passed_on(request, self.channel)
                and split_reply(exchange.text)[1] not in ("", "OK"))

    def at(self, text: str, timeout: float | None = None) -> AtReply:
        """Send an AT text and return its reply; an error packet raises ``Refused``."""
        command = text.rstrip("\r\n")
        data = self._encode_text(command)
        limit = timeout or self.timeout or DEFAULT_TIMEOUT
        reply = AtReply(command)
        for timed in self._arrivals(data, limit):
            item, reply.seconds = timed.item, timed.seconds
            if isinstance(item, Text):
                reply.raw += item.text
                reply.lines, reply.final = split_reply(reply.raw, command)
                if reply.final:
                    return reply
            else:
                reply.stray.append(item)
            if isinstance(item, Frame) and judge.is_refusal(item.packet, self.channel):
                raise judge.refusal_of_text(command, item.packet)
        raise _no_final_result(reply, limit)

    def _encode_text(self, command: str) -> bytes:
        if self.channel is not Channel.PC:
            raise UsageProblem("AT text is understood on the PC line only")
        data = command.encode("utf-8", "surrogateescape") + b"\r"
        if len(data) > LARGEST_REQUEST:
            raise UsageProblem(f"an AT text of {len(data)} bytes; the handset takes "
                               f"{LARGEST_REQUEST}")
        return data

    def recover(self, timeout: float = RECOVER_TIMEOUT) -> Recovery:
        """Flush a text that the handset holds, and make sure that it holds nothing any more.

        A packet that is held and refused again raises ``Refused`` with the advice. One that the
        handset now carries out answers instead and is gone with that; the flush is then repeated.
        """
        late: list[Packet] = []
        for attempt in (1, 2):
            try:
                reply = self.at(FLUSH_COMMAND, timeout)
            except NoAnswer as error:
                answers = [item.packet for item in error.arrived if isinstance(item, Frame)]
                if attempt == 2 or not answers:
                    raise
                late += answers
                continue
            if not reply.ok:
                raise Refused(f"{FLUSH_COMMAND} was answered with {reply.final}")
            return Recovery(attempt, tuple(late))
        raise AssertionError("the second attempt returns or raises")


def _encode(packet: Packet, channel: Channel) -> bytes:
    try:
        return encode_request(packet, enveloped=channel is Channel.PC)
    except WireError as error:
        raise UsageProblem(str(error)) from error


def _unanswered(exchange: Exchange, limit: float) -> StationError:
    name = display_name(exchange.request.command)
    arrived = [timed.item for timed in exchange.items]
    if exchange.answers:
        return NoAnswer(f"{name} was taken, but its outcome was not reported within {limit:g} s",
                        arrived)
    damage = _first_damage(arrived)
    if damage is not None:
        return BadFrame(f"the answer to {name} could not be read: {damage.error}", damage.error)
    if any(isinstance(item, Acknowledgement) for item in arrived):
        return NoAnswer(f"{name} was acknowledged, but not answered within {limit:g} s", arrived)
    return NoAnswer(f"no answer to {name} within {limit:g} s", arrived)


def _no_final_result(reply: AtReply, limit: float) -> StationError:
    damage = _first_damage(reply.stray)
    if damage is not None:
        return BadFrame(f"the answer to {reply.sent} could not be read: {damage.error}",
                        damage.error)
    return NoAnswer(f"no final result for {reply.sent} within {limit:g} s", reply.stray)


def _first_damage(items: list[Item]) -> Skipped | None:
    return next((item for item in items if isinstance(item, Skipped)), None)
