"""Calls of the platform that last as long as a test wants."""

import os
from typing import Callable

from amt_simulator import Handset
from amt_simulator.waiting import wait_until


class HeldCall:
    """Calls of a stand-in's function wait: their script is a pipe that nobody writes to."""

    def __init__(self, handset: Handset, function: str) -> None:
        self._path = handset.path(f"/handset/answers/{function}")
        self._path.unlink(missing_ok=True)
        os.mkfifo(self._path)
        self._function = function

    def release(self) -> None:
        """Wait until a call waits, and let it return 0."""
        wait_until(self._let_go, f"a call of {self._function}")

    def release_until(self, finished: Callable[[], bool]) -> None:
        """Let calls return 0 until all is FINISHED."""
        wait_until(lambda: finished() or (self._let_go() and None), "the end of all calls")

    def _let_go(self) -> bool:
        """Whether some call waited."""
        try:
            fd = os.open(self._path, os.O_WRONLY | os.O_NONBLOCK | os.O_CLOEXEC)
        except OSError:
            return False
        os.write(fd, b"0\n")
        os.close(fd)
        return True
