"""A link that lost an answer finds its place before anything else is sent; nothing late passes."""

from __future__ import annotations

import threading
import time
from typing import Sequence

import pytest
from station_peer import Peer, answering, error_packet, ok, sequence

from amt_station.errors import IncompleteAnswer, NoAnswer, OutOfStep, Refused, UsageProblem
from amt_station.exchange import Purpose
from amt_station.link import Link
from amt_station.perform import perform
from amt_station.requests.model import Channel
from amt_station.requests.operations import prepare, prepare_packet, prepare_text
from amt_station.requests.table import requests_by_id
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item, Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

VERSION = Packet(45, (Atom.integer(19, 16),))
FLUSH = b"AT^DBTADDR=?\r"
OK = b"\r\nOK\r\n"
SHORT = 0.3


def lost(peer: Peer, link: Link, *then: Sequence[bytes]) -> None:
    """Lose the answer to one request; the handset then goes on with these answers."""
    peer.script = sequence([], *then)
    with pytest.raises(NoAnswer):
        link.request(VERSION, SHORT)


def test_a_late_answer_passes_nothing(peer: Peer, link: Link) -> None:
    lost(peer, link, [ok(46), OK], [ACKNOWLEDGEMENT, ok(194)])
    assert not link.in_step
    with link.recorded() as transcripts:
        exchange = link.request(Packet(193))
    assert exchange.answers == [Packet(194, (Atom.integer(1, 0),))]
    assert peer.raw == encode_envelope(VERSION) + FLUSH + encode_envelope(Packet(193))
    place, own = transcripts
    assert (place.purpose, own.purpose) == (Purpose.PLACE, Purpose.REQUEST)
    assert Packet(46, (Atom.integer(1, 0),)) in [
        timed.item.packet for timed in place.items if isinstance(timed.item, Frame)]
    assert link.in_step


def test_the_late_answer_to_the_same_request_is_not_taken(peer: Peer, link: Link) -> None:
    late = encode_envelope(Packet(46, (Atom.raw(18, b"late"), Atom.integer(1, 0))))
    true = encode_envelope(Packet(46, (Atom.raw(18, b"true"), Atom.integer(1, 0))))
    lost(peer, link, [late, OK], [ACKNOWLEDGEMENT, true])
    assert link.request(VERSION).answer.atoms[0].content == b"true"


def test_a_late_ok_of_a_text_passes_nothing(peer: Peer, link: Link) -> None:
    peer.script = sequence([], [OK, OK], [b"\r\nERROR\r\n"])
    with pytest.raises(NoAnswer):
        link.at("AT+A", SHORT)
    assert link.at("AT+B").final == "ERROR"
    assert peer.raw == b"AT+A\r" + FLUSH + b"AT+B\r"


def test_a_late_ok_behind_that_of_the_search_is_dropped_too(peer: Peer, link: Link) -> None:
    late = threading.Timer(0.2, peer.say, [OK])

    def script(item: Item) -> Sequence[bytes]:
        assert isinstance(item, Text)
        if item.text.startswith("AT^DBTADDR"):
            late.start()
            return [OK]
        return [b"\r\nERROR\r\n"] if item.text.startswith("AT+B") else []

    peer.script = script
    with pytest.raises(NoAnswer):
        link.at("AT+A", SHORT)
    assert link.at("AT+B").final == "ERROR"
    late.join()


def test_a_late_error_does_not_end_the_search(peer: Peer, link: Link) -> None:
    lost(peer, link, [b"\r\nERROR\r\n" + OK], [ok(194)])
    assert link.request(Packet(193)).answer.result == 0


def test_without_a_place_nothing_else_is_sent(peer: Peer, link: Link) -> None:
    lost(peer, link)
    with pytest.raises(OutOfStep, match="nothing else was sent"):
        link.find_place(SHORT)
    assert peer.raw == encode_envelope(VERSION) + FLUSH
    assert not link.in_step


class EndlessPort:
    """A line on which there is always another OK."""

    name = "endless"

    def read(self, timeout: float) -> bytes:
        """The next OK, at once where there is no time to wait for it."""
        time.sleep(min(timeout, 0.02))
        return OK if timeout > 0 else b""

    def write(self, data: bytes, timeout: float) -> None:
        """Taken, and not looked at."""

    def close(self) -> None:
        """Nothing is held."""


def test_a_line_that_never_falls_silent_is_an_error() -> None:
    with pytest.raises(OutOfStep, match="fall silent"):
        Link(EndlessPort()).find_place()


def test_a_held_packet_found_on_the_way_is_refused_with_the_advice(peer: Peer, link: Link) -> None:
    lost(peer, link, [ACKNOWLEDGEMENT, error_packet(194)])
    with pytest.raises(Refused, match="still holds") as caught:
        link.request(VERSION)
    assert "unplug" in caught.value.advice


