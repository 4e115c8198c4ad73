"""The page's server: a thread of its own, so that no browser is ever in a run's way."""

from __future__ import annotations

import asyncio
import threading
from typing import Any, Callable, Mapping

from aiohttp import web

from amt_line.run.desk import Desk
from amt_line.view.board import Board
from amt_line.view.web.address import Address, Names, bound
from amt_line.view.web.changes import Changes
from amt_line.view.web.guard import Guard, add_headers
from amt_line.view.web.live import Live, Pace
from amt_line.view.web.pages import Pages
from amt_line.view.web.records import OpenStore, Records
from amt_line.view.web.render import Renderer

# More than any bench has browsers; a station has few descriptors, and its ports need them.
_MOST_CONNECTIONS = 256
_LARGEST_BODY = 64 * 1024
_PATIENCE = 10.0


class Page:
    """The served pages, and a listener to the events of a line: what it is told, it shows."""

    def __init__(self, address: Address, *, desk: Desk | None = None,
                 store: OpenStore | None = None, access: str | None = None,
                 delivery: Callable[[], str] = lambda: "ok", pace: Pace = Pace()) -> None:
        """``UsageProblem`` when nothing can be served at the address.

        Without a ``desk`` there is no line to be watched, without a ``store`` there are no records.
        ``access`` is the token that a browser has to show; ``delivery`` says how far the store is.
        """
        self._socket = bound(address)
        self.port: int = self._socket.getsockname()[1]
        # For the person at the terminal: it lets a browser in.
        self.url = f"http://{address.url_host}:{self.port}/" + (
            f"?token={access}" if access else "")
        self._loop = asyncio.new_event_loop()
        self._changes = Changes(Board(), self._loop)
        self._records = Records(store) if store is not None else None
        rooms = {"line"} if desk is not None else set()
        rooms |= {"runs", "statistics"} if store is not None else set()
        renderer = Renderer(frozenset(rooms), delivery)
        self._guard = Guard(Names(address), access, renderer)
        self._pages = Pages(renderer, self._records, desk is not None)
        self._live = Live(self._changes, desk, self._guard, pace) if desk is not None else None
        self._end = asyncio.Event()
        self._thread = threading.Thread(target=self._serve, name="page", daemon=True)
        self._thread.start()

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event; returns at once."""
        self._changes.take(event)

    @property
    def watching(self) -> int:
        """How many browsers watch the line."""
        return self._live.watching if self._live is not None else 0

    def close(self) -> None:
        """Say goodbye to the browsers and end the thread."""
        if self._thread.is_alive():
            try:
                self._loop.call_soon_threadsafe(self._end.set)
            except RuntimeError:
                pass  # it has just ended by itself
            self._thread.join(_PATIENCE)

    def _serve(self) -> None:
        asyncio.set_event_loop(self._loop)
        try:
            self._loop.run_until_complete(self._run())
            self._loop.run_until_complete(self._loop.shutdown_default_executor())
        finally:
            self._loop.close()
            self._socket.close()
            if self._records is not None:
                self._records.close()

    async def _run(self) -> None:
        application = web.Application(middlewares=[self._guard.middleware],
                                      client_max_size=_LARGEST_BODY)
        application.on_response_prepare.append(add_headers)
        self._guard.add_to(application)
        self._pages.add_to(application)
        if self._live is not None:
            self._live.add_to(application)
        runner = web.AppRunner(application, access_log=None, handle_signals=False)
        await runner.setup()
        assert runner.server is not None
        server = await self._loop.create_server(_at_most(runner.server), sock=self._socket)
        try:
            await self._end.wait()
        finally:
            server.close()
            if self._live is not None:
                self._live.close()
            # What is still under way has this long.
            await runner.server.shutdown(2.0)
            await runner.cleanup()
            await _end_of_tasks()


async def _end_of_tasks() -> None:
    """A browser that has just gone away has left a task that does not know it yet."""
    others = asyncio.all_tasks() - {asyncio.current_task()}
    for task in others:
        task.cancel()
    await asyncio.gather(*others, return_exceptions=True)


def _at_most(server: web.Server) -> Callable[[], asyncio.BaseProtocol]:
    """Makes the protocol of a connection; one too many is closed at once."""
    def protocol() -> asyncio.BaseProtocol:
        return _Closed() if len(server.connections) >= _MOST_CONNECTIONS else server()
    return protocol


class _Closed(asyncio.Protocol):
    def connection_made(self, transport: asyncio.BaseTransport) -> None:
        transport.close()


def start(address: Address, *, desk: Desk | None = None, store: OpenStore | None = None,
          access: str | None = None, delivery: Callable[[], str] = lambda: "ok") -> Page:
    """Serve the pages until ``close``. Hand the page to the stream of events as a listener."""
    return Page(address, desk=desk, store=store, access=access, delivery=delivery)
