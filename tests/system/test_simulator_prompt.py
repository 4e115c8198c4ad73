"""The prompt of `amt-handset up`: typed commands, history, and what is told meanwhile."""

import json
import os
import pty
import select
import signal
import subprocess
import sys
from pathlib import Path

import pytest

from amt_simulator.running import find
from support.command import COMMAND, PATIENCE, PROJECT

pytestmark = pytest.mark.usefixtures("base")
PROMPT = b"handset> "


class Terminal:
    """The command at a terminal of its own."""

    def __init__(self, *words: str) -> None:
        self.pid, self._fd = pty.fork()
        if self.pid == 0:
            os.chdir(PROJECT)
            os.execv(sys.executable, [*COMMAND, *words])
        self._said = b""

    def until(self, text: bytes) -> bytes:
        """Read up to TEXT; returns what came before."""
        while text not in self._said:
            assert select.select([self._fd], [], [], PATIENCE)[0], self._said
            try:
                self._said += os.read(self._fd, 4096)
            except OSError:
                raise AssertionError(f"the terminal has closed after {self._said!r}") from None
        before, _, self._said = self._said.partition(text)
        return before

    def type(self, data: bytes) -> None:
        """Press keys."""
        os.write(self._fd, data)

    def end(self) -> int:
        """The exit status, once it has ended."""
        ended = os.pidfd_open(self.pid)
        try:
            assert select.select([ended], [], [], PATIENCE)[0], "it does not end"
        finally:
            os.close(ended)
        status = os.waitstatus_to_exitcode(os.waitpid(self.pid, 0)[1])
        os.close(self._fd)
        return status


@pytest.fixture
def terminal(handset_build, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> Terminal:
    """A handset that is brought up at a terminal, at its prompt."""
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    monkeypatch.setenv("TERM", "xterm")
    made = Terminal("up", "--build", str(handset_build))
    made.until(PROMPT)
    return made


def test_the_prompt(terminal: Terminal) -> None:
    """At a terminal the same commands are typed; Ctrl-C ends the handset."""
    for typed, shown in ((b"help", b"Pull the USB cable out"), (b"show usb", b"CONFIGURED"),
                         (b"frob", b"no such command: frob"), (b"show 'x", b"No closing quotation"),
                         (b"show", b"Missing argument"), (b"", b"\n"), (b"get x", b"is not set"),
                         (b"show --help", b"Usage: show"), (b"up", b"no such command: up")):
        terminal.type(typed + b"\n")
        terminal.until(shown)
        terminal.until(PROMPT)
    terminal.type(b"\x03")
    terminal.until(b"handset is down")
    assert terminal.end() == 0


@pytest.mark.parametrize("typed", [b"exit\n", b"quit\n", b"\x04"])
def test_leaving_the_prompt(terminal: Terminal, base: Path, typed: bytes) -> None:
    """By a word, or by the end of the typing."""
    terminal.type(typed)
    terminal.until(b"handset is down")
    assert terminal.end() == 0
    assert list(base.iterdir()) == []


def test_lines_are_edited_and_kept(terminal: Terminal, tmp_path: Path, handset_build) -> None:
    """Arrow keys move, names are completed, and the next handset knows the last lines."""
    terminal.type(b"show sb\x1b[D\x1b[Du\x1b[C\x1b[C\x08\n")
    terminal.until(b"no file is called us; give")
    terminal.until(PROMPT)
    terminal.type(b"conf\t\n")
    terminal.until(PROMPT)
    terminal.type(b"show usb\n")
    terminal.until(b"CONFIGURED")
    terminal.until(PROMPT)
    terminal.type(b"exit\n")
    assert terminal.end() == 0
    again = Terminal("up", "--build", str(handset_build))
    again.until(PROMPT)
    again.type(b"\x1b[A\x1b[A\n")
    again.until(b"CONFIGURED")
    # Keys count from the prompt on: before, the terminal itself edits.
    again.until(PROMPT)
    again.type(b"\x04")
    assert again.end() == 0
    kept = (tmp_path / "state" / "amt-handset" / "history").read_text().splitlines()
    assert kept[-3:] == ["show usb", "exit", "show usb"]


def test_deaths_are_told_at_the_prompt(terminal: Terminal) -> None:
    """The daemon's with its status, though nothing was typed; the sandbox's ends the program."""
    terminal.type(b"status --json\n")
    pid = json.loads(b"{" + terminal.until(b"}").partition(b"{")[2] + b"}")["daemon_pid"]
    terminal.until(PROMPT)
    with_control = find(None)
    with_control.signal(signal.SIGKILL, pid=pid)
    terminal.until(b"amt-handset: the daemon has ended with signal 9 (SIGKILL)")
    terminal.type(b"get no.such\n")
    terminal.until(b"amt-handset: the property no.such is not set")
    terminal.until(PROMPT)
    kill_init(with_control.directory)
    terminal.until(b"amt-handset: the sandbox has ended with signal 9 (SIGKILL)")
    assert terminal.end() == 1


def test_deaths_are_told_without_a_terminal(up, base: Path) -> None:
    """On standard error, with the statuses; nothing is left."""
    process = up("--path", "packet")
    handset = find(None)
    handset.log.wait("amt_handle_read_app_loop()")
    handset.signal(signal.SIGSEGV)
    assert process.stderr.readline() == "amt-handset: the daemon has ended with status 0\n"
    kill_init(handset.directory)
    assert process.wait(PATIENCE) == 1
    assert process.stderr.read() == (
        "amt-handset: the sandbox has ended with signal 9 (SIGKILL)\n")
    assert list(base.iterdir()) == []


ASKED_WHILE_LOOKING = """
import os, signal
from amt_simulator import prompt


class Handset:
    asked = looked = 0
    death = ""

    @property
    def is_up(self):
        self.asked += 1
        os.kill(os.getpid(), signal.SIGTERM)
        sum(range(1000))
        self.looked += 1
        return True

    def exits(self):
        return []


end = prompt.End()
signal.signal(signal.SIGTERM, end)
handset = Handset()
prompt.serve(handset, None, end)
print(handset.asked, handset.looked, end.is_asked)
"""


def test_an_end_that_is_asked_for_leaves_nothing_half_done() -> None:
    """A look at the sandbox takes a lock; interrupted in there, the end would wait for it."""
    done = subprocess.run([sys.executable, "-c", ASKED_WHILE_LOOKING], cwd=PROJECT, text=True,
                          stdin=subprocess.DEVNULL, capture_output=True, timeout=PATIENCE,
                          check=False)
    assert (done.stdout, done.stderr) == ("1 1 True\n", "")


def kill_init(directory: Path) -> None:
    """Kill process 1 of the handset in DIRECTORY, seen from the PC."""
    for entry in (entry for entry in Path("/proc").iterdir() if entry.name.isdigit()):
        try:
            is_init = f"NSpid:\t{entry.name}\t1\n" in (entry / "status").read_text()
            if is_init and f" {directory}/root" in (entry / "mountinfo").read_text():
                os.kill(int(entry.name), signal.SIGKILL)
                return
        except OSError:
            continue
    raise AssertionError("there is no init")
