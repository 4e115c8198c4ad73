"""Why an exchange failed: what came instead of the answer, in one line that says what to do."""

from __future__ import annotations

from typing import Sequence

from amt_station.errors import BadFrame, NoAnswer, StationError
from amt_station.exchange import AtReply, Exchange, Transcript
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name
from amt_station.text import printable, shortened
from amt_station.wire.decoder import Acknowledgement, BareDecoder, Frame, Item, Skipped, Text
from amt_station.wire.envelope import HEAD_SIZE, MAGIC
from amt_station.wire.packet import PACKET_SIZE, Packet

_PC_LINE = "this is the PC line, not the app channel: use --pc"
# A packet that is there is among the first; a line that says anything for ever has no other.
_LOOKED_AT = 4 * PACKET_SIZE
_APP_CHANNEL = "this is the app channel, not the PC line: use --app"


class WrongLineWatch:
    """Notices envelopes on a line that was named the app channel.

    The packet inside an envelope would be read as an answer there, envelope or not.
    """

    def __init__(self) -> None:
        self._tail = b""

    def look(self, item: Item) -> None:
        """Take the next item that arrived; raises ``BadFrame`` for an envelope."""
        if isinstance(item, Frame):
            self._tail = b""
            return
        seen = self._tail + item.raw
        if MAGIC in seen:
            raise BadFrame(f"a packet in an envelope came instead of a bare one; {_PC_LINE}")
        self._tail = seen[-HEAD_SIZE:]


def unanswered(exchange: Exchange, limit: float) -> StationError:
    """The error for a request whose answer did not come within ``limit`` seconds."""
    name = display_name(exchange.request.command)
    arrived = [timed.item for timed in exchange.items]
    if exchange.answers:
        return NoAnswer(f"{name} was taken, but its outcome was not reported within {limit:g} s",
                        arrived)
    wrong = wrong_line(arrived, exchange.channel)
    if wrong:
        return BadFrame(f"no answer to {name} within {limit:g} s: {wrong}")
    if any(isinstance(item, Frame) and item.packet == exchange.request for item in arrived):
        return NoAnswer(f"no answer to {name} within {limit:g} s: the line sent the request "
                        "itself back, as an echo or a loop does", arrived)
    damage = first_damage(arrived)
    if damage is not None:
        return BadFrame(f"the answer to {name} could not be read: {damage.error}", damage.error)
    other = instead(arrived)
    if any(isinstance(item, Acknowledgement) for item in arrived):
        return NoAnswer(f"{name} was acknowledged, but not answered within {limit:g} s{other}",
                        arrived)
    return NoAnswer(f"no answer to {name} within {limit:g} s{other}", arrived)


def no_final_result(reply: AtReply, echoed: bool, limit: float) -> StationError:
    """The error for an AT text whose final result did not come within ``limit`` seconds."""
    arrived = [timed.item for timed in reply.transcript.items]
    wrong = wrong_line(arrived, Channel.PC)
    if wrong:
        return BadFrame(f"no final result for {printable(reply.sent)} within {limit:g} s: {wrong}")
    damage = first_damage(reply.stray)
    if damage is not None:
        return BadFrame(f"the answer to {printable(reply.sent)} could not be read: {damage.error}",
                        damage.error)
    other = instead(arrived)
    if echoed and not reply.lines:
        other = ": the line only sent the text itself back, as an echo or a loop does"
    return NoAnswer(f"no final result for {printable(reply.sent)} within {limit:g} s{other}",
                    reply.stray)


def no_place(transcript: Transcript, limit: float) -> str:
    """What to say when the link could not find its place."""
    items = [timed.item for timed in transcript.items]
    wrong = wrong_line(items, transcript.channel)
    other = f": {wrong}" if wrong else instead(items)
    return (f"the line is out of step and the handset did not answer {transcript.what} within "
            f"{limit:g} s{other}; nothing else was sent")


def wrong_line(items: Sequence[Item], channel: Channel) -> str:
    """That the answer came in the form of the other line; empty when it did not."""
    if channel is not Channel.PC:
        return ""
    # Some bytes of a bare packet may look like text.
    unframed = b"".join(item.raw for item in items
                        if isinstance(item, (Skipped, Text)))[:_LOOKED_AT]
    packets = [item.packet for item in BareDecoder().feed(unframed) if isinstance(item, Frame)]
    if not packets or first_damage(items) is None or MAGIC in unframed:
        return ""
    return f"{_packet(packets[0])} came without an envelope; {_APP_CHANNEL}"


def instead(items: Sequence[Item]) -> str:
    """What came instead of an answer, short enough for the line; empty when nothing did."""
    for item in items:
        if isinstance(item, Frame):
            return f"; {_packet(item.packet)} came instead"
        if isinstance(item, Text) and item.text.strip():
            return f"; the text {shortened(item.text.strip())} came instead"
    return ""


def _packet(packet: Packet) -> str:
    return f"packet {packet.command} ({display_name(packet.command)})"


def first_damage(items: Sequence[Item]) -> Skipped | None:
    """The first bytes that were neither a frame nor text."""
    return next((item for item in items if isinstance(item, Skipped)), None)
