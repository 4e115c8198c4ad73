"""The Bluetooth start (170): the service answers at once, its child switches the chip on."""

import signal
from typing import Callable, Union

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import AppChannel, PcChannel, packet
from support.handler import HandlerTrace, device_error, done, refusal
from support.held import HeldCall
from support.threads import wait_calm
from support.trace import TAG
from support.traffic import APP_OUT, PC_OUT, dump

BT, HANDLER = 170, "amt_device_bt"
GPS_TEST, RADIO_TEST = 176, 187
CALL = "ldt_btCtrl(1) = {}"
KILLED = "BT-start error. child {} ended by signal 9(SIGKILL)"

Channel = Union[AppChannel, PcChannel]
PATHS: dict[str, Callable[[Handset], Channel]] = {"packet": AppChannel, "pc": PcChannel}
both_lines = pytest.mark.parametrize("path", PATHS)


def children(handset: Handset) -> list[int]:
    """The daemon's children, those that have ended and were not waited for included."""
    return handset.inspect().children


def child(handset: Handset) -> int:
    """The one child that switches the chip on, as soon as it is there."""
    return wait_until(lambda: children(handset) or None, "the child")[0]


def lines_of(handset: Handset, pid: int) -> list[str]:
    """The daemon's lines that the process PID has logged."""
    return [record.text for record in handset.log.records(tag=TAG) if record.pid == pid]


def sent(path: str, answer: wire.Packet) -> list[str]:
    """What a child logs behind its own lines: it returns into the reader as the service does."""
    if path == "packet":
        return [dump(APP_OUT, answer.encode())]
    return ["amt_convert_app_2_pc()", dump(PC_OUT, wire.encode_envelope(answer)),
            "handle_amt_imei_and_sn--->req_id_en:170."]


@both_lines
def test_both_acknowledge(make_handset: HandsetFactory, path: str) -> None:
    handset = make_handset(path)
    channel = PATHS[path](handset)
    for _ in range(5):
        trace = HandlerTrace(handset)
        mark = handset.log.mark()
        assert channel.request(BT) == done(BT)
        assert channel.read_packet() == done(BT)
        channel.expect_silence(0.1)
        assert trace.calls() == [CALL.format(0)]
        trace.expect_handler(HANDLER)
        pid = handset.log.wait("BT-start start", after=mark).pid
        assert pid != handset.pid
        wait_calm(handset)
        assert lines_of(handset, pid) == ["BT-start start", "BT-start end. return:0.",
                                          *sent(path, done(BT))]


@both_lines
def test_service_answers_while_the_chip_comes_up(make_handset: HandsetFactory, path: str) -> None:
    handset = make_handset(path, files={"/data/local/wifi/keep": ""})
    channel = PATHS[path](handset)
    held = HeldCall(handset, "ldt_btCtrl")
    assert channel.request(BT) == done(BT)
    pid = child(handset)
    for _ in range(20):
        assert channel.request(GPS_TEST) == packet(175, *done(0).atoms)
    # The shell's children are found and waited for as ever.
    trace = HandlerTrace(handset)
    assert channel.request(RADIO_TEST, wire.Atom.raw(154, b"\2")).result == 0
    assert handset.text("/data/local/wifi/wifi_dbg_file.txt") == (
        "the cmd value received from pc is : 2\n")
    assert trace.calls() == [], "the chip is not on yet"
    channel.expect_silence(0.1)
    assert children(handset) == [pid]
    held.release()
    assert channel.read_packet() == done(BT)
    wait_calm(handset)
    # Only the service reads: no request is lost to the child, none is served twice.
    for _ in range(50):
        assert channel.request(GPS_TEST) == packet(175, *done(0).atoms)
    channel.expect_silence(0.1)


@both_lines
def test_child_fails(make_handset: HandsetFactory, path: str) -> None:
    handset = make_handset(path, answers={"ldt_btCtrl": "6"})
    channel = PATHS[path](handset)
    for _ in range(3):
        mark = handset.log.mark()
        trace = HandlerTrace(handset)
        # Which of the two processes is first is the scheduler's choice.
        answers = [channel.request(BT), channel.read_packet()]
        assert answers in ([done(BT), refusal(BT)], [refusal(BT), done(BT)])
        assert trace.calls() == [CALL.format(6)]
        wait_calm(handset)
        pid = handset.log.wait("BT-start start", after=mark).pid
        lines = lines_of(handset, pid)
        assert lines[:2] == ["BT-start start", "BT-start end. return:6."]
        assert device_error(HANDLER, -100).fullmatch(lines[2])
        assert lines[3] == "BT-start error. call ldt_btCtrl fail: 6"
        assert device_error(HANDLER, -118).fullmatch(lines[4])
        assert lines[5] == "error to exec: hciattach"
        assert sorted(lines[6:]) == sorted(sent(path, refusal(BT)))
    # The service itself has seen no failure: nothing is held, the next request is served.
    assert channel.request(GPS_TEST) == packet(175, *done(0).atoms)
    channel.expect_silence(0.1)


