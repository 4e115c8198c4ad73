"""Command line, run modes, paths, the pid file and the start's texts."""

import re

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from support.trace import TAG, error_line

PROGRAM = "/system/bin/vx-kel-amt"
LOCAL = "/data/local/vx-kel-amt"
NORMAL = "normal mode(with KEL platform)"
SIMPLIFIED = "simplified mode(only with kernel)"
SYSTEM_PATHS = ('[vx-kel-amt]config file is "/system/etc/vx-kel-amt.cfg"\n'
                '            pid file is "/tmp/vx-kel-amt.pid"\n')


def usage(name: str) -> str:
    """The usage text of a program started under a name."""
    return (f"\nUsage: {name} [OPTION]\n"
            "  -h                     Display this help and exit.\n"
            "  -u                     For usb-insert-enter-amt.\n\n")


def status_byte(code: int) -> int:
    """A negative code as an exit status."""
    return code & 0xFF


@pytest.fixture
def idle_handset(make_handset: HandsetFactory) -> Handset:
    """A handset whose init starts nothing."""
    return make_handset("pc", ready=False, start=False, restart=False)


# what a start prints and logs


def test_normal_mode_start(pc_handset: Handset) -> None:
    assert pc_handset.stdout().decode() == (
        "g_usb_activate:0.\n"
        '[vx-kel-amt]command path is "/system/bin"\n'
        f"[vx-kel-amt]run under {NORMAL} \n"
        f"{SYSTEM_PATHS}"
        "[vx-kel-amt]config over result=0\n"
        '[vx-kel-amt]init over result=0"\n')
    texts = pc_handset.log.texts(TAG)
    assert texts[:2] == ["", "    vx-kel-amt, version 001.001"]
    assert re.fullmatch(r"    Build time: [A-Z][a-z]{2} [ \d]\d \d{4} \d\d:\d\d:\d\d", texts[2])
    assert texts[3:6] == [
        f"run under {NORMAL}",
        "config file[/system/etc/vx-kel-amt.cfg], pid file[/tmp/vx-kel-amt.pid]",
        "amt_cfg_init()"]
    assert pc_handset.text("/tmp/vx-kel-amt.pid") == f"{pc_handset.pid}\n"


def test_usb_inserted_start(make_handset: HandsetFactory) -> None:
    handset = make_handset("usb-inserted")
    assert handset.stdout().decode().startswith(f"g_usb_activate:1.\n{SYSTEM_PATHS}")
    assert f"run under {SIMPLIFIED}" in handset.log.texts(TAG)
    assert "init_for_amt_1_4()" in handset.log.texts(TAG)


def test_simplified_start_keeps_its_files_beside_the_program(make_handset: HandsetFactory) -> None:
    handset = make_handset("simplified")
    assert handset.stdout().decode().startswith(
        "g_usb_activate:0.\n"
        '[vx-kel-amt]command path is "/data/local"\n'
        f"[vx-kel-amt]run under {SIMPLIFIED} \n"
        '[vx-kel-amt]config file is "/data/local/vx-kel-amt.cfg"\n'
        '            pid file is "/data/local/vx-kel-amt.pid"\n')
    # The pid file is written where every start writes it, and looked for beside the program.
    assert handset.text("/tmp/vx-kel-amt.pid") == f"{handset.pid}\n"
    assert not handset.path("/data/local/vx-kel-amt.pid").exists()


def test_priority_is_asked_for(pc_handset: Handset) -> None:
    texts = pc_handset.log.texts("vx-kel-pub")
    asked = texts.index("pub_util_raise_process_priority()")
    # No handset on a PC is granted it, so the failure is what shows that it was asked for.
    assert texts[asked + 1] == "sys call: sched_setscheduler() failed! errno = 1"


# options


@pytest.mark.parametrize("arguments", [["-h"], ["-h", "x"], ["-x"], ["-u", "-h", "now"], ["-ux"]])
def test_other_options_print_the_usage(idle_handset: Handset, arguments: list[str]) -> None:
    ended = idle_handset.run([PROGRAM, *arguments])
    assert (ended.status, ended.stdout.decode()) == (0, usage(PROGRAM))
    assert idle_handset.log.texts() == []


@pytest.mark.parametrize("arguments", [["-u", "-u"], ["-uuu"]])
def test_one_option_may_be_given_again(idle_handset: Handset, arguments: list[str]) -> None:
    idle_handset.place("/system/etc/vx-kel-amt.cfg", None)
    ended = idle_handset.run([PROGRAM, *arguments])
    assert ended.stdout.decode().startswith("g_usb_activate:1.\n")
    assert ended.status == status_byte(-118)


def test_words_that_are_no_options_are_ignored(idle_handset: Handset) -> None:
    idle_handset.place("/system/etc/vx-kel-amt.cfg", None)
    ended = idle_handset.run([PROGRAM, "word"])
    assert ended.stdout.decode().startswith("g_usb_activate:0.\n")
    assert ended.status == status_byte(-118)


# paths


def test_bare_name_is_its_own_folder(idle_handset: Handset) -> None:
    ended = idle_handset.run(["vx-kel-amt"], program=PROGRAM)
    assert ended.status == status_byte(-118)
    assert ('[vx-kel-amt]command path is "vx-kel-amt"\n'
            f"[vx-kel-amt]run under {SIMPLIFIED} \n"
            '[vx-kel-amt]config file is "vx-kel-amt/vx-kel-amt.cfg"\n'
            '            pid file is "vx-kel-amt/vx-kel-amt.pid"\n') in ended.stdout.decode()


