"""Ports of the PC that lead into the handset, under stable paths in its directory."""

import os
import tty
from pathlib import Path

from .client import Client


class Port:
    """A pseudo-terminal of the PC that the handset's init connects with one of its lines."""

    def __init__(self, client: Client, name: str, path: Path, held: bool) -> None:
        """HELD keeps the port's side open here: programs may come and go unnoticed."""
        self.path = path
        master, slave = os.openpty()
        tty.setraw(slave)
        path.symlink_to(os.ttyname(slave))
        try:
            if not held:
                os.close(slave)
            client.give_fd("relay", master, line=name)
        finally:
            os.close(master)
        self._slave = slave if held else -1

    def close(self) -> None:
        """Take the port away."""
        if self._slave >= 0:
            os.close(self._slave)
            self._slave = -1