def test_failure_on_the_wire(make_handset: HandsetFactory) -> None:
    pc = PcChannel(make_handset("pc", answers={"ldt_btCtrl": "-1"}))
    pc.send_packet(BT)
    assert pc.line.read_exactly(16) == wire.ACKNOWLEDGEMENT
    # The child and the service answer at the same time.
    answers = {pc.line.read_exactly(31) for _ in range(2)}
    assert answers == {wire.encode_envelope(done(BT)), wire.encode_envelope(refusal(BT))}
    pc.expect_silence(0.1)


@both_lines
def test_starts_at_once(make_handset: HandsetFactory, path: str) -> None:
    handset = make_handset(path)
    channel = PATHS[path](handset)
    held = HeldCall(handset, "ldt_btCtrl")
    for _ in range(4):
        assert channel.request(BT) == done(BT)
    wait_until(lambda: len(children(handset)) == 4 or None, "four children")
    held.release_until(lambda: handset.calls().count(CALL.format(0)) == 4)
    for _ in range(4):
        assert channel.read_packet() == done(BT)
    wait_calm(handset)
    channel.expect_silence(0.1)


# the end of the service, of the child


def end_by_signal(number: int) -> Callable[[Handset], None]:
    """A way to end the daemon."""
    return lambda handset: handset.signal(number)


ENDS: dict[str, Callable[[Handset], None]] = {
    "killed": end_by_signal(signal.SIGKILL), "told": end_by_signal(signal.SIGTERM),
    "crashed": end_by_signal(signal.SIGSEGV), "unplugged": lambda handset: handset.usb.unplug()}


@pytest.mark.parametrize("path, end", [
    ("packet", "killed"), ("packet", "told"), ("packet", "crashed"), ("pc", "killed"),
    ("pc", "told"), ("pc", "unplugged")])
def test_child_ends_with_the_service(make_handset: HandsetFactory, path: str, end: str) -> None:
    handset = make_handset(path, restart=False)
    channel = PATHS[path](handset)
    HeldCall(handset, "ldt_btCtrl")
    assert channel.request(BT) == done(BT)
    pid = child(handset)
    ENDS[end](handset)
    assert handset.wait_exit() == (-signal.SIGKILL if end == "killed" else 0)
    wait_until(lambda: pid not in handset.processes() or None, "the end of the child")
    assert not any("vx-kel-amt" in command[0] for command in handset.processes().values())
    assert CALL.format(0) not in handset.calls()


@pytest.mark.parametrize("number", [signal.SIGKILL, signal.SIGTERM, signal.SIGSEGV])
@both_lines
def test_service_outlives_the_child(make_handset: HandsetFactory, path: str, number: int) -> None:
    handset = make_handset(path, restart=False)
    channel = PATHS[path](handset)
    HeldCall(handset, "ldt_btCtrl")
    for _ in range(2):
        mark = handset.log.mark()
        assert channel.request(BT) == done(BT)
        pid = child(handset)
        wait_until(lambda: "BT-start start" in lines_of(handset, pid) or None, "the start")
        handset.signal(number, pid=pid)
        wait_calm(handset)
        # The other two end the child by its own signal treatment.
        told = [record.text for record in handset.log.records(mark, TAG)
                if record.pid == handset.pid and record.text.startswith("BT-start error")]
        assert told == ([KILLED.format(pid)] if number == signal.SIGKILL else [])
        # What the service holds was not put away: its lines, its link, its files.
        assert channel.request(GPS_TEST) == packet(175, *done(0).atoms)
    assert "amt_handle_deinit()" not in handset.log.texts(TAG)
    if path == "packet":
        assert handset.run(["/usr/bin/test", "-L", "/dev/ttyAPP0"]).status == 0
    assert handset.exits() == []
