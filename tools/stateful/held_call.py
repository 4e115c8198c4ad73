"""A call of the platform that lasts as long as a run wants."""

import os

from amt_simulator import Handset
from amt_simulator.waiting import wait_until


class HeldCall:
    """The next call of a stand-in's function waits: its script is a pipe that nobody writes to."""

    def __init__(self, handset: Handset, function: str) -> None:
        self._handset = handset
        self._function = function
        self._path = handset.path(f"/handset/answers/{function}")
        self._path.unlink(missing_ok=True)
        os.mkfifo(self._path)
        self._fd = -1

    def wait(self) -> None:
        """Wait until the call waits."""
        wait_until(self._is_read, f"a call of {self._function}")

    def _is_read(self) -> bool:
        try:
            self._fd = os.open(self._path, os.O_WRONLY | os.O_NONBLOCK | os.O_CLOEXEC)
        except OSError:
            return False
        return True

    def release(self) -> None:
        """Let the call return 0, and those behind it."""
        self._handset.answer(self._function, "0")
        os.write(self._fd, b"0\n")
        os.close(self._fd)
