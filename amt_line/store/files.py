"""The directory of records: which files there are, in the order in which their runs began."""

from __future__ import annotations

import os
import re
import socket
from itertools import groupby
from pathlib import Path
from typing import Iterable

from amt_line.store.problems import BadRecord

_NAME = re.compile(r"-(\d{8}T\d{6}Z)-[0-9a-f]{8}\.json\Z")
_BEGAN = re.compile(rb'^"began": "([^"]*)"', re.MULTILINE)
_HEAD = 1 << 16
_LARGEST = 256 * 1024 * 1024
# Behind every time: what is named differently comes last.
_NO_TIME = "~"


def origin_of(directory: Path) -> str:
    """What the database knows a directory by: the machine and the path on it."""
    return f"{socket.gethostname()}:{os.path.abspath(directory)}"


def file_names(directory: Path) -> list[str]:
    """The names of what could be records, in no order; none where there is no directory."""
    try:
        with os.scandir(directory) as entries:
            return [entry.name for entry in entries
                    if entry.name.endswith(".json") and not entry.name.startswith(".")
                    and _can_be_kept(entry.name)]
    except FileNotFoundError:
        return []


def in_order(directory: Path, names: Iterable[str]) -> list[str]:
    """These names in the order in which the runs began."""
    ordered: list[str] = []
    for _, group in groupby(sorted(names, key=_second), key=_second):
        together = sorted(group)
        if len(together) > 1:
            together.sort(key=lambda name: _began(directory / name))
        ordered += together
    return ordered


def read_text(path: Path) -> str:
    """The text of a record's file; raises ``BadRecord`` when it cannot be one.

    ``FileNotFoundError`` says that it is gone.
    """
    try:
        if path.stat().st_size > _LARGEST:
            raise BadRecord(f"larger than {_LARGEST} bytes")
        return path.read_bytes().decode("utf-8")
    except FileNotFoundError:
        raise
    except OSError as error:
        raise BadRecord(error.strerror or type(error).__name__) from error
    except UnicodeDecodeError as error:
        raise BadRecord("no record of a run: no text") from error


def _can_be_kept(name: str) -> bool:
    """A name of other bytes than characters is none of a record's."""
    try:
        name.encode("utf-8")
    except UnicodeEncodeError:
        return False
    return True


def _second(name: str) -> str:
    match = _NAME.search(name)
    return match.group(1) if match else _NO_TIME


def _began(path: Path) -> bytes:
    """When a run began, to the millisecond, from the head of its file."""
    try:
        with path.open("rb") as file:
            match = _BEGAN.search(file.read(_HEAD))
    except OSError:
        return _NO_TIME.encode()
    return match.group(1) if match else _NO_TIME.encode()
