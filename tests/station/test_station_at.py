"""AT text over the link, and how a held request is got rid of."""

from __future__ import annotations

import pytest
from station_peer import Peer, error_packet, ok, replying, sequence

from amt_station.errors import BadFrame, Held, NoAnswer, Refused
from amt_station.link import Link
from amt_station.wire.decoder import Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT

OK = "\r\nOK\r\n"
FLUSH = b"AT^DBTADDR=?\r"
SHORT = 1.0


def test_an_at_reply(peer: Peer, link: Link) -> None:
    peer.script = sequence([b'\r\n^DBTADDR: "00:1', b'1"\r\n\r\nO', b"K\r\n"])
    reply = link.at("AT^DBTADDR?")
    assert peer.raw == b"AT^DBTADDR?\r"
    assert (reply.ok, reply.final, reply.lines) == (True, "OK", ['^DBTADDR: "00:11"'])


@pytest.mark.parametrize("final", ["ERROR", "+CME ERROR: 100", "+CMS ERROR: 5"])
def test_final_results_that_say_no(peer: Peer, link: Link, final: str) -> None:
    peer.script = replying(f"\r\n{final}\r\n")
    reply = link.at("AT^DSVER\r")
    assert peer.raw == b"AT^DSVER\r"
    assert (reply.ok, reply.final) == (False, final)


def test_a_reply_with_an_echo_and_unasked_lines(peer: Peer, link: Link) -> None:
    peer.script = replying("AT+X\r\r\n^DLKS: 1\r\n\r\nOK?\r\n\r\nOK\r\n")
    assert link.at("AT+X").lines == ["^DLKS: 1", "OK?"]


def test_a_reply_is_not_over_before_its_last_line_end(peer: Peer, link: Link) -> None:
    peer.script = replying("\r\nOK")
    with pytest.raises(NoAnswer, match="no final result for AT within"):
        link.at("AT", SHORT)


def test_a_refused_text_is_held(peer: Peer, link: Link) -> None:
    peer.script = sequence([error_packet(0)])
    with pytest.raises(Refused) as caught:
        link.at('AT^DBTADDR=""')
    assert (caught.value.code, caught.value.held) == (1, Held.TEXT)
    assert "AT^DBTADDR=?" in caught.value.advice


def test_a_text_behind_a_held_packet(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    with pytest.raises(Refused, match="still holds") as caught:
        link.at("AT^DSVER")
    assert caught.value.held is Held.PACKET


def test_a_reply_that_cannot_be_read(peer: Peer, link: Link) -> None:
    peer.script = sequence([b"\x01\x02\x03"])
    with pytest.raises(BadFrame):
        link.at("AT", SHORT)


def test_recover_flushes_a_text(peer: Peer, link: Link) -> None:
    peer.script = replying(OK)
    recovery = link.recover()
    assert peer.raw == FLUSH
    assert (recovery.attempts, recovery.late_answers) == (1, ())


def test_recover_behind_a_held_packet(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    with pytest.raises(Refused) as caught:
        link.recover()
    assert caught.value.held is Held.PACKET


def test_recover_behind_a_packet_that_succeeds_now(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(194)], [OK.encode()])
    recovery = link.recover(SHORT)
    assert peer.raw == FLUSH * 2
    assert recovery.attempts == 2
    assert [packet.command for packet in recovery.late_answers] == [194]


def test_recover_without_an_answer(peer: Peer, link: Link) -> None:
    with pytest.raises(NoAnswer):
        link.recover(SHORT)
    assert isinstance(peer.next(), Text)
    assert peer.raw == FLUSH, "nothing came, so nothing is repeated"


def test_recover_answered_with_an_error(peer: Peer, link: Link) -> None:
    peer.script = replying("\r\nERROR\r\n")
    with pytest.raises(Refused, match="ERROR"):
        link.recover()
