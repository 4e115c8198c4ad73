"""Ports of the PC, connected with lines of the handset: pseudo-terminals that programs can open.

The PC's side makes the pseudo-terminal and hands its master in here.
"""

import os
import select
import struct
from typing import Callable

from amt_simulator.inside.lines import READ_SIZE, AppLine, NoLine
from amt_simulator.inside.loop import Loop

LOOK_SECONDS = 0.02
# Of inotify: opened; closed, whether written to or not; an event without a name.
OPENED, CLOSED = 0x20, 0x18
EVENT = struct.Struct("iIII")
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

    So the daemon hears of a program that comes and goes as it hears of its app. WATCH is an inotify
    descriptor of the PC's side, which sees the port being opened and closed.
    """

    def __init__(self, loop: Loop, master: int, watch: int, line: AppLine) -> None:
        self._loop = loop
        self._master = master
        self._watch = watch
        self._line = line
        self._slave = -1
        self._passed = ""
        for fd in (master, watch):
            os.set_blocking(fd, False)
        loop.watch(watch, self._look)

    def _look(self) -> None:
        """See whether programs have come or gone."""
        is_closed = is_reopened = False
        for mask in self._events():
            is_closed = is_closed or bool(mask & CLOSED)
            is_reopened = is_closed and bool(mask & OPENED)
        is_open = self._port_is_open()
        if self._slave >= 0 and is_closed and (is_reopened or not is_open):
            if not is_open:
                self._copy(self._master, self._slave)
            self._disconnect()
        if is_open and self._slave < 0:
            self._connect()

    def _events(self) -> list[int]:
        try:
            data = os.read(self._watch, READ_SIZE)
        except BlockingIOError:
            return []
        # Events of a watched file have no name: each is as long as its fixed part.
        return [mask for _, mask, _, _ in EVENT.iter_unpack(data)]

    def _port_is_open(self) -> bool:
        poller = select.poll()
        poller.register(self._master, 0)
        return not poller.poll(0)

    def _connect(self) -> None:
        """Open the app line for the program, as soon as the daemon has published it (again)."""
        if self._slave >= 0 or not self._port_is_open():
            return
        try:
            self._slave = self._line.open(self._passed)
        except NoLine:
            self._loop.after(LOOK_SECONDS, self._connect)
            return
        self._passed = self._line.identity()
        self._loop.watch(self._master, self._from_port)
        self._loop.watch(self._slave, self._from_line)

    def _disconnect(self) -> None:
        self._loop.watch(self._master, None)
        if self._slave >= 0:
            self._loop.watch(self._slave, None)
            os.close(self._slave)
            self._slave = -1

    def _from_port(self) -> None:
        # What a new program says must not go to the app line that an old one has left.
        self._look()
        if self._slave >= 0 and not self._copy(self._master, self._slave):
            self._disconnect()

    def _from_line(self) -> None:
        if not self._copy(self._slave, self._master):
            # The daemon has gone; a program that stays is connected to the next one.
            self._disconnect()
            self._connect()

    @staticmethod
    def _copy(source: int, target: int) -> bool:
        """Pass on what is there; False when one of the sides is gone."""
        try:
            data = read_all(source)
            os.write(target, data)
        except BlockingIOError:
            # Nobody reads there; a line without flow control loses it.
            return True
        except OSError:
            return False
        return bool(data)
