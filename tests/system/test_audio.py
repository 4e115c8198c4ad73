"""The ring test (33) with its player, and the codec's loop (31) in the audio HAL."""

from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import AppChannel, flag, integer
from support.handler import NO_ENTRY, HandlerTrace, device_error, done, refused
from support.shell import break_shell
from support.trace import Wanted

RING, RING_HANDLER = 33, "amt_device_audio"
VOLTAGE, VOLTAGE_FILE = 9, "/sys/class/power_supply/battery/voltage_now"
PLAYER, PID_FILE = "/system/bin/amt-audio", "/tmp/amt-audio.pid"
SOUND = "/system/media/audio/amt/sweep.wav"
START, STOP, SWITCH = flag(15, 1), flag(15, 0), 15
PLAY_CALL = f"amt-audio(44100, 1, 1024, {SOUND}) = 0"

LOOP, LOOP_HANDLER = 31, "amt_device_audio_loop"
LIBRARY = "/system/lib/hw/audio.primary.tq5530.amt.so"


def player_pid(handset: Handset) -> int:
    """The process id on the player's record."""
    return int(handset.text(PID_FILE))


def is_alive(handset: Handset, pid: int) -> bool:
    """Whether the process is there."""
    return pid in handset.processes()


def wait_dead(handset: Handset, pid: int) -> None:
    """Wait until the process is gone."""
    wait_until(lambda: not is_alive(handset, pid) or None, f"the end of process {pid}")


def check_lines(pid: int, command: str) -> list[str]:
    """The lines of the look for a player whose record holds PID, a process of this COMMAND."""
    path = f"/proc/{pid}/cmdline"
    name = "pub_util_get_pid_and_check_run"
    runs = "amt-audio" in command
    return [f"{name}()", f"{name} pid_file_ptr[{PID_FILE}] name_ptr[amt-audio]",
            f"{name} pid[{pid}]", f"{name} fopen buf_a[{path}]",
            f"{name} fscanf buf_a[{command}] ret_val[1]",
            f"{name} return is_run_ptr[{int(runs)}] pid_ptr[{pid if runs else 0}]"]


# ring: starting


@pytest.mark.parametrize("atoms, word", [
    ((), "start"), ((START,), "start"), ((flag(SWITCH, 2),), "stop"), ((flag(15, 255),), "stop"),
    ((integer(SWITCH, -1),), "stop")])
def test_ring_starts_and_stops(app: AppChannel, atoms: tuple[wire.Atom, ...], word: str) -> None:
    handset = app.handset
    trace = HandlerTrace(handset)
    assert app.request(RING, *atoms) == done(RING)
    trace.expect_handler(RING_HANDLER, f"{word} audio")
    assert trace.calls() == [PLAY_CALL]
    pid = player_pid(handset)
    assert handset.inspect(pid).command == [PLAYER, "44100", "1", "1024", SOUND]

    trace = HandlerTrace(handset)
    assert app.request(RING, STOP) == done(RING)
    trace.expect_handler(RING_HANDLER, *check_lines(pid, PLAYER), "stop audio")
    assert not handset.path(PID_FILE).exists()
    wait_dead(handset, pid)
    assert trace.calls() == []


def test_ring_plays_what_is_configured(make_handset: HandsetFactory) -> None:
    sound = "/data/local/" + "s" * 35
    assert len(sound) == 47
    app = AppChannel(make_handset("packet", files={sound: "x"}, config={
        "vx.audio.file": sound, "vx.audio.sample.rate": "-8000", "vx.audio.format": "0",
        "vx.audio.frame.count": "2147483647"}))
    trace = HandlerTrace(app.handset)
    assert app.request(RING) == done(RING)
    assert trace.calls() == [f"amt-audio(-8000, 0, 2147483647, {sound}) = 0"]


def test_ring_command_is_cut_at_99_characters(make_handset: HandsetFactory) -> None:
    sound = "/data/local/" + "s" * 35
    lowest = "-2147483648"
    app = AppChannel(make_handset("packet", files={sound: "x"}, config={
        "vx.audio.file": sound, "vx.audio.sample.rate": lowest, "vx.audio.format": lowest,
        "vx.audio.frame.count": lowest}))
    trace = HandlerTrace(app.handset)
    assert app.request(RING) == done(RING)
    command = f"{PLAYER} {lowest} {lowest} {lowest} {sound}"
    cut = command[:99].rpartition(" ")[2]
    assert len(cut) < len(sound)
    assert trace.calls() == [f"amt-audio({lowest}, {lowest}, {lowest}, {cut}) = 0"]


