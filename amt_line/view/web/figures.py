"""The page of statistics: which runs are meant, and the figures in the browser's language."""

from __future__ import annotations

import os
import re
from dataclasses import fields, replace
from datetime import datetime, tzinfo
from typing import Any, Mapping, Sequence
from zoneinfo import ZoneInfo

from amt_line.drawing.axis import number_text
from amt_line.drawing.days import yield_over_days
from amt_line.drawing.histogram import value_histogram
from amt_line.drawing.pareto import failure_pareto
from amt_line.drawing.words import Words
from amt_line.report import statistics_tables as tables
from amt_line.report.statistics_tables import Table
from amt_line.statistics.figures import Statistics
from amt_line.statistics.filter import Filter
from amt_line.statistics.values import FEW, ValueFigures
from amt_line.view.web.language import Language
from amt_line.view.web.search import BadQuery, day_begin

_MOST_HISTOGRAMS = 60
_LIMITS = 3
_CHOICES = ("plan", "station", "slot")
_LONGEST = 200
_NOT_A_WORD = re.compile("[^a-z0-9]+")
_ZONES = "/zoneinfo/"


def read_filter(given: Mapping[str, str]) -> tuple[dict[str, str], Filter]:
    """The query as texts and as a filter; ``BadQuery`` when a date is none."""
    texts = {name: given.get(name, "").strip()[:_LONGEST] for name in (*_CHOICES, "since", "until")}
    since, until = day_begin(texts["since"]), day_begin(texts["until"], 1)
    if since is not None and until is not None and since >= until:
        raise BadQuery("query.period")
    return texts, Filter(**{name: texts[name] for name in _CHOICES}, since=since, until=until,
                         zone=wall_zone())


def wall_zone() -> tzinfo:
    """The zone of the clock on the wall, with its summer time where the system names it."""
    name = os.environ.get("TZ") or os.path.realpath("/etc/localtime").partition(_ZONES)[2]
    try:
        return ZoneInfo(name)
    except (OSError, KeyError, ValueError):
        zone = datetime.now().astimezone().tzinfo
        assert zone is not None
        return zone


def shown_figures(found: Statistics, language: Language) -> dict[str, Any]:
    """What the page's template shows."""
    words = Words(**{field.name: language.words[f"draw.{field.name}"] for field in fields(Words)})
    limited = tables.limited_values(found)
    others = [one for one in found.values if not one.limited]
    return {
        "all": found.all, "yields": yield_over_days(found.days, words),
        "groups": [_told(table, language) for table in tables.group_tables(found)],
        "days": _told(tables.day_table(found), language),
        "pareto": failure_pareto(found.failures, words),
        "failures": _told(tables.failure_table(found), language, "figures.failures.note"),
        "values": _values(limited, language), "others": _values(others, language),
        "histograms": [(one, value_histogram(one, words)) for one in limited[:_MOST_HISTOGRAMS]],
        "not_drawn": max(0, len(limited) - _MOST_HISTOGRAMS),
        "steps": _told(tables.step_table(found), language, "figures.steps.note")}


def _told(table: Table, language: Language, note: str = "") -> Table:
    """A table with its title and columns in another language; one without words stays."""
    def told(kind: str, text: str) -> str:
        key = f"{kind}.{_NOT_A_WORD.sub('-', text.lower()).strip('-')}"
        return language.words.get(key, text)

    return replace(table, title=told("table", table.title),
                   columns=tuple(told("column", name) for name in table.columns),
                   note=language.word(note, few=FEW) if note else "")


def _values(values: Sequence[ValueFigures], language: Language) -> Table:
    table = _told(tables.value_table(values), language, "figures.values.note")
    return replace(table, rows=[(*row[:_LIMITS], _limits(one, language), *row[_LIMITS + 1:])
                                for one, row in zip(values, table.rows)])


def _limits(one: ValueFigures, language: Language) -> str:
    """The limits of a value's runs."""
    if one.own_limits:
        return language.word("limits.own")
    low, high = one.limits.low, one.limits.high
    unit = f" {one.value.unit}" if one.value.unit else ""
    if low is None and high is None:
        return tables.NONE
    if high is None:
        return language.word("limits.least", low=number_text(low or 0) + unit)
    if low is None:
        return language.word("limits.most", high=number_text(high) + unit)
    return language.word("limits.between", low=number_text(low), high=number_text(high) + unit)
