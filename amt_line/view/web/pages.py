"""The pages: Line, Runs, Run, Statistics, and the files that they are made of."""

from __future__ import annotations

import json
from typing import Any

from aiohttp import web

from amt_line.run.record_file import file_name
from amt_line.view.web import language
from amt_line.view.web.assets import assets
from amt_line.view.web.records import Records
from amt_line.view.web.render import Renderer
from amt_line.view.web.search import VERDICTS, BadQuery, read_query

_RUN = "{run:[0-9a-f-]{36}}"


class Pages:
    """Serves what is asked for and shown whole."""

    def __init__(self, renderer: Renderer, records: Records | None, has_line: bool) -> None:
        self._renderer = renderer
        self._records = records
        self._has_line = has_line

    def add_to(self, application: web.Application) -> None:
        """Serve these."""
        router = application.router
        router.add_get("/", self._first)
        router.add_get("/static/{name}", self._static)
        if self._records is not None:
            router.add_get("/runs", self._runs)
            router.add_get("/statistics", self._statistics)
            router.add_get(f"/runs/{_RUN}", self._run)
            router.add_get(f"/runs/{_RUN}/record.json", self._record)

    async def _first(self, request: web.Request) -> web.StreamResponse:
        if not self._has_line:
            raise web.HTTPFound("/runs")
        return self._renderer.page(request, "line.html", room="line")

    async def _static(self, request: web.Request) -> web.Response:
        asset = assets().get(request.match_info["name"])
        if asset is None:
            raise web.HTTPNotFound()
        # Asked for each time, sent only when it has changed.
        headers = {"ETag": asset.tag, "Cache-Control": "no-cache"}
        if request.headers.get("If-None-Match") == asset.tag:
            return web.Response(status=304, headers=headers)
        return web.Response(body=asset.content, headers=headers,
                            content_type=asset.content_type, charset="utf-8")

    async def _runs(self, request: web.Request) -> web.Response:
        assert self._records is not None
        shown: dict[str, Any] = {"room": "runs", "verdicts": VERDICTS}
        try:
            query = read_query(request.query)
        except BadQuery as error:
            return self._renderer.page(request, "runs.html", 400, **shown, query=None,
                                       given=request.query, choices={}, wrong=str(error))
        found = await self._records.ask(lambda store: store.runs(query.search))
        choices = await self._records.ask(lambda store: store.words())
        return self._renderer.page(request, "runs.html", **shown, query=query, wrong="",
                                   given=query.texts, choices=choices, found=found)

    async def _statistics(self, request: web.Request) -> web.Response:
        from amt_line.store.figures import gather
        from amt_line.view.web.figures import read_filter, shown_figures

        assert self._records is not None
        try:
            texts, chosen = read_filter(request.query)
        except BadQuery as error:
            return self._renderer.page(request, "statistics.html", 400, room="statistics",
                                       given=request.query, choices={}, wrong=str(error))
        words = language.chosen(request)
        choices = await self._records.ask(lambda store: store.words())
        figures = await self._records.ask_long(
            lambda store: shown_figures(gather(store, chosen), words))
        return self._renderer.page(request, "statistics.html", room="statistics", given=texts,
                                   choices=choices, wrong="", figures=figures)

    async def _run(self, request: web.Request) -> web.Response:
        record = json.loads(await self._record_text(request))
        return self._renderer.page(request, "run.html", room="runs", record=record)

    async def _record(self, request: web.Request) -> web.Response:
        text = await self._record_text(request)
        record = json.loads(text)
        name = file_name(record["dut"], record["began"], record["run"])
        return web.Response(body=text.encode(), content_type="application/json", charset="utf-8",
                            headers={"Content-Disposition": f'attachment; filename="{name}"'})

    async def _record_text(self, request: web.Request) -> str:
        assert self._records is not None
        run = request.match_info["run"]
        text = await self._records.ask(lambda store: store.record_text(run))
        if text is None:
            raise web.HTTPNotFound()
        return text
