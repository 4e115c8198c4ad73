"""Nothing of a handset outlives its launcher, however the launcher ends."""

import json
import os
import signal
import subprocess
import sys
import time
from pathlib import Path
from typing import Callable, Iterator

import pytest

from amt_simulator import Handset, HandsetError
from amt_simulator.rundir import BASE_VARIABLE, RunDirectory, base_directory, remove_tree, sweep
from support.command import PATIENCE, PROJECT

FAKE_DAEMON = Path(__file__).with_name("support") / "fake_daemon.py"
# A suite that runs in the background has Ctrl-C ignored, and hands that on.
LAUNCHER = """
import json, signal, sys, time
from pathlib import Path
from amt_simulator import Handset
signal.signal(signal.SIGINT, signal.default_int_handler)
with Handset("pc", build=None, daemon=Path(sys.argv[1])) as handset:
    handset.wait_ready()
    print(json.dumps([str(handset.directory), handset.pid]), flush=True)
    if sys.argv[2] == "raise":
        raise RuntimeError("as a test that fails")
    time.sleep(60)
"""


@pytest.fixture
def launcher(base: Path) -> Iterator[Callable[..., subprocess.Popen[str]]]:
    """Start a program that launches a handset."""
    started = []

    def launch(how: str) -> "subprocess.Popen[str]":
        process = subprocess.Popen(
            [sys.executable, "-c", LAUNCHER, str(FAKE_DAEMON), how], cwd=PROJECT, text=True,
            stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        started.append(process)
        return process

    yield launch
    for process in started:
        process.kill()
        process.communicate()


def processes_of(directory: str) -> list[int]:
    """Processes of the PC that belong to the handset in DIRECTORY, by root or command line."""
    found = []
    for entry in Path("/proc").iterdir():
        if not entry.name.isdigit():
            continue
        try:
            if directory in (entry / "cmdline").read_text("utf-8", "replace") or (
                    directory in (entry / "mountinfo").read_text()):
                found.append(int(entry.name))
        except OSError:
            continue
    return found


def wait_gone(directory: str) -> None:
    """Wait until no process and no file of the handset is left."""
    end = time.monotonic() + PATIENCE
    while processes_of(directory) or os.path.exists(directory):
        assert time.monotonic() < end, (processes_of(directory), os.path.exists(directory))
        time.sleep(0.01)


@pytest.mark.parametrize("number", [signal.SIGKILL, signal.SIGINT, signal.SIGTERM])
def test_a_launcher_that_is_ended(launcher, number: int) -> None:
    """By a crash as by Ctrl-C: processes, mounts and files are gone."""
    process = launcher("stay")
    assert process.stdout is not None
    directory, pid = json.loads(process.stdout.readline())
    assert pid and len(processes_of(directory)) >= 3
    process.send_signal(number)
    process.wait(PATIENCE)
    wait_gone(directory)


def test_a_launcher_that_fails(launcher) -> None:
    """An exception in the test takes the handset down too."""
    process = launcher("raise")
    directory = json.loads(process.stdout.readline())[0]
    assert process.wait(PATIENCE) == 1
    assert not os.path.exists(directory)
    assert processes_of(directory) == []


def test_taking_down_leaves_nothing(base: Path) -> None:
    """Neither after a plain end, nor after a power-off, nor with forbidden directories."""
    for order in (b"", b"!off"):
        with Handset(build=None, daemon=FAKE_DAEMON) as handset:
            handset.wait_ready()
            handset.run(["/bin/sh", "-c", "mkdir -p /data/a/b; touch /data/a/b/c; "
                                          "chmod 0 /data/a/b /data/a"])
            directory = str(handset.directory)
            if order:
                handset.pc.write(order)
                handset.wait_power_off()
        assert list(base.iterdir()) == []
        assert processes_of(directory) == []
        handset.down()


def test_a_daemon_that_cannot_come_up_leaves_nothing(base: Path, tmp_path: Path,
                                                     monkeypatch: pytest.MonkeyPatch) -> None:
    """A sandbox that fails is cleaned up before the error is told."""
    stub = tmp_path / "bwrap"
    stub.write_text("#!/bin/sh\nexit 1\n")
    stub.chmod(0o755)
    monkeypatch.setenv("PATH", f"{tmp_path}:{os.environ['PATH']}")
    with pytest.raises(Exception, match="did not come up: no message"):
        Handset(build=None, daemon=FAKE_DAEMON).up()
    assert list(base.iterdir()) == []


def test_a_directory_can_be_kept(base: Path) -> None:
    """For looking into it afterwards; no later start sweeps it."""
    with Handset(build=None, daemon=FAKE_DAEMON, keep=True) as handset:
        directory = handset.directory
    assert (directory / "state" / "log.txt").exists()
    sweep(base)
    assert directory.exists()
    remove_tree(directory)


def test_left_directories_are_swept(base: Path) -> None:
    """What a power cut of the PC left is removed by the next start; what is in use is not."""
    base.mkdir(mode=0o700)
    stale = base / "1-stale"
    stale.mkdir()
    (stale / "owner").touch()
    foreign = base / "something"
    foreign.mkdir()
    used = RunDirectory()
    other = RunDirectory()
    try:
        assert not stale.exists()
        assert foreign.exists() and used.path.exists() and other.path.exists()
    finally:
        used.close()
        other.close()
    assert not used.path.exists()


def test_the_usual_base_is_made_for_one_user(tmp_path: Path,
                                             monkeypatch: pytest.MonkeyPatch) -> None:
    """Below the temporary directory, named after the user, and closed to all others."""
    monkeypatch.delenv(BASE_VARIABLE, raising=False)
    monkeypatch.setattr("tempfile.tempdir", str(tmp_path))
    made = base_directory()
    assert made == tmp_path / f"vx-handset-{os.getuid()}"
    assert made.stat().st_mode & 0o777 == 0o700
    assert base_directory() == made


def test_a_link_in_place_of_the_base_is_refused(tmp_path: Path,
                                                monkeypatch: pytest.MonkeyPatch) -> None:
    """Whoever laid it there cannot make the sweep remove directories of the victim."""
    victim = tmp_path / "home"
    precious = victim / "precious"
    precious.mkdir(parents=True)
    (precious / "owner").touch()
    monkeypatch.delenv(BASE_VARIABLE, raising=False)
    monkeypatch.setattr("tempfile.tempdir", str(tmp_path))
    (tmp_path / f"vx-handset-{os.getuid()}").symlink_to(victim)
    with pytest.raises(HandsetError, match="is a symbolic link; set HANDSET_BASE"):
        Handset(build=None, daemon=FAKE_DAEMON).up()
    assert (precious / "owner").exists()


@pytest.mark.parametrize("mode", [0o755, 0o770, 0o707, 0o500])
def test_a_base_of_another_mode_is_refused(base: Path, mode: int) -> None:
    """Nobody else may look into it or lay something there."""
    base.mkdir()
    base.chmod(mode)
    with pytest.raises(HandsetError, match=f"has the mode {mode:04o}, not 0700"):
        RunDirectory()


def test_a_base_of_another_user_is_refused(base: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    """Whoever made it could change it."""
    base.mkdir(mode=0o700)
    monkeypatch.setattr("os.getuid", lambda: base.stat().st_uid + 1)
    with pytest.raises(HandsetError, match="belongs to another user"):
        RunDirectory()


def test_a_base_that_is_no_directory_is_refused(base: Path) -> None:
    """A file there is told, and left alone."""
    base.write_text("mine")
    with pytest.raises(HandsetError, match="is no directory"):
        RunDirectory()
    assert base.read_text() == "mine"


def test_a_sweep_looks_at_directories_of_the_base_only(base: Path, tmp_path: Path) -> None:
    """A link in the base is nothing that a handset left."""
    base.mkdir(mode=0o700)
    precious = tmp_path / "precious"
    precious.mkdir()
    (precious / "owner").touch()
    (base / "1-link").symlink_to(precious)
    sweep(base)
    assert (precious / "owner").exists() and (base / "1-link").is_symlink()


def test_a_directory_that_never_got_its_name_is_swept(base: Path) -> None:
    """An hour later nobody is making it any more; a fresh one may be in the making."""
    base.mkdir(mode=0o700)
    old, fresh = base / ".new-1-old", base / ".new-1-fresh"
    old.mkdir()
    fresh.mkdir()
    os.utime(old, (time.time() - 7200,) * 2)
    sweep(base)
    assert not old.exists() and fresh.exists()


def test_a_directory_that_cannot_be_held_is_removed(base: Path,
                                                    monkeypatch: pytest.MonkeyPatch) -> None:
    """Whatever fails behind its making."""
    def refuse(*_arguments: object, **_others: object) -> None:
        raise BlockingIOError("no more processes")

    monkeypatch.setattr("amt_simulator.rundir.subprocess.Popen", refuse)
    with pytest.raises(BlockingIOError):
        RunDirectory()
    assert list(base.iterdir()) == []
