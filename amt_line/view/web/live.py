"""The live line: server-sent events to every browser, and what a browser sends back."""

from __future__ import annotations

import asyncio
import json
from dataclasses import dataclass
from pathlib import Path
from typing import Any

from aiohttp import web

from amt_line.run.desk import Desk, NoSuchQuestion, NoSuchSlot, NotAnAnswer
from amt_line.view.web.assets import version
from amt_line.view.web.changes import Changes
from amt_line.view.web.guard import Guard
from amt_station.text import printable

_LONGEST_ANSWER = 4096
_PICTURES = {".png": "image/png", ".jpg": "image/jpeg", ".jpeg": "image/jpeg", ".gif": "image/gif",
             ".webp": "image/webp"}


@dataclass(frozen=True)
class Pace:
    """Times in seconds, and how many browsers may watch."""

    # Changes that come closer together than this are told together.
    gather: float = 0.1
    # A browser hears something at least this often, or knows that the server is gone.
    beat: float = 5.0
    # A browser that has not read for so long is given up.
    patience: float = 15.0
    browsers: int = 64


class Live:
    """What the page of the line talks to."""

    def __init__(self, changes: Changes, desk: Desk, guard: Guard, pace: Pace) -> None:
        self._changes = changes
        self._desk = desk
        self._guard = guard
        self._pace = pace
        self._closing = False
        self.watching = 0

    def add_to(self, application: web.Application) -> None:
        """Serve this."""
        application.router.add_get("/live", self._live, allow_head=False)
        application.router.add_post("/answer", self._answer)
        application.router.add_post("/stop", self._stop)
        application.router.add_get("/picture/{question}", self._picture)

    def close(self) -> None:
        """Say goodbye to every browser."""
        self._closing = True
        self._changes.wake()

    async def _live(self, request: web.Request) -> web.StreamResponse:
        if self.watching >= self._pace.browsers or self._closing:
            raise web.HTTPServiceUnavailable()
        response = web.StreamResponse(headers={"Content-Type": "text/event-stream; charset=utf-8",
                                               "X-Accel-Buffering": "no"})
        seen = self._changes.seen(request.headers.get("Last-Event-ID", "")
                                  or request.query.get("since", ""))
        self.watching += 1
        try:
            await response.prepare(request)
            await self._tell(request, response, seen)
        except ConnectionError:
            pass  # it went away
        except asyncio.TimeoutError:
            if request.transport is not None:
                request.transport.abort()
        finally:
            self.watching -= 1
        return response

    async def _tell(self, request: web.Request, response: web.StreamResponse,
                    seen: int | None) -> None:
        changes, told = self._changes, False
        while not self._closing and request.transport is not None:
            if told and changes.version == seen:
                await changes.news(self._pace.beat)
                if changes.version == seen and not self._closing:
                    await self._send(response, "beat", {}, changes.event_id)
                continue
            document: dict[str, Any] = changes.since(seen)
            if not told:
                document.update(token=self._guard.token, version=version())
            kind = "snapshot" if seen is None else "change"
            seen, told = changes.version, True
            await self._send(response, kind, document, changes.event_id)
            await asyncio.sleep(self._pace.gather)
        if self._closing and request.transport is not None:
            await self._send(response, "bye", {}, changes.event_id)

    async def _send(self, response: web.StreamResponse, kind: str, document: dict[str, Any],
                    event_id: str) -> None:
        data = json.dumps(document, ensure_ascii=False, separators=(",", ":"))
        message = f"id: {event_id}\nevent: {kind}\ndata: {data}\n\n"
        await asyncio.wait_for(response.write(message.encode()), self._pace.patience)

    # what comes back

    async def _answer(self, request: web.Request) -> web.Response:
        said = await _said(request, "id", "text")
        if len(said["text"]) > _LONGEST_ANSWER:
            return _no(422, "unfit", "")
        try:
            await asyncio.to_thread(self._desk.answer, said["id"], said["text"], "page")
        except NoSuchQuestion:
            return _no(409, "gone", "")
        except NotAnAnswer as error:
            return _no(422, "unfit", printable(str(error)))
        return web.json_response({"ok": True})

    async def _stop(self, request: web.Request) -> web.Response:
        said = await _said(request, "slot", "run")
        slot = self._changes.slot_with(said["slot"], said["run"])
        if slot is None:
            return _no(409, "gone", "")
        try:
            await asyncio.to_thread(self._desk.stop, slot)
        except NoSuchSlot:
            return _no(409, "gone", "")
        return web.json_response({"ok": True})

    async def _picture(self, request: web.Request) -> web.StreamResponse:
        try:
            path: Path | None = self._desk.picture(request.match_info["question"])
        except NoSuchQuestion:
            path = None
        kind = _PICTURES.get(path.suffix.lower()) if path is not None else None
        if path is None or kind is None or not path.is_file():
            raise web.HTTPNotFound()
        return web.FileResponse(path, headers={"Content-Type": kind})


async def _said(request: web.Request, *names: str) -> dict[str, str]:
    """The texts that a page has sent; anything else is a bad request."""
    if request.content_type != "application/json":
        raise web.HTTPUnsupportedMediaType()
    try:
        document = await request.json()
    except (ValueError, RecursionError):
        document = None
    if not isinstance(document, dict) or not all(isinstance(document.get(name), str)
                                                 for name in names):
        raise web.HTTPBadRequest()
    return {name: document[name] for name in names}


def _no(status: int, problem: str, text: str) -> web.Response:
    return web.json_response({"ok": False, "problem": problem, "text": text}, status=status)
