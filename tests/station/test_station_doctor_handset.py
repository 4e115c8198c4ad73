"""The doctor and what is at the other end: handsets, other things, and nothing at all."""

from __future__ import annotations

import os
from pathlib import Path
from typing import Sequence

import pytest
from doctor_visit import FakeComputer, examined
from station_peer import Peer, Script, error_packet, ok, replying, sequence

from amt_station.doctor.finding import Finding, Level, exit_status
from amt_station.errors import NoPort
from amt_station.port import FdPort
from amt_station.requests.model import Channel
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item, Text
from amt_station.wire.envelope import encode_envelope
from amt_station.wire.packet import Packet

QUESTION = b"AT^DBTADDR=?\r"
OK = "\r\nOK\r\n"


@pytest.fixture
def fake(tmp_path: Path) -> FakeComputer:
    """A PC on which all is well."""
    return FakeComputer(tmp_path / "pc")


class Found:
    """What the three checks of the handset have found."""

    def __init__(self, findings: Sequence[tuple[str, Finding]]) -> None:
        by_name = dict(findings)
        assert len(by_name) == len(findings)
        self.answer, self.mode = by_name["answer"], by_name["mode"]
        self.buffer = by_name["request buffer"]
        self.status = exit_status([finding for _, finding in findings])

    @property
    def levels(self) -> list[Level]:
        """How bad they are."""
        return [self.answer.level, self.mode.level, self.buffer.level]


def always(*answers: bytes) -> Script:
    """A script that says the same whatever comes."""
    return lambda item: answers


def refusing(item: Item) -> Sequence[bytes]:
    """An app channel: it refuses every request, and takes a text for one."""
    # The decoder keeps the end of a text back: a packet might begin there.
    if not isinstance(item, Frame) and QUESTION[:8] not in item.raw:
        return ()
    command = item.packet.command if isinstance(item, Frame) else QUESTION[3]
    return (Packet(command + 1, (Atom.integer(1, 1),)).encode(),)


GOOD = [Level.OK, Level.OK, Level.OK]
SILENT = [Level.ERROR, Level.UNCHECKED, Level.UNCHECKED]


def test_a_healthy_handset_is_asked_once(peer: Peer, fake: FakeComputer) -> None:
    peer.script = replying(OK)
    found = Found(examined(peer.path, fake))
    assert (found.levels, found.status) == (GOOD, 0)
    assert peer.raw == QUESTION


def test_a_healthy_app_channel(app_peer: Peer, fake: FakeComputer) -> None:
    app_peer.script = refusing
    found = Found(examined(app_peer.path, fake, channel=Channel.APP))
    assert (found.levels, found.status) == (GOOD, 0)


def test_nobody_answers(peer: Peer, fake: FakeComputer) -> None:
    found = Found(examined(peer.path, fake))
    assert (found.levels, found.status) == (SILENT, 5)
    assert found.answer.text == "nothing comes back within 0.3 s"
    assert "switch the handset on" in found.answer.advice


@pytest.mark.parametrize("answer, text, advice, status", [
    (b"\xf0\x80\x00\xf8\x9e\x00\xe0\x06\xff", "garbage comes instead of an answer: f0 80 00 f8 9e",
     "--baud", 6),
    (b"\0", "garbage comes instead of an answer: 00", "--baud", 6),
    (ok(46)[:-1] + b"\x55" + ok(46)[:9], "what comes is damaged: ", "another program", 6),
    (QUESTION, "the line sends back what is sent, and nothing else", "loop", 5),
    (b"\r\nERROR\r\n", "something else than a handset's test service answers: "
     "ERROR came", "name another port", 1),
    (b"\r\nhandset login: ", "something else than a handset's test service answers: "
     "handset login: came", "name another port", 5),
])
def test_something_else_answers(answer: bytes, text: str, advice: str, status: int, peer: Peer,
                                fake: FakeComputer) -> None:
    peer.script = always(answer)
    found = Found(examined(peer.path, fake))
    assert (found.levels, found.status) == (SILENT, status)
    assert found.answer.text.startswith(text) and advice in found.answer.advice


class Flood:
    """A line that never falls silent."""

    name = "flood"

    def read(self, timeout: float) -> bytes:
        return b"\xff\x00" * 100

    def write(self, data: bytes, timeout: float) -> None:
        raise AssertionError("nothing may be sent")

    def close(self) -> None:
        pass


def test_a_line_that_never_falls_silent(fake: FakeComputer, peer: Peer) -> None:
    found = Found(examined(peer.path, fake, open_port=lambda url: Flood()))
    assert (found.levels, found.answer.status) == (SILENT, 6)
    assert "garbage" in found.answer.text


class Gone(FdPort):
    """A port whose handset goes when it is asked."""

    def read(self, timeout: float) -> bytes:
        if timeout:
            raise NoPort(f"port {self.name} went away: I/O error")
        return b""


def test_a_handset_that_goes(fake: FakeComputer, peer: Peer) -> None:
    found = Found(examined(peer.path, fake, open_port=lambda url: Gone(os.dup(peer.slave), url)))
    assert (found.levels, found.answer.status) == (SILENT, 3)
    assert "went away" in found.answer.text and "cable" in found.answer.advice


def test_the_app_channel_where_the_pc_line_was_named(app_peer: Peer, fake: FakeComputer) -> None:
    app_peer.script = refusing
    found = Found(examined(app_peer.path, fake))
    assert found.levels == [Level.OK, Level.ERROR, Level.UNCHECKED] and found.status == 5
    assert found.mode.text == "it serves the app channel here, not the PC line"
    assert "--app mode enter" in found.mode.advice


def test_the_pc_line_where_the_app_channel_was_named(peer: Peer, fake: FakeComputer) -> None:
    # The packet without an envelope goes to the modem, which does not know it.
    peer.script = lambda item: (OK.encode(),) if item.raw.endswith(QUESTION) else ()
    found = Found(examined(peer.path, fake, channel=Channel.APP))
    assert found.levels == [Level.OK, Level.ERROR, Level.UNCHECKED] and found.status == 5
    assert found.mode.text == "it serves the PC line here, not the app channel"
    assert "--pc" in found.mode.advice


def test_an_envelope_where_the_app_channel_was_named(peer: Peer, fake: FakeComputer) -> None:
    peer.script = lambda item: (OK.encode(),) if isinstance(item, Text) and item.raw.endswith(
        QUESTION) else (encode_envelope(Packet(46, (Atom.integer(1, 0),))),)
    found = Found(examined(peer.path, fake, channel=Channel.APP))
    assert found.levels == [Level.OK, Level.ERROR, Level.UNCHECKED] and found.status == 6


def test_a_refused_packet_is_held(peer: Peer, fake: FakeComputer) -> None:
    peer.script = always(error_packet(194))
    found = Found(examined(peer.path, fake))
    assert found.levels == [Level.OK, Level.OK, Level.ERROR] and found.status == 1
    assert "the handset still holds the request AMT_BOARD_PCBA_CTRL_CMD" in found.buffer.text
    assert "unplug the USB cable" in found.buffer.advice


def test_a_held_packet_is_carried_out_now(peer: Peer, fake: FakeComputer) -> None:
    peer.script = sequence([ok(194, Atom.string(191, "PCBA-7"))], [OK.encode()])
    found = Found(examined(peer.path, fake))
    assert found.levels == [Level.OK, Level.OK, Level.WARNING] and found.status == 8
    assert found.buffer.text.endswith("was asked before: AMT_BOARD_PCBA_CTRL_RSPCMD")
