"""One real handset beside what the model knows of it, and the comparison of both."""

from __future__ import annotations

import os
from dataclasses import dataclass
from typing import Any, Callable, Sequence

from amt_simulator import Handset
from amt_simulator.errors import HandsetError
from amt_simulator.line import Line
from amt_simulator.waiting import wait_until
from tools.stateful import phone as models
from tools.stateful.pc_model import FILES as IDENTITY_FILES
from tools.stateful.phone import Phone

RECORD_BYTES = 16 << 20
RECORDS = ("log.txt", "stdout.txt")

# Looked at after every step.
WATCHED = (*models.BT_FILES, models.WIFI_FILE, models.WIFI_DEBUG, models.PERMISSION_FILE,
           models.AMT_RESULTS, models.PRODUCT_RESULTS, models.ADB_FILE, models.VBATT_FILE,
           models.LCD_FILE, models.BUTTON_FILE, models.VIBRATOR_FILE,
           *(path for pair in IDENTITY_FILES.values() for path in pair))


class Mismatch(Exception):
    """A handset has done something else than the model."""


@dataclass
class Side:
    """A handset, what the model knows of it, and how much of its calls was looked at."""

    name: str
    handset: Handset
    phone: Phone
    lines: Sequence[Line]
    calls_seen: int = 0
    look: "tuple[int, int, int] | None" = None

    def new_calls(self) -> list[str]:
        """The complete records of calls since the last look."""
        with self.handset.path("/handset/calls.txt").open("rb") as stream:
            stream.seek(self.calls_seen)
            data = stream.read()
        whole = data[:data.rfind(b"\n") + 1]
        self.calls_seen += len(whole)
        return whole.decode().splitlines()

    def check(self) -> None:
        """The calls and the files are the model's, and no line has more to say."""
        told, self.phone.calls = self.phone.calls, []
        same(f"{self.name}: calls", self.new_calls(), told)
        for path in WATCHED:
            try:
                found: str | None = self.handset.text(path)
            except (FileNotFoundError, NotADirectoryError):
                found = None
            same(f"{self.name}: {path}", found, self.phone.files.get(path))
        for line in self.lines:
            same(f"{self.name}: more on the line {line.name}", line.read_all(0), b"")

    def check_size(self) -> None:
        """No thread and no descriptor more or less than at first, and the same process."""
        def now() -> tuple[int, int, int]:
            info = self.handset.inspect()
            return info.pid, len(info.descriptors), len(info.threads) + len(info.children)

        found = now()
        self.look = self.look or found
        if found != self.look:
            # A thread that waits for a child ends soon after it.
            wait_same(f"{self.name}: pid, descriptors, threads and children", now, self.look)

    def cut_records(self) -> None:
        """Empty what would fill the disk; its writers append."""
        for name in RECORDS:
            path = self.handset.path(f"/handset/{name}")
            if path.exists() and path.stat().st_size > RECORD_BYTES:
                os.truncate(path, 0)


def same(what: str, found: Any, wanted: Any) -> None:
    """Raise unless they are equal."""
    if found != wanted:
        raise Mismatch(f"{what}:\n  found  {found!r}\n  wanted {wanted!r}")


def wait_same(what: str, look: Callable[[], Any], wanted: Any) -> None:
    """Raise unless they become equal."""
    found: list[Any] = [None]

    def attempt() -> bool:
        found[0] = look()
        return bool(found[0] == wanted)

    try:
        wait_until(attempt, what)
    except HandsetError:
        same(what, found[0], wanted)
