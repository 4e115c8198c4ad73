"""The directory in which the station keeps what outlives a command."""

from __future__ import annotations

import os
import tempfile
import time
import traceback
from pathlib import Path


def state_directory() -> Path:
    """Below the XDG state directory; the directory need not be there yet."""
    base = os.environ.get("XDG_STATE_HOME", "")
    if not os.path.isabs(base):
        base = os.path.join(os.path.expanduser("~"), ".local", "state")
    return Path(base) / "amt-station"


def records_directory() -> Path:
    """Where the records of runs go unless something else is said."""
    return state_directory() / "records"


def write_defect(error: Exception) -> Path | None:
    """Keep the traceback of a defect; None when no place for it can be written."""
    text = "".join(traceback.format_exception(error))
    name = f"defect-{time.strftime('%Y%m%dT%H%M%SZ', time.gmtime())}-{os.getpid()}.txt"
    for directory in (state_directory(), Path(tempfile.gettempdir())):
        try:
            directory.mkdir(mode=0o700, parents=True, exist_ok=True)
            path = directory / name
            with open(path, "x", encoding="utf-8", errors="backslashreplace",
                      opener=_private) as stream:
                stream.write(text)
            return path
        except (OSError, ValueError):
            continue
    return None


def _private(path: str, flags: int) -> int:
    return os.open(path, flags, 0o600)
