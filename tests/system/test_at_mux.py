"""The AT channel of the packet path: opened, silenced, lost and found again."""

import re

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import scaled
from support.channels import AppChannel, integer, packet, string
from support.modem_desk import OK
from support.trace import Trace, error_line

SILENCE = b"AT^DLKS=0\r"
SILENCE_FUNC = "disable_unsolicited_code"
ASK = b"AT^DMSN\r"
ANSWER = b"\r\n^DMSN: 77\r\n\r\nOK\r\n"
BOARD = packet(86, string(38, "77"), integer(1, 0))
FAILED = packet(86, integer(1, 10))
READER = "amt_handle_read_app_loop()"
EIO = 5
OPENED = 'open device "/dev/ttyMUX0" successfully'


def starting(make_handset: HandsetFactory) -> Handset:
    """A handset whose daemon has just asked the modem for silence."""
    handset = make_handset("packet", ready=False, modem="held")
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    return handset


def serving(make_handset: HandsetFactory) -> tuple[Handset, AppChannel]:
    """A handset that serves its app, with the test in the modem's place."""
    handset = starting(make_handset)
    handset.mux.write(OK)
    handset.wait_ready()
    return handset, AppChannel(handset)


def expect_board(handset: Handset, app: AppChannel) -> None:
    """A request that the modem answers."""
    app.send_packet(85)
    assert handset.mux.read_exactly(len(ASK)) == ASK
    handset.mux.write(ANSWER)
    assert app.read_packet() == BOARD


# silence at the start


def test_modem_is_silenced_before_the_app_is_served(make_handset: HandsetFactory) -> None:
    handset = starting(make_handset)
    assert not handset.log.find(READER)
    # What is no final result is waited out, in pieces of 18 bytes that replace each other.
    noise = (b"OK\r\n", b"^DNOTE: 1\r\n", b"ERROR", b"\r\nOK", b"\0", b"x" * 18, b"\r\n")
    handset.mux.write(b"".join(piece.ljust(18, b".") for piece in noise))
    handset.mux.expect_silence(0.2)
    assert not handset.log.find(READER)
    handset.mux.write(OK)
    handset.wait_ready()
    assert not handset.log.find(error_line(SILENCE_FUNC, -100))
    expect_board(handset, AppChannel(handset))


def test_result_across_two_pieces_is_not_seen(make_handset: HandsetFactory) -> None:
    handset = starting(make_handset)
    handset.mux.write(b"z" * 15 + OK)
    handset.mux.expect_silence(0.3)
    assert not handset.log.find(READER)
    handset.mux.write(OK)
    handset.wait_ready()


@pytest.mark.parametrize("refusal", [b"\r\nERROR\r\n", b"\r\n+CME ERROR: 50\r\n",
                                     b"\r\n+CMS ERROR: 1\r\n", b"\r\n+CME ERROR: "])
def test_refusal_is_no_hindrance(make_handset: HandsetFactory, refusal: bytes) -> None:
    handset = starting(make_handset)
    handset.mux.write(refusal)
    handset.wait_ready()
    assert handset.log.find(error_line(SILENCE_FUNC, -100))
    assert not handset.log.find("The AT device is not opened with modem.")
    expect_board(handset, AppChannel(handset))


def test_ok_wins_over_an_error_in_one_piece(make_handset: HandsetFactory) -> None:
    handset = starting(make_handset)
    handset.mux.write(b"\r\nERROR\r\n" + OK)
    handset.wait_ready()
    assert not handset.log.find(error_line(SILENCE_FUNC, -100))


def test_silent_modem_is_waited_for(make_handset: HandsetFactory) -> None:
    handset = starting(make_handset)
    pattern = re.compile(r"^read time out: (\d+):(\d+) -> (\d+):(\d+)$")
    mark = handset.log.mark()
    found = handset.log.wait(pattern, after=mark)
    start, start_ns, end, end_ns = (int(part) for part in pattern.findall(found.text)[0])
    waited = end + end_ns / 1e9 - start - start_ns / 1e9
    assert 4.9 <= waited < scaled(7.0)
    assert handset.log.find(error_line(SILENCE_FUNC, -118), mark)
    # It is not asked again, and waits on.
    handset.mux.expect_silence(0.1)
    assert not handset.log.find(READER)
    handset.mux.write(OK)
    handset.wait_ready()
    expect_board(handset, AppChannel(handset))


def test_tty_lost_while_the_start_awaits_silence(make_handset: HandsetFactory) -> None:
    handset = starting(make_handset)
    handset.mux.hang_up()
    # Away for a while: it is asked for once a second.
    handset.log.wait('(1/30)try to open device "/dev/ttyMUX0"')
    assert handset.log.find(error_line(SILENCE_FUNC, -118))
    handset.mux.come_back(held=True)
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    assert not handset.log.find(READER)
    handset.mux.write(OK)
    handset.wait_ready()
    assert not handset.log.find("The AT device is not opened with modem.")
    expect_board(handset, AppChannel(handset))


