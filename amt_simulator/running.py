"""Handsets that are up: how one tells of itself, and how another process finds it."""

import json
from dataclasses import asdict, dataclass
from pathlib import Path

from amt_simulator.client import Client
from amt_simulator.control import HandsetControl
from amt_simulator.errors import HandsetError
from amt_simulator.rundir import base_directory, has_owner

ANNOUNCEMENT = "up.json"


class NoHandset(HandsetError):
    """There is no such handset."""


@dataclass(frozen=True)
class Announcement:
    """What a handset that was brought up by hand says of itself."""

    directory: str
    path: str
    build: str
    pid: int
    ports: dict[str, str]

    def write(self) -> None:
        """Let other processes find the handset."""
        (Path(self.directory) / ANNOUNCEMENT).write_text(json.dumps(asdict(self)), "utf-8")

    @classmethod
    def read(cls, directory: Path) -> "Announcement":
        """What the handset in DIRECTORY says."""
        try:
            return cls(**json.loads((directory / ANNOUNCEMENT).read_text("utf-8")))
        except (OSError, ValueError, TypeError):
            raise NoHandset(f"no handset is up in {directory}") from None


def running() -> list[Path]:
    """The directories of this user's handsets that were brought up by hand."""
    return sorted(directory for directory in base_directory().iterdir()
                  if (directory / ANNOUNCEMENT).exists() and has_owner(directory))


def find(directory: Path | None) -> HandsetControl:
    """The handset in DIRECTORY or, without one, the only one that is up."""
    if directory is None:
        found = running()
        if not found:
            raise NoHandset("no handset is up; `amt-handset up` brings one up")
        if len(found) > 1:
            raise NoHandset("several handsets are up; choose one with --dir: " +
                            " ".join(str(path) for path in found))
        directory = found[0]
    Announcement.read(directory)
    Client(directory / "control").ask("daemon")
    handset = HandsetControl()
    handset.attach(directory)
    return handset
