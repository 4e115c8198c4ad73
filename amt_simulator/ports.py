"""Ports of the PC that lead into the handset, under stable paths in its directory.

The handset's init holds a port open: it lasts as long as init wants it, whichever process made it.
"""

import ctypes
import os
import threading
import tty
from pathlib import Path

from amt_simulator.client import Client
from amt_simulator.errors import HandsetError

APP_LINE, STATION_LINE = "app", "pc"
CLOSE_ON_EXEC = 0x80000
OPEN_AND_CLOSE = 0x20 | 0x18


def _watch(path: str) -> int:
    """An inotify descriptor that tells when PATH is opened or closed."""
    library = ctypes.CDLL(None, use_errno=True)
    watch = int(library.inotify_init1(CLOSE_ON_EXEC))
    if watch < 0 or library.inotify_add_watch(watch, path.encode(), OPEN_AND_CLOSE) < 0:
        error = os.strerror(ctypes.get_errno())
        if watch >= 0:
            os.close(watch)
        raise HandsetError(f"this system does not let {path} be watched: {error}; "
                           "sysctl fs.inotify.max_user_instances says how often it may be done")
    return watch


def open_port(client: Client, name: str, directory: Path) -> None:
    """Make a port for the line NAME, with a link NAME to it in the handset's DIRECTORY."""
    fds: list[int] = []
    try:
        try:
            fds += os.openpty()
        except OSError as error:
            raise HandsetError("this system gives no pseudo-terminal for the port of the line "
                               f"{name}: {error.strerror}") from None
        master, slave = fds
        tty.setraw(slave)
        path = os.ttyname(slave)
        if name == APP_LINE:
            # The daemon is to hear of each program that opens and closes the app's port: nobody
            # else may hold it open.
            fds.append(_watch(path))
            os.close(slave)
            fds.remove(slave)
        client.give_fds("relay", fds, line=name)
        _link(directory / name, path)
    finally:
        for fd in fds:
            os.close(fd)


def _link(place: Path, path: str) -> None:
    """Let PLACE lead to PATH, whatever it led to before."""
    fresh = place.with_name(f".{place.name}-{os.getpid()}-{threading.get_ident()}")
    fresh.symlink_to(path)
    fresh.rename(place)


def close_port(name: str, directory: Path) -> None:
    """Take the link to the port of the line NAME away."""
    (directory / name).unlink(missing_ok=True)
