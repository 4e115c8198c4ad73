"""Moments and spans that a machine which is busy elsewhere cannot falsify."""

import threading
import time
from calendar import timegm
from types import TracebackType

from amt_simulator import Record

TICK_SECONDS = 0.01


def logged_at(record: Record) -> float:
    """The moment of a log record, as `time.time` counts.

    A span that begins here and ends when a test looks is never measured too short, however late
    the test is.
    """
    year = time.gmtime().tm_year
    day, milliseconds = record.time.split(".")
    return timegm(time.strptime(f"{year}-{day}", "%Y-%m-%d %H:%M:%S")) + int(milliseconds) / 1000


class Patience:
    """Counts the time in which this machine let somebody run who sleeps for a tick again and again.

    So what a limit is compared with stands still while the machine does, or is busy with others.
    """

    def __init__(self) -> None:
        self._ticks = 0
        self._end = threading.Event()
        self._thread = threading.Thread(target=self._count, daemon=True)

    def __enter__(self) -> "Patience":
        self._thread.start()
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self._end.set()
        self._thread.join()

    @property
    def seconds(self) -> float:
        """What has passed so far."""
        return self._ticks * TICK_SECONDS

    def _count(self) -> None:
        while not self._end.wait(TICK_SECONDS):
            self._ticks += 1
