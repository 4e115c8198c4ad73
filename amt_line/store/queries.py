"""The questions to the database, one text for every kind of it."""

from __future__ import annotations

from datetime import datetime, timezone
from typing import Any

from sqlalchemy import func, or_, select

from amt_line.store.search import SORTS, UNFINISHED, Filter, RunRow, Search, StepRow, ValueRow
from amt_line.store.tables import RUNS, STEP_VALUES, STEPS
from amt_station.errors import UsageProblem

_LARGEST_PAGE = 10_000
_IN_TEXT = ("dut", "plan", "station", "slot", "operator", "reason", "first_failed_step", "run")

_RUN_COLUMNS = [RUNS.c[name] for name in RunRow._fields]
_STEP_COLUMNS = [STEPS.c[name] for name in StepRow._fields]
_VALUE_COLUMNS = [STEP_VALUES.c[name] for name in ValueRow._fields]


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


def chosen_runs(wanted: Filter) -> Any:
    """The runs of a filter, the oldest first."""
    return (select(*_RUN_COLUMNS).where(*_chosen(wanted))
            .order_by(RUNS.c.began, RUNS.c.id))


def chosen_steps(wanted: Filter) -> Any:
    """The steps of the runs of a filter."""
    return (_of_runs(select(*_STEP_COLUMNS), STEPS, wanted)
            .order_by(STEPS.c.run_id, STEPS.c.number))


def chosen_values(wanted: Filter) -> Any:
    """The values of the runs of a filter."""
    return (_of_runs(select(*_VALUE_COLUMNS), STEP_VALUES, wanted)
            .order_by(STEP_VALUES.c.run_id, STEP_VALUES.c.step, STEP_VALUES.c.position))


def _of_runs(query: Any, table: Any, wanted: Filter) -> Any:
    chosen = _chosen(wanted)
    return query.join_from(RUNS, table).where(*chosen) if chosen else query


def _chosen(wanted: Filter) -> list[Any]:
    exact = [RUNS.c[name] == text for name in ("plan", "plan_version", "station", "slot", "dut")
             if (text := getattr(wanted, name))]
    return exact + _verdict(wanted.verdict) + _between(wanted.since, wanted.until)


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
