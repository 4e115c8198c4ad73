"""All figures of a filter."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Mapping

from amt_line.statistics.filter import Filter
from amt_line.statistics.rows import Rows
from amt_line.statistics.steps import Failures, StepTimes, names_of, pareto, step_times
from amt_line.statistics.values import ValueFigures, value_figures
from amt_line.statistics.yields import Counter, DayKey, PlanKey, SlotKey, StationKey, Yields


@dataclass(frozen=True)
class Statistics:
    """The figures of one filter. Groups, steps and values are sorted for showing.

    ``failures`` has the step that ended most runs first; ``steps`` and ``values`` are in the
    order of the plans, ``days`` in that of time, days without a run left out.
    """

    filter: Filter
    all: Yields
    plans: Mapping[PlanKey, Yields]
    stations: Mapping[StationKey, Yields]
    slots: Mapping[SlotKey, Yields]
    days: Mapping[DayKey, Yields]
    failures: tuple[Failures, ...]
    steps: tuple[StepTimes, ...]
    values: tuple[ValueFigures, ...]


def statistics_of(rows: Rows, chosen: Filter) -> Statistics:
    """The figures of rows that are those of the filter."""
    counter, names = Counter(rows), names_of(rows)
    return Statistics(
        filter=chosen, all=counter.all(),
        plans=counter.groups(lambda run: PlanKey(run.plan)),
        stations=counter.groups(lambda run: StationKey(run.station)),
        slots=counter.groups(lambda run: SlotKey(run.station, run.slot)),
        days=counter.groups(lambda run: DayKey(chosen.day(run.began))),
        failures=pareto(rows.not_passed, names), steps=step_times(rows.steps, names),
        values=value_figures(rows.values, names))


def worst_first(values: tuple[ValueFigures, ...]) -> list[ValueFigures]:
    """Values with limits, the least capable first, then those whose capability cannot be said."""
    limited = [value for value in values if value.limited]
    return sorted(limited, key=lambda value: (value.capability.cpk is None,
                                              value.capability.cpk or 0.0))
