"""The Wi-Fi radio test (187): its sub-commands, their order, their state and their trace file."""

from typing import Sequence

import pytest

from conftest import HandsetFactory
from amt_station import wire
from support.channels import AppChannel, PcChannel, flag, integer, raw, string
from support.handler import HandlerTrace, device_error, done, refusal, refused
from support.trace import Wanted

RADIO, HANDLER = 187, "amt_device_wifi_rtx_test"
TRACE_FILE = "/data/local/wifi/wifi_dbg_file.txt"
START, STOP, TX_START, TX_STOP, RX_START, RX_STOP = range(1, 7)
CHANNEL, RATE, POWER = raw(155, b"\x06"), raw(156, b"\x26\x02"), raw(157, b"\x0f\x00")
NOT_RUNNING = "WIFI is not running"


@pytest.fixture
def radio(make_handset: HandsetFactory) -> AppChannel:
    """The app's line of a handset that has the folder of the trace."""
    return AppChannel(make_handset("packet", files={"/data/local/wifi/keep": ""}))


def sub(number: int) -> wire.Atom:
    """A sub-command."""
    return raw(154, bytes([number]))


def expect_done(radio: AppChannel, number: int, atoms: Sequence[wire.Atom],
                calls: Sequence[str], *wanted: Wanted,
                answered: Sequence[wire.Atom] = ()) -> None:
    """The sub-command is carried out with these CALLS and lines, and ANSWERED."""
    trace = HandlerTrace(radio.handset)
    assert radio.request(RADIO, sub(number), *atoms) == done(RADIO, sub(number), *answered)
    trace.expect_handler(HANDLER, *wanted)
    assert trace.calls() == list(calls)


def expect_refused(radio: AppChannel, number: int, atoms: Sequence[wire.Atom],
                   calls: Sequence[str], *wanted: Wanted) -> None:
    """The sub-command is refused after these CALLS, with these lines."""
    trace = HandlerTrace(radio.handset)
    refused(radio, RADIO, sub(number), *atoms)
    trace.expect_handler(HANDLER, *wanted)
    assert trace.calls() == list(calls)


def start(radio: AppChannel) -> None:
    """Switch the chip's test mode on."""
    expect_done(radio, START, (), ["ldt_wifiCtrl(1) = 0"], "WIFI-start start",
                "WIFI-start end. return:0.")


def failure(text: str) -> list[Wanted]:
    """The lines of a request that ends with -100."""
    return [device_error(HANDLER, -100), text]


def test_start_and_stop_are_done_once(radio: AppChannel) -> None:
    expect_done(radio, STOP, (), [])
    start(radio)
    expect_done(radio, START, (), [])
    expect_done(radio, STOP, (), ["ldt_wifiCtrl(0) = 0"], "WIFI-stop start",
                "WIFI-stop end. return:0.")
    expect_done(radio, STOP, (), [])
    start(radio)
    assert radio.handset.text(TRACE_FILE).splitlines() == [
        f"the cmd value received from pc is : {number}" for number in (2, 1, 1, 2, 2, 1)]


def test_failed_start_and_stop_change_nothing(radio: AppChannel) -> None:
    radio.handset.answer("ldt_wifiCtrl", "7", "-1", "0", "9", "0")
    for status in (7, -1):
        expect_refused(radio, START, (), [f"ldt_wifiCtrl(1) = {status}"], "WIFI-start start",
                       f"WIFI-start end. return:{status}.",
                       *failure(f"WIFI-start error. call ldt_wifiCtrl fail: {status}"))
        expect_refused(radio, TX_STOP, (), [], *failure(NOT_RUNNING))
    start(radio)
    expect_refused(radio, STOP, (), ["ldt_wifiCtrl(0) = 9"], "WIFI-stop start",
                   "WIFI-stop end. return:9.",
                   *failure("WIFI-stop error. call ldt_wifiCtrl fail: 9"))
    expect_done(radio, START, (), [])
    expect_done(radio, STOP, (), ["ldt_wifiCtrl(0) = 0"], "WIFI-stop start",
                "WIFI-stop end. return:0.")


