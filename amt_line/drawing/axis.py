"""Axes: round numbers, and days that are not too many."""

from __future__ import annotations

from dataclasses import dataclass
from datetime import date, timedelta
from math import ceil, floor, log10
from typing import Sequence

_STEPS = (1.0, 2.0, 2.5, 5.0, 10.0)
_EVERY_DAYS = (1, 2, 7, 14)
_EVERY_MONTHS = (1, 2, 3, 6, 12, 24, 60, 120)


@dataclass(frozen=True)
class Scale:
    """Where a number lies between two ends of a drawing."""

    low: float
    high: float
    start: float
    end: float

    def __call__(self, number: float) -> float:
        share = (number - self.low) / (self.high - self.low) if self.high > self.low else 0.5
        return self.start + (self.end - self.start) * share


def round_step(span: float, most: int, whole: bool = False) -> float:
    """The smallest round distance of which at most so many fit into a span."""
    wanted = max(span / max(most, 1), 1e-300)
    power = 10.0 ** floor(log10(wanted))
    steps = [step for step in _STEPS if not (whole and power <= 1.0 and step == 2.5)]
    step = next((step * power for step in steps if step * power >= wanted * (1 - 1e-9)),
                10.0 * power)
    return max(step, 1.0) if whole else step


def ticks(low: float, high: float, most: int, whole: bool = False) -> list[float]:
    """Round numbers within a span."""
    step = round_step(high - low, most, whole)
    first = ceil(low / step - 1e-9)
    last = floor(high / step + 1e-9)
    return [index * step for index in range(first, last + 1)][:most * 3 + 3]


def tick_text(number: float, step: float) -> str:
    """A number with as many digits as tell it from its neighbours."""
    if abs(number) >= 1e15 or step < 1e-9:
        return f"{number:.6g}"
    digits = max(0, -floor(log10(step) + 1e-9))
    if abs(step * 10 ** digits - round(step * 10 ** digits)) > 1e-6:
        digits += 1
    return f"{number + 0.0:.{digits}f}"


def number_text(number: float) -> str:
    """A number without digits that say nothing."""
    return f"{number:.10g}"


def mean_text(mean: float, deviation: float | None) -> str:
    """A mean with two digits more than the numbers keep to."""
    if not deviation:
        return number_text(mean)
    return number_text(round(mean, 2 - floor(log10(deviation))))


@dataclass(frozen=True)
class DayTick:
    """A day with a label."""

    day: date
    text: str


def day_ticks(first: date, last: date, most: int) -> Sequence[DayTick]:
    """Days, or firsts of months, of which at most so many are labelled."""
    span = (last - first).days + 1
    for every in _EVERY_DAYS:
        if ceil(span / every) <= most:
            return [DayTick(day, day.isoformat()) for day in
                    (first + timedelta(days=offset) for offset in range(0, span, every))]
    months = range(first.year * 12 + first.month - 1, last.year * 12 + last.month)
    for every in _EVERY_MONTHS:
        chosen = [month for month in months if month % every == 0
                  and date(month // 12, month % 12 + 1, 1) >= first]
        if len(chosen) <= most:
            break
    return [DayTick(date(month // 12, month % 12 + 1, 1), f"{month // 12}-{month % 12 + 1:02}")
            for month in chosen[:most]]
