"""What can be done with a handset that is up: its daemon, its commands, its lines, its devices."""

import json
import re
import signal as signals
from dataclasses import dataclass
from pathlib import Path
from typing import Mapping, Sequence

from amt_simulator.client import Client
from amt_simulator.errors import HandsetTimeout
from amt_simulator.files import HandsetFiles
from amt_simulator.line import AppLine, Line
from amt_simulator.usb import Usb
from amt_simulator.waiting import scaled, wait_until

STORY_LINES = 8
RECORD = re.compile(r"^\S+ (?P<what>start|exit) #(?P<number>\d+) pid (?P<pid>\d+): (?P<how>.*)$")


@dataclass(frozen=True)
class Completed:
    """A command that ran in the handset; a status below 0 is the signal that ended it."""

    status: int
    stdout: bytes
    stderr: bytes


@dataclass(frozen=True)
class ProcessInfo:
    """A look at a process of the handset."""

    pid: int
    command: list[str]
    state: str
    # Thread id to its name, state and the kernel function that it waits in.
    threads: dict[int, dict[str, str]]
    descriptors: dict[int, str]
    children: list[int]
    resident_kib: int
    # Of these, the part that no file is behind: what the process has written and allocated.
    anonymous_kib: int
    policy: int


class HandsetControl(HandsetFiles):
    """A handset that is up, from whatever process."""

    client: Client

    def attach(self, directory: Path) -> None:
        """Control the handset in DIRECTORY."""
        super().attach(directory)
        self.client = Client(directory / "control")
        self.pc = Line(self.client, "pc")
        self.modem = Line(self.client, "modem")
        self.mux = Line(self.client, "mux")
        self.app = AppLine(self.client)
        self.usb = Usb(self.client, directory, self.log.tail)

    # the daemon

    @property
    def pid(self) -> int:
        """The daemon's process id in the handset; 0 while it does not run."""
        return int(self.client.ask("daemon")["pid"])

    def start(self) -> int:
        """Have init start the daemon unless it runs; returns its process id."""
        return int(self.client.ask("start")["pid"])

    def signal(self, number: int, tid: int = 0, pid: int = 0) -> None:
        """Send a signal to the daemon (or the process PID), or to one of its threads."""
        self.client.ask("signal", signal=int(number), tid=tid, pid=pid)

    def stop(self, number: int = signals.SIGTERM, timeout: float | None = None) -> int:
        """End the daemon by a signal, for good; returns its exit status."""
        self.set_restart(False)
        ended = len(self.exits())
        self.signal(number)
        return self.wait_exit(ended, timeout)

    def set_restart(self, on: bool) -> None:
        """Whether init starts the daemon again when it has ended."""
        self.client.ask("restart", on=on)

    def inspect(self, pid: int = 0) -> ProcessInfo:
        """Look at the daemon, or at the process PID: threads, descriptors, children, memory."""
        answer = self.client.ask("inspect", pid=pid)
        for name in ("threads", "descriptors"):
            answer[name] = {int(key): value for key, value in answer[name].items()}
        return ProcessInfo(**answer)

    def processes(self) -> dict[int, list[str]]:
        """Every process of the handset with its command line."""
        found = self.client.ask("processes")["processes"]
        return {int(pid): command for pid, command in found.items()}

    def exits(self) -> list[int]:
        """The exit statuses of the daemon so far, in order; below 0: ended by that signal."""
        records = [match for line in self.text("/handset/init.txt").splitlines()
                   if (match := RECORD.match(line))]
        numbers = {record["number"] for record in records
                   if record["what"] == "start" and record["how"].startswith("daemon: ")}
        statuses = []
        for record in records:
            if record["what"] == "exit" and record["number"] in numbers:
                kind, value = record["how"].split()
                statuses.append(int(value) if kind == "status" else -int(value))
        return statuses

    def wait_exit(self, after: int = 0, timeout: float | None = None) -> int:
        """Wait for the daemon's exit that follows the first AFTER ones; returns its status."""
        def attempt() -> tuple[int] | None:
            exits = self.exits()
            return (exits[after],) if len(exits) > after else None

        return wait_until(attempt, f"exit {after + 1} of the daemon", timeout, self.story)[0]

    def run(self, argv: Sequence[str], *, program: str = "", env: Mapping[str, str] | None = None,
            directory: str = "/", timeout: float = 10.0) -> Completed:
        """Run a command in the handset, in the daemon's environment, and wait for its end.

        PROGRAM is the file to execute when ARGV's first word is not its path.
        """
        daemon = json.loads(self.text("/handset/init.json"))["daemon"]
        seconds = scaled(timeout)
        answer = self.client.ask_slowly(
            "run", seconds, timeout=seconds, argv=list(argv), program=program,
            directory=directory, env={**daemon["env"], **(env or {})},
            no_randomize=daemon["no_randomize"])
        if answer["late"]:
            raise HandsetTimeout(f"{' '.join(argv)} did not end within {seconds:g} s")
        return Completed(answer["status"], self.read(answer["output"] + ".out"),
                         self.read(answer["output"] + ".err"))

    # devices

    def set_card(self, size: int | None) -> None:
        """Put a memory card of SIZE bytes in, or (None) take it out."""
        self.client.ask("card", size=size)

    def set_modem(self, mode: str) -> None:
        """Bring the modem into another mode."""
        self.client.ask("modem_mode", mode=mode)

    def answer_modem(self, command: str, answer: str | None) -> None:
        """Replace the modem's answer to a whole command line; None: as its table says."""
        self.client.ask("modem_answer", command=command, answer=answer)

    def story(self) -> str:
        """What a person wants to read when something went wrong."""
        last = {"init's record": self.text("/handset/init.txt"),
                "standard error": self.stderr().decode("utf-8", "replace")}
        return "\n".join([self.log.tail(), *(
            f"{name} ends with:\n" + "\n".join(text.splitlines()[-STORY_LINES:])
            for name, text in last.items() if text)])
