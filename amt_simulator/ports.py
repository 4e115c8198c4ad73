"""Ports of the PC that lead into the handset, under stable paths in its directory."""

import ctypes
import os
import tty
from pathlib import Path

from amt_simulator.client import Client

CLOSE_ON_EXEC = 0x80000
OPEN_AND_CLOSE = 0x20 | 0x18


def _watch(path: str) -> int:
    """An inotify descriptor that tells when PATH is opened or closed."""
    library = ctypes.CDLL(None, use_errno=True)
    watch = int(library.inotify_init1(CLOSE_ON_EXEC))
    if watch < 0 or library.inotify_add_watch(watch, path.encode(), OPEN_AND_CLOSE) < 0:
        code = ctypes.get_errno()
        raise OSError(code, f"inotify on {path}: {os.strerror(code)}")
    return watch


class Port:
    """A pseudo-terminal of the PC that the handset's init connects with one of its lines."""

    def __init__(self, client: Client, name: str, path: Path) -> None:
        self.path = path
        master, self._slave = os.openpty()
        given = [master]
        tty.setraw(self._slave)
        path.symlink_to(os.ttyname(self._slave))
        try:
            if name == "app":
                # The daemon is to hear of each program that opens and closes the app's port; the
                # others' ports stay open here, programs come and go unnoticed.
                given.append(_watch(os.ttyname(self._slave)))
                self.close()
            client.give_fds("relay", given, line=name)
        finally:
            for fd in given:
                os.close(fd)

    def close(self) -> None:
        """Take the port away."""
        if self._slave >= 0:
            os.close(self._slave)
            self._slave = -1
