"""The values that steps brought: their spread, their capability, how near the limits they are."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Mapping, NamedTuple, Sequence

from amt_line.statistics.histogram import Histogram, histogram
from amt_line.statistics.rows import Limits, ValueCounts, ValueKey
from amt_line.statistics.spread import Capability, Numbers, Spread, capability
from amt_line.statistics.steps import StepName, StepNames

# A value that was judged by more different limits has limits of each run's own.
MOST_LIMITS = 5
# A spread of fewer values says little.
FEW = 30
# What is larger, or no number at all, was not measured.
_LARGEST = 1e100


class ValueName(NamedTuple):
    """A value of a step."""

    step: StepName
    name: str
    unit: str


@dataclass(frozen=True)
class ValueFigures:
    """One value as judged by the same limits; ``own_limits`` when each run had its own."""

    value: ValueName
    limits: Limits
    own_limits: bool
    spread: Spread
    capability: Capability
    marginal: int
    failed: int
    histogram: Histogram

    @property
    def few(self) -> bool:
        """Whether there are too few values for the spread to say much."""
        return self.spread.count < FEW

    @property
    def limited(self) -> bool:
        """Whether a number could be out of limits."""
        return self.own_limits or self.limits.low is not None or self.limits.high is not None


def value_figures(rows: Mapping[ValueKey, ValueCounts], names: StepNames
                  ) -> tuple[ValueFigures, ...]:
    """The figures of each value, in the order of the plans; a row for each pair of limits."""
    found: dict[ValueName, dict[Limits, list[ValueCounts]]] = {}
    for key, counts in rows.items():
        value = ValueName(names[key.place], key.name, key.unit)
        found.setdefault(value, {}).setdefault(key.limits, []).append(counts)
    figures: list[ValueFigures | None] = []
    for value in sorted(found, key=lambda value: (names.order(value.step), value)):
        sets = found[value]
        if len(sets) > MOST_LIMITS:
            every = [counts for several in sets.values() for counts in several]
            figures.append(_figures(value, Limits(), True, every))
            continue
        for limits in sorted(sets, key=_sortable):
            figures.append(_figures(value, limits, False, sets[limits]))
    return tuple(one for one in figures if one is not None)


def _sortable(limits: Limits) -> tuple[tuple[bool, float], ...]:
    return tuple((bound is not None, bound or 0.0) for bound in limits)


def _figures(value: ValueName, limits: Limits, own: bool, counted: Sequence[ValueCounts]
             ) -> ValueFigures | None:
    together: dict[float, int] = {}
    for counts in counted:
        for number, times in counts.numbers.items():
            if abs(number) <= _LARGEST:
                together[number] = together.get(number, 0) + times
    numbers = Numbers(together)
    spread, bins = numbers.spread(), histogram(numbers, limits.low, limits.high)
    if spread is None or bins is None:
        return None
    return ValueFigures(value, limits, own, spread,
                        capability(spread, limits.low, limits.high),
                        sum(counts.marginal for counts in counted),
                        sum(counts.failed for counts in counted), bins)
