"""Where the records of a line go: a directory, and from there the store."""

from __future__ import annotations

import sys
import threading
from contextlib import contextmanager
from pathlib import Path
from typing import Iterator

from amt_line.run.record import Record
from amt_line.run.record_file import NoRecord, RecordFile, file_name
from amt_line.run.slot import RecordKeeper
from amt_line.store import Delivery, checked_url
from amt_station.errors import StationError, UsageProblem


class _Nowhere(NoRecord):
    """No record is kept."""

    def close(self) -> None:
        """As in ``RecordKeeper``."""


class _Delivered(RecordFile):
    """A record that goes to the store when its run has ended."""

    delivery: Delivery | None = None

    def close(self) -> None:
        """As in ``RecordKeeper``."""
        super().close()
        if self.delivery is not None:
            self.delivery.recorded(self.path)


class LineRecords:
    """Keeps the records of all slots. ``directory`` is None when none are to be kept."""

    def __init__(self, directory: Path | None, store: str | None) -> None:
        """``UsageProblem`` when nothing can be written into the directory."""
        self.problems: list[str] = []
        self.remarks: list[str] = []
        self.store_url: str | None = None
        self._directory = directory
        self._delivery: Delivery | None = None
        self._turn = threading.Lock()
        if directory is not None:
            self.store_url = checked_url(store)
            _check_writable(directory)

    @contextmanager
    def open(self) -> Iterator[None]:
        """Hand records on to the store meanwhile."""
        if self._directory is not None and self.store_url is not None:
            self._delivery = Delivery(self.store_url, self._directory)
        try:
            yield
        finally:
            if self._delivery is not None:
                try:
                    self._delivery.close()
                except KeyboardInterrupt:
                    pass  # nobody has to wait for it
                self.remarks = self._delivery.lines()

    def state(self) -> str:
        """How far the store is."""
        return self._delivery.state if self._delivery is not None else "ok"

    def keep(self, dut: str, record: Record) -> RecordKeeper:
        """Begin the record of a run."""
        if self._directory is None:
            return _Nowhere()
        name = file_name(dut, record.head["began"], record.run)
        file = _Delivered(self._directory, name, record.text())
        file.delivery = self._delivery
        return file

    def lost(self, error: StationError, text: str) -> None:
        """A record can no longer be written: rather on standard error than nowhere."""
        with self._turn:
            print(text, end="", file=sys.stderr, flush=True)
            if str(error) not in self.problems:
                self.problems.append(str(error))


def _check_writable(directory: Path) -> None:
    place = directory / f".{threading.get_ident()}.try"
    try:
        directory.mkdir(parents=True, exist_ok=True)
        place.touch()
        place.unlink()
    except OSError as error:
        raise UsageProblem(f"no record can be written into {directory}: "
                           f"{error.strerror}") from error
