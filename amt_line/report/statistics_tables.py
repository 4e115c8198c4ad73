"""Statistics as tables for people: for a terminal, plain text and the HTML file."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Any, Iterable, Mapping, Sequence

from amt_line.drawing.axis import mean_text, number_text
from amt_line.drawing.days import share_text
from amt_line.report.records import duration
from amt_line.statistics.figures import Statistics, worst_first
from amt_line.statistics.filter import Filter
from amt_line.statistics.values import FEW, ValueFigures
from amt_line.statistics.yields import Yields
from amt_station.text import printable

NONE = "\u2013"


@dataclass(frozen=True)
class Table:
    """Rows of texts. The first ``words`` columns are words, the others numbers."""

    title: str
    columns: tuple[str, ...]
    rows: Sequence[tuple[str, ...]]
    words: int = 1
    note: str = ""


_YIELD_COLUMNS = ("Runs", "Pass", "Fail", "Error", "Aborted", "Handsets", "First pass",
                  "At the end", "Retests", "Run", "Takt")


def _yield_row(one: Yields) -> tuple[str, ...]:
    return (str(one.runs), str(one.passed), str(one.failed), str(one.errors), str(one.aborted),
            str(one.handsets), share_text(one.first_pass_yield), share_text(one.final_yield),
            str(one.retests), duration(one.run_median) or NONE, duration(one.takt) or NONE)


def filter_text(chosen: Filter) -> str:
    """Which runs these are."""
    parts = [f"{word} {printable(text)}" for word, text in (
        ("plan", chosen.plan), ("version", chosen.plan_version), ("station", chosen.station),
        ("slot", chosen.slot)) if text]
    for word, moment in (("since", chosen.since), ("until", chosen.until)):
        if moment is not None:
            parts.append(f"{word} {moment.astimezone(chosen.zone):%Y-%m-%d %H:%M}")
    return f"{', '.join(parts) or 'all runs'} (days of {chosen.zone})"


def summary(found: Statistics) -> list[str]:
    """What counts most, in a few lines."""
    one = found.all
    lines = [f"{_several(one.runs, 'run')}, {_several(one.handsets, 'handset')}: "
             f"{one.passed} PASS, {one.failed} FAIL, {one.errors} ERROR, {one.aborted} ABORTED"
             + (f", {one.unfinished} unfinished" if one.unfinished else ""),
             f"first-pass yield {share_text(one.first_pass_yield)} "
             f"({one.first_passed} of {one.handsets}), final yield "
             f"{share_text(one.final_yield)} ({one.final_passed} of {one.handsets}), "
             f"{_several(one.retests, 'retest')}"]
    if one.in_doubt:
        lines.append(f"in doubt, since the last run came to neither PASS nor FAIL: "
                     f"{_several(one.in_doubt, 'handset')}")
    if one.unnamed:
        lines.append(f"in no yield, since no handset is named: {_several(one.unnamed, 'run')}")
    if one.run_median is not None:
        takt = f", takt of a slot {duration(one.takt)}" if one.takt is not None else ""
        lines.append(f"a run takes {duration(one.run_median)} (median), 95 % of them up to "
                     f"{duration(one.run_p95)}{takt}")
    return lines


def _several(number: int, what: str) -> str:
    return f"{number} {what}{'' if number == 1 else 's'}"


def group_tables(found: Statistics) -> list[Table]:
    """Plans, stations and slots, where there are several."""
    every: Sequence[tuple[str, tuple[str, ...], Mapping[Any, Yields]]] = (
        ("Plans", ("Plan",), found.plans), ("Stations", ("Station",), found.stations),
        ("Slots", ("Station", "Slot"), found.slots))
    return [_groups(title, names, groups) for title, names, groups in every if len(groups) > 1]


def day_table(found: Statistics) -> Table:
    """The days, the newest first."""
    table = _groups("Days", ("Day",), found.days)
    return Table(table.title, table.columns, table.rows[::-1], table.words)


def _groups(title: str, names: tuple[str, ...], groups: Mapping[Any, Yields]) -> Table:
    rows = [(*(printable(str(word)) or NONE for word in key), *_yield_row(one))
            for key, one in groups.items()]
    return Table(title, (*names, *_YIELD_COLUMNS), rows, len(names))


def failure_table(found: Statistics) -> Table:
    """The steps that did not pass."""
    total = sum(one.runs for one in found.failures)
    rows, cumulated = [], 0
    for one in found.failures:
        cumulated += one.runs
        rows.append((printable(one.step.plan), printable(one.step.label), str(one.runs),
                     share_text(one.runs / total if total else None),
                     share_text(cumulated / total if total else None), str(one.failed),
                     str(one.errors)))
    return Table("Failures by step",
                 ("Plan", "Step", "Runs", "Share", "With those above", "Failed", "Errors"), rows,
                 2, "Runs: failed runs of which it was the first step to fail.")


def value_table(values: Iterable[ValueFigures], title: str = "Values") -> Table:
    """Values, as they come."""
    rows = [_value_row(one) for one in values]
    note = "Cp and Cpk by the deviation of all values (n - 1)."
    if any(row[-3].endswith("*") for row in rows):
        note += f" *: fewer than {FEW} values."
    return Table(title, ("Plan", "Step", "Value", "Limits", "Count", "Mean", "Deviation",
                         "Smallest", "Largest", "Cp", "Cpk", "Near", "Out"), rows, 4, note)


def limited_values(found: Statistics) -> list[ValueFigures]:
    """The values that have limits, the least capable first."""
    return worst_first(found.values)


def _value_row(one: ValueFigures) -> tuple[str, ...]:
    spread, unit = one.spread, f" {printable(one.value.unit)}" if one.value.unit else ""
    mark = "*" if one.few else ""
    return (printable(one.value.step.plan), printable(one.value.step.label),
            printable(one.value.name), _limits(one) + (unit if one.limited else ""),
            str(spread.count), mean_text(spread.mean, spread.deviation) + unit,
            f"{spread.deviation:.3g}" if spread.deviation is not None else NONE,
            number_text(spread.minimum), number_text(spread.maximum),
            _ratio(one.capability.cp, mark), _ratio(one.capability.cpk, mark),
            str(one.marginal), str(one.failed))


def _ratio(ratio: float | None, mark: str) -> str:
    return NONE if ratio is None else f"{ratio:.2f}{mark}"


def _limits(one: ValueFigures) -> str:
    if one.own_limits:
        return "each run its own"
    low, high = one.limits.low, one.limits.high
    if low is None and high is None:
        return NONE
    if high is None:
        return f"at least {number_text(low or 0)}"
    if low is None:
        return f"at most {number_text(high)}"
    return f"{number_text(low)} to {number_text(high)}"


def step_table(found: Statistics) -> Table:
    """How long each step takes, in the order of the plan."""
    whole = sum(one.total for one in found.steps)
    rows = [(printable(one.step.plan), printable(one.step.label), str(one.count),
             duration(one.median), duration(one.p95),
             share_text(one.total / whole if whole else None)) for one in found.steps]
    return Table("Step times", ("Plan", "Step", "Count", "Median", "95 % up to", "Share of time"),
                 rows, 2, "All attempts of a step together; runs with a verdict of PASS or FAIL.")
