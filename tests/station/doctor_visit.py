"""A PC of a test's own for the doctor: its processes, programs and clock are what the test says."""

from __future__ import annotations

import os
from dataclasses import replace
from pathlib import Path
from typing import Any, Callable

import pytest

from amt_station.cli import doctor
from amt_station.doctor.checks import examine
from amt_station.doctor.computer import Computer
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding
from amt_station.port import FdPort, Port, SerialPort
from amt_station.requests.model import Channel

# What never comes is waited for so long.
SHORT = 0.3


class FakeComputer:
    """All is well on it until the test says otherwise."""

    def __init__(self, root: Path) -> None:
        self._root = root
        self._programs = root / "programs"
        self._programs.mkdir(parents=True)
        self.computer = Computer(
            proc=root / "proc", search_path=str(self._programs), clock_is_kept=lambda: True,
            free_bytes=lambda path: 10**12)
        self.process(1, "init")
        self.systemctl({})
        self.program("udevadm", "true")

    def set(self, **values: Any) -> None:
        """Let some of it be otherwise."""
        self.computer = replace(self.computer, **values)

    def process(self, pid: int, command: str, opens: str = "") -> None:
        """A process, with a file that it has open."""
        directory = self.computer.proc / str(pid)
        (directory / "fd").mkdir(parents=True)
        (directory / "comm").write_text(f"{command}\n", encoding="ascii")
        if opens:
            (directory / "fd" / "3").symlink_to(opens)

    def hide_processes(self) -> None:
        """As a /proc that shows a user's own processes only."""
        (self.computer.proc / "1" / "comm").unlink()

    def program(self, name: str, script: str) -> None:
        """A program: a shell script."""
        path = self._programs / name
        path.write_text(f"#!/bin/sh\n{script}\n", encoding="ascii")
        path.chmod(0o755)

    def systemctl(self, states: dict[str, str]) -> None:
        """What systemd says of its units; others are not installed."""
        rows = "".join(f"{unit}) echo '{state}';;\n" for unit, state in states.items())
        self.program("systemctl", f'case $2 in {rows} *) echo "Failed to get unit file state for '
                     '$2: No such file or directory" >&2; exit 1;; esac')

    def without(self, name: str) -> None:
        """Take a program away."""
        (self._programs / name).unlink()

    def port(self) -> Port:
        """A port that nobody serves."""
        return FdPort(os.open(os.devnull, os.O_RDWR), owned=True)

    def install(self, monkeypatch: pytest.MonkeyPatch, state: Path) -> None:
        """Let the command look at this PC, with a state directory of its own."""
        monkeypatch.setenv("XDG_STATE_HOME", str(state))
        for name in [name for name in os.environ if name.startswith("AMT_STATION_")]:
            monkeypatch.delenv(name)
        monkeypatch.setattr(doctor, "Examination", self._examination)

    def _examination(self, *arguments: Any) -> Examination:
        made = Examination(*arguments)
        made.computer = self.computer
        return made


def visit(url: str, fake: FakeComputer, channel: Channel = Channel.PC,
          open_port: Callable[[str], Port] = SerialPort,
          records: Path | None = None) -> Examination:
    """A visit to a port of this PC that does not wait long."""
    return Examination(lambda: url, open_port, channel, timeout=SHORT, records=records,
                       computer=fake.computer)


def examined(url: str, fake: FakeComputer, **more: Any) -> list[tuple[str, Finding]]:
    """Everything that is found, but for the store."""
    from amt_station.doctor.checks import CHECKS

    made = visit(url, fake, **more)
    try:
        return list(examine(made, [check for check in CHECKS if check.name != "store"]))
    finally:
        made.close()
