"""Waiting for what happens in a handset: deadlines, never fixed pauses."""

import os
import select
import time
from typing import Callable, TypeVar

from amt_simulator.errors import HandsetTimeout

# Only what never happens takes so long, however busy the machine is.
DEFAULT_SECONDS = 40.0
SCALE_VARIABLE = "HANDSET_TIME_SCALE"
# The pause between two looks grows with the wait, so that a long one costs the processor little.
SHORTEST_STEP, LONGEST_STEP, STEP_SHARE = 0.001, 0.02, 0.05

Found = TypeVar("Found")


def scaled(seconds: float) -> float:
    """SECONDS as this machine and build need them: sanitizer runs ask for more by a variable."""
    return seconds * float(os.environ.get(SCALE_VARIABLE, "1"))


def deadline(seconds: float | None) -> float:
    """The moment, on the monotonic clock, at which a wait of SECONDS (None: the usual) ends."""
    return time.monotonic() + scaled(DEFAULT_SECONDS if seconds is None else seconds)


def is_ready(fd: int, events: int, seconds: float) -> bool:
    """Wait until FD is ready for EVENTS (of poll), or its other side has gone; False if late."""
    poller = select.poll()
    poller.register(fd, events)
    return bool(poller.poll(max(0.0, seconds) * 1000))


def wait_until(attempt: Callable[[], Found | None], what: str, timeout: float | None = None,
               explain: Callable[[], str] | None = None) -> Found:
    """Repeat ATTEMPT until it gives something true; raise with WHAT and EXPLAIN's text if late."""
    begin = time.monotonic()
    end = deadline(timeout)
    while True:
        # The clock is read first: what happened before the deadline counts.
        now = time.monotonic()
        late = now >= end
        found = attempt()
        if found:
            return found
        if late:
            raise HandsetTimeout(f"waited in vain for {what}" +
                                 (f"\n{explain()}" if explain else ""))
        time.sleep(min(LONGEST_STEP, max(SHORTEST_STEP, (now - begin) * STEP_SHARE)))
