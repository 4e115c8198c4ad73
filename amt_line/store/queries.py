"""The questions to the database, one text for every kind of it."""

from __future__ import annotations

from datetime import datetime, timezone
from typing import Any

from sqlalchemy import func, or_, select

from amt_line.store.search import SORTS, UNFINISHED, RunRow, Search
from amt_line.store.tables import RUNS
from amt_station.errors import UsageProblem

_LARGEST_PAGE = 10_000
_IN_TEXT = ("dut", "plan", "station", "slot", "operator", "reason", "first_failed_step", "run")

_RUN_COLUMNS = [RUNS.c[name] for name in RunRow._fields]


def utc_text(moment: datetime) -> str:
    """A moment as records have it; one without a zone is UTC."""
    if moment.tzinfo is None:
        moment = moment.replace(tzinfo=timezone.utc)
    return moment.astimezone(timezone.utc).isoformat(timespec="milliseconds").replace(
        "+00:00", "Z")


def count(search: Search) -> Any:
    """How many runs a search finds."""
    return select(func.count()).select_from(RUNS).where(*_searched(search))


def page(search: Search) -> Any:
    """One page of the runs that a search finds."""
    if search.page < 1 or not 1 <= search.size <= _LARGEST_PAGE:
        raise UsageProblem(f"page {search.page} of {search.size} runs cannot be shown")
    return (select(*_RUN_COLUMNS).where(*_searched(search)).order_by(*_order(search.sort))
            .limit(search.size).offset((search.page - 1) * search.size))


def _searched(search: Search) -> list[Any]:
    exact = [RUNS.c[name] == text for name in ("plan", "station", "slot")
             if (text := getattr(search, name))]
    found = [_contains(RUNS.c.dut, search.dut)] if search.dut else []
    if search.text:
        found.append(or_(*(_contains(RUNS.c[name], search.text) for name in _IN_TEXT)))
    return exact + found + _verdict(search.verdict) + _between(search.since, search.until)


def _contains(column: Any, text: str) -> Any:
    return func.lower(column).contains(text.lower(), autoescape=True)


def _verdict(word: str) -> list[Any]:
    return [RUNS.c.verdict == ("" if word == UNFINISHED else word)] if word else []


def _between(since: datetime | None, until: datetime | None) -> list[Any]:
    return ([RUNS.c.began >= utc_text(since)] if since is not None else []) + \
        ([RUNS.c.began < utc_text(until)] if until is not None else [])


def _order(sort: str) -> list[Any]:
    name, falling = sort.removeprefix("-"), sort.startswith("-")
    if name not in SORTS:
        raise UsageProblem(f"runs cannot be sorted by {name!r}, but by {', '.join(SORTS)}")
    columns = [RUNS.c[name], *([RUNS.c.began] if name != "began" else []), RUNS.c.id]
    ordered = [column.desc() if falling else column.asc() for column in columns]
    # The databases disagree on where a run without a time belongs.
    return [ordered[0].nulls_last(), *ordered[1:]] if name == "seconds" else ordered
