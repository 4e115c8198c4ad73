"""Ports of the PC, connected with lines of the handset: pseudo-terminals that programs can open.

The PC's side makes the pseudo-terminal and hands its descriptors in here.
"""

import os
import select
import struct

from amt_simulator.inside.endpoint import MOST_WAITING, READ_SIZE, Endpoint
from amt_simulator.inside.lines import AppLine, NoLine
from amt_simulator.inside.loop import Loop

LOOK_SECONDS = 0.02
# Of inotify: opened; closed, whether written to or not; an event without a name.
OPENED, CLOSED = 0x20, 0x18
EVENT = struct.Struct("iIII")


class Port:
    """A port that is held open here, so that programs may come and go unnoticed.

    A port that nobody reads loses what is too much, the oldest first.
    """

    def __init__(self, loop: Loop, master: int, slave: int) -> None:
        self._fds = (master, slave)
        self.end = Endpoint(loop, master)

    def close(self) -> None:
        """Take the port away: a program that holds it sees the hang-up."""
        self.end.close()
        for fd in self._fds:
            os.close(fd)


class AppRelay:
    """A port for the app: the handset's app line is open exactly while a program has the port open.

    So the daemon hears of a program that comes and goes as it hears of its app. WATCH is an inotify
    descriptor of the PC's side, which sees the port being opened and closed.
    """

    def __init__(self, loop: Loop, master: int, watch: int, line: AppLine) -> None:
        self._loop = loop
        self._master = master
        self._port = Endpoint(loop, master)
        self._watch = watch
        self._line = line
        self._slave = -1
        self._daemon: Endpoint | None = None
        self._passed = ""
        os.set_blocking(watch, False)
        loop.watch(watch, self._look)

    def _look(self) -> None:
        """See whether programs have come or gone."""
        is_closed = is_reopened = False
        for mask in self._events():
            is_closed = is_closed or bool(mask & CLOSED)
            is_reopened = is_closed and bool(mask & OPENED)
        is_open = self._port_is_open()
        if self._daemon and is_closed and (is_reopened or not is_open):
            if not is_open:
                self._daemon.say(self._port.read())
            self._disconnect()
        if is_open and not self._daemon:
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
        if self._daemon or not self._port_is_open():
            return
        try:
            self._slave = self._line.open(self._passed)
        except NoLine:
            self._loop.after(LOOK_SECONDS, self._connect)
            return
        self._passed = self._line.identity()
        self._daemon = Endpoint(self._loop, self._slave)
        self._daemon.watch(self._from_daemon)
        self._port.watch(self._from_port)

    def _disconnect(self) -> None:
        self._port.watch(None)
        self._port.forget()
        if self._daemon:
            self._daemon.close()
            self._daemon = None
            os.close(self._slave)

    def _from_port(self) -> None:
        # What a new program says must not go to the app line that an old one has left.
        self._look()
        if not self._daemon:
            return
        data = self._port.read()
        if not data:
            self._disconnect()
            return
        self._daemon.say(data)
        if self._daemon.waiting >= MOST_WAITING // 2:
            # Whoever writes to the port has to wait, as for an app line that is not read.
            self._port.watch(None)
            self._daemon.when_said(lambda: self._port.watch(self._from_port))

    def _from_daemon(self) -> None:
        assert self._daemon is not None
        data = self._daemon.read()
        if data:
            self._port.say(data)
        else:
            # The daemon has gone; a program that stays is connected to the next one.
            self._disconnect()
            self._connect()