def test_later_player_takes_over(app: AppChannel) -> None:
    assert app.request(RING) == done(RING)
    first = player_pid(app.handset)
    assert app.request(RING) == done(RING)
    second = player_pid(app.handset)
    assert second != first
    wait_dead(app.handset, first)
    assert app.request(RING, STOP) == done(RING)
    wait_dead(app.handset, second)


def access_failure(path: str) -> list[Wanted]:
    """The lines of a missing file of the ring test."""
    return [device_error(RING_HANDLER, -118, NO_ENTRY),
            f'access("{path}") fail: 2 - No such file or directory']


def test_ring_with_something_missing(app: AppChannel) -> None:
    sound = app.handset.read(SOUND)
    for gone in ((SOUND,), (PLAYER, SOUND), (PLAYER,)):
        app.handset.place(SOUND, sound)
        for path in gone:
            app.handset.place(path, None)
        trace = HandlerTrace(app.handset)
        refused(app, RING)
        trace.expect_handler(RING_HANDLER, *[line for path in gone
                                             for line in access_failure(path)])
        assert trace.calls() == []
    # To stop, nothing of it is needed.
    assert app.request(RING, STOP) == done(RING)


@pytest.mark.parametrize("length", [48, 60])
def test_ring_path_is_cut_at_47_characters(make_handset: HandsetFactory, length: int) -> None:
    sound = ("/data/local/" + "s" * 60)[:length]
    app = AppChannel(make_handset("packet", files={sound: "x"}, config={"vx.audio.file": sound}))
    trace = HandlerTrace(app.handset)
    refused(app, RING)
    trace.expect_handler(RING_HANDLER, *access_failure(sound[:47]))


def test_ring_without_a_configured_sound(make_handset: HandsetFactory) -> None:
    app = AppChannel(make_handset("packet", config={"vx.audio.file": None}))
    trace = HandlerTrace(app.handset)
    refused(app, RING)
    trace.expect_handler(RING_HANDLER, *access_failure(""))


def test_ring_player_that_fails(app: AppChannel) -> None:
    command = f"{PLAYER} 44100 1 1024 {SOUND}"
    failure = [device_error(RING_HANDLER, -118, 0), f"system({command}) fail: 0 - Success"]
    app.handset.answer("amt-audio", "3")
    trace = HandlerTrace(app.handset)
    refused(app, RING, START)
    trace.expect_handler(RING_HANDLER, *failure)
    assert trace.calls() == [PLAY_CALL.replace("= 0", "= 3")]
    assert not app.handset.path(PID_FILE).exists()

    # What another request has failed with is not told as its reason.
    app.handset.place(VOLTAGE_FILE, None)
    refused(app, VOLTAGE)
    trace = HandlerTrace(app.handset)
    refused(app, RING, START)
    trace.expect_handler(RING_HANDLER, *failure)

    # It is run once: nobody tries again.
    app.handset.answer("amt-audio")
    with break_shell(app.handset, PLAYER, 1):
        trace = HandlerTrace(app.handset)
        refused(app, RING, START)
    trace.expect_handler(RING_HANDLER, *failure)
    assert trace.calls() == []

    app.handset.path(PLAYER).chmod(0o644)
    trace = HandlerTrace(app.handset)
    refused(app, RING, START)
    trace.expect_handler(RING_HANDLER, *failure)


# ring: stopping


def test_stop_without_a_player(app: AppChannel) -> None:
    name = "pub_util_get_pid_and_check_run"
    trace = HandlerTrace(app.handset)
    assert app.request(RING, STOP) == done(RING)
    lines = trace.lines(RING_HANDLER)
    assert lines[1:3] == [f"{name}()", f"{name} pid_file_ptr[{PID_FILE}] name_ptr[amt-audio]"]
    assert lines[4:] == [f'Open file "{PID_FILE}" fail: 2 - No such file or directory',
                         f"{name} return is_run_ptr[0] pid_ptr[0]", "stop audio"]

    for content in ("", "none\n", "0\n", "-1\n", "999999\n"):
        app.handset.place(PID_FILE, content)
        assert app.request(RING, STOP) == done(RING)
        assert app.handset.text(PID_FILE) == content


