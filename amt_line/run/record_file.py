"""Writes a record whole, again and again: what a power cut leaves is the last whole one."""

from __future__ import annotations

import os
import re
import threading
from pathlib import Path
from typing import Protocol

from amt_station.errors import StationError, UsageProblem

_UNSAFE = re.compile(r"[^A-Za-z0-9_-]+")
_LONGEST_NAME = 64


class RecordLost(StationError):
    """The record can no longer be written."""

    exit_status = 7
    kind = "record"


class Keeper(Protocol):
    """Where a record goes."""

    def put(self, text: str) -> None:
        """Keep this instead of what was kept; raises ``RecordLost`` when that has failed."""

    def flush(self) -> None:
        """Return when all is safe; raises ``RecordLost`` when it is not."""


class NoRecord:
    """Keeps nothing."""

    def put(self, text: str) -> None:
        """As in ``Keeper``."""

    def flush(self) -> None:
        """As in ``Keeper``."""


def file_name(dut: str, began: str, run: str) -> str:
    """The name of a record's file: under its DUT, in the order of time."""
    safe = _UNSAFE.sub("_", dut)[:_LONGEST_NAME] or "unnamed"
    stamp = re.sub(r"[-:]|\.[0-9]+", "", began)
    return f"{safe}-{stamp}-{run[:8]}.json"


class RecordFile:
    """One record in a directory.

    The disk takes longer than a step of a plan, so a thread of its own writes, always the newest
    that there is; ``flush`` waits for it.
    """

    def __init__(self, directory: Path, name: str, text: str) -> None:
        """Write the record for the first time; ``UsageProblem`` when that cannot be done."""
        self.path = directory / name
        self._temporary = directory / f".{name}.new"
        try:
            directory.mkdir(parents=True, exist_ok=True)
            self._write(text)
        except OSError as error:
            self._forget_temporary()
            raise UsageProblem(f"no record can be written into {directory}: "
                               f"{error.strerror}") from error
        self._changed = threading.Condition()
        self._next: str | None = None
        self._busy = False
        self._closed = False
        self._failure: OSError | None = None
        self._thread = threading.Thread(target=self._serve, name="record", daemon=True)
        self._thread.start()

    def put(self, text: str) -> None:
        """As in ``Keeper``."""
        with self._changed:
            self._complain()
            self._next = text
            self._changed.notify_all()

    def flush(self) -> None:
        """As in ``Keeper``."""
        with self._changed:
            self._changed.wait_for(lambda: self._next is None and not self._busy)
            self._complain()

    def close(self) -> None:
        """End the thread; what was put is written first."""
        with self._changed:
            self._closed = True
            self._changed.notify_all()
        self._thread.join()

    def _complain(self) -> None:
        if self._failure is not None:
            raise RecordLost(f"the record {self.path} can no longer be written: "
                             f"{self._failure.strerror}")

    def _serve(self) -> None:
        while (text := self._take()) is not None:
            failure = None
            try:
                self._write(text)
            except OSError as error:
                failure = error
                self._forget_temporary()
            with self._changed:
                self._failure = failure or self._failure
                self._busy = False
                self._changed.notify_all()

    def _take(self) -> str | None:
        with self._changed:
            self._changed.wait_for(lambda: self._next is not None or self._closed)
            text, self._next = self._next, None
            self._busy = text is not None
            return text

    def _write(self, text: str) -> None:
        with self._temporary.open("w", encoding="utf-8") as file:
            file.write(text)
            file.flush()
            os.fsync(file.fileno())
        os.replace(self._temporary, self.path)
        folder = os.open(self.path.parent, os.O_RDONLY | os.O_DIRECTORY)
        try:
            os.fsync(folder)
        finally:
            os.close(folder)

    def _forget_temporary(self) -> None:
        try:
            self._temporary.unlink(missing_ok=True)
        except OSError:
            pass
