"""Ctrl-C and SIGTERM during a run: the first ends it in order, the second at once."""

from __future__ import annotations

import os
import signal
from contextlib import contextmanager
from types import FrameType
from typing import Any, Callable, Iterator

from amt_line.run.stop import INTERRUPTED, TERMINATED, Abort

_ABORTS = {signal.SIGINT: INTERRUPTED, signal.SIGTERM: TERMINATED}
# Should even the second not help, a third does.
_MOST = 3


@contextmanager
def ending_in_order(abort: Callable[[Abort], None]) -> Iterator[None]:
    """Hand the signals to the run meanwhile."""
    count = 0

    def handle(number: int, _frame: FrameType | None) -> None:
        nonlocal count
        count += 1
        how = _ABORTS[signal.Signals(number)]
        if count >= _MOST:
            os._exit(how.exit_status)
        abort(how)

    before: dict[signal.Signals, Any] = {number: signal.signal(number, handle)
                                         for number in _ABORTS}
    try:
        yield
    finally:
        for number, handler in before.items():
            signal.signal(number, handler)
