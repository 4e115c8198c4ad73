"""The handset's ttys: pseudo-terminals under the names that the daemon is configured with."""

import errno
import os
import termios
import tty
from typing import Callable

from amt_simulator.inside.endpoint import MOST_WAITING, Endpoint
from amt_simulator.inside.loop import Loop


class NoLine(Exception):
    """The line is not there (hung up, absent, not published by the daemon), or nobody reads it."""


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
        self._end: Endpoint | None = None

    @property
    def is_up(self) -> bool:
        """Whether the tty exists."""
        return self._end is not None

    def connect(self) -> None:
        """Make the tty, raw and without echo, under its name."""
        if self.is_up:
            return
        try:
            self._master, self._slave = os.openpty()
        except OSError as error:
            raise OSError(error.errno, "this system gives no pseudo-terminal for the line "
                                       f"{self.name}: {error.strerror}") from None
        tty.setraw(self._slave)
        self._end = Endpoint(self._loop, self._master)
        # The slave stays open here: the master must not see a hang-up while nobody serves the tty.
        place_link(self.path, os.ttyname(self._slave))

    def hang_up(self) -> None:
        """Take the tty away: whoever holds it gets EIO, its name is gone."""
        if self._end is None:
            return
        self._end.close()
        self._end = None
        os.unlink(self.path)
        for fd in (self._master, self._slave):
            os.close(fd)

    def listen(self, listener: Callable[[bytes], None] | None) -> None:
        """Hand what arrives to LISTENER; without one, leave it to the master's other holders."""
        if self._end:
            self._end.listen(listener)

    def send(self, data: bytes) -> None:
        """Say DATA on the line, now or as soon as there is room for it."""
        end = self._there()
        if end.waiting + len(data) > MOST_WAITING:
            raise NoLine(f"nobody reads {self.name}: {end.waiting} bytes are waiting already")
        end.say(data)

    @property
    def is_full(self) -> bool:
        """Whether whoever has more to say should wait until all has been said."""
        return self._end is not None and self._end.waiting >= MOST_WAITING // 2

    def when_said(self, callback: Callable[[], None]) -> None:
        """Call back once, when all has been said that waits, unless the line goes away first."""
        self._there().when_said(callback)

    def later(self, seconds: float, callback: Callable[[], None]) -> None:
        """Call back once, so many SECONDS from now, whatever becomes of the line."""
        self._loop.after(seconds, callback)

    def master(self) -> int:
        """The master side, to be handed out."""
        self._there()
        return self._master

    def discard_input(self) -> None:
        """Forget what the daemon has not read, as a tty does when its last user closes it."""
        if self._end:
            self._end.forget()
            termios.tcflush(self._slave, termios.TCIFLUSH)

    def _there(self) -> Endpoint:
        if self._end is None:
            raise NoLine(f"{self.name} is hung up or absent")
        return self._end


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
