"""What the slots of a line share: named in a step's ``needs``, and taken in turn."""

from __future__ import annotations

import threading
import time
from contextlib import contextmanager
from dataclasses import dataclass
from typing import Callable, Iterator, Sequence

_LOOK_SECONDS = 0.05


@dataclass(frozen=True, eq=False)
class _Wish:
    """Somebody who holds, or waits for, all of these at once."""

    names: frozenset[str]
    who: str


class Shared:
    """Hands out what there is once only, first come first served.

    A step gets all that it needs at once and holds nothing while it waits, so nobody can wait for
    each other. Who came first for a thing gets it first, also when others need less.
    """

    def __init__(self) -> None:
        self._changed = threading.Condition()
        # In the order of coming; those who hold something stand before those who wait for it.
        self._queue: list[_Wish] = []

    @contextmanager
    def taken(self, names: Sequence[str], who: str, check: Callable[[], None],
              waiting: Callable[[str], None] = lambda text: None) -> Iterator[float]:
        """Hold all of ``names`` within the block; the seconds that were waited for them.

        ``check`` is called all the time while waiting; what it raises ends that. ``waiting`` is
        told once what is waited for, and who has it.
        """
        if not names:
            yield 0.0
            return
        wish = _Wish(frozenset(names), who)
        start = time.monotonic()
        try:
            with self._changed:
                self._queue.append(wish)
            self._wait(wish, check, waiting)
            yield time.monotonic() - start
        finally:
            with self._changed:
                self._queue.remove(wish)
                self._changed.notify_all()

    def _wait(self, wish: _Wish, check: Callable[[], None],
              waiting: Callable[[str], None]) -> None:
        told = False
        while True:
            with self._changed:
                text = self._in_the_way(wish)
                if text and told:
                    self._changed.wait(_LOOK_SECONDS)
                    text = self._in_the_way(wish)
            if not text:
                return
            if not told:
                told = True
                waiting(text)
            check()

    def _in_the_way(self, wish: _Wish) -> str:
        """What is waited for; empty when nobody who came before needs any of it."""
        before = self._queue[:self._queue.index(wish)]
        for other in before:
            common = sorted(wish.names & other.names)
            if common:
                whose = f", slot {other.who} came first" if other.who else ""
                return f"waits for {', '.join(common)}{whose}"
        return ""
