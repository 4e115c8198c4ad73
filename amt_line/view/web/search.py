"""What a browser asks of the runs: its query, read strictly, and written again for links."""

from __future__ import annotations

from dataclasses import dataclass
from datetime import date, datetime, time, timedelta, timezone
from typing import Mapping
from urllib.parse import urlencode

from amt_line.store import Search

SORTS = ("verdict", "dut", "plan", "slot", "station", "began", "seconds")
VERDICTS = ("PASS", "FAIL", "ERROR", "ABORTED", "UNFINISHED")
_TEXTS = ("text", "dut", "plan", "station", "slot")
_NEWEST = "-began"
_LONGEST = 200
_PAGE_SIZE = 50
_MOST_PAGES = 1_000_000


class BadQuery(ValueError):
    """The query cannot be meant so; the text is the key of words that say why."""


@dataclass(frozen=True)
class Query:
    """A query of the page of runs, as texts and as the store takes it."""

    texts: Mapping[str, str]
    search: Search

    def link(self, **changes: str) -> str:
        """The same page with something changed."""
        return "/runs?" + urlencode({name: value for name, value in
                                     {**self.texts, **changes}.items() if value})

    def sorted_by(self, name: str) -> str:
        """A link that sorts by a column, the other way round if it does so already."""
        turned = "" if self.search.sort == f"-{name}" else "-"
        return self.link(sort=f"{turned}{name}", page="")

    def direction(self, name: str) -> str:
        """How a column is sorted now, in the words of ARIA."""
        return {name: "ascending", f"-{name}": "descending"}.get(self.search.sort, "none")

    def pages(self, total: int) -> int:
        """How many pages there are."""
        return max(1, -(-total // self.search.size))


def read_query(given: Mapping[str, str]) -> Query:
    """The query; ``BadQuery`` when something in it is no date, sort, verdict or page."""
    texts = {name: given.get(name, "").strip()[:_LONGEST]
             for name in (*_TEXTS, "verdict", "since", "until", "sort", "page")}
    if texts["verdict"] not in ("", *VERDICTS):
        raise BadQuery("query.verdict")
    if texts["sort"].removeprefix("-") not in ("", *SORTS):
        raise BadQuery("query.sort")
    page = texts["page"] or "1"
    if not page.isascii() or not page.isdecimal() or not 1 <= int(page) <= _MOST_PAGES:
        raise BadQuery("query.page")
    return Query(texts, Search(
        **{name: texts[name] for name in _TEXTS}, verdict=texts["verdict"],
        since=day_begin(texts["since"]), until=day_begin(texts["until"], 1),
        sort=texts["sort"] or _NEWEST, page=int(page), size=_PAGE_SIZE))


def day_begin(text: str, later: int = 0) -> datetime | None:
    """The first moment of a day on the wall's calendar, in UTC."""
    if not text:
        return None
    try:
        day = date.fromisoformat(text) + timedelta(days=later)
        return datetime.combine(day, time()).astimezone().astimezone(timezone.utc)
    except (ValueError, OverflowError) as error:
        raise BadQuery("query.date") from error
