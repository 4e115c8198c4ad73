"""Makes pages of templates: in the browser's language, everything from outside escaped."""

from __future__ import annotations

from datetime import datetime
from functools import lru_cache
from typing import Any, Callable

from aiohttp import web
from jinja2 import Environment
from yarl import URL

from amt_line.drawing.value_bar import value_bar
from amt_line.report.template import environment_of
from amt_line.view.web import language
from amt_line.view.web.assets import version
from amt_line.view.web.words import limits_words

ROOMS = (("line", "/"), ("runs", "/runs"), ("statistics", "/statistics"))
_EXPLAINED = frozenset({400, 401, 403, 404, 421, 500, 503})


@lru_cache(maxsize=1)
def _environment() -> Environment:
    environment = environment_of("amt_line.view.web")
    environment.filters.update(local=local_time)
    environment.globals.update(limits_words=limits_words, bar=value_bar)
    return environment


def local_time(text: str | None) -> str:
    """A time of a record as the clock on the wall says it."""
    if not text:
        return ""
    return datetime.fromisoformat(text.replace("Z", "+00:00")).astimezone().strftime(
        "%Y-%m-%d %H:%M:%S")


def zone_name() -> str:
    """The zone of the clock on the wall."""
    return datetime.now().astimezone().tzname() or ""


class Renderer:
    """Makes the responses that are pages."""

    def __init__(self, rooms: frozenset[str], delivery: Callable[[], str]) -> None:
        """``rooms`` are those that there are; ``delivery`` says how far the store is."""
        self._rooms = [row for row in ROOMS if row[0] in rooms]
        self._delivery = delivery

    def page(self, request: web.Request, template: str, status: int = 200,
             **values: Any) -> web.Response:
        """A page."""
        chosen = language.chosen(request)
        text = _environment().get_template(template).render(
            t=chosen.word, language=chosen, languages=list(language.languages().values()),
            words=dict(chosen.words), version=version(), rooms=self._rooms,
            delivery=self._delivery().removeprefix("behind: "),  # the page says that by itself
            with_language=lambda code: _with_language(request, code),
            zone=zone_name(), **{"room": "", **values})
        response = web.Response(text=text, status=status, content_type="text/html")
        response.headers["Vary"] = "Accept-Language, Cookie"
        language.remember(request, response)
        return response

    def problem(self, request: web.Request, status: int, text: str = "") -> web.Response:
        """What is wrong, for a person or for a program."""
        chosen = language.chosen(request)
        key = f"status.{status}" if status in _EXPLAINED else "status.other"
        if "text/html" not in request.headers.get("Accept", ""):
            # Whatever asks so is no person with a language of its own.
            words = language.languages()[language.DEFAULT]
            return web.Response(text=f"{words.word(key)} {text}".strip() + "\n", status=status)
        return self.page(request, "problem.html", status, wrong=status, title=chosen.word(key),
                         text=text)


def _with_language(request: web.Request, code: str) -> str:
    """This page in another language."""
    if request.method != "GET":
        return "/"
    query = [(name, value) for name, value in request.query.items()
             if name not in (language.QUERY, "token")]
    path: URL = request.rel_url.with_query([*query, (language.QUERY, code)])
    return str(path)
