"""The store behind the pages: opened when it is first needed, asked in threads of its own."""

from __future__ import annotations

import asyncio
import threading
from concurrent.futures import ThreadPoolExecutor
from typing import TYPE_CHECKING, Callable, TypeVar

if TYPE_CHECKING:
    from amt_line.store import Store

_Answer = TypeVar("_Answer")
_THREADS = 2

OpenStore = Callable[[], "Store"]


class Records:
    """Asks the store without keeping a browser's event from another browser."""

    def __init__(self, open_store: OpenStore) -> None:
        self._open = open_store
        self._lock = threading.Lock()
        self._store: Store | None = None
        self._threads = ThreadPoolExecutor(_THREADS, "page-store")
        self._counting = ThreadPoolExecutor(1, "page-statistics")

    async def ask(self, question: Callable[[Store], _Answer]) -> _Answer:
        """The answer; raises ``StoreProblem`` when the store has none to give."""
        return await self._ask(self._threads, question)

    async def ask_long(self, question: Callable[[Store], _Answer]) -> _Answer:
        """As ``ask``, for what takes seconds: one at a time, and nobody else waits for it."""
        return await self._ask(self._counting, question)

    async def _ask(self, threads: ThreadPoolExecutor,
                   question: Callable[[Store], _Answer]) -> _Answer:
        return await asyncio.get_running_loop().run_in_executor(
            threads, lambda: question(self._opened()))

    def _opened(self) -> Store:
        """A database that was away is tried again with every question."""
        with self._lock:
            if self._store is None:
                self._store = self._open()
            return self._store

    def close(self) -> None:
        """Give the database back; what is still asked is waited for."""
        for threads in (self._threads, self._counting):
            threads.shutdown(cancel_futures=True)
        if self._store is not None:
            self._store.close()