def test_stop_leaves_other_programs_alone(app: AppChannel) -> None:
    # The record outlived its player, and another program has got the number.
    app.handset.place(PID_FILE, f"{app.handset.pid}\n")
    trace = HandlerTrace(app.handset)
    assert app.request(RING, STOP) == done(RING)
    trace.expect_handler(RING_HANDLER, *check_lines(app.handset.pid, "/system/bin/vx-kel-amt"),
                         "stop audio")
    assert player_pid(app.handset) == app.handset.pid
    assert app.request(29) == done(29)


def test_stop_kills_a_player_that_ignores_signals(app: AppChannel) -> None:
    handset = app.handset
    ended = handset.run(["/usr/bin/bash", "-c", "trap '' HUP INT QUIT TERM USR1 USR2; "
                         "(exec -a /x/amt-audio-2 sleep 1000) >/dev/null 2>&1 & "
                         f"echo $! > {PID_FILE}"])
    assert ended.status == 0
    pid = player_pid(handset)
    wait_until(lambda: "amt-audio" in handset.inspect(pid).command[0] or None, "the player")
    trace = HandlerTrace(handset)
    assert app.request(RING, STOP) == done(RING)
    trace.expect_handler(RING_HANDLER, *check_lines(pid, "/x/amt-audio-2"), "stop audio")
    wait_dead(handset, pid)
    assert not handset.path(PID_FILE).exists()


# loop


def loaded(handset: Handset, library: str) -> bool:
    """Whether the daemon has LIBRARY loaded."""
    maps = handset.run(["/usr/bin/cat", f"/proc/{handset.pid}/maps"]).stdout.decode()
    return library in maps


def test_loop(app: AppChannel) -> None:
    for atoms, kind, enable in (
            ((), 0, 1), ((integer(30, 2),), 2, 1), ((integer(30, -1), START), -1, 1),
            ((STOP, integer(30, 1)), 1, 0), ((STOP,), 0, 0), ((flag(SWITCH, 2),), 0, 0),
            ((integer(SWITCH, 0x101), integer(30, 0x7FFFFFFF)), 0x7FFFFFFF, 0)):
        trace = HandlerTrace(app.handset)
        assert app.request(LOOP, *atoms) == done(LOOP)
        trace.expect_handler(LOOP_HANDLER,
                             f"will call codec_loop_test. enable:{enable}; type:{kind}.",
                             "stop call codec_loop_test.",
                             f"{'start' if enable else 'stop'} audio-loop")
        assert trace.calls() == [f"codec_loop_test({kind}, {enable}) = 0"]
    assert not loaded(app.handset, LIBRARY)


def test_loop_result_does_not_matter(app: AppChannel) -> None:
    for status in (-5, 1):
        app.handset.answer("codec_loop_test", str(status))
        trace = HandlerTrace(app.handset)
        assert app.request(LOOP) == done(LOOP)
        assert trace.calls() == [f"codec_loop_test(0, 1) = {status}"]


def test_loop_without_its_library(app: AppChannel) -> None:
    app.handset.place(LIBRARY, None)
    trace = HandlerTrace(app.handset)
    refused(app, LOOP)
    trace.expect_handler(
        LOOP_HANDLER, device_error(LOOP_HANDLER, -118),
        f"call dlopen fail: - {LIBRARY}: cannot open shared object file: "
        "No such file or directory")

    app.handset.place(LIBRARY, "no library\n")
    trace = HandlerTrace(app.handset)
    refused(app, LOOP)
    trace.expect_handler(LOOP_HANDLER, device_error(LOOP_HANDLER, -118),
                         f"call dlopen fail: - {LIBRARY}: file too short")
    assert trace.calls() == []


def test_loop_without_its_entry(app: AppChannel) -> None:
    # Another library in its place; it stays loaded after the failed look-up.
    other: Path = app.handset.path("/system/lib/hw/amt.tq5530.misc.so")
    app.handset.place(LIBRARY, other)
    for _ in range(2):
        trace = HandlerTrace(app.handset)
        refused(app, LOOP)
        trace.expect_handler(LOOP_HANDLER, device_error(LOOP_HANDLER, -118),
                             f"call dlopen fail: - {LIBRARY}: undefined symbol: codec_loop_test")
    assert trace.calls() == []
    assert loaded(app.handset, LIBRARY)
