"""Calls into the system's libraries that fail, one at a time; often only the log tells of it."""

import os
import re
from datetime import datetime
from functools import reduce
from operator import or_
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from support.channels import OK, AppChannel, PcChannel, integer, packet
from support.handler import (DEVICE, IO_ERROR, NO_DEVICE, NO_SPACE, HandlerTrace, device_error,
                             done, refusal)
from support.replaced_cutils import replace_cutils
from support.threads import wait_calm
from support.trace import Trace, error_line
from test_handshake import shake_hands
from test_screen import PREPARED, Operator

FAILURES = "/handset/fail"
TIME = "%m-%d %H:%M:%S.%f"
AGAIN, TOO_MANY_FILES = 11, 24
VOLTAGE, CARD, CAMERA, BT, CALIBRATE, READ_ITEM = 9, 137, 139, 170, 226, 228
CALIBRATE_HANDLER = "amt_device_battery_voltage_check"


def prepare(handset: Handset, folder: Path, *failing: str) -> Handset:
    """Give a handset that is not started the library in which the calls named FAILING do so."""
    replace_cutils(handset, folder, "failing_calls")
    for name in failing:
        fail(handset, name)
    return handset


def fail(handset: Handset, name: str, text: str = "") -> None:
    """Let the call fail from now on."""
    handset.place(f"{FAILURES}/{name}", text)


def served(make_handset: HandsetFactory, folder: Path, path: str) -> Handset:
    """A handset that serves; no call fails yet."""
    handset = prepare(make_handset(path, ready=False, start=False, restart=False), folder)
    handset.start()
    handset.wait_ready()
    return handset


class WholeTrace(Trace):
    """The texts of the libraries below, too."""

    def texts(self) -> list[str]:
        """All texts of the log, in order."""
        return self._handset.log.texts(after=self._log_mark)


def ended(make_handset: HandsetFactory, folder: Path, path: str, failing: str) -> tuple[int, Trace]:
    """The status of a start in which a call fails, and its log."""
    handset = prepare(make_handset(path, ready=False, start=False, restart=False), folder, failing)
    trace = WholeTrace(handset)
    handset.start()
    return handset.wait_exit(), trace


# the start


@pytest.mark.parametrize("call", ["tcgetattr", "tcsetattr"])
def test_station_s_port_that_cannot_be_set(make_handset: HandsetFactory, tmp_path: Path,
                                           call: str) -> None:
    status, trace = ended(make_handset, tmp_path, "pc", call)
    assert status == -1 & 0xFF
    trace.expect('open device "/dev/ttyGS0" successfully', f"sys call: {call}() failed! errno = 5",
                 error_line("set_serial_dev_attr", -1, IO_ERROR), "FATAL ERROR!!!")


def test_first_thread_that_cannot_be_had(make_handset: HandsetFactory, tmp_path: Path) -> None:
    status, trace = ended(make_handset, tmp_path, "packet", "thread")
    assert status == -118 & 0xFF
    trace.expect("FATAL ERROR!!!", error_line("main", -118, AGAIN, "amt/main"))


def test_event_that_is_lost(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "pc")
    handset.usb.wait_listener()
    fail(handset, "event")
    trace = Trace(handset)
    handset.usb.send("USB_STATE=LOST")
    PcChannel(handset).at("AT", OK)
    wait_calm(handset)
    handset.place(f"{FAILURES}/event", None)
    handset.usb.send("USB_STATE=HEARD")
    handset.log.wait("usb_status:[USB_STATE=HEARD]")
    assert not [text for text in trace.texts() if "LOST" in text]


def test_pseudo_terminal_that_cannot_be_had(make_handset: HandsetFactory, tmp_path: Path) -> None:
    status, trace = ended(make_handset, tmp_path, "packet", "ptmx")
    assert status == -118 & 0xFF
    trace.expect("pub_pty_open m_ptm_fd[-1]", "sys call: open() failed! errno = 28",
                 error_line("pub_pty_open", -1, NO_SPACE, "pty/pty"), "FATAL ERROR!!!")


def test_start_where_the_system_does_not_tell_who_sleeps(make_handset: HandsetFactory,
                                                         tmp_path: Path) -> None:
    handset = prepare(make_handset("packet", ready=False, start=False), tmp_path)
    fail(handset, "fopen", "/proc/self/task/2/stat")  # the first process behind init
    handset.start()
    handset.wait_ready()
    assert handset.pid == 2
    assert AppChannel(handset).request(VOLTAGE).result == 0


