"""Suites again and again: whether a test fails now and then, also on a busy machine."""

import shutil
import threading
import time
from contextlib import contextmanager, nullcontext
from typing import Callable, Iterator, Sequence

from tools import children
from tools.project import PROJECT, note, say
from tools.results import Count
from tools.suites import Suite

# A build of everything, begun anew until the run is over; nobody uses it.
BESIDE = PROJECT / "build" / "beside"
CONFIGURE = ("cmake", "--preset", "release", "-B", str(BESIDE),
             "-D", "CMAKE_CXX_COMPILER_LAUNCHER=")
BUILD = ("cmake", "--build", str(BESIDE), "--clean-first")


def _forget(_piece: bytes) -> None:
    """What the build beside says matters to nobody."""


class Beside:
    """Builds until told to stop."""

    def __init__(self) -> None:
        self.is_over = False
        self.failure = ""
        self.ended = threading.Event()
        self._lock = threading.Lock()
        self._child = children.start(CONFIGURE)
        self._thread = threading.Thread(target=self._work, daemon=True)
        self._thread.start()

    def _work(self) -> None:
        try:
            status = children.follow(self._child, _forget)
            while status == 0 and self._begin():
                status = children.follow(self._child, _forget)
            if not self.is_over:
                self.failure = f"the build beside ended with status {status}"
        except children.Stopped:
            pass
        finally:
            self.ended.set()

    def _begin(self) -> bool:
        with self._lock:
            if self.is_over:
                return False
            self._child = children.start(BUILD)
            return True

    def stop(self) -> None:
        """End it where it is."""
        with self._lock:
            self.is_over = True
            children.end(self._child)
        self._thread.join()


@contextmanager
def build_beside() -> Iterator[Beside]:
    """Build, from nothing and again, while the block runs; a build that fails is an error."""
    beside = Beside()
    try:
        yield beside
    finally:
        beside.stop()
        shutil.rmtree(BESIDE, ignore_errors=True)
    if beside.failure:
        raise SystemExit(f"dev: {beside.failure}")


def repeat(suites: Sequence[Suite], times: int, beside: int,
           run: Callable[[Sequence[Suite]], Count]) -> Count:
    """Run SUITES so many TIMES, the first ones with a build BESIDE; each run is told at the end."""
    total = Count()
    told = []
    for number in range(1, times + 1):
        is_beside = number <= beside
        say(f"run {number} of {times}{', a build beside' if is_beside else ''}")
        started = time.monotonic()
        with build_beside() if is_beside else nullcontext():
            count = run(suites)
        total.add(count)
        told.append(f"run {number}: {count} in {time.monotonic() - started:.0f} s"
                    f"{' (a build beside)' if is_beside else ''}")
    say(f"{times} runs")
    for line in told:
        note(line)
    return total
