"""The words of the pages: one file a language, and which one a browser gets."""

from __future__ import annotations

import json
import re
from dataclasses import dataclass
from functools import lru_cache
from importlib import resources
from typing import Any, Mapping

from aiohttp import web

DEFAULT = "en"
COOKIE = "amt-language"
QUERY = "lang"
_YEAR = 365 * 24 * 3600
_PLACE = re.compile(r"\{(\w+)\}")
_RANGE = re.compile(r"\s*([A-Za-z]{1,8}|\*)(?:-[A-Za-z0-9-]*)?\s*"
                    r"(?:;\s*q=([01](?:\.\d{0,3})?)\s*)?")


@dataclass(frozen=True)
class Language:
    """A language: its code as HTML has it, and its words by key."""

    code: str
    words: Mapping[str, str]

    def word(self, key: str, **values: Any) -> str:
        """The words of a key, with what stands in their places."""
        return _PLACE.sub(lambda found: str(values[found[1]]), self.words[key])

    @property
    def name(self) -> str:
        """What the language calls itself."""
        return self.words["language.name"]


@lru_cache(maxsize=1)
def languages() -> Mapping[str, Language]:
    """All languages by code, in the order in which they are offered."""
    folder = resources.files("amt_line.view.web") / "words"
    found = {}
    for file in sorted(folder.iterdir(), key=lambda entry: entry.name):
        if file.name.endswith(".json"):
            code = file.name.removesuffix(".json")
            found[code] = Language(code, json.loads(file.read_text(encoding="utf-8")))
    return found


def chosen(request: web.Request) -> Language:
    """The language of the switch, else that of the browser, else English."""
    known = languages()
    for code in (request.query.get(QUERY, ""), request.cookies.get(COOKIE, "")):
        if code in known:
            return known[code]
    return known[best(request.headers.get("Accept-Language", ""))]


def best(accepted: str) -> str:
    """The code that fits an Accept-Language header best."""
    wanted: list[tuple[float, str]] = []
    for part in accepted[:1000].split(","):
        found = _RANGE.fullmatch(part)
        if found is not None:
            wanted.append((float(found[2] or 1), found[1].lower()))
    for quality, prefix in sorted(wanted, key=lambda item: -item[0]):
        for code in languages():
            if quality and code.partition("-")[0].lower() == prefix:
                return code
    return DEFAULT


def remember(request: web.Request, response: web.StreamResponse) -> None:
    """Keep what the switch was set to."""
    code = request.query.get(QUERY, "")
    if code in languages():
        response.set_cookie(COOKIE, code, max_age=_YEAR, httponly=True, samesite="Lax")
