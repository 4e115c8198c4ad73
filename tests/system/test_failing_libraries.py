"""Calls into the system's libraries that fail one at a time, where only the log tells of it."""

import re
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from support.channels import OK, PcChannel
from support.replaced_cutils import replace_cutils
from support.trace import Trace
from test_screen import PREPARED, Operator

FAILURES = "/handset/fail"


def with_failing_calls(handset: Handset, folder: Path, *failing: str) -> Handset:
    """Start the handset with a library in which the calls named FAILING do so."""
    replace_cutils(handset, folder, "failing_calls")
    for name in failing:
        handset.place(f"{FAILURES}/{name}", "")
    handset.start()
    return handset


@pytest.mark.parametrize("failing, text", [
    ("memory", "Out of memory\\n"), ("inflate", "Unexpected inflate error\\n")])
def test_picture_that_cannot_be_unpacked(make_handset: HandsetFactory, tmp_path: Path,
                                         failing: str, text: str) -> None:
    operator = Operator(make_handset, start=False)
    if failing == "memory" and operator.handset.program.sanitizer:
        pytest.skip("the sanitizer has its own malloc")
    handset = with_failing_calls(operator.handset, tmp_path, failing)
    operator.shake_hands()
    operator.wait_thread_gone()
    operator.expect_untouched(PREPARED)
    assert handset.log.texts("CHARGE_ONLY_MODE") == [text]
    PcChannel(handset).at("AT", OK)


def test_timer_whose_id_says_that_there_is_none(make_handset: HandsetFactory,
                                                tmp_path: Path) -> None:
    handset = make_handset("usb-inserted", ready=False, start=False)
    trace = Trace(handset)
    with_failing_calls(handset, tmp_path, "timer")
    handset.log.wait(re.compile(r"invalid parameter\.timerId:-1; timeMSec:\d+\."))
    trace.expect("timer_create, error, id is -1.",
                 re.compile(r"invalid parameter\.timerId:-1; timeMSec:\d+\."))
    trace.expect_none(re.compile("createTimer success.*"))


def test_station_that_cannot_be_written_to(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = make_handset("pc", ready=False, start=False, restart=False)
    with_failing_calls(handset, tmp_path, "station")
    handset.wait_ready()
    trace = Trace(handset)
    refused = b"\r\nREFUSED\r\n"
    handset.modem.write(refused)
    assert handset.wait_exit() == 0
    trace.expect(f"write to pc, m_buf_len={len(refused)}, write_len=-1",
                 "write error, errno[28]", "amt_handle_deinit()")