# the tty is lost


def test_tty_lost_before_a_request(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    handset.mux.hang_up()
    handset.mux.come_back(held=True)
    trace = Trace(handset)
    printed = len(handset.stdout())
    app.send_packet(85)
    # Opened anew, silenced anew, written anew.
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    assert OPENED in handset.log.texts("vx-kel-pub")[-1]
    handset.mux.expect_silence(0.1)
    handset.mux.write(OK)
    assert handset.mux.read_exactly(len(ASK)) == ASK
    handset.mux.write(ANSWER)
    assert app.read_packet() == BOARD
    size = len(ANSWER)
    shown = ANSWER.decode().replace("\r", "\\r").replace("\n", "\\n")
    trace.expect("write_at()", "write_at write_len[-1]", "write_at ret_val[-118]",
                 "send ==> AT^DMSN\\r", f"read_at read_len_ptr[{size}] buf_ptr[{shown}]",
                 f"receive <== {shown}")
    assert handset.stdout()[printed:] == (
        b"[vx-kel-amt:L912]write_at: AT^DMSN\r\n[vx-kel-amt]write_at return:-1\n"
        b"[vx-kel-amt]read_at\n[vx-kel-amt]read_at return:" + ANSWER + b"\n")
    expect_board(handset, app)


def test_tty_lost_while_an_answer_is_awaited(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    trace = Trace(handset)
    app.send_packet(85)
    assert handset.mux.read_exactly(len(ASK)) == ASK
    handset.mux.hang_up()
    # Away for a while: it is asked for once a second.
    handset.log.wait('(1/30)try to open device "/dev/ttyMUX0"')
    handset.mux.come_back(held=True)
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    handset.mux.write(OK)
    # The request is not repeated, its answer is still awaited.
    handset.mux.expect_silence(0.1)
    handset.mux.write(ANSWER)
    assert app.read_packet() == BOARD
    trace.expect("write_at write_len[8]", "write_at ret_val[0]", "send ==> AT^DMSN\\r",
                 re.compile(r"read_at read_len_ptr\[(-1|0)\] buf_ptr\[\]"),
                 "read_at ret_val[-118]",
                 "receive <== \\r\\n^DMSN: 77\\r\\n\\r\\nOK\\r\\n")
    expect_board(handset, app)


def test_refused_silence_after_a_loss_is_no_hindrance(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    handset.mux.hang_up()
    handset.mux.come_back(held=True)
    app.send_packet(85)
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    handset.mux.write(b"\r\n+CME ERROR: 3\r\n")
    assert handset.mux.read_exactly(len(ASK)) == ASK
    handset.mux.write(b"\r\n+CME ERROR: 3\r\n")
    assert app.read_packet() == FAILED


def test_tty_lost_and_found_again_and_again(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    before = len(handset.inspect().descriptors)
    for _ in range(3):
        handset.mux.hang_up()
        handset.mux.come_back(held=True)
        app.send_packet(85)
        assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
        handset.mux.write(OK)
        assert handset.mux.read_exactly(len(ASK)) == ASK
        handset.mux.write(ANSWER)
        assert app.read_packet() == BOARD
    # No descriptor of a lost tty is kept.
    assert len(handset.inspect().descriptors) == before


def test_tty_lost_again_before_it_was_silent(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    before = len(handset.inspect().descriptors)
    handset.mux.hang_up()
    handset.mux.come_back(held=True)
    app.send_packet(85)
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    # The modem that came back says nothing, and goes again.
    handset.mux.expect_silence(0.1)
    handset.mux.hang_up()
    handset.mux.come_back(held=True)
    assert handset.mux.read_exactly(len(SILENCE)) == SILENCE
    handset.mux.write(OK)
    assert handset.mux.read_exactly(len(ASK)) == ASK
    handset.mux.write(ANSWER)
    assert app.read_packet() == BOARD
    assert app.request(9).result == 0
    expect_board(handset, app)
    assert len(handset.inspect().descriptors) == before


def test_requests_that_need_no_modem_do_not_notice(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    handset.mux.hang_up()
    assert app.request(9).result == 0
    assert handset.exits() == []


def test_long_command_and_answer_are_cut_in_the_log(make_handset: HandsetFactory) -> None:
    handset, app = serving(make_handset)
    trace = Trace(handset)
    app.send_packet(85)
    assert handset.mux.read_exactly(len(ASK)) == ASK
    answer = b"n" * 1500 + ANSWER
    handset.mux.write(answer)
    assert app.read_packet() == BOARD
    longest = [text for text in trace.texts() if text.startswith("receive <== ")][0]
    assert longest == "receive <== " + "n" * 1023
