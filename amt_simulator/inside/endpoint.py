"""An end of a tty in init's loop: what arrives is heard, what is said waits for room."""

import os
from typing import Callable

from amt_simulator.inside.loop import Loop

READ_SIZE = 4096
# So much is read at once at most, and twice as much may wait to be said.
MOST_READ = 1 << 15
MOST_WAITING = 2 * MOST_READ


class Endpoint:
    """A descriptor that nobody ever waits for. It stays its maker's."""

    def __init__(self, loop: Loop, fd: int) -> None:
        os.set_blocking(fd, False)
        self._loop = loop
        self._fd = fd
        self._waiting = b""
        self._on_arrival: Callable[[], None] | None = None
        self._on_said: Callable[[], None] | None = None

    @property
    def waiting(self) -> int:
        """How many bytes wait for room."""
        return len(self._waiting)

    def listen(self, listener: Callable[[bytes], None] | None) -> None:
        """Hand what arrives to LISTENER; without one, leave it to other holders of the line."""
        def hear() -> None:
            data = self.read()
            if data and listener:
                listener(data)

        self.watch(hear if listener else None)

    def watch(self, on_arrival: Callable[[], None] | None) -> None:
        """Call back when there is something to read."""
        self._on_arrival = on_arrival
        self._update()

    def read(self) -> bytes:
        """Everything that is there; a request that arrived in pieces goes on in one.

        Nothing at all when there is nothing, or nobody at the other end.
        """
        data = b""
        while len(data) < MOST_READ:
            try:
                piece = os.read(self._fd, READ_SIZE)
            except OSError:
                break
            if not piece:
                break
            data += piece
        return data

    def say(self, data: bytes) -> None:
        """Say DATA, now or as soon as there is room; where nobody reads, the oldest is lost."""
        self._waiting = (self._waiting + data)[-MOST_WAITING:]
        self._flush()

    def when_said(self, callback: Callable[[], None]) -> None:
        """Call back once, when nothing waits any more."""
        self._on_said = callback
        self._update()

    def forget(self) -> None:
        """Do not say what still waits."""
        self._waiting = b""
        self._flush()

    def close(self) -> None:
        """Take the descriptor out of the loop."""
        self._loop.watch(self._fd, None)

    def _update(self) -> None:
        is_busy = self._waiting or self._on_said
        self._loop.watch(self._fd, self._on_arrival, self._flush if is_busy else None)

    def _flush(self) -> None:
        try:
            if self._waiting:
                self._waiting = self._waiting[os.write(self._fd, self._waiting):]
        except BlockingIOError:
            pass
        except OSError:
            # Nobody is left who could read it.
            self._waiting = b""
        callback = self._on_said
        if not self._waiting and callback:
            self._on_said = None
            callback()
        self._update()
