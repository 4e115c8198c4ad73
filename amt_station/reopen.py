"""Takes a port again that went away: after an unplug, a mode change, a power cycle."""

from __future__ import annotations

import time
from typing import Callable

from amt_station.errors import NoPort, PortBusy
from amt_station.port import Port

_LOOK_SECONDS = 0.05


def reopened(reopen: Callable[[], Port], timeout: float) -> Port:
    """The port, as soon as it can be opened within ``timeout`` seconds.

    A port that just appeared may be held for a moment by a program that looks at new ports.
    """
    end = time.monotonic() + timeout
    while True:
        try:
            return reopen()
        except (NoPort, PortBusy):
            if time.monotonic() >= end:
                raise
            time.sleep(_LOOK_SECONDS)
