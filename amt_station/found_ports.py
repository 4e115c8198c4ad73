"""The serial ports of this computer: which there are, who holds one, and the one that is meant."""

from __future__ import annotations

import os
import re
import time
from dataclasses import dataclass
from pathlib import Path
from typing import Collection

from amt_station.errors import NoPort, UsageProblem

_VID_PID = re.compile(r"([0-9A-Fa-f]{4}):([0-9A-Fa-f]{4})", re.ASCII)
_LOOK_SECONDS = 0.1
PROC = Path("/proc")
_PSEUDO_TERMINALS = "/dev/pts/"


@dataclass(frozen=True)
class FoundPort:
    """A port as the system describes it; ids are None for one that is not on USB."""

    device: str
    description: str = ""
    vid: int | None = None
    pid: int | None = None
    serial: str = ""
    location: str = ""

    @property
    def usb(self) -> bool:
        """Whether it belongs to a USB device, as a handset's does."""
        return self.vid is not None

    @property
    def vid_pid(self) -> str:
        """The ids as they are written; empty for a port that is not on USB."""
        return f"{self.vid:04x}:{self.pid or 0:04x}" if self.vid is not None else ""


@dataclass(frozen=True)
class Holder:
    """A process that has a port open."""

    pid: int
    command: str

    def __str__(self) -> str:
        return f"{self.command} ({self.pid})"


def found_ports() -> list[FoundPort]:
    """Every port that pySerial finds, by device name."""
    from serial.tools import list_ports

    return sorted((FoundPort(port.device, port.description or "", port.vid, port.pid,
                             port.serial_number or "", port.location or "")
                   for port in list_ports.comports()), key=lambda port: port.device)


def holders(device: str, proc: Path = PROC) -> list[Holder]:
    """The processes that have ``device`` open, of those that this user may look at."""
    path = os.path.realpath(device)
    try:
        node = os.stat(path)
    except OSError:
        return []
    return [_holder(process) for process in _processes(proc)
            if int(process.name) != os.getpid() and _has_open(process, path, node)]


def is_pseudo_terminal(device: str) -> bool:
    """Whether there is a program at the other end, which has the port open by right."""
    return os.path.realpath(device).startswith(_PSEUDO_TERMINALS)


def running(commands: Collection[str], proc: Path = PROC) -> list[Holder]:
    """The processes that go by one of these names."""
    return [_holder(process) for process in _processes(proc) if _command(process) in commands]


def _processes(proc: Path) -> list[Path]:
    """The directory of every process that is shown here, by number."""
    return sorted(proc.glob("[0-9]*"), key=lambda process: int(process.name))


def _holder(process: Path) -> Holder:
    return Holder(int(process.name), _command(process))


def _has_open(process: Path, path: str, node: os.stat_result) -> bool:
    """Another container may have another device of the same name."""
    try:
        return any(os.readlink(entry.path) == path and os.path.samestat(os.stat(entry.path), node)
                   for entry in os.scandir(process / "fd"))
    except OSError:
        return False


def _command(process: Path) -> str:
    try:
        return (process / "comm").read_text(encoding="utf-8", errors="backslashreplace").strip()
    except OSError:
        return "?"


@dataclass(frozen=True)
class Wanted:
    """Which USB port is meant: any, or the one with this serial number or these ids."""

    serial: str = ""
    vid_pid: str = ""

    def __post_init__(self) -> None:
        if self.vid_pid and not _VID_PID.fullmatch(self.vid_pid):
            raise UsageProblem(f"{self.vid_pid!r} is not VID:PID, two numbers of four hexadecimal "
                               "digits")

    def __str__(self) -> str:
        parts = ([f"serial number {self.serial}"] if self.serial else [])
        parts += [f"ids {self.vid_pid}"] if self.vid_pid else []
        return f"with {' and '.join(parts)}" if parts else "on USB"

    def fits(self, port: FoundPort) -> bool:
        """Whether a port may be the one."""
        return (port.usb and self.serial in ("", port.serial)
                and self.vid_pid.lower() in ("", port.vid_pid))

    def find(self) -> FoundPort:
        """The only port that fits; none is ``NoPort``, several are usage."""
        fitting = [port for port in found_ports() if self.fits(port)]
        if not fitting:
            raise NoPort(f"no port {self} is there")
        if len(fitting) > 1:
            names = ", ".join(f"{port.device} ({port.serial or port.vid_pid})" for port in fitting)
            raise UsageProblem(f"several ports {self}: {names}; choose one with -p, --serial or "
                               "--vid-pid")
        return fitting[0]

    def wait(self, timeout: float) -> FoundPort:
        """The only port that fits, as soon as it is there within ``timeout`` seconds."""
        end = time.monotonic() + timeout
        while True:
            try:
                return self.find()
            except NoPort:
                if time.monotonic() >= end:
                    raise
            time.sleep(_LOOK_SECONDS)
