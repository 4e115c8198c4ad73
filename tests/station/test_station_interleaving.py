"""Whatever comes late, doubled, damaged or not at all: no step is passed by another's answer.

What is more than three seconds late, the time that a link gives a search, is beyond it: a text's
answer says nothing of the text. The handset is a port without any time of its own: what it says
becomes readable when the link waits long enough, so that hundreds of lines are played in a second.

The handset and its modem answer in two orders: what the modem takes its time for is overtaken by
what the handset knows itself. A process that is killed leaves all this to the next one.
"""

from __future__ import annotations

import contextlib
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
HANDSET, MODEM = range(2)
KILLED, NEXT_PROCESS = "killed in the middle", "another process"


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
    """A handset and its modem, each answering in order, each answer in its own way."""

    clock: Clock
    channel: Channel
    ways: list[int]
    name: str = "scripted"
    sent: int = 0
    waiting: list[tuple[float, bytes]] = field(default_factory=list)
    ready: list[float] = field(default_factory=lambda: [0.0, 0.0])
    killing: bool = False
    marked: bool = False

    def left_out_of_step(self) -> bool:
        """As a terminal remembers it."""
        return self.marked

    def remember(self, out_of_step: bool) -> None:
        """As a terminal remembers it."""
        self.marked = out_of_step

    def read(self, timeout: float) -> bytes:
        """What has become readable within ``timeout``."""
        if self.killing and timeout:
            self.killing = False
            raise KeyboardInterrupt
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
            self.answer(how, *self.reply(item))

    def answer(self, how: int, who: int, data: bytes) -> None:
        """Answers leave the handset in the order of the requests, however long one takes."""
        delay = {LATE: LIMIT + 0.3, LATER: 3 * LIMIT}.get(how, 0.01)
        if how == MISSING:
            return
        if how == DAMAGED:
            data = data[:-3] + bytes([data[-3] ^ 0x55]) + data[-2:]
        self.ready[who] = max(self.ready[who], self.clock.now + delay)
        self.waiting += [(self.ready[who], data)] * (2 if how == DOUBLED else 1)
        self.waiting.sort(key=lambda one: one[0])

    def reply(self, item: Item) -> tuple[int, bytes]:
        """Who answers, and an answer that tells which sending it belongs to, if it can."""
        if isinstance(item, Text):
            if b"DBTADDR=?" in item.raw:
                return HANDSET, b"\r\nOK\r\n"
            return MODEM, b"\r\n+N: %d\r\n\r\nOK\r\n" % self.sent
        assert isinstance(item, Frame)
        number = item.packet.command
        atoms = {9: Atom.integer(5, self.sent), 224: Atom.integer(151, self.sent),
                 85: Atom.string(38, str(self.sent))}
        if number in atoms:
            answer = Packet(number + 1, (atoms[number], Atom.integer(1, 0)))
        else:
            answer = Packet(number + 1, (Atom.integer(1, 1),))
        pc = self.channel is Channel.PC
        return (MODEM if pc and number == 85 else HANDSET,
                encode_envelope(answer) if pc else answer.encode())

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
        if step in (NEXT_PROCESS, KILLED):
            _end_process(port, link, step)
            link = Link(port, channel)
            continue
        prepared = prepare_text(step) if step.startswith("AT") else prepare(step, {}, channel)
        try:
            outcome = perform(link, prepared, LIMIT)
        except StationError as error:
            assert str(error)
            continue
        asked = port.sent
        value = outcome.values[0].value
        passed.append((asked, int(str(value).rpartition(" ")[2] or -1)))
    return passed


def _end_process(port: ScriptedPort, link: Link, how: str) -> None:
    """The link is left as it is; whoever opens the port drops what lies in it."""
    if how == KILLED:
        port.killing = True
        with contextlib.suppress(KeyboardInterrupt, StationError):
            link.at("AT+K") if link.channel is Channel.PC else link.request(Packet(9))
        port.killing = False
    port.waiting = [one for one in port.waiting if one[0] > port.clock.now]


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


@settings(max_examples=300)
@given(st.lists(st.sampled_from(["board read", "battery adc", "AT+N"]), min_size=1, max_size=8),
       st.lists(HOW, max_size=24))
def test_what_the_modem_answers_in_an_order_of_its_own(clock: Clock, steps: list[str],
                                                       ways: list[int]) -> None:
    for asked, taken in played(clock, Channel.PC, steps, ways):
        assert asked == taken


@settings(max_examples=300)
@given(st.sampled_from(Channel), st.data(), st.lists(HOW, max_size=24))
def test_what_earlier_processes_left_behind(clock: Clock, channel: Channel, data: st.DataObject,
                                            ways: list[int]) -> None:
    asked_for = (["board read", "AT+N"] if channel is Channel.PC else ["battery voltage"])
    steps = data.draw(st.lists(st.sampled_from([*asked_for, KILLED, NEXT_PROCESS]), min_size=1,
                               max_size=8))
    for asked, taken in played(clock, channel, steps, ways):
        assert asked == taken


@pytest.mark.parametrize("step", ["board read", "AT+N"])
@pytest.mark.parametrize("ways", [[LATE, ON_TIME], [LATE, DOUBLED], [LATER, DOUBLED]])
def test_the_modem_is_overtaken_by_the_answer_to_the_search(clock: Clock, step: str,
                                                            ways: list[int]) -> None:
    assert played(clock, Channel.PC, [step] * 2, ways) == [(3, 3)]
    assert played(clock, Channel.PC, [KILLED, step], ways) == [(3, 3)]


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
