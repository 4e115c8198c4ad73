"""What stands in the way of a handset: one clear line, and nothing is left."""

import os
import subprocess
import sys
from pathlib import Path

import pytest

from support.command import COMMAND, PATIENCE, PROJECT, handset, output

pytestmark = pytest.mark.usefixtures("base")


def restricted(*words: str) -> "subprocess.CompletedProcess[str]":
    """Run the command in a system that bubblewrap makes up of this one."""
    return subprocess.run(["bwrap", "--dev-bind", "/", "/", *words], cwd=PROJECT, text=True,
                          capture_output=True, check=False, timeout=PATIENCE)


@pytest.mark.parametrize("size", [40_000, 100_000, 400_000])
def test_a_full_disk_is_told(handset_build, base: Path, size: int) -> None:
    """In one line, wherever the room ends; nothing is left."""
    base.mkdir(mode=0o700)
    done = restricted(
        "--perms", "0700", "--size", str(size), "--tmpfs", str(base), "sh", "-c",
        '"$@"; status=$?; ls -A "$0"; exit $status', str(base),
        *COMMAND, "up", "--build", str(handset_build))
    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr.startswith("amt-handset: cannot make the handset: No space left on device")
    assert done.stderr.count("\n") == 1


def test_a_disk_that_gets_full_is_told(up, tmp_path: Path) -> None:
    """The handset goes on, what does not fit is refused in one line."""
    up("--path", "packet")
    huge = tmp_path / "huge"
    huge.touch()
    done = subprocess.run(
        ["sh", "-c", 'ulimit -f 0; exec "$@"', "sh", *COMMAND, "set", "a.b", "c"],
        cwd=PROJECT, text=True, capture_output=True, check=False, timeout=PATIENCE)
    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr == "amt-handset: File too large\n"
    assert output("get", "ro.build.factory.id") == "F01\n"
    assert handset("get", "a.b").returncode == 1


def test_a_system_without_pseudo_terminals_is_told(handset_build, base: Path) -> None:
    """In one line; nothing is left."""
    done = restricted("--dev-bind", "/dev/null", "/dev/ptmx", *COMMAND, "up", "--build",
                      str(handset_build))
    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr.startswith("amt-handset: this system gives no pseudo-terminal for the port")
    assert done.stderr.count("\n") == 1
    assert list(base.iterdir()) == []


def test_a_file_that_is_missing_is_told(handset_build, base: Path) -> None:
    """With its name and its place; nothing is left."""
    done = handset("up", "--build", str(handset_build), "--file", "/amt/x=/no/such/file")
    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr == ("amt-handset: cannot place /no/such/file as /amt/x: "
                           "No such file or directory\n")
    assert list(base.iterdir()) == []


def test_many_handsets_at_once(base: Path) -> None:
    """Started at the same moment, they come up, are told apart, and leave nothing."""
    script = """
import sys, threading
from pathlib import Path
from amt_simulator import Handset
handsets = [Handset("pc", build=None, daemon=Path(sys.argv[1]), ports=True) for _ in range(32)]
threads = [threading.Thread(target=handset.up) for handset in handsets]
for thread in threads: thread.start()
for thread in threads: thread.join()
for number, handset in enumerate(handsets):
    handset.wait_ready()
    handset.pc.write(b"handset %d" % number)
    handset.modem.open()
for number, handset in enumerate(handsets):
    handset.pc.write(b"number %d." % number)
    assert b"number %d." % number in handset.modem.read_until(b".")
threads = [threading.Thread(target=handset.down) for handset in handsets]
for thread in threads: thread.start()
for thread in threads: thread.join()
print("all")
"""
    daemon = PROJECT / "tests" / "system" / "support" / "fake_daemon.py"
    done = subprocess.run([sys.executable, "-c", script, str(daemon)], cwd=PROJECT, text=True,
                          capture_output=True, check=False, timeout=PATIENCE * 2,
                          env={**os.environ, "HANDSET_TIME_SCALE": "6"})
    assert (done.returncode, done.stdout, done.stderr) == (0, "all\n", "")
    assert list(base.iterdir()) == []
