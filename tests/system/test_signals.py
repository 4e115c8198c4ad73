"""Signals that find the daemon busy: in a shell command, in its start, in its log, in its end."""

import fcntl
import os
import signal
import time
from collections.abc import Callable
from contextlib import suppress
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.errors import HandsetError
from amt_simulator.waiting import scaled, wait_until
from amt_station import wire
from support.channels import AppChannel, PcChannel, flag, integer
from support.replaced_cutils import replace_cutils
from support.slow_shell import SlowShell
from support.threads import wait_calm
from support.trace import Trace

NAMES = {2: "SIGINT", 15: "SIGTERM", 11: "SIGSEGV", 7: "SIGBUS", 12: "SIGUSR2"}
SOON = 1.0
# The library late_wait lets nobody wait for signals for a while, and while the first file is
# there; it makes the second when somebody would.
DISPLACED, DISPLACED_NOW = "/tmp/displaced", "/tmp/displaced-now"
DISPLACED_S = 0.5
APP_LINK = "/dev/ttyAPP0"
PID_FILE = "vx-kel-amt.pid"
PROGRAM = "/system/bin/vx-kel-amt"


def expect_end(handset: Handset, send: Callable[[], None], soon: float = SOON) -> None:
    """SEND ends the daemon with status 0, within a second, and the app's link is gone."""
    handset.set_restart(False)
    ended = len(handset.exits())
    started = time.monotonic()
    send()
    assert handset.wait_exit(ended) == 0
    assert time.monotonic() - started < scaled(soon)
    assert handset.run(["/usr/bin/test", "-L", APP_LINK]).status == 1


def end_by(handset: Handset, number: int, tid: int = 0) -> None:
    """End the daemon by a signal; the log tells of it."""
    trace = Trace(handset)
    expect_end(handset, lambda: handset.signal(number, tid))
    trace.expect("signal_treatment()", f"receive signal: {number} - {NAMES[number]}",
                 "amt_deinit_resource()", "amt_handle_deinit()")


def start_with_slow_shell(make_handset: HandsetFactory, path: str, text: str,
                          ready: bool = True) -> tuple[Handset, SlowShell]:
    """A handset whose shell holds the commands that hold TEXT; the start's own unless READY."""
    handset = make_handset(path, ready=False, start=False)
    shell = SlowShell(handset, text)
    if not ready:
        shell.hold()
    handset.start()
    if ready:
        handset.wait_ready()
        shell.hold()
    return handset, shell


def threads(handset: Handset) -> list[int]:
    """The daemon's threads, the main thread first."""
    return sorted(handset.inspect().threads)


# a shell command runs

REQUESTS = [("pc", "/system/bin/sync", 219, integer(192, 1)),
            ("packet", "/system/bin/sync", 219, integer(192, 1)),
            ("packet", "/system/bin/amt-audio", 33, flag(15, 1))]


@pytest.mark.parametrize("path, text, request_id, atom", REQUESTS)
@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM, signal.SIGSEGV])
def test_signal_while_a_request_s_command_runs(make_handset: HandsetFactory, number: int, path: str,
                                               text: str, request_id: int, atom: wire.Atom) -> None:
    handset, shell = start_with_slow_shell(make_handset, path, text)
    channel: PcChannel | AppChannel = (PcChannel(handset) if path == "pc"
                                       else AppChannel(handset))
    channel.send_packet(request_id, atom)
    shell.wait_held()
    end_by(handset, number)


@pytest.mark.parametrize("path", ["pc", "packet"])
@pytest.mark.parametrize("text", [PID_FILE, "/amt/BT"])
def test_interrupt_while_a_start_s_command_runs(make_handset: HandsetFactory, path: str,
                                                text: str) -> None:
    handset, shell = start_with_slow_shell(make_handset, path, text, ready=False)
    shell.wait_held()
    end_by(handset, signal.SIGINT)


