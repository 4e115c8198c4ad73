"""Hands records on to the store in the background; nothing that goes wrong there ends a run."""

from __future__ import annotations

from pathlib import Path


class Delivery:
    """To come: so far nothing is handed on."""

    def __init__(self, url: str, directory: Path) -> None:
        self.url = url
        self.directory = directory

    def recorded(self, path: Path) -> None:
        """A record is on the disk, whole."""

    @property
    def state(self) -> str:
        """``ok``, or how many records are still to be delivered, since when, and why."""
        return "ok"

    def close(self, patience: float = 5.0) -> None:
        """End the thread; what is still to be delivered is waited for that long."""
