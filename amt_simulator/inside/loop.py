"""The event loop of the handset's init: descriptors, timers, nothing else."""

import heapq
import itertools
import selectors
import time
from typing import Callable


class Loop:
    """Calls back when a descriptor is readable or writable, or when a moment has come."""

    def __init__(self) -> None:
        self._selector = selectors.DefaultSelector()
        self._timers: list[tuple[float, int, Callable[[], None]]] = []
        self._order = itertools.count()

    def watch(self, fd: int, on_read: Callable[[], None] | None,
              on_write: Callable[[], None] | None = None) -> None:
        """Watch FD with these callbacks; with none at all, stop watching it."""
        events = (selectors.EVENT_READ if on_read else 0) | (
            selectors.EVENT_WRITE if on_write else 0)
        known = fd in self._selector.get_map()
        if not events:
            if known:
                self._selector.unregister(fd)
        elif known:
            self._selector.modify(fd, events, (on_read, on_write))
        else:
            self._selector.register(fd, events, (on_read, on_write))

    def after(self, seconds: float, callback: Callable[[], None]) -> None:
        """Call back once, SECONDS from now."""
        heapq.heappush(self._timers,
                       (time.monotonic() + seconds, next(self._order), callback))

    def run(self) -> None:
        """Serve for ever."""
        while True:
            for key, events in self._selector.select(self._pause()):
                for place, event in enumerate((selectors.EVENT_READ, selectors.EVENT_WRITE)):
                    # A callback before may have taken the descriptor away, or changed this one.
                    known = self._selector.get_map().get(key.fd)
                    if events & event and known and known.data[place]:
                        known.data[place]()
            self._fire()

    def _pause(self) -> float | None:
        if not self._timers:
            return None
        return max(0.0, self._timers[0][0] - time.monotonic())

    def _fire(self) -> None:
        while self._timers and self._timers[0][0] <= time.monotonic():
            heapq.heappop(self._timers)[2]()
