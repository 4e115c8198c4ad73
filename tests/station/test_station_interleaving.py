"""Whatever comes late, doubled, damaged or not at all: no step is passed by another's answer.

What is more than three seconds late, the time that a link gives a search, is beyond it: a text's
answer says nothing of the text. The handset is a port without any time of its own: what it says
becomes readable when the link waits long enough, so that hundreds of lines are played in a second.
"""

from __future__ import annotations

from dataclasses import dataclass, field
from typing import Iterator, Sequence

import pytest
from hypothesis import given, settings
from hypothesis import strategies as st

from amt_station import line as line_module
from amt_station import link as link_module
from amt_station.errors import StationError
from amt_station.link import Link
from amt_station.perform import perform
from amt_station.requests.model import Channel
from amt_station.requests.operations import prepare, prepare_text
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import BareDecoder, EnvelopeDecoder, Frame, Item, Text
from amt_station.wire.envelope import encode_envelope
from amt_station.wire.packet import Packet

ON_TIME, LATE, LATER, MISSING, DAMAGED, DOUBLED = range(6)
HOW = st.sampled_from([ON_TIME] * 3 + [LATE, LATER, MISSING, DAMAGED, DOUBLED])
LIMIT = 1.0


class Clock:
    """Time that passes only when somebody waits."""

    def __init__(self) -> None:
        self.now = 1000.0

    def monotonic(self) -> float:
        """As in ``time``; it never stands still, so that nothing waits for ever."""
        self.now += 1e-6
        return self.now


@dataclass
class ScriptedPort:
    """A handset that answers in order, each answer in its own way."""

    clock: Clock
    channel: Channel
    ways: list[int]
    name: str = "scripted"
    sent: int = 0
    waiting: list[tuple[float, bytes]] = field(default_factory=list)
    ready: float = 0.0

    def read(self, timeout: float) -> bytes:
        """What has become readable within ``timeout``."""
        end = self.clock.now + timeout
        if not self.waiting or self.waiting[0][0] > end:
            self.clock.now = end
            return b""
        moment, data = self.waiting.pop(0)
        self.clock.now = max(self.clock.now, moment)
        return data

    def write(self, data: bytes, timeout: float) -> None:
        """Answer each request in the way that is next."""
        pc = self.channel is Channel.PC
        decoder = EnvelopeDecoder() if pc else BareDecoder()
        for item in [*decoder.feed(data), *decoder.give_up()]:
            self.sent += 1
            how = self.ways.pop(0) if self.ways else ON_TIME
            self.answer(how, self.reply(item))

    def answer(self, how: int, data: bytes) -> None:
        """Answers leave the handset in the order of the requests, however long one takes."""
        delay = {LATE: LIMIT + 0.3, LATER: 3 * LIMIT}.get(how, 0.01)
        if how == MISSING:
            return
        if how == DAMAGED:
            data = data[:-3] + bytes([data[-3] ^ 0x55]) + data[-2:]
        self.ready = max(self.ready, self.clock.now + delay)
        self.waiting.append((self.ready, data))
        if how == DOUBLED:
            self.waiting.append((self.ready, data))

    def reply(self, item: Item) -> bytes:
        """An answer that tells which sending it belongs to, as far as it can hold that."""
        if isinstance(item, Text):
            if b"DBTADDR=?" in item.raw:
                return b"\r\nOK\r\n"
            return b"\r\n+N: %d\r\n\r\nOK\r\n" % self.sent
        assert isinstance(item, Frame)
        number = item.packet.command
        if number in (9, 224):
            atom = Atom.integer(5 if number == 9 else 151, self.sent)
            answer = Packet(number + 1, (atom, Atom.integer(1, 0)))
        else:
            answer = Packet(number + 1, (Atom.integer(1, 1),))
        return encode_envelope(answer) if self.channel is Channel.PC else answer.encode()

    def close(self) -> None:
        """Nothing to give back."""


@pytest.fixture(scope="module", autouse=True)
def clock() -> Iterator[Clock]:
    """The time of the link is the script's."""
    made = Clock()
    patch = pytest.MonkeyPatch()
    for module in (line_module, link_module):
        patch.setattr(module, "time", made)
    yield made
    patch.undo()


def played(clock: Clock, channel: Channel, steps: Sequence[str],
           ways: list[int]) -> list[tuple[int, int]]:
    """The steps that passed: the sending that asked, and the sending whose answer was taken."""
    port = ScriptedPort(clock, channel, list(ways))
    link = Link(port, channel)
    passed = []
    for step in steps:
        prepared = prepare_text(step) if step.startswith("AT") else prepare(step, {}, channel)
        try:
            outcome = perform(link, prepared, LIMIT)
        except StationError as error:
            assert str(error)
            continue
        asked = port.sent
        value = outcome.values[0].value
        taken = int(str(value).rpartition(" ")[2] or -1) if prepared.packet is None else value
        assert isinstance(taken, int)
        passed.append((asked, taken))
    return passed


@settings(max_examples=300)
@given(st.lists(st.just("battery adc"), min_size=1, max_size=8), st.lists(HOW, max_size=24))
def test_packets_on_the_pc_line(clock: Clock, steps: list[str], ways: list[int]) -> None:
    for asked, taken in played(clock, Channel.PC, steps, ways):
        assert asked == taken


@settings(max_examples=300)
@given(st.lists(st.just("battery voltage"), min_size=1, max_size=8), st.lists(HOW, max_size=24))
def test_packets_on_the_app_channel(clock: Clock, steps: list[str], ways: list[int]) -> None:
    for asked, taken in played(clock, Channel.APP, steps, ways):
        assert asked == taken


@settings(max_examples=1000)
@given(st.lists(st.sampled_from(["battery adc", "AT+N"]), min_size=1, max_size=8),
       st.lists(HOW, max_size=24))
def test_packets_and_texts_on_the_pc_line(clock: Clock, steps: list[str],
                                          ways: list[int]) -> None:
    for asked, taken in played(clock, Channel.PC, steps, ways):
        assert asked == taken


def test_the_script_can_pass_at_all(clock: Clock) -> None:
    assert played(clock, Channel.PC, ["battery adc", "AT+N", "battery adc"], []) == [
        (1, 1), (2, 2), (3, 3)]
    assert played(clock, Channel.APP, ["battery voltage"] * 2, []) == [(1, 1), (2, 2)]


@pytest.mark.parametrize("ways", [
    [MISSING, LATER, LATER], [MISSING, LATER, LATE], [LATER, LATER], [LATE, LATE, LATE],
    [MISSING, DAMAGED, LATER, DOUBLED], [LATER, MISSING, LATER, LATER]])
@pytest.mark.parametrize("first", ["battery adc", "AT+N"])
def test_searches_that_are_answered_late_themselves(clock: Clock, first: str,
                                                    ways: list[int]) -> None:
    passed = played(clock, Channel.PC, [first, *["AT+N"] * 5], ways)
    assert all(asked == taken for asked, taken in passed)
    assert passed, "the line finds its place in the end"