def test_an_answer_to_another_request_leaves_the_link_out_of_step(peer: Peer, link: Link) -> None:
    peer.script = sequence([error_packet(194)])
    with pytest.raises(Refused, match="not looked at"):
        link.request(VERSION)
    assert not link.in_step


def test_the_app_channel_asks_for_what_nobody_serves(app_peer: Peer, app_link: Link) -> None:
    served = set(requests_by_id())

    def script(item: Item) -> Sequence[bytes]:
        assert isinstance(item, Frame)
        number = item.packet.command
        if number == 35:
            return []
        late = Packet(36, (Atom.integer(1, 0),)).encode()
        code = 0 if number in served else 1
        return [late, Packet(number + 1, (Atom.integer(1, code),)).encode()]

    app_peer.script = script
    with pytest.raises(NoAnswer):
        app_link.request(Packet(35, (Atom.boolean(15, 1),)), SHORT)
    assert app_link.request(Packet(37, (Atom.boolean(15, 1),))).answer.command == 38
    sent = [app_peer.next() for _ in range(3)]
    numbers = [item.packet.command for item in sent if isinstance(item, Frame)]
    assert numbers[0] == 35 and numbers[2] == 37
    assert numbers[1] not in served and numbers[1] - 1 not in served


def test_the_app_channel_never_asks_twice_for_the_same(app_peer: Peer, app_link: Link) -> None:
    app_peer.script = lambda item: (
        [Packet(item.packet.command + 1, (Atom.integer(1, 1),)).encode()]
        if isinstance(item, Frame) else [])
    app_link.find_place()
    app_link.find_place()
    first, second = app_peer.next(), app_peer.next()
    assert first != second, "the refusal of the first must not be that of the second"


def test_a_run_begins_in_step_whatever_an_earlier_process_left(peer: Peer, link: Link) -> None:
    peer.script = sequence([ok(46), OK])
    place = link.find_place()
    assert [packet.command for packet in place.late_answers] == [46]


def test_an_interrupted_exchange_leaves_the_link_out_of_step(peer: Peer, link: Link) -> None:
    class Interrupting:
        name = "interrupting"

        def read(self, timeout: float) -> bytes:
            if timeout:
                raise KeyboardInterrupt
            return b""

        def write(self, data: bytes, timeout: float) -> None:
            pass

        def close(self) -> None:
            pass

    broken = Link(Interrupting())
    with broken.recorded() as transcripts, pytest.raises(KeyboardInterrupt):
        broken.request(VERSION)
    assert not broken.in_step
    assert transcripts[0].error == "KeyboardInterrupt"


def test_two_threads_take_turns(peer: Peer, link: Link) -> None:
    def script(item: Item) -> Sequence[bytes]:
        assert isinstance(item, Frame)
        module = item.packet.get_int(19)
        return [ACKNOWLEDGEMENT, encode_envelope(Packet(
            46, (Atom.integer(19, module), Atom.raw(18, b"%d" % module), Atom.integer(1, 0))))]

    peer.script = script
    answers: dict[int, set[bytes]] = {1: set(), 64: set()}
    problems: list[BaseException] = []

    def ask(module: int) -> None:
        try:
            for _ in range(20):
                answer = link.request(Packet(45, (Atom.integer(19, module),))).answer
                answers[module].add(answer.atoms[1].content)
        except BaseException as problem:
            problems.append(problem)

    threads = [threading.Thread(target=ask, args=(module,)) for module in answers]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert problems == []
    assert answers == {1: {b"1"}, 64: {b"64"}}


# answers that say yes and bring nothing

@pytest.mark.parametrize("command, values, answer, words", [
    ("version", {"module": "software"}, [Atom.integer(19, 16), Atom.integer(1, 0)],
     "holds no version"),
    ("version", {"module": "software"}, [Atom.integer(19, 17), Atom.raw(18, b"1"),
                                         Atom.integer(1, 0)], "holds no module 16"),
    ("version", {"module": "software"}, [Atom.raw(18, b"1"), Atom.integer(1, 0)],
     "holds no module"),
    ("version", {"module": "software"}, [Atom.integer(19, 16), Atom.integer(18, 5),
                                         Atom.integer(1, 0)], "of type int, not bytes"),
    ("battery adc", {}, [Atom.integer(1, 0)], "holds no adc"),
    ("battery adc", {}, [Atom.integer(151, 4)], "holds no result"),
    ("battery adc", {}, [], "holds no adc"),
    ("battery adc", {}, [Atom.string(151, "4"), Atom.integer(1, 0)], "of type str"),
    ("adb-serial read", {}, [Atom.integer(1, 0)], "holds no serial"),
    ("test-result read", {"station": 3}, [Atom.integer(39, 4), Atom.integer(36, 1),
                                          Atom.integer(1, 0)], "holds no station 3"),
    ("sim check", {}, [], "holds no sim"),
])
def test_a_read_that_brings_nothing_is_no_pass(command: str, values: dict[str, object],
                                               answer: list[Atom], words: str, peer: Peer,
                                               link: Link) -> None:
    prepared = prepare(command, values)
    assert prepared.row is not None
    peer.script = sequence([ACKNOWLEDGEMENT, encode_envelope(
        Packet(prepared.row.answer_id, tuple(answer)))])
    with pytest.raises(IncompleteAnswer, match=words):
        perform(link, prepared)
    assert not link.in_step