@pytest.mark.parametrize("length", [39, 40, 41])
def test_name_of_the_kernel_that_is_too_long(make_handset: HandsetFactory, tmp_path: Path,
                                             length: int) -> None:
    handset = prepare(make_handset("packet", ready=False, start=False), tmp_path)
    name = "/dev/pts/".ljust(length, "7")
    fail(handset, "pts-name", name)
    trace = WholeTrace(handset)
    handset.start()
    kept = f"create_pts_mapping m_pts_name_a[{name[:39]}] ret_val[0]"
    handset.log.wait(kept)
    place = trace.texts().index(kept)
    cut = ["WARNING !", f"[PTY]{length} > 39"] if length > 39 else []
    assert trace.texts()[place - 1 - len(cut):place] == [
        f"create_pts_mapping pts_name_ptr[{name}]", *cut]


def test_timer_whose_id_says_that_there_is_none(make_handset: HandsetFactory,
                                                tmp_path: Path) -> None:
    handset = prepare(make_handset("usb-inserted", ready=False, start=False), tmp_path, "timer")
    trace = Trace(handset)
    handset.start()
    invalid = re.compile(r"invalid parameter\.timerId:-1; timeMSec:\d+\.")
    handset.log.wait(invalid)
    trace.expect("timer_create, error, id is -1.", invalid)
    trace.expect_none(re.compile("createTimer success.*"))
    # The real-time clock, a thread for the notice, and what nobody looks at.
    assert handset.text(f"{FAILURES}/timer") == (
        "clock 0 notify 2 signal 32 value 111 attributes (nil)\n")


# the lines


