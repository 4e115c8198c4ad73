"""Ports of the PC, connected with lines of the handset: pseudo-terminals that programs can open.

The PC's side makes the pseudo-terminal and hands its master in here.
"""

import errno
import os
import select
from typing import Callable

from .lines import READ_SIZE, AppLine, NoLine
from .loop import Loop

LOOK_SECONDS = 0.02
FULL = 1 << 16


class PortRelay:
    """A port whose other side is held open on the PC, so that programs may come and go."""

    def __init__(self, loop: Loop, master: int) -> None:
        os.set_blocking(master, False)
        self._loop = loop
        self._master = master
        self._waiting = b""
        self._listener: Callable[[bytes], None] | None = None

    def listen(self, listener: Callable[[bytes], None] | None) -> None:
        """Hand what a program writes to LISTENER; without one, leave it in the port."""
        self._listener = listener
        self._watch()

    def send(self, data: bytes) -> None:
        """Give DATA to whoever reads the port; a port that nobody reads loses what is too much."""
        self._waiting = (self._waiting + data)[-FULL:]
        self._flush()

    def _watch(self) -> None:
        self._loop.watch(self._master, self._receive if self._listener else None,
                         self._flush if self._waiting else None)

    def _receive(self) -> None:
        data = read_all(self._master)
        if data and self._listener:
            self._listener(data)

    def _flush(self) -> None:
        try:
            self._waiting = self._waiting[os.write(self._master, self._waiting):]
        except BlockingIOError:
            pass
        self._watch()


def read_all(fd: int) -> bytes:
    """Everything that is there; a request that arrived in pieces goes on in one."""
    data = b""
    while len(data) < FULL:
        try:
            piece = os.read(fd, READ_SIZE)
        except BlockingIOError:
            break
        if not piece:
            break
        data += piece
    return data


class AppRelay:
    """A port for the app: the handset's app line is open exactly while a program has the port open.

    So the daemon hears of a program that comes and goes as it hears of its app.
    """

    def __init__(self, loop: Loop, master: int, line: AppLine) -> None:
        os.set_blocking(master, False)
        self._loop = loop
        self._master = master
        self._line = line
        self._slave = -1
        self._passed = ""
        self._look()

    def _look(self) -> None:
        """Connect when a program has opened the port and the daemon has published its line."""
        if not self._port_is_open():
            self._again()
            return
        try:
            self._slave = self._line.open(self._passed)
        except NoLine:
            self._again()
            return
        self._passed = self._line.identity()
        self._loop.watch(self._master, lambda: self._copy(self._master, self._slave))
        self._loop.watch(self._slave, lambda: self._copy(self._slave, self._master))

    def _again(self) -> None:
        self._loop.after(LOOK_SECONDS, self._look)

    def _port_is_open(self) -> bool:
        poller = select.poll()
        poller.register(self._master, 0)
        return not poller.poll(0)

    def _copy(self, source: int, target: int) -> None:
        try:
            data = read_all(source)
            if not data:
                raise OSError(errno.EIO, "the other side is gone")
            os.write(target, data)
        except BlockingIOError:
            # Nobody reads there; a line without flow control loses it.
            pass
        except OSError:
            self._disconnect()

    def _disconnect(self) -> None:
        for fd in (self._master, self._slave):
            self._loop.watch(fd, None)
        os.close(self._slave)
        self._slave = -1
        self._again()