def test_nothing_runs_while_the_chip_is_off(radio: AppChannel) -> None:
    for number in (TX_START, TX_STOP, RX_START, RX_STOP):
        expect_refused(radio, number, (CHANNEL, RATE, POWER), [], *failure(NOT_RUNNING))
    start(radio)
    expect_done(radio, STOP, (), ["ldt_wifiCtrl(0) = 0"], "WIFI-stop start",
                "WIFI-stop end. return:0.")
    for number in (TX_START, TX_STOP, RX_START, RX_STOP):
        expect_refused(radio, number, (CHANNEL, RATE, POWER), [], *failure(NOT_RUNNING))


def test_transmission(radio: AppChannel) -> None:
    start(radio)
    for atoms, channel, rate, power in (
            ((CHANNEL, RATE, POWER), 6, 550, 15),
            ((raw(155, b"\xff"), raw(156, b"\xff\xff"), raw(157, b"\xff\xff")), 255, 65535, 65535),
            # Atoms of any type give their first bytes, in any order; short ones are numbers too.
            ((integer(157, 0x70001), string(156, "ab?"), flag(155, 14)), 14, 0x6261, 1),
            ((raw(155, b"\1\2\3"), raw(156, b"\5"), raw(157, b"\x80")), 1, 5, 128)):
        expect_done(radio, TX_START, atoms, [f"ldt_TxTest(1, {power}, {rate}, {channel}) = 0"],
                    f"WIFI-TX-start start. channel:{channel}; power:{power}; rate:{rate}",
                    "WIFI-TX-start end. return:0.")
    expect_done(radio, TX_STOP, (CHANNEL,), ["ldt_TxTest(0, 0, 0, 0) = 0"],
                "WIFI-TX-stop start. ", "WIFI-TX-stop end. return:0.")

    radio.handset.answer("ldt_TxTest", "-3", "4")
    expect_refused(radio, TX_START, (CHANNEL, RATE, POWER), ["ldt_TxTest(1, 15, 550, 6) = -3"],
                   "WIFI-TX-start start. channel:6; power:15; rate:550",
                   "WIFI-TX-start end. return:-3.",
                   *failure("WIFI-TX-start error. call ldt_TxTest fail: -3"))
    expect_refused(radio, TX_STOP, (), ["ldt_TxTest(0, 0, 0, 0) = 4"], "WIFI-TX-stop start. ",
                   "WIFI-TX-stop end. return:4.",
                   *failure("WIFI-TX-stop error. call ldt_TxTest fail: 4"))


def test_first_missing_number_is_named(radio: AppChannel) -> None:
    start(radio)
    for number, atoms, text in (
            (TX_START, (), "Tx get channel error"),
            (TX_START, (RATE, POWER), "Tx get channel error"),
            (TX_START, (CHANNEL, POWER), "Tx get rate error"),
            (TX_START, (CHANNEL,), "Tx get rate error"),
            (TX_START, (CHANNEL, RATE), "Tx get power error"),
            (TX_START, (CHANNEL, raw(156, b""), POWER), "Tx get rate error"),
            (RX_START, (RATE,), "Rx get channel error"),
            (RX_START, (), "Rx get channel error"),
            (RX_START, (CHANNEL, POWER), "Rx get rate error"),
            (RX_START, (raw(155, b""), RATE), "Rx get channel error")):
        expect_refused(radio, number, atoms, [], *failure(text))


def receive(radio: AppChannel, channel: int, rate: int) -> None:
    """Start a reception."""
    expect_done(radio, RX_START,
                (raw(155, bytes([channel])), raw(156, rate.to_bytes(2, "little"))),
                [f"ldt_RxTest(1, {channel}, {rate}, null) = 0"],
                f"WIFI-RX-start start. channel:{channel}; rate:{rate}",
                "WIFI-RX-start end. return:0.")


def stop_reception(radio: AppChannel, channel: int, count: int, status: int = 0) -> None:
    """Stop the reception on CHANNEL, whatever the request's atom says."""
    calls = [f"ldt_RxTest(0, {channel}, 0, out) = {status} [{count}]"]
    lines = [f"WIFI-RX-stop start. channel:{channel}",
             f"WIFI-RX-stop end. return:{status}; cnt:{count}."]
    other = raw(155, b"\x63")
    if status:
        expect_refused(radio, RX_STOP, (other,), calls, *lines,
                       *failure(f"WIFI-RX-stop error. call ldt_RxTest fail: {status}"))
    else:
        expect_done(radio, RX_STOP, (other,), calls, *lines, answered=(integer(158, count),))


