"""What has changed on the board, and since when: what every browser is told.

A browser is told states, not events: it names the version that it has seen and gets every slot that
has changed since, as the slot is now. So one that reads slowly, or comes back after a lost
connection, has nothing waiting for it anywhere, misses nothing and sees nothing twice.
"""

from __future__ import annotations

import asyncio
import re
import secrets
from collections import deque
from typing import Any, Mapping

from amt_line.view.board import Board
from amt_station.text import printable

Document = dict[str, Any]
_ENDINGS = 256
_NOT_TOLD = ("ended_steps", "began", "counts")


class Changes:
    """The board with a version for each slot. Used in the server's thread, but for ``take``."""

    def __init__(self, board: Board, loop: asyncio.AbstractEventLoop) -> None:
        self.epoch = secrets.token_hex(4)
        self.version = 0
        self._board = board
        self._loop = loop
        self._inbox: deque[Mapping[str, Any]] = deque()
        self._called = False
        self._versions: dict[str, int] = {}
        self._began: dict[str, float] = {}
        self._asked: dict[str, int] = {}
        self._endings: deque[tuple[int, str, str]] = deque(maxlen=_ENDINGS)
        self._news = asyncio.Event()

    def take(self, event: Mapping[str, Any]) -> None:
        """An event, in whichever thread it happened; returns at once."""
        self._inbox.append(event)
        if not self._called:
            self._called = True
            try:
                self._loop.call_soon_threadsafe(self._drain)
            except RuntimeError:
                pass  # the page has been closed; the line has not

    def _drain(self) -> None:
        self._called = False
        while self._inbox:
            event = self._inbox.popleft()
            self._board.take(event)
            self._note(event)
        news, self._news = self._news, asyncio.Event()
        news.set()

    def _note(self, event: Mapping[str, Any]) -> None:
        self.version += 1
        slot = str(event.get("slot", ""))
        self._versions[slot] = self.version
        name = event["event"]
        if name == "run-began":
            self._began[slot] = self._loop.time()
        elif name == "question":
            self._asked[slot] = self.version
        elif name == "run-ended":
            self._began.pop(slot, None)
            self._endings.append((self.version, slot, str(event["verdict"])))

    async def news(self, timeout: float) -> None:
        """Return when something has changed, at the latest after ``timeout`` seconds."""
        try:
            await asyncio.wait_for(self._news.wait(), timeout)
        except asyncio.TimeoutError:
            pass

    def wake(self) -> None:
        """Let everybody look who waits for news."""
        self._news.set()

    def seen(self, event_id: str) -> int | None:
        """The version that an id stands for; None when it is of another life of this server."""
        epoch, _, number = event_id.partition(".")
        if epoch != self.epoch or not re.fullmatch("[0-9]{1,15}", number):
            return None
        return min(int(number), self.version)

    @property
    def event_id(self) -> str:
        """The id of what has been seen now."""
        return f"{self.epoch}.{self.version}"

    def since(self, version: int | None) -> Document:
        """What a browser that has seen this version is to be told; everything without one."""
        slots = [self._told(name, slot) for name, slot in self._board.slots.items()
                 if version is None or self._versions.get(name, 0) > version]
        ended = [{"slot": slot, "verdict": verdict} for number, slot, verdict in self._endings
                 if version is not None and number > version]
        told: Document = shown({"slots": slots, "counts": self._board.counts, "ended": ended})
        return told

    def slot_with(self, slot: str, run: str) -> str | None:
        """The slot that is shown by this name, if it is busy with this run; "" is no run yet."""
        return next((name for name, document in self._board.slots.items()
                     if printable(name) == slot and document["run"] == run), None)

    def _told(self, name: str, slot: Document) -> Document:
        """A slot as a browser needs it. How long a run has taken is said: its clock may be any."""
        told = {key: value for key, value in slot.items() if key not in _NOT_TOLD}
        told["verdicts"] = "".join(step["verdict"][0] for step in slot["ended_steps"])
        began = self._began.get(name)
        told["elapsed"] = None if began is None else round(self._loop.time() - began, 3)
        if slot["question"] is not None:
            told["question"] = {**slot["question"], "asked": self._asked.get(name, 0)}
        return told


def shown(value: Any) -> Any:
    """A document in which no text does anything but be read: no bidirectional sign, no control."""
    if isinstance(value, str):
        return printable(value)
    if isinstance(value, Mapping):
        return {name: shown(entry) for name, entry in value.items()}
    if isinstance(value, (list, tuple)):
        return [shown(entry) for entry in value]
    return value