def test_app_line_whose_read_fails(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    app = AppChannel(handset)
    assert app.request(VOLTAGE).result == 0
    before = set(wait_calm(handset).threads)
    master, = (number for number, name in handset.inspect().descriptors.items() if "ptmx" in name)
    slave = handset.run(["/usr/bin/readlink", "/dev/ttyAPP0"]).stdout.decode().strip()
    trace = Trace(handset)
    fail(handset, "app-read")
    app.send_packet(VOLTAGE)
    gone = wait_until(lambda: before - set(handset.inspect().threads) or None,
                      "the end of the app's reader")
    assert len(gone) == 1
    trace.expect("sys call: read() failed! errno = 19",
                 error_line("amt_handle_read_app_loop", -1, NO_DEVICE),
                 f"pty disconnect: pts name({slave}), pts mapping name(/dev/ttyAPP0), "
                 f"thread id({gone.pop()}), PTM fd({master})")
    assert handset.run(["/usr/bin/test", "-L", "/dev/ttyAPP0"]).status == 1
    # The daemon itself goes on, and ends as ever.
    assert handset.exits() == []
    assert handset.stop() == 0


def test_app_line_that_has_nothing(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    app = AppChannel(handset)
    assert app.request(VOLTAGE).result == 0
    trace = Trace(handset)
    fail(handset, "app-empty")
    app.send_packet(VOLTAGE)
    wait_until(lambda: trace.texts().count("app read empty data") >= 3 or None, "three reads")
    handset.place(f"{FAILURES}/app-empty", None)
    assert app.read_packet().result == 0
    trace.expect("WARNING !", "app read empty data", "WARNING !", "app read empty data")
    # It rests in between.
    times = [datetime.strptime(record.time, TIME) for record in handset.log.records()
             if record.text == "app read empty data"]
    assert all((later - earlier).total_seconds() >= 0.199
               for earlier, later in zip(times, times[1:]))


def test_station_that_cannot_be_written_to(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "pc")
    trace = Trace(handset)
    fail(handset, "station")
    refused = b"\r\nREFUSED\r\n"
    handset.modem.write(refused)
    assert handset.wait_exit() == 0
    trace.expect(f"write to pc, m_buf_len={len(refused)}, write_len=-1", "write error, errno[28]",
                 "amt_handle_deinit()")


# requests


def test_calibration_without_a_shell(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "pc")
    fail(handset, "system")
    trace = Trace(handset)
    assert PcChannel(handset).request(CALIBRATE) == done(CALIBRATE)
    trace.expect(re.compile(r'echo "amt_set_vbatt\[0\] \[0\] \[0\] \[0\]" > .*'),
                 "sys call: system() failed! errno = 11",
                 error_line(CALIBRATE_HANDLER, -1, AGAIN, DEVICE))


def test_bluetooth_without_a_child(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    fail(handset, "fork")
    trace = HandlerTrace(handset)
    assert AppChannel(handset).request(BT) == refusal(BT)
    trace.expect_handler("amt_device_bt", device_error("amt_device_bt", -118, AGAIN),
                         "error to exec: hciattach")
    assert trace.calls() == []


def test_camera_as_descriptor_0(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    app = AppChannel(handset)
    assert app.request(CAMERA).result == 0
    fail(handset, "camera")
    assert 0 in handset.inspect().descriptors
    trace = HandlerTrace(handset)
    assert app.request(CAMERA) == refusal(CAMERA)
    trace.expect_handler("amt_device_camera", device_error("amt_device_camera", -100))
    assert 0 not in handset.inspect().descriptors


def opened(handset: Handset) -> list[str]:
    """What was opened since the last look, and with which flags."""
    lines = handset.text(f"{FAILURES}/opened").splitlines()
    handset.place(f"{FAILURES}/opened", "")
    return lines


def flags(*values: int) -> str:
    """As they are noted."""
    return f"{reduce(or_, values, os.O_RDWR | os.O_CLOEXEC):o}"


def test_camera_is_opened_for_both_ways_and_for_nobody_else(make_handset: HandsetFactory,
                                                            tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    handset.place(f"{FAILURES}/opened", "")
    assert AppChannel(handset).request(CAMERA).result == 0
    assert [line for line in opened(handset) if "video" in line] == [f"/dev/video0 {flags()}"]


def test_screen_is_opened_for_both_ways_and_for_nobody_else(make_handset: HandsetFactory,
                                                            tmp_path: Path) -> None:
    handset = prepare(Operator(make_handset, start=False).handset, tmp_path)
    handset.start()
    handset.wait_ready()
    handset.place(f"{FAILURES}/opened", "")
    shake_hands(handset)
    wait_until(lambda: "fb0" in handset.text(f"{FAILURES}/opened") or None, "the screen's opening")
    lines = [line for line in opened(handset) if "tty0" in line or "fb0" in line]
    assert lines == [f"/dev/tty0 {flags(os.O_SYNC)}", f"/dev/graphics/fb0 {flags()}"]


def test_card_without_the_list_of_mounts(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    fail(handset, "fopen", "/proc/mounts")
    trace = WholeTrace(handset)
    assert AppChannel(handset).request(CARD) == done(CARD, integer(55, 0))
    trace.expect("sys call: fopen() failed! errno = 24",
                 error_line("pub_util_get_mount_fs_info", -1, TOO_MANY_FILES, "util/util"),
                 error_line("pub_util_get_mount_fs_info", -104, source="util/util"),
                 'file system "/storage/sdcard1" has not been mounted')


def test_item_whose_file_cannot_be_opened(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = served(make_handset, tmp_path, "packet")
    app = AppChannel(handset)
    assert app.request(READ_ITEM, integer(39, 2)) == packet(229, integer(39, 2), integer(36, 0),
                                                            integer(1, 0))
    fail(handset, "fopen", "/amt/product.txt")
    trace = Trace(handset)
    assert app.request(READ_ITEM, integer(39, 2)).result != 0
    trace.expect(error_line("readProductResult", -1, TOO_MANY_FILES),
                 "open file(/amt/product.txt) failure. errorr: 24 - Too many open files")


# the picture


@pytest.mark.parametrize("failing, text", [
    ("memory", "Out of memory\\n"), ("inflate-init", "Unexpected inflate error\\n"),
    ("inflate", "Unexpected inflate error\\n")])
def test_picture_that_cannot_be_unpacked(make_handset: HandsetFactory, tmp_path: Path,
                                         failing: str, text: str) -> None:
    operator = Operator(make_handset, start=False)
    if failing == "memory" and operator.handset.program.sanitizer:
        pytest.skip("the sanitizer has its own malloc")
    prepare(operator.handset, tmp_path, failing).start()
    operator.shake_hands()
    operator.wait_thread_gone()
    operator.expect_untouched(PREPARED)
    assert operator.handset.log.texts("CHARGE_ONLY_MODE") == [text]
    PcChannel(operator.handset).at("AT", OK)


def test_picture_without_a_thread(make_handset: HandsetFactory, tmp_path: Path) -> None:
    operator = Operator(make_handset, start=False)
    handset = prepare(operator.handset, tmp_path)
    handset.start()
    handset.wait_ready()
    wait_until(lambda: b"init over result=0" in handset.stdout() or None, "the start's last thread")
    fail(handset, "thread")
    shake_hands(handset)
    trace = Trace(handset)
    handset.log.wait("pthread_create() amt_handle_load_image_for_handshake: 11 - Resource "
                     "temporarily unavailable")
    PcChannel(handset).at("AT", OK)
    trace.expect_none("pthread_create() amt_handle_load_image_for_handshake success.")
    operator.expect_untouched([])
