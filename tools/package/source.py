"""What goes into packages: the files of the project, its version and the time of its commit."""

import os
import shutil
from functools import lru_cache
from pathlib import Path
from typing import Iterable, Sequence

from amt_station import __version__
from tools import children
from tools.project import PROJECT, GitFailed, git

NAME, VERSION = "vx-kel-amt", __version__
EPOCH = "SOURCE_DATE_EPOCH"
SHOWN_LINES, SHOWN_COLUMNS = 15, 160


class PackageFailed(Exception):
    """What went wrong, for people; and all that a program has said of it."""

    def __init__(self, text: str, said: str = "") -> None:
        super().__init__(text)
        self.said = said


def _git(*words: str) -> str:
    try:
        return git(*words)
    except GitFailed as failed:
        raise PackageFailed(f"git cannot tell what belongs to the project: {failed}") from None


@lru_cache(maxsize=1)
def epoch() -> int:
    """The time that everything in a package has: the same commit gives the same bytes."""
    given = os.environ.get(EPOCH) or _git("log", "-1", "--format=%ct").strip()
    if not given.isdecimal():
        raise PackageFailed(f"{EPOCH} is a number of seconds, not {given!r}")
    return int(given)


def put(source: Path, target: Path, mode: int | None = None) -> None:
    """Copy a file, a link as what it leads to, with one of two modes unless MODE is given."""
    target.parent.mkdir(parents=True, exist_ok=True)
    shutil.copyfile(source, target)
    plain = 0o755 if os.access(source, os.X_OK) else 0o644
    target.chmod(plain if mode is None else mode)
    os.utime(target, (epoch(), epoch()))


def copy_rooms(rooms: Sequence[str], into: Path) -> None:
    """Copy the files below some paths as they are in the tree, those that git has been told of."""
    for name in _git("ls-files", "-z", "--", *rooms).split("\0"):
        if name and (PROJECT / name).is_file():
            put(PROJECT / name, into / name)


def publish(made: Iterable[Path], into: Path) -> list[Path]:
    """Move finished files to where they are looked for, each in one step."""
    into.mkdir(parents=True, exist_ok=True)
    return [path.replace(into / path.name) for path in sorted(made)]


def run(command: Sequence[str], folder: Path, environment: dict[str, str] | None = None) -> str:
    """Run a program; what it says, or PackageFailed with the end of it."""
    said: list[bytes] = []
    kept = {"LC_ALL": "C.UTF-8", **(environment or {})}
    try:
        status = children.run(command, said.append, kept, folder)
    except OSError as error:
        raise PackageFailed(f"{command[0]}: {error.strerror}") from None
    text = b"".join(said).decode(errors="backslashreplace")
    if status != 0:
        shown = [line[:SHOWN_COLUMNS] for line in text.splitlines()[-SHOWN_LINES:]]
        raise PackageFailed("\n".join([*shown, f"{command[0]} ended with status {status}"]), text)
    return text
