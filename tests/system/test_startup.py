"""What a start does before and while it opens its lines: folders, tables, the two paths."""

import re
import subprocess
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import scaled
from amt_station.requests.catalogue import command_name
from support.channels import AppChannel, PcChannel, integer, packet
from support.registrations import APP_ROWS, PC_ROWS
from support.replaced_cutils import replace_cutils
from support.threads import wait_calm
from support.trace import TAG, Trace, error_line

REGISTER = re.compile(r"(PC|APP) register command id: (\d+)\(0x([0-9a-f]{2})\) - (.*)")
SWITCH = "amt.normal.amt.switch_status"


# the tables


def test_registrations_are_logged_in_their_order(pc_handset: Handset) -> None:
    logged = [match.groups() for text in pc_handset.log.texts(TAG)
              if (match := REGISTER.fullmatch(text))]
    wanted = [(table, str(number), f"{number:02x}", command_name(number))
              for table, rows in (("PC", PC_ROWS), ("APP", APP_ROWS)) for number in rows]
    assert logged == wanted
    assert len(PC_ROWS) == 18


def test_one_id_is_registered_twice(pc_handset: Handset) -> None:
    texts = pc_handset.log.texts(TAG)
    again = [text for text in texts if text.startswith("re-register")]
    assert again == ["re-register the handle function of request id: 219"]
    place = texts.index(again[0])
    assert texts[place - 1] == "WARNING !"
    assert texts[place + 1] == "APP register command id: 219(0xdb) - AMT_DAMT1_CMD"


# what is loaded


def test_needs_no_library_but_the_platform_s_and_the_c_library(pc_handset: Handset) -> None:
    if pc_handset.program.sanitizer or pc_handset.program.counts_coverage:
        pytest.skip("what the daemon is instrumented with brings libraries of its own")
    dynamic = subprocess.run(["readelf", "-d", str(pc_handset.program.daemon)], check=True,
                             capture_output=True, text=True).stdout
    needed = re.findall(r"\(NEEDED\).*\[(.*?)\]", dynamic)
    platform = {"liblog.so", "libcutils.so", "libldt.so"}
    # The loader itself is named where thread-local storage is used, the unwinder where the
    # compiler calls it for a division.
    own = {name for name in needed if not name.startswith("ld-linux")} - {"libgcc_s.so.1"}
    assert own == {*platform, "libz.so.1", "libc.so.6"}


# folders


def test_folders_are_made(pc_handset: Handset) -> None:
    texts = pc_handset.log.texts(TAG)
    for folder in ("/amt/BT", "/amt/WIFI"):
        assert pc_handset.path(folder).is_dir()
        place = texts.index(f"amt_make_folder: {folder} does not exist.\\r\\n")
        assert texts[place + 1] == f"amt_make_folder mkdir({folder}) successfully"
        assert pc_handset.path(folder).stat().st_mode & 0o777 == 0o766


def test_second_folder_needs_the_first(make_handset: HandsetFactory) -> None:
    # Something at the place of /amt itself: no folder can be made below it.
    handset = make_handset("pc", files={"/amt": "no folder\n"})
    texts = handset.log.texts(TAG)
    assert any(re.fullmatch(r"amt_make_folder mkdir\(/amt/BT\) faild errno\[20\] "
                            r"strerror\[Not a directory\]", text) for text in texts)
    assert not any("/amt/WIFI does not exist" in text for text in texts)
    assert "amt_write_wifi_to_nvram_file()" in texts


# the paths


@pytest.mark.parametrize("value, is_pc", [(None, False), ("1", True), ("0", False), ("1 ", False),
                                          ("11", False)])
def test_switch_property_chooses_the_path(make_handset: HandsetFactory, value: str | None,
                                          is_pc: bool) -> None:
    handset = make_handset("pc", ready=False, properties={SWITCH: value})
    handset.wait_ready(path="pc" if is_pc else "packet")
    texts = handset.log.texts(TAG)
    assert ("init_for_amt_1_4()" in texts) == is_pc
    assert ("init_for_amt_2_3()" in texts) == (not is_pc)
    assert (f"property-{SWITCH} value: 1" in texts) == is_pc
    assert ("will create amt1/4 thread. " in texts) == is_pc


@pytest.mark.parametrize("mode, path", [("pc", "init_for_amt_1_4"),
                                        ("packet", "init_for_amt_2_3")])
def test_start_is_logged_step_by_step(make_handset: HandsetFactory, mode: str, path: str) -> None:
    handset = make_handset(mode)
    texts = handset.log.texts(TAG)
    steps = ["amt_handle_init()", "amt_write_wifi_to_nvram_file()", f"{path}()"]
    assert [text for text in texts if text in steps] == steps


@pytest.mark.parametrize("path", ["simplified", "usb-inserted"])
def test_simplified_mode_serves_the_pc(make_handset: HandsetFactory, path: str) -> None:
    handset = make_handset(path, properties={SWITCH: "0"})
    assert "init_for_amt_1_4()" in handset.log.texts(TAG)
    PcChannel(handset).at("AT^DBTADDR=?", "\r\nOK\r\n")


def test_pc_path_threads_and_descriptors(pc_handset: Handset) -> None:
    info = wait_calm(pc_handset)
    ttys = [name for name in info.descriptors.values() if name.startswith("/dev/pts/")]
    assert len(ttys) == 2
    assert sum(name.startswith("socket:") for name in info.descriptors.values()) == 1