def test_reception(radio: AppChannel) -> None:
    start(radio)
    stop_reception(radio, 0, 1000)
    receive(radio, 11, 65535)
    stop_reception(radio, 11, 1000)
    stop_reception(radio, 11, 1000)
    receive(radio, 255, 10)

    radio.handset.answer("ldt_RxTest", "5", "0 -1", "2", "3 77", "0 2147483647")
    expect_refused(radio, RX_START, (CHANNEL, RATE), ["ldt_RxTest(1, 6, 550, null) = 5"],
                   "WIFI-RX-start start. channel:6; rate:550", "WIFI-RX-start end. return:5.",
                   *failure("WIFI-RX-start error. call ldt_RxTest fail: 5"))
    # The channel is that of the last start that succeeded, a later stop of the chip or not.
    stop_reception(radio, 255, -1)
    stop_reception(radio, 255, 0, status=2)
    stop_reception(radio, 255, 77, status=3)
    expect_done(radio, STOP, (), ["ldt_wifiCtrl(0) = 0"], "WIFI-stop start",
                "WIFI-stop end. return:0.")
    start(radio)
    stop_reception(radio, 255, 0x7FFFFFFF)


def test_other_sub_commands(radio: AppChannel) -> None:
    numbers = []
    for atoms, number in (
            ((), 0), ((sub(0),), 0), ((sub(7),), 7), ((sub(255),), 255), ((raw(154, b""),), 0),
            ((integer(154, 0x100),), 0), ((string(154, "1"),), 49), ((flag(154, 8),), 8)):
        trace = HandlerTrace(radio.handset)
        refused(radio, RADIO, *atoms)
        trace.expect_handler(HANDLER, device_error(HANDLER, -101),
                             f"unknown operation: {number}")
        assert trace.calls() == []
        numbers.append(number)
    assert radio.handset.text(TRACE_FILE).splitlines() == [
        line for number in numbers for line in (f"the cmd value received from pc is : {number}",
                                                "the subcmd is invalid")]


def test_sub_command_is_the_first_byte_of_any_type(radio: AppChannel) -> None:
    for atom in (integer(154, 0x7F000001), string(154, "\x01z"), flag(154, 1), raw(154, b"\1\7")):
        assert radio.request(RADIO, atom) == done(RADIO, sub(START))
    assert radio.handset.calls().count("ldt_wifiCtrl(1) = 0") == 1


def test_trace_file_is_appended_to(radio: AppChannel) -> None:
    radio.handset.place(TRACE_FILE, "before\n")
    expect_done(radio, STOP, (), [])
    assert radio.handset.text(TRACE_FILE) == "before\nthe cmd value received from pc is : 2\n"


def test_radio_works_without_the_folder_of_the_trace(app: AppChannel) -> None:
    start(app)
    expect_refused(app, 7, (), [], device_error(HANDLER, -101), "unknown operation: 7")
    assert not app.handset.path(TRACE_FILE).exists()


def test_pc_line(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", files={"/data/local/wifi/keep": ""})
    pc = PcChannel(handset)
    for _ in range(2):
        assert pc.request(RADIO, sub(START)) == done(RADIO, sub(START))
    assert handset.calls().count("ldt_wifiCtrl(1) = 0") == 1
    # The AT commands on the chip leave the flag and the channel of the packets alone.
    pc.at("AT^DWLTRD=1,3,2", "\r\nOK\r\n")
    pc.at("AT^DWLTRD=0", "\r\nOK\r\n")
    trace = HandlerTrace(handset)
    assert pc.request(RADIO, sub(RX_STOP)) == done(RADIO, sub(RX_STOP), integer(158, 1000))
    assert trace.calls() == ["ldt_RxTest(0, 0, 0, out) = 0 [1000]"]
    assert pc.request(RADIO, sub(7)) == refusal(RADIO)
    assert handset.text(TRACE_FILE).endswith(
        "the cmd value received from pc is : 7\nthe subcmd is invalid\n")
