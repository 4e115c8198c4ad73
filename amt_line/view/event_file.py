"""The stream of events as JSON lines in a file, or on standard output."""

from __future__ import annotations

import json
import os
import queue
import threading
from pathlib import Path
from typing import Any, Callable, Mapping, TextIO

# A reader that is so far behind will not come back.
_MOST_WAITING = 100_000


class EventFile:
    """Writes each event at once, on a thread of its own: no slot waits for a disk or a pipe.

    When that fails, ``failed`` is told why, once, and nothing more is written.
    """

    def __init__(self, stream: TextIO, name: str, failed: Callable[[str], None],
                 path: Path | None = None) -> None:
        """``path`` is watched: a file that somebody takes away ends this too."""
        self.failure = ""
        self._stream = stream
        self._name = name
        self._failed = failed
        self._path = path
        self._events: queue.Queue[Mapping[str, Any] | None] = queue.Queue(_MOST_WAITING)
        self._thread = threading.Thread(target=self._serve, name="events", daemon=True)
        self._thread.start()

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        if self.failure:
            return
        try:
            self._events.put_nowait(event)
        except queue.Full:
            self._fail("nobody reads them any more")

    def close(self, patience: float = 5.0) -> None:
        """Write what is left, for ``patience`` seconds at most."""
        try:
            self._events.put(None, timeout=patience)
        except queue.Full:
            self._fail("nobody reads them any more")
        self._thread.join(patience)
        if self._thread.is_alive():
            self._fail("nobody reads them any more")
        elif self._path is not None:
            self._stream.close()

    def _serve(self) -> None:
        while (event := self._events.get()) is not None:
            if self.failure:
                continue
            try:
                self._stream.write(json.dumps(event) + "\n")
                self._stream.flush()
                self._check_place()
            except (OSError, ValueError) as error:
                self._fail(getattr(error, "strerror", None) or str(error))

    def _check_place(self) -> None:
        if self._path is None:
            return
        try:
            there = os.stat(self._path)
        except FileNotFoundError:
            self._fail("the file was taken away")
            return
        if (there.st_dev, there.st_ino) != _place(self._stream):
            self._fail("the file was replaced")

    def _fail(self, why: str) -> None:
        if not self.failure:
            self.failure = f"{self._name}: the events can no longer be written: {why}"
            self._failed(self.failure)


def _place(stream: TextIO) -> tuple[int, int]:
    status = os.fstat(stream.fileno())
    return status.st_dev, status.st_ino
