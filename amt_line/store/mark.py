"""A small durable mark: how many files of a directory its database was known to have.

It only tells the person how many are missing while the database cannot be asked; what is delivered
is always found by comparing the two.
"""

from __future__ import annotations

import hashlib
import json
import os
from pathlib import Path

from amt_line.store.files import origin_of
from amt_line.store.url import shown_url
from amt_station.state import state_directory


class Mark:
    """The mark of one directory and one database."""

    def __init__(self, url: str, directory: Path) -> None:
        name = hashlib.sha256(f"{shown_url(url)}\n{origin_of(directory)}".encode()).hexdigest()
        self._path = state_directory() / "delivered" / f"{name[:16]}.json"
        self._words = {"store": shown_url(url), "records": origin_of(directory)}

    def read(self) -> int:
        """How many files were known to be there; 0 when nothing is known."""
        try:
            files = json.loads(self._path.read_text(encoding="utf-8"))["files"]
            return files if isinstance(files, int) and files >= 0 else 0
        except (OSError, ValueError, KeyError, TypeError):
            return 0

    def write(self, files: int) -> None:
        """Remember it. Where that is not possible, more are said to be missing than are."""
        temporary = self._path.with_suffix(f".{os.getpid()}.new")
        try:
            self._path.parent.mkdir(parents=True, exist_ok=True)
            temporary.write_text(json.dumps({**self._words, "files": files}) + "\n",
                                 encoding="utf-8")
            os.replace(temporary, self._path)
        except OSError:
            try:
                temporary.unlink(missing_ok=True)
            except OSError:
                pass
