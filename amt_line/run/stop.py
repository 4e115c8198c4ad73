"""How a run is ended from outside, and when its time is over."""

from __future__ import annotations

import time
from dataclasses import dataclass
from typing import Callable, Sequence

SLICE = 0.05
# What the always steps are given when a run was ended, or its time was over.
LAST_SECONDS = 5.0
# How often somebody looks whether the handset is still there.
_WATCH_SECONDS = 0.25


@dataclass(frozen=True)
class Abort:
    """Why a run is ended from outside, and the status that it then has."""

    reason: str
    exit_status: int


INTERRUPTED = Abort("interrupted", 130)
TERMINATED = Abort("terminated", 143)
STOPPED = Abort("stopped by the operator", 130)
PULLED = Abort("the handset was pulled out", 3)


class Ended(Exception):
    """The step cannot go on: the run was ended, or its time is over."""


class Aborted(Ended):
    """Somebody ended the run."""


class TimeOver(Ended):
    """The run's time is over."""


class Stop:
    """Asked everywhere where a run waits. Requests may come from a signal handler or a thread.

    The first request ends the step at hand; the second also the always steps. Nothing here takes
    a lock: a handler may interrupt any line of this.
    """

    def __init__(self, deadline: float | None = None, of_all: Sequence[Abort] = (),
                 watch: Callable[[], Abort | None] = lambda: None) -> None:
        """``deadline`` in seconds from now, for the whole run.

        ``of_all`` may grow: requests to all runs of a line. ``watch`` looks now and then for a
        reason to end the run.
        """
        self._own: list[Abort] = []
        self._of_all = of_all
        self._watch = watch
        self._next_look = 0.0
        self._accepted = 0
        self._what = f"the run's deadline of {deadline:g} s is reached" if deadline else ""
        self._end = time.monotonic() + deadline if deadline else None

    def request(self, how: Abort) -> None:
        """End the run."""
        self._own.append(how)

    @property
    def _requests(self) -> list[Abort]:
        return [*self._own, *self._of_all]

    @property
    def requested(self) -> Abort | None:
        """The first request."""
        return next(iter(self._requests), None)

    @property
    def at_once(self) -> bool:
        """Whether not even the always steps are wanted."""
        return len(self._requests) > 1

    def begin_last_steps(self, hurry: bool) -> None:
        """From now on the first request counts no more; in a ``hurry`` there are only seconds."""
        self._accepted = 1 if self._requests else 0
        last = time.monotonic() + LAST_SECONDS
        if hurry:
            self._what = "no time is left for what is always done"
            self._end = last
        elif self._end is not None:
            self._end = max(self._end, last)

    def hurry(self) -> None:
        """The run was ended during the always steps: they have seconds."""
        if self._requests and not self._accepted:
            self.begin_last_steps(hurry=True)

    def check(self) -> None:
        """Raise ``Ended`` when the step cannot go on."""
        requests = self._requests
        if not requests:
            requests = self._look()
        if len(requests) > self._accepted:
            raise Aborted(requests[-1].reason)
        if self._end is not None and time.monotonic() >= self._end:
            raise TimeOver(self._what)

    def _look(self) -> list[Abort]:
        now = time.monotonic()
        if now >= self._next_look:
            self._next_look = now + _WATCH_SECONDS
            how = self._watch()
            if how is not None:
                self.request(how)
        return self._requests

    def sleep(self, seconds: float) -> None:
        """Wait, unless the run ends."""
        end = time.monotonic() + seconds
        while (left := end - time.monotonic()) > 0:
            self.check()
            time.sleep(min(left, SLICE))
        self.check()