def test_reads_of_a_new_handset_go_as_text_that_is_not_held(peer: Peer, link: Link) -> None:
    peer.script = sequence([b"\r\n^DPCBACTRL: P-0042\r\n\r\nOK\r\n"], [b"\r\nERROR\r\n"],
                           [b'\r\n^DBTADDR: "00:11:22:33:44:55"\r\n\r\nOK\r\n'], [OK])
    assert perform(link, prepare("pcba read"))["serial"].value == "P-0042"
    with pytest.raises(Refused, match="the file is missing or empty") as caught:
        perform(link, prepare("pcba read"))
    assert not caught.value.held
    assert perform(link, prepare("bt-address read"))["address"].value == "00:11:22:33:44:55"
    with pytest.raises(IncompleteAnswer, match="DWIFIADDR"):
        perform(link, prepare("wifi-address read"))
    assert peer.raw == b"AT^DPCBACTRL=1\r" * 2 + b"AT^DBTADDR?\rAT^DWIFIADDR?\r"


def test_a_refusal_says_why(peer: Peer, link: Link) -> None:
    peer.script = answering(code=1)
    with pytest.raises(Refused, match="holds no word") as caught:
        perform(link, prepare("adb-serial read"))
    assert not any("write" in cause for cause in caught.value.causes), "only those of a read"
    assert caught.value.details()["causes"] == list(caught.value.causes)


def test_what_is_prepared_for_one_channel_is_not_sent_on_the_other(peer: Peer,
                                                                   link: Link) -> None:
    with pytest.raises(UsageProblem, match="prepared for the app channel"):
        perform(link, prepare("vibrator on", channel=Channel.APP))
    assert peer.raw == b""


def test_a_value_is_shown_in_its_unit(app_peer: Peer, app_link: Link) -> None:
    app_peer.script = lambda item: [Packet(10, (Atom.integer(5, 4012345),
                                                Atom.integer(1, 0))).encode()]
    voltage = perform(app_link, prepare("battery voltage", channel=Channel.APP))["voltage"]
    assert (voltage.value, voltage.shown, voltage.unit) == (4012345, 4.012345, "V")


def test_two_lines_with_a_value_are_no_value(peer: Peer, link: Link) -> None:
    peer.script = sequence([b'\r\n^DBTADDR: "00:11:22:33:44:55"\r\n\r\nO?\r\n'
                            b'\r\n^DBTADDR: "00:11:22:33:44:66"\r\n\r\nOK\r\n'])
    with pytest.raises(IncompleteAnswer, match="holds 2 .DBTADDR: lines"):
        perform(link, prepare("bt-address read"))
    assert not link.in_step


@pytest.mark.parametrize("atoms, words", [
    ([Atom.integer(19, 17), Atom.raw(18, b"1"), Atom.integer(1, 0)], "holds no module 16"),
    ([Atom.integer(19, 16), Atom.raw(18, b"1")], "holds no result"),
    ([Atom.integer(19, 16), Atom.integer(18, 1), Atom.integer(1, 0)], "of type int, not bytes")])
def test_any_request_has_to_be_answered_as_asked(atoms: list[Atom], words: str, peer: Peer,
                                                 link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, encode_envelope(Packet(46, tuple(atoms)))])
    with pytest.raises(IncompleteAnswer, match=words):
        perform(link, prepare_packet(VERSION))
    assert not link.in_step


def test_a_text_says_why_it_was_refused(peer: Peer, link: Link) -> None:
    peer.script = sequence([b"\r\nERROR\r\n"])
    with pytest.raises(Refused, match="read: the file is missing or empty"):
        perform(link, prepare_text("AT^DPCBACTRL=1"))


class FloodedPort(EndlessPort):
    """A line that says OK without a pause."""

    written = b""

    def read(self, timeout: float) -> bytes:
        """As much as anybody takes."""
        return OK * 100

    def write(self, data: bytes, timeout: float) -> None:
        """Taken."""
        self.written += data


def test_a_line_that_says_ok_without_a_pause_passes_nothing() -> None:
    port = FloodedPort()
    with pytest.raises(OutOfStep, match="does not fall silent.*the text .*OK.* came instead"):
        Link(port).at("AT+A")
    assert port.written == b""
