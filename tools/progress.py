"""How far something long has come: one line that moves on a terminal, a line now and then else."""

import sys
import time
from dataclasses import dataclass, field

QUIET_SECONDS = 15.0
CLEAR_LINE = "\r\x1b[K"


@dataclass
class Progress:
    """Shown on standard error, so that it is never part of a result."""

    what: str
    on_terminal: bool = field(default_factory=sys.stderr.isatty)
    _told: float = field(default_factory=time.monotonic)
    _is_open: bool = False

    def show(self, done: int, total: int) -> None:
        """DONE of TOTAL are done."""
        text = f"   {self.what}: {done} of {total}"
        if self.on_terminal:
            print(f"{CLEAR_LINE}{text}", end="", file=sys.stderr, flush=True)
            self._is_open = True
        elif time.monotonic() - self._told > QUIET_SECONDS:
            print(text, file=sys.stderr, flush=True)
            self._told = time.monotonic()

    def close(self) -> None:
        """Leave a clean line behind."""
        if self._is_open:
            print(CLEAR_LINE, end="", file=sys.stderr, flush=True)
            self._is_open = False
