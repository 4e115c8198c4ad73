"""The link against a scripted handset: what it waits for, and what it makes of what comes."""

from __future__ import annotations

import os
import threading

import pytest
from station_peer import Peer, answering, error_packet, ok, sequence

from amt_station.errors import BadFrame, Held, NoAnswer, NoPort, PortBusy, Refused, UsageProblem
from amt_station.link import Link
from amt_station.port import FdPort, SerialPort
from amt_station.requests.model import Channel
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item, Skipped, Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT, LARGEST_REQUEST, encode_envelope
from amt_station.wire.packet import Packet

VERSION = Packet(45, (Atom.integer(19, 16),))
SHORT = 1.0


def test_a_request_with_its_acknowledgement_and_answer(peer: Peer, link: Link) -> None:
    peer.script = answering(Atom.raw(18, b"1.2"))
    exchange = link.request(VERSION)
    assert peer.raw == exchange.sent == encode_envelope(VERSION)
    assert exchange.acknowledged
    assert exchange.answer == Packet(46, (Atom.raw(18, b"1.2"), Atom.integer(1, 0)))
    assert exchange.stray == []


def test_an_answer_byte_by_byte(peer: Peer, link: Link) -> None:
    stream = ACKNOWLEDGEMENT + ok(46)
    peer.script = sequence([stream[at:at + 1] for at in range(len(stream))])
    assert link.request(VERSION).answer.result == 0


def test_an_answer_without_acknowledgement_counts(peer: Peer, link: Link) -> None:
    peer.script = answering(acknowledged=False)
    exchange = link.request(Packet(85))
    assert exchange.answer.command == 86 and not exchange.acknowledged


def test_the_gps_test_is_answered_with_another_id(peer: Peer, link: Link) -> None:
    peer.script = answering(answer=175)
    assert link.request(Packet(176)).answer.command == 175


def test_what_belongs_to_something_else_is_kept_apart(peer: Peer, link: Link) -> None:
    other = Packet(221, (Atom.integer(1, 0), Atom.raw(62, b"x")))
    peer.script = sequence([ACKNOWLEDGEMENT, b"\r\n^DLKS: 1\r\n", encode_envelope(other), ok(46)])
    exchange = link.request(VERSION)
    assert exchange.answer.command == 46
    assert exchange.stray == [Text(b"\r\n^DLKS: 1\r\n"), Frame(other, encode_envelope(other))]


def test_what_came_before_the_request_is_no_answer(peer: Peer, link: Link) -> None:
    peer.say(error_packet(46))
    peer.script = answering()
    assert link.request(VERSION).answer.result == 0


def test_a_refused_packet_is_held(peer: Peer, link: Link) -> None:
    peer.script = answering(code=1)
    with pytest.raises(Refused) as caught:
        link.request(Packet(193))
    refusal = caught.value
    assert (refusal.code, refusal.response, refusal.held) == (1, 194, Held.PACKET)
    assert "unplug" in refusal.advice
    assert refusal.details()["held"] == "packet"


def test_code_10_leaves_nothing_behind(peer: Peer, link: Link) -> None:
    peer.script = answering(code=10)
    with pytest.raises(Refused) as caught:
        link.request(Packet(193))
    assert (caught.value.code, caught.value.held, caught.value.advice) == (10, Held.NOTHING, "")


def test_code_1_of_a_request_for_the_modem_may_be_the_modems(peer: Peer, link: Link) -> None:
    peer.script = answering(code=1, acknowledged=False)
    with pytest.raises(Refused) as caught:
        link.request(Packet(5, (Atom.string(21, "1"),)))
    assert caught.value.held is Held.UNKNOWN
    assert "recover" in caught.value.advice


def test_a_refusal_with_data_is_the_modems(peer: Peer, link: Link) -> None:
    peer.script = answering(Atom.raw(21, b"x"), code=1)
    with pytest.raises(Refused) as caught:
        link.request(Packet(7))
    assert caught.value.held is Held.NOTHING


def test_an_older_request_that_is_still_held(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    with pytest.raises(Refused, match="still holds the request AMT_BOARD_PCBA_CTRL_CMD") as caught:
        link.request(VERSION)
    assert caught.value.held is Held.PACKET


def test_an_older_text_that_is_still_held(peer: Peer, link: Link) -> None:
    peer.script = sequence([error_packet(0)])
    with pytest.raises(Refused, match="still holds an AT text") as caught:
        link.request(VERSION)
    assert caught.value.held is Held.TEXT
    assert "recover" in caught.value.advice


def test_bluetooth_answers_twice(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(171), ok(171)])
    assert len(link.request(Packet(170)).answers) == 2


def test_bluetooth_fails_at_the_second_answer(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(171), error_packet(171)])
    with pytest.raises(Refused) as caught:
        link.request(Packet(170))
    assert caught.value.held is Held.NOTHING, "the first answer has completed the request"


def test_bluetooth_refused_at_once(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(171)])
    with pytest.raises(Refused) as caught:
        link.request(Packet(170), SHORT)
    assert caught.value.held is Held.PACKET


def test_bluetooth_whose_outcome_stays_away(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(171)])
    with pytest.raises(NoAnswer, match="outcome"):
        link.request(Packet(170), SHORT)


@pytest.mark.parametrize("request_packet", [
    Packet(7), Packet(91), Packet(200), Packet(45, (Atom.integer(19, 17),)),
    Packet(45, (Atom.integer(19, 18),))])