@pytest.mark.parametrize("length", [48, 49, 50, 120])
def test_long_folder_cuts_the_paths(idle_handset: Handset, length: int) -> None:
    folder = "/" + "d" * (length - 1)
    ended = idle_handset.run([f"{folder}/vx-kel-amt"], program=PROGRAM)
    config, pid_file = (f"{folder}/vx-kel-amt.{end}"[:59] for end in ("cfg", "pid"))
    assert (f'config file is "{config}"\n            pid file is "{pid_file}"\n'
            in ended.stdout.decode())
    assert f"fail to open file: {config}" in idle_handset.log.texts(TAG)
    assert ended.status == status_byte(-118)


def test_system_bin_anywhere_means_normal_mode(idle_handset: Handset) -> None:
    idle_handset.place("/system/etc/vx-kel-amt.cfg", None)
    ended = idle_handset.run(["/mnt/system/bin/deep/vx-kel-amt"], program=PROGRAM)
    assert f"run under {NORMAL} \n{SYSTEM_PATHS}" in ended.stdout.decode()


# a second instance


def test_second_instance_ends_at_once(pc_handset: Handset) -> None:
    mark = pc_handset.log.mark()
    ended = pc_handset.run([PROGRAM])
    assert ended.status == 0
    assert ended.stdout.decode().endswith(f"{SYSTEM_PATHS}vx-kel-amt already run.\n")
    texts = pc_handset.log.texts("vx-kel-pub", mark)
    assert f"pub_util_get_pid_and_check_run pid[{pc_handset.pid}]" in texts
    assert (f"pub_util_get_pid_and_check_run return is_run_ptr[1] pid_ptr[{pc_handset.pid}]"
            in texts)
    assert pc_handset.log.texts(TAG, mark) == []


@pytest.mark.parametrize("content", ["1\n", "none\n", "", "999999\n"])
def test_stale_pid_file_does_not_hinder(make_handset: HandsetFactory, content: str) -> None:
    handset = make_handset("pc", files={"/tmp/vx-kel-amt.pid": content})
    assert handset.text("/tmp/vx-kel-amt.pid") == f"{handset.pid}\n"


# fatal errors


def test_missing_configuration_is_fatal(idle_handset: Handset) -> None:
    idle_handset.place("/system/etc/vx-kel-amt.cfg", None)
    ended = idle_handset.run([PROGRAM])
    assert ended.status == status_byte(-118)
    assert ended.stdout.decode().endswith("[vx-kel-amt]config over result=-118\n")
    texts = idle_handset.log.texts(TAG)
    start = texts.index("amt_cfg_init()")
    expected: list[str | re.Pattern[str]] = [
        "amt_cfg_init()", "parse_amt_cfg()", "sys call: fopen() failed! errno = 2",
        error_line("parse_amt_cfg", -1, 2, "amt/amt-cfg"),
        error_line("parse_amt_cfg", -118, 2, "amt/amt-cfg"),
        "fail to open file: /system/etc/vx-kel-amt.cfg", "FATAL ERROR!!!",
        re.compile(r"FILE-amt/main, LINE-429, FUNC-main\(\), error_code=-118, errno=\d+"),
        "amt_deinit_resource()", "amt_handle_deinit()"]
    for text, wanted in zip(texts[start:], expected, strict=False):
        assert text == wanted if isinstance(wanted, str) else wanted.fullmatch(text), text
    assert len(texts[start:]) >= len(expected)


def test_hub_that_cannot_start_is_fatal(make_handset: HandsetFactory) -> None:
    # No name for the app's link: the packet path cannot open its pseudo-terminal.
    handset = make_handset("packet", ready=False, restart=False, config={"vx.tty.app": None})
    assert handset.wait_exit() == status_byte(-101)
    assert handset.stdout().decode().endswith('[vx-kel-amt]init over result=-101"\n')
    assert handset.log.find(re.compile("LINE-429, FUNC-main.., error_code=-101,"))


# configuration


def test_settings_are_logged_as_stored(make_handset: HandsetFactory) -> None:
    text = ("  # vx.tty.pc = /dev/other\r\n"
            "   vx.tty.pc   =   /dev/ttyGS0   \r\n"
            "vx.tty.app=/dev/ttyAPP0\nvx.tty.modem=/dev/ttyMODEM0\nvx.tty.at.mux=/dev/ttyMUX0\n"
            "VX.TTY.PC=/dev/none\nvx.mode.file=\nno key here\n"
            f"vx.audio.file=/{'a' * 60}\nvx.audio.sample.rate=-8000\nvx.audio.format = 2\n"
            "vx.audio.frame.count = 4x\nvx.modem.uart.amt.default.baudrate=230400\n"
            "vx.modem.uart.at.default.baudrate=fast")
    handset = make_handset("pc", files={"/system/etc/vx-kel-amt.cfg": text})
    assert [line for line in handset.log.texts(TAG) if line.startswith("[cfg]")] == [
        "[cfg]vx.tty.pc = /dev/ttyGS0", "[cfg]vx.tty.app = /dev/ttyAPP0",
        "[cfg]vx.tty.modem = /dev/ttyMODEM0", "[cfg]vx.tty.at.mux = /dev/ttyMUX0",
        f"[cfg]vx.audio.file = /{'a' * 46}", "[cfg]vx.audio.sample.rate = -8000",
        "[cfg]vx.audio.format = 2", "[cfg]vx.audio.frame.count = 4",
        "[cfg]vx.modem.uart.amt.default.baudrate = 230400",
        "[cfg]vx.modem.uart.at.default.baudrate = 0"]
