"""The handset's ttys: pseudo-terminals under the names that the daemon is configured with."""

import errno
import os
import termios
import tty
from typing import Callable

from amt_simulator.inside.loop import Loop

READ_SIZE = 4096


class NoLine(Exception):
    """The line is not there: hung up, absent, or not published by the daemon."""


def place_link(path: str, target: str) -> None:
    """Make PATH a link to TARGET, whatever stood there before."""
    os.makedirs(os.path.dirname(path), exist_ok=True)
    if os.path.lexists(path):
        os.unlink(path)
    os.symlink(target, path)


class Line:
    """A tty of the handset; its master side stays here, or goes out to whoever asks for it."""

    def __init__(self, loop: Loop, name: str, path: str) -> None:
        self.name = name
        self.path = path
        self._loop = loop
        self._master = -1
        self._slave = -1
        self._waiting = b""
        self._listener: Callable[[bytes], None] | None = None

    @property
    def is_up(self) -> bool:
        """Whether the tty exists."""
        return self._master >= 0

    def connect(self) -> None:
        """Make the tty, raw and without echo, under its name."""
        if self.is_up:
            return
        self._master, self._slave = os.openpty()
        tty.setraw(self._slave)
        os.set_blocking(self._master, False)
        # The slave stays open here: the master must not see a hang-up while nobody serves the tty.
        place_link(self.path, os.ttyname(self._slave))
        self._watch()

    def hang_up(self) -> None:
        """Take the tty away: whoever holds it gets EIO, its name is gone."""
        if not self.is_up:
            return
        self._loop.watch(self._master, None)
        os.unlink(self.path)
        for fd in (self._master, self._slave):
            os.close(fd)
        self._master = self._slave = -1
        self._waiting = b""

    def listen(self, listener: Callable[[bytes], None] | None) -> None:
        """Hand what arrives to LISTENER; without one, leave it to the master's other holders."""
        self._listener = listener
        if self.is_up:
            self._watch()

    def send(self, data: bytes) -> None:
        """Say DATA on the line, now or as soon as there is room."""
        if not self.is_up:
            raise NoLine(f"{self.name} is hung up")
        self._waiting += data
        self._flush()

    def master(self) -> int:
        """The master side, to be handed out."""
        if not self.is_up:
            raise NoLine(f"{self.name} is hung up or absent")
        return self._master

    def discard_input(self) -> None:
        """Forget what the daemon has not read, as a tty does when its last user closes it."""
        if self.is_up:
            termios.tcflush(self._slave, termios.TCIFLUSH)

    def _watch(self) -> None:
        self._loop.watch(self._master, self._receive if self._listener else None,
                         self._flush if self._waiting else None)

    def _receive(self) -> None:
        try:
            data = os.read(self._master, READ_SIZE)
        except BlockingIOError:
            return
        if data and self._listener:
            self._listener(data)

    def _flush(self) -> None:
        try:
            self._waiting = self._waiting[os.write(self._master, self._waiting):]
        except BlockingIOError:
            pass
        self._watch()


class AppLine:
    """The line that the daemon publishes itself; here it is only opened for the outside."""

    def __init__(self, path: str) -> None:
        self.path = path

    def identity(self) -> str:
        """Tells one publication from the next, empty when there is none."""
        try:
            status = os.lstat(self.path)
            return f"{os.readlink(self.path)} {status.st_ino} {status.st_ctime_ns}"
        except OSError:
            return ""

    def open(self, passed: str = "") -> int:
        """Open the slave side; not the publication PASSED, which the caller has left before."""
        if not self.path or self.identity() in ("", passed):
            raise NoLine("the daemon has not published the app line")
        try:
            return os.open(self.path, os.O_RDWR | os.O_NOCTTY | os.O_CLOEXEC | os.O_NONBLOCK)
        except OSError as error:
            # A daemon that was killed leaves its link behind, and nothing at its end.
            raise NoLine(f"the app line is gone: {errno.errorcode[error.errno or 0]}") from error