@pytest.mark.parametrize("path", ["pc", "packet"])
def test_interrupt_while_a_displaced_start_s_command_runs(make_handset: HandsetFactory, path: str,
                                                          tmp_path: Path) -> None:
    handset = make_handset(path, ready=False, start=False)
    replace_cutils(handset, tmp_path, "late_wait")
    shell = SlowShell(handset, PID_FILE)
    shell.hold()
    handset.start()
    shell.wait_held()
    end_by(handset, signal.SIGINT)


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_signal_before_the_first_wait_leaves_nothing_of_the_start(
        make_handset: HandsetFactory, number: int, tmp_path: Path) -> None:
    handset = make_handset("pc", ready=False, start=False)
    replace_cutils(handset, tmp_path, "late_wait")
    handset.place(DISPLACED, "")
    handset.start()
    handset.wait_file(DISPLACED_NOW)

    def send_and_let_wait() -> None:
        handset.signal(number)
        handset.place(DISPLACED, None)

    expect_end(handset, send_and_let_wait, soon=SOON + DISPLACED_S)
    texts = handset.log.texts()
    assert texts[:2] == ["signal_treatment()", f"receive signal: {number} - {NAMES[number]}"]
    assert "pub_util_get_pid_and_check_run()" not in texts


def test_interrupt_in_the_pause_before_the_station_s_port_is_set(
        make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", ready=False)
    handset.log.wait('open device "/dev/ttyGS0" successfully')
    end_by(handset, signal.SIGINT)


@pytest.mark.parametrize("path, device", [("pc", "MODEM0"), ("packet", "MUX0")])
def test_interrupt_while_a_tty_is_waited_for(make_handset: HandsetFactory, path: str,
                                             device: str) -> None:
    handset = make_handset(path, ready=False, modem="absent")
    handset.log.wait(f'open device "/dev/tty{device}" fail: 2 - No such file or directory')
    end_by(handset, signal.SIGINT)


# dispositions


def test_commands_start_with_default_dispositions_and_an_empty_mask(
        make_handset: HandsetFactory) -> None:
    handset, shell = start_with_slow_shell(make_handset, "packet", "/system/bin/sync")
    app = AppChannel(handset)
    app.send_packet(219, integer(192, 1))
    shell.wait_held()
    assert [shell.status(key) for key in ("SigBlk", "SigIgn", "SigCgt")] == [0, 0, 0]
    shell.release()
    app.read_packet()


def test_start_s_commands_do_so_too(make_handset: HandsetFactory) -> None:
    handset, shell = start_with_slow_shell(make_handset, "packet", PID_FILE, ready=False)
    shell.wait_held()
    assert [shell.status(key) for key in ("SigBlk", "SigIgn", "SigCgt")] == [0, 0, 0]
    shell.release()
    handset.wait_ready()


def test_what_the_starter_ignores_means_nothing(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", ready=False, start=False, restart=False)
    ended = handset.run(["/usr/bin/sh", "-c", f"trap '' CHLD INT TERM HUP; ({PROGRAM} &) ; "
                         "until grep -q amt_handle_read_app_loop /handset/log.txt; do sleep 0.1; "
                         f"done; cat /proc/$(cat /tmp/{PID_FILE})/status"])
    lines = dict(line.split(":", 1) for line in ended.stdout.decode().splitlines() if ":" in line)
    assert int(lines["SigIgn"], 16) == 0
    caught = int(lines["SigCgt"], 16)
    assert all(caught & 1 << number - 1 for number in (2, 15, 11, 7, 12, 10, 13))
    app = AppChannel(handset)
    # The player's command has a status, and it is looked at.
    assert app.request(33, flag(15, 1)).get_int(1) == 0
    handset.signal(signal.SIGINT, pid=int(handset.text(f"/tmp/{PID_FILE}")))
    handset.log.wait("receive signal: 2 - SIGINT")


def test_a_reader_of_its_output_that_goes_away_does_not_matter(
        make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", ready=False, start=False, restart=False)
    handset.run(["/usr/bin/sh", "-c", f"({PROGRAM} | :) >/dev/null 2>&1 &"])
    handset.log.wait("amt_handle_read_app_loop()")
    app = AppChannel(handset)
    # It tells its output what it writes to the modem.
    app.request(85)
    assert app.request(219, integer(192, 2)).command == 220
    assert handset.run(["/usr/bin/test", "-L", APP_LINK]).status == 0
    handset.signal(signal.SIGTERM, pid=int(handset.text(f"/tmp/{PID_FILE}")))
    handset.log.wait("receive signal: 15 - SIGTERM")
    wait_until(lambda: handset.run(["/usr/bin/test", "-L", APP_LINK]).status == 1 or None,
               "the end of the link")


# the log's reader is stuck


@pytest.mark.parametrize("number", NAMES)
def test_signal_while_the_log_is_stuck(make_handset: HandsetFactory, number: int) -> None:
    handset = make_handset("packet", ready=False, start=False, restart=False)
    log = handset.path("/tmp/stuck-log")
    os.mkfifo(log)
    fd = os.open(log, os.O_RDWR | os.O_CLOEXEC)
    try:
        # Room for a whole start; then somebody fills it, and nobody reads.
        fcntl.fcntl(fd, fcntl.F_SETPIPE_SZ, 1 << 18)
        ended = handset.run(["/usr/bin/sh", "-c", f"""
            {PROGRAM} & daemon=$!
            until [ -L {APP_LINK} ]; do sleep 0.02; done
            head -c 1000000 /dev/zero > /tmp/stuck-log & filler=$!
            until grep -q pipe_w /proc/$filler/wchan; do sleep 0.02; done
            kill -{number} $daemon
            wait $daemon; echo "status $?" """], env={"VX_HOST_LOG": "/tmp/stuck-log"})
    finally:
        os.close(fd)
    assert ended.stdout.decode().endswith("status 0\n")


# an end has begun


def hold_an_end(make_handset: HandsetFactory) -> Handset:
    """A packet path whose end waits for a worker that is in a slow command."""
    handset, shell = start_with_slow_shell(make_handset, "packet", "/system/bin/sync")
    wait_calm(handset)
    AppChannel(handset).send_packet(219, integer(192, 1))
    shell.wait_held()
    return handset


@pytest.mark.parametrize("first", [signal.SIGINT, signal.SIGSEGV])
@pytest.mark.parametrize("second", NAMES)
def test_signals_behind_the_first_change_nothing(make_handset: HandsetFactory, first: int,
                                                 second: int) -> None:
    handset = hold_an_end(make_handset)
    everywhere = [0, *threads(handset)]
    trace = Trace(handset)

    def send() -> None:
        handset.signal(first)
        handset.log.wait("amt_handle_deinit()")
        with suppress(HandsetError):  # the daemon may be gone before the last of them
            for tid in everywhere:
                handset.signal(second, tid)

    expect_end(handset, send)
    texts = trace.texts()
    assert [text for text in texts if text.startswith("receive signal")] == [
        f"receive signal: {first} - {NAMES[first]}"]
    assert texts.count("amt_handle_deinit()") == 1


@pytest.mark.parametrize("numbers", [(15, 11), (11, 15), (7, 11), (2, 15, 12, 11, 7)])
def test_signals_at_once_end_once(packet_handset: Handset, numbers: tuple[int, ...]) -> None:
    trace = Trace(packet_handset)
    everywhere = [0, *sorted(wait_calm(packet_handset).threads)]

    def send() -> None:
        with suppress(HandsetError):
            for number in numbers:
                for tid in everywhere:
                    packet_handset.signal(number, tid)

    expect_end(packet_handset, send)
    assert trace.texts().count("amt_handle_deinit()") == 1