def test_packet_path_threads_and_link(packet_handset: Handset) -> None:
    wait_calm(packet_handset)
    link = packet_handset.run(["/usr/bin/readlink", "/dev/ttyAPP0"]).stdout.decode().strip()
    assert link.startswith("/dev/pts/")
    state = packet_handset.run(["/usr/bin/stat", "-Lc", "%a", "/dev/ttyAPP0"]).stdout.decode()
    assert state.strip() == "660"


def test_modem_tty_is_waited_for(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", ready=False, modem="absent")
    handset.log.wait('(1/60)try to open device "/dev/ttyMODEM0"')
    handset.set_modem("table")
    handset.wait_ready()
    texts = handset.log.texts(TAG)
    opened = [text for text in texts if text.startswith("pub_util_try_to_open_device, ")]
    assert len(opened) == 1
    assert re.fullmatch(r"pub_util_try_to_open_device, handle_context_st\.m_fd_modem  = \d+, "
                        r"amt_cfg_st\.m_tty_modem_a = /dev/ttyMODEM0\\n", opened[0])
    PcChannel(handset).at("AT", "\r\nOK\r\n")


def test_no_modem_still_serves_the_app(make_handset: HandsetFactory) -> None:
    # Thirty attempts, a second apart: the one long wait of these tests.
    handset = make_handset("packet", ready=False, modem="absent")
    handset.log.wait("The AT device is not opened with modem.", timeout=60)
    handset.wait_ready()
    texts = handset.log.texts(TAG)
    place = texts.index("The AT device is not opened with modem.")
    assert texts[place - 1] == "WARNING !"
    assert '(29/30)try to open device "/dev/ttyMUX0"' in handset.log.texts("vx-kel-pub")
    app = AppChannel(handset)
    assert app.request(9).get_int(1) == 0
    trace = Trace(handset)
    assert app.request(85) == packet(86, integer(1, 1))
    trace.expect("WARNING !", "no CP.")


# the PC's port and the modem's


def flags(handset: Handset, tty: str) -> set[str]:
    """The line settings of a tty, as `stty` words them."""
    shown = handset.run(["/usr/bin/stty", "-a", "-F", tty]).stdout.decode()
    return set(re.split(r"[;\s]+", shown))


def test_pc_line_is_set_for_bytes(pc_handset: Handset) -> None:
    words = flags(pc_handset, "/dev/ttyGS0")
    assert {"-inlcr", "-icrnl", "-ixon", "-opost", "115200"} <= words


def test_serial_modem_line_is_set(make_handset: HandsetFactory) -> None:
    speed = "vx.modem.uart.amt.default.baudrate"
    handset = make_handset("pc", config={"vx.tty.modem": "/dev/ttyS1", speed: "460800"})
    assert "convert speed 460800 -> B460800" in handset.log.texts("vx-kel-pub")
    words = flags(handset, "/dev/ttyS1")
    assert {"460800", "crtscts", "-icanon", "-echo", "-isig", "-onlcr"} <= words


def test_other_modem_line_is_left_alone(pc_handset: Handset) -> None:
    assert not pc_handset.log.find("convert speed")


def test_start_waits_a_second_for_the_pc_port(pc_handset: Handset) -> None:
    def moment(text: str) -> float:
        record = pc_handset.log.wait(text)
        hours, minutes, seconds = record.time.split()[1].split(":")
        return int(hours) * 3600 + int(minutes) * 60 + float(seconds)

    paused = moment('try to open device "/dev/ttyMODEM0"') - moment(
        'open device "/dev/ttyGS0" successfully')
    assert 0.99 <= paused % 86400 < scaled(3.0)


def test_start_against_a_dead_folder_ends_by_the_fatal_error(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", ready=False, restart=False,
                           config={"vx.tty.app": "/nowhere/ttyAPP0"})
    assert handset.wait_exit() == -118 & 0xFF
    assert handset.log.find(error_line("main", -118, source="amt/main"))


# a system with one thread to give, by a library in the place of the usual one


@pytest.mark.parametrize("path, loops", [
    ("pc", ["amt_handle_read_pc_loop()", "amt_handle_read_modem_loop()"]),
    ("packet", ["amt_handle_read_app_loop()"])])
def test_readers_say_that_they_have_begun(make_handset: HandsetFactory, path: str,
                                          loops: list[str]) -> None:
    handset = make_handset(path)
    for loop in loops:
        handset.log.wait(loop)
    begun = [text for text in handset.log.texts(TAG)
             if re.fullmatch(r"amt_handle_read_\w+_loop\(\)", text)]
    assert sorted(begun) == sorted(loops)


@pytest.mark.parametrize("mode, path, line", [
    ("pc", "init_for_amt_1_4", "pthread_create(): 11 - Resource temporarily unavailable"),
    ("packet", "init_for_amt_2_3", "pthread_create() fail: 11")])
def test_start_without_a_thread_names_its_path(make_handset: HandsetFactory, tmp_path: Path,
                                               mode: str, path: str, line: str) -> None:
    handset = make_handset(mode, ready=False, start=False, restart=False)
    if handset.program.sanitizer:
        pytest.skip("the sanitizer makes the threads itself")
    replace_cutils(handset, tmp_path, "one_thread")
    handset.start()
    assert handset.wait_exit() == -118 & 0xFF
    texts = handset.log.texts(TAG)
    place = texts.index(line)
    assert re.fullmatch(rf"FILE-amt/amt-handle, LINE-\d+, FUNC-{path}\(\), error_code=-118, "
                        "errno=11", texts[place - 1])
    assert "FATAL ERROR!!!" in texts[place:]
