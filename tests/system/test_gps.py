"""GPS: control (174), the test that answers under the control's id (176), signals (178)."""

from typing import Callable, Union

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from support.channels import AppChannel, PcChannel, integer, packet, raw
from support.handler import HandlerTrace, done, gps_error, refusal, refused
from support.trace import Wanted
from support.traffic import APP_IN, APP_OUT, dump

CONTROL, CONTROL_HANDLER = 174, "amt_gps_control"
TEST = 176
READ, READ_HANDLER = 178, "amt_gps_read_result"
OTHERS = (1, 3, 5, -1, 0x7FFFFFFF, -0x80000000)

Channel = Union[AppChannel, PcChannel]
PATHS: dict[str, Callable[[Handset], Channel]] = {"packet": AppChannel, "pc": PcChannel}
both_lines = pytest.mark.parametrize("path", PATHS)


def step_lines(operation: int, title: str, call: str, status: int) -> list[Wanted]:
    """The lines of a control request."""
    failure: list[Wanted] = [gps_error(CONTROL_HANDLER, -100),
                             f"{title} error. call {call} fail: {status}"]
    return [f"{CONTROL_HANDLER} is_start:{operation}", f"{title} start",
            f"{title} end. return:{status}.", *(failure if status else [])]


@both_lines
def test_control(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    steps = [(0, "GPS stop", "ldt_gpsCtrl", "ldt_gpsCtrl(0, 0, null, null) = 0"),
             (2, "GPS connectivity check", "ldt_gpsCheck", "ldt_gpsCheck() = 0"),
             *((other, "GPS-start", "ldt_gpsCtrl", "ldt_gpsCtrl(1, 0, null, null) = 0")
               for other in OTHERS)]
    for operation, title, call, recorded in steps:
        trace = HandlerTrace(channel.handset)
        assert channel.request(CONTROL, integer(140, operation)) == done(CONTROL)
        trace.expect_handler(CONTROL_HANDLER, *step_lines(operation, title, call, 0))
        assert trace.calls() == [recorded]
    trace = HandlerTrace(channel.handset)
    assert channel.request(CONTROL) == done(CONTROL)
    assert trace.calls() == ["ldt_gpsCtrl(0, 0, null, null) = 0"], "an absent operation stops"


def test_control_fails(app: AppChannel) -> None:
    for status in (3, -1):
        app.handset.answer("ldt_gpsCtrl", str(status))
        app.handset.answer("ldt_gpsCheck", str(status))
        for operation, title, call, arguments in (
                (0, "GPS stop", "ldt_gpsCtrl", "0, 0, null, null"),
                (1, "GPS-start", "ldt_gpsCtrl", "1, 0, null, null"),
                (5, "GPS-start", "ldt_gpsCtrl", "1, 0, null, null"),
                (2, "GPS connectivity check", "ldt_gpsCheck", "")):
            trace = HandlerTrace(app.handset)
            refused(app, CONTROL, integer(140, operation))
            trace.expect_handler(CONTROL_HANDLER, *step_lines(operation, title, call, status))
            assert trace.calls() == [f"{call}({arguments}) = {status}"]


@both_lines
def test_test_answers_with_the_id_of_the_control(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    trace = HandlerTrace(channel.handset)
    for atoms in ((), (integer(140, 1),), (raw(141, b"x" * 100),)):
        assert channel.request(TEST, *atoms) == packet(175, integer(1, 0))
    assert trace.calls() == []
    trace.expect_none("amt_gps_test()")


def test_test_on_the_wire(app: AppChannel) -> None:
    request, answer = bytes.fromhex("0600bbb00000"), bytes.fromhex("0f00bbaf0900ee0101040000000000")
    mark = app.handset.log.mark()
    app.send(request)
    assert app.line.read_exactly(len(answer)) == answer
    app.handset.log.wait(dump(APP_OUT, answer), after=mark)
    # It is the one handler that does not log its entry.
    assert app.handset.log.texts(after=mark) == [
        dump(APP_IN, request), "handle_amt_app_req()",
        "receive command id: 176(0xB0) - AMT_GPS_TEST_CMD", dump(APP_OUT, answer)]


@both_lines
def test_signals(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    handset = channel.handset
    for answer, index, svid, cnr in (
            (None, 3, 4, 41), (None, -1, 0, 41), (None, 0, 1, 41), ("0 32 0", 7, 32, 0),
            ("0 -5 -2147483648", 0x7FFFFFFF, -5, -0x80000000)):
        handset.answer("ldt_gpsCtrl", *([answer] if answer else []))
        trace = HandlerTrace(handset)
        assert channel.request(READ, integer(141, index)) == done(
            READ, integer(144, cnr), integer(141, svid))
        trace.expect_handler(READ_HANDLER, f"GPS-READ-SIGNAL start. index:{index}",
                             f"GPS-READ-SIGNAL end. return:0; svid:{svid}; cnr:{cnr}.")
        assert trace.calls() == [f"ldt_gpsCtrl(2, {index}, out, out) = 0 [{svid} {cnr}]"]
    handset.answer("ldt_gpsCtrl")
    trace = HandlerTrace(handset)
    assert channel.request(READ) == done(READ, integer(144, 41), integer(141, 1))
    assert trace.calls() == ["ldt_gpsCtrl(2, 0, out, out) = 0 [1 41]"], "an absent index is 0"


@both_lines
def test_signal_that_cannot_be_read(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    # What the library does not store is 0.
    for answer, svid in (("-7 12", 12), ("-7", 0)):
        channel.handset.answer("ldt_gpsCtrl", answer)
        trace = HandlerTrace(channel.handset)
        assert channel.request(READ, integer(141, 2)) == refusal(READ)
        trace.expect_handler(READ_HANDLER, "GPS-READ-SIGNAL start. index:2",
                             f"GPS-READ-SIGNAL end. return:-7; svid:{svid}; cnr:0.",
                             gps_error(READ_HANDLER, -100),
                             "GPS-READ-SIGNAL error. call ldt_gpsCtrl fail: -7")
    channel.expect_silence(0.1)
