"""A pseudo-terminal that stands for a handset's port: its far end for this program."""

from __future__ import annotations

import errno
import fcntl
import os
import select
import struct
import termios
import time
import tty
from pathlib import Path

from amt_station.errors import UsageProblem

_CHUNK = 1 << 16
_LOOK_SECONDS = 0.02


class Terminal:
    """The far end of a port; ``link`` is a name under which the port is found, too."""

    def __init__(self, link: Path | None = None) -> None:
        self.link = link
        self._master = self._slave = -1
        self._stop_read, self._stop_write = os.pipe()
        self.path = ""
        try:
            self.plug()
        except BaseException:
            self.close()
            raise

    @property
    def name(self) -> str:
        """What a station gives as its port."""
        return str(self.link) if self.link is not None else self.path

    @property
    def is_plugged(self) -> bool:
        """Whether the port is there."""
        return self._master >= 0

    def plug(self) -> None:
        """Let the port be there, after ``unplug`` as a new one."""
        self._master, self._slave = os.openpty()
        tty.setraw(self._slave)
        os.set_blocking(self._master, False)
        self.path = os.ttyname(self._slave)
        if self.link is not None:
            try:
                self.link.symlink_to(self.path)
            except OSError as error:
                raise UsageProblem(f"--link {self.link}: {error.strerror}") from error

    def unplug(self) -> None:
        """Take the port away; who has it open sees a hang-up."""
        if self._master < 0:
            return
        if self.link is not None and _leads_to(self.link, self.path):
            self.link.unlink(missing_ok=True)
        self.let_go()
        os.close(self._master)
        self._master = -1

    def let_go(self) -> None:
        """Keep the port open no longer on the station's side, so that its closing is seen."""
        slave, self._slave = self._slave, -1
        if slave >= 0:
            os.close(slave)

    def stop(self) -> None:
        """Let every wait end now, in whatever thread."""
        os.write(self._stop_write, b"x")

    def is_stopped(self, seconds: float = 0.0) -> bool:
        """Whether ``stop`` was said, within so many seconds."""
        return bool(_polled({self._stop_read: select.POLLIN}, seconds))

    def read(self, timeout: float | None) -> bytes | None:
        """What the station has sent; empty when time is up, None when stopped or hung up."""
        ready = _polled({self._master: select.POLLIN, self._stop_read: select.POLLIN}, timeout)
        if self._stop_read in ready:
            return None
        if not ready:
            return b""
        try:
            return os.read(self._master, _CHUNK)
        except OSError as error:
            if error.errno == errno.EIO:
                return None
            raise

    def write(self, data: bytes, timeout: float | None) -> bytes:
        """Let the station hear ``data``; returns what it did not take in time."""
        end = None if timeout is None else time.monotonic() + timeout
        while data:
            left = None if end is None else max(0.0, end - time.monotonic())
            ready = _polled({self._master: select.POLLOUT, self._stop_read: select.POLLIN}, left)
            if self._stop_read in ready or not ready:
                break
            try:
                data = data[os.write(self._master, data):]
            except BlockingIOError:
                continue
            except OSError as error:
                if error.errno == errno.EIO:
                    break  # nobody has the port open
                raise
        return data

    def wait_read(self) -> None:
        """Wait until the station has read everything."""
        while self._slave >= 0:
            waiting = fcntl.ioctl(self._slave, termios.FIONREAD, bytes(4))
            if not struct.unpack("i", waiting)[0] or self.is_stopped(_LOOK_SECONDS):
                return

    def wait_closed(self) -> bytes:
        """Wait until nobody has the port open; or what the station says instead of closing it."""
        self.let_go()
        while not self.is_stopped(_LOOK_SECONDS):
            happened = _polled({self._master: select.POLLIN}, 0.0).get(self._master, 0)
            if happened & select.POLLIN:
                return self.read(0.0) or b""
            if happened & select.POLLHUP:
                break
        return b""

    def close(self) -> None:
        """Give everything back; a port that is there goes away."""
        self.unplug()
        for descriptor in (self._stop_read, self._stop_write):
            os.close(descriptor)


def _polled(wanted: dict[int, int], seconds: float | None) -> dict[int, int]:
    """The descriptors at which something happens within so many seconds, and what."""
    poll = select.poll()
    for descriptor, events in wanted.items():
        poll.register(descriptor, events)
    return dict(poll.poll(None if seconds is None else seconds * 1000))


def _leads_to(link: Path, path: str) -> bool:
    try:
        return os.readlink(link) == path
    except OSError:
        return False
