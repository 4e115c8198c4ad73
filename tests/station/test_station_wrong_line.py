"""What came instead of an answer is said: the other line's form, an echo, a packet, a text."""

from __future__ import annotations

from typing import Sequence

import pytest
from station_peer import Peer, Script, ok

from amt_station.errors import BadFrame, NoAnswer, OutOfStep, StationError
from amt_station.link import Link
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import BareDecoder, Item
from amt_station.wire.envelope import encode_envelope
from amt_station.wire.packet import Packet

NAME = "AMT_VERSION_CMD"
VERSION = Packet(45, (Atom.integer(19, 16),))
ANSWER = Packet(46, (Atom.integer(1, 0),))
SHORT = 0.3


def always(*answers: bytes) -> Script:
    """A script that says the same whatever comes."""
    return lambda item: answers


@pytest.mark.parametrize("answer, kind, text", [
    (ANSWER.encode(), BadFrame, "packet 46 (AMT_VERSION_RSPCMD) came without an envelope; this is "
                                "the app channel, not the PC line: use --app"),
    (encode_envelope(VERSION), NoAnswer, "the line sent the request itself back, as an echo or a "
                                         "loop does"),
    (ok(194), NoAnswer, "packet 194 (AMT_BOARD_PCBA_CTRL_RSPCMD) came instead"),
    (b"\r\nRING\r\n", NoAnswer, "the text RING came instead"),
])
def test_a_packet_on_the_pc_line(peer: Peer, link: Link, answer: bytes,
                                 kind: type[StationError], text: str) -> None:
    peer.script = always(answer)
    with pytest.raises(kind) as caught:
        link.request(VERSION, SHORT)
    assert str(caught.value) == f"no answer to {NAME} within 0.3 s{separator(text)}{text}"


def separator(text: str) -> str:
    """What stands before it: something instead of an answer is an addition, the rest a reason."""
    return "; " if text.endswith("instead") else ": "


@pytest.mark.parametrize("answers, kind, text", [
    ([ANSWER.encode()], BadFrame, "packet 46 (AMT_VERSION_RSPCMD) came without an envelope; this "
                                  "is the app channel, not the PC line: use --app"),
    ([b"AT+X\r"], NoAnswer, "the line only sent the text itself back, as an echo or a loop does"),
])
def test_a_text_on_the_pc_line(peer: Peer, link: Link, answers: Sequence[bytes],
                               kind: type[StationError], text: str) -> None:
    peer.script = always(*answers)
    with pytest.raises(kind) as caught:
        link.at("AT+X", SHORT)
    assert str(caught.value) == f"no final result for AT+X within 0.3 s: {text}"


def test_an_envelope_on_the_app_channel(app_peer: Peer, app_link: Link) -> None:
    app_peer.script = always(encode_envelope(ANSWER))
    with pytest.raises(BadFrame) as caught:
        app_link.request(VERSION, SHORT)
    assert str(caught.value) == ("a packet in an envelope came instead of a bare one; this is the "
                                 "PC line, not the app channel: use --pc")


def test_the_search_for_the_place_says_it_too(peer: Peer, link: Link) -> None:
    peer.script = always(ANSWER.encode())
    with pytest.raises(OutOfStep, match="came without an envelope.*use --app; nothing else"):
        link.find_place(SHORT)


def test_a_flood_is_not_looked_through(peer: Peer, link: Link,
                                       monkeypatch: pytest.MonkeyPatch) -> None:
    looked_at = []
    feed = BareDecoder.feed

    def counting(self: BareDecoder, data: bytes) -> list[Item]:
        looked_at.append(len(data))
        return feed(self, data)

    monkeypatch.setattr(BareDecoder, "feed", counting)
    # Each byte of it may be the head of a packet, and none of it is text.
    peer.script = always(*[b"\xbb" * 4000] * 16)
    with pytest.raises(BadFrame):
        link.request(VERSION, 1.0)
    assert 0 < max(looked_at) <= 4 * 4096


@pytest.mark.parametrize("text", ["AT+\x1b[2J", "AT+\u202e"])
def test_a_text_is_escaped_in_what_went_wrong(text: str, peer: Peer, link: Link) -> None:
    with pytest.raises(NoAnswer) as caught:
        link.at(text, SHORT)
    assert str(caught.value).isprintable()
