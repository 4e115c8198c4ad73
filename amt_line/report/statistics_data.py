"""Statistics as data: one JSON document, or CSV with a line a figure."""

from __future__ import annotations

import csv
import io
from typing import Any, Iterator, Mapping

from amt_line.statistics.figures import Statistics
from amt_line.statistics.values import ValueFigures
from amt_line.statistics.yields import Yields
from amt_station.text import printable

Document = dict[str, Any]

# The figures of a group of runs, by the names that they have everywhere.
YIELD_FIGURES = (
    "runs", "passed", "failed", "errors", "aborted", "unfinished", "unnamed", "handsets",
    "first_passed", "first_pass_yield", "final_passed", "final_yield", "in_doubt", "retests",
    "run_median", "run_p95", "takt")
KEYS = ("plan", "station", "slot", "day", "step", "value", "unit", "min", "max")
COLUMNS = ("about", *KEYS, "figure", "number")

# A spreadsheet would carry out a text that begins like this.
_FORMULA = ("=", "+", "-", "@")


def statistics_document(found: Statistics) -> Document:
    """Everything, for programs; what cannot be said is null. Times are seconds."""
    chosen = found.filter
    return {
        "filter": {"plan": chosen.plan, "plan_version": chosen.plan_version,
                   "station": chosen.station, "slot": chosen.slot,
                   "since": chosen.since.isoformat() if chosen.since else None,
                   "until": chosen.until.isoformat() if chosen.until else None,
                   "zone": str(chosen.zone)},
        "all": _yields(found.all),
        "plans": [{**_key(key), **_yields(one)} for key, one in found.plans.items()],
        "stations": [{**_key(key), **_yields(one)} for key, one in found.stations.items()],
        "slots": [{**_key(key), **_yields(one)} for key, one in found.slots.items()],
        "days": [{**_key(key), **_yields(one)} for key, one in found.days.items()],
        "failures": [{"plan": one.step.plan, "step": one.step.label, "runs": one.runs,
                      "failed": one.failed, "errors": one.errors} for one in found.failures],
        "steps": [{"plan": one.step.plan, "step": one.step.label, "count": one.count,
                   "median": one.median, "p95": one.p95, "total": one.total}
                  for one in found.steps],
        "values": [_value(one) for one in found.values]}


def _key(key: Any) -> Document:
    return {name: str(word) for name, word in key._asdict().items()}


def _yields(one: Yields) -> Document:
    return {name: getattr(one, name) for name in YIELD_FIGURES}


def _value(one: ValueFigures) -> Document:
    spread = one.spread
    return {"plan": one.value.step.plan, "step": one.value.step.label, "value": one.value.name,
            "unit": one.value.unit, "min": one.limits.low, "max": one.limits.high,
            "own_limits": one.own_limits, "count": spread.count, "mean": spread.mean,
            "deviation": spread.deviation, "minimum": spread.minimum, "maximum": spread.maximum,
            "cp": one.capability.cp, "cpk": one.capability.cpk, "marginal": one.marginal,
            "failed": one.failed, "histogram": {
                "edges": list(one.histogram.edges), "counts": list(one.histogram.counts),
                "below": one.histogram.below, "above": one.histogram.above}}


_ABOUT: Mapping[str, str] = {"plans": "plan", "stations": "station", "slots": "slot",
                             "days": "day", "failures": "failures", "steps": "step",
                             "values": "value"}
_NO_FIGURES = (*KEYS, "histogram", "own_limits")


def statistics_csv(found: Statistics) -> str:
    """A line a figure; ``about`` says what it is a figure of, and the columns behind which."""
    out = io.StringIO()
    writer = csv.DictWriter(out, COLUMNS, restval="", lineterminator="\r\n")
    writer.writeheader()
    for row in _rows(statistics_document(found)):
        writer.writerow({name: _cell(cell) for name, cell in row.items()})
    return out.getvalue()


def _rows(document: Document) -> Iterator[Document]:
    for figure, number in document["all"].items():
        yield {"about": "all", "figure": figure, "number": number}
    for name, about in _ABOUT.items():
        for entry in document[name]:
            keys = {key: entry[key] for key in KEYS if key in entry}
            for figure, number in entry.items():
                if figure not in _NO_FIGURES:
                    yield {"about": about, **keys, "figure": figure, "number": number}


def _cell(cell: Any) -> Any:
    if not isinstance(cell, str):
        return cell
    text = printable(cell)
    return f"'{text}" if text.startswith(_FORMULA) else text