def test_a_modem_that_answers_a_packet_with_an_at_error(peer: Peer, link: Link,
                                                        request_packet: Packet) -> None:
    peer.script = sequence([b"\r\nERR", b"OR\r\n"])
    with pytest.raises(Refused, match="the modem answered .* with ERROR"):
        link.request(request_packet)


def test_an_at_error_beside_a_request_of_the_handset_is_only_stray(peer: Peer,
                                                                   link: Link) -> None:
    peer.script = sequence([b"\r\nERROR\r\n", ACKNOWLEDGEMENT, ok(46)])
    assert link.request(VERSION).stray == [Text(b"\r\nERROR\r\n")]


def test_no_answer(peer: Peer, link: Link) -> None:
    with pytest.raises(NoAnswer, match=r"no answer to AMT_VERSION_CMD within 1 s"):
        link.request(VERSION, SHORT)


def test_acknowledged_but_not_answered(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT])
    with pytest.raises(NoAnswer, match="acknowledged, but not answered"):
        link.request(VERSION, SHORT)


def test_an_answer_with_a_wrong_checksum(peer: Peer, link: Link) -> None:
    frame = bytearray(ok(46))
    frame[-1] ^= 1
    peer.script = sequence([ACKNOWLEDGEMENT, bytes(frame)])
    with pytest.raises(BadFrame, match="checksum"):
        link.request(VERSION, SHORT)


def test_a_truncated_answer(peer: Peer, link: Link) -> None:
    peer.script = sequence([ok(46)[:-3]])
    with pytest.raises(BadFrame, match="not completed"):
        link.request(VERSION, 1.0)


def test_a_good_answer_behind_a_truncated_one(peer: Peer, link: Link) -> None:
    peer.script = sequence([ok(46)[:18] + ok(46)])
    exchange = link.request(VERSION)
    assert exchange.answer.result == 0
    assert isinstance(exchange.stray[0], Skipped)


def test_a_request_that_is_too_large_is_not_sent(peer: Peer, link: Link) -> None:
    with pytest.raises(UsageProblem, match="4095"):
        link.request(Packet(1, (Atom.raw(1, bytes(4069)),)))
    with pytest.raises(UsageProblem, match="4095"):
        link.at("A" * LARGEST_REQUEST)
    peer.script = answering()
    link.request(VERSION)
    assert peer.raw == encode_envelope(VERSION)


def test_the_app_channel_has_no_envelope(app_peer: Peer, app_link: Link) -> None:
    answer = Packet(36, (Atom.integer(1, 0),))
    app_peer.script = lambda item: (answer.encode(),)
    exchange = app_link.request(Packet(35, (Atom.boolean(15, 1),)))
    assert app_peer.raw == Packet(35, (Atom.boolean(15, 1),)).encode()
    assert exchange.answer == answer and not exchange.acknowledged


def test_the_app_channel_holds_nothing(app_peer: Peer, app_link: Link) -> None:
    app_peer.script = lambda item: (Packet(201, (Atom.integer(1, 1),)).encode(),)
    with pytest.raises(Refused) as caught:
        app_link.request(Packet(200))
    assert (caught.value.code, caught.value.held) == (1, Held.NOTHING)


def test_the_app_channel_takes_no_text(app_peer: Peer, app_link: Link) -> None:
    with pytest.raises(UsageProblem, match="PC line only"):
        app_link.at("AT")
    assert app_peer.raw == b""


def test_a_port_that_goes_away(peer: Peer) -> None:
    with Link(SerialPort(peer.path), timeout=2.0) as link:
        peer.hang_up()
        with pytest.raises(NoPort, match="went away"):
            link.request(VERSION)


def test_a_descriptor_that_goes_away() -> None:
    reading, writing = os.pipe()
    os.close(writing)
    port = FdPort(reading, "the line", owned=True)
    with pytest.raises(NoPort, match="the line went away"):
        port.read(0.1)
    port.close()
    port.close()
    with pytest.raises(OSError):
        os.fstat(reading)


def test_one_port_one_station(peer: Peer) -> None:
    with Link.open(peer.path):
        with pytest.raises(PortBusy, match="busy"):
            Link.open(peer.path)
    Link.open(peer.path).close()


@pytest.mark.parametrize("url", ["/dev/no-such-port", "nonsense://x", "/dev/null"])
def test_no_port(url: str) -> None:
    with pytest.raises(NoPort, match=url.split(":", maxsplit=1)[0]):
        Link.open(url)


def test_a_port_without_a_descriptor() -> None:
    with Link.open("loop://", Channel.PC, timeout=SHORT) as link:
        # The loop sends the request back: a packet, but not an answer to it.
        with pytest.raises(NoAnswer) as caught:
            link.request(VERSION)
        assert [item.packet for item in caught.value.arrived] == [VERSION]


class FloodingPort:
    """A port on which bytes never stop arriving."""

    name = "flood"

    def read(self, timeout: float) -> bytes:
        """Always something."""
        return b"x" * 100

    def write(self, data: bytes, timeout: float) -> None:
        """Gone."""

    def close(self) -> None:
        """Nothing to give back."""


def test_a_flood_ends_with_a_time_out() -> None:
    with pytest.raises(NoAnswer):
        Link(FloodingPort()).request(VERSION, 0.2)


def test_the_time_counts_from_the_request(peer: Peer, link: Link) -> None:
    released = threading.Event()

    def script(item: Item) -> list[bytes]:
        released.wait(0.2)
        return [ACKNOWLEDGEMENT, ok(46)]

    peer.script = script
    assert link.request(VERSION).seconds >= 0.2
