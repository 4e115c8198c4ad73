"""Numbers sorted into bins of a round width."""

from __future__ import annotations

from bisect import bisect_left, bisect_right
from dataclasses import dataclass
from math import cbrt, ceil, floor, inf, log10, nextafter
from typing import Sequence

from amt_line.statistics.spread import Numbers

_MOST_BINS, _FEWEST_BINS = 40, 10
# Above this many different numbers, how far they lie apart at least says nothing.
_MOST_DIFFERENT = 1000
# So many steps of a converter are shown one by one.
_EACH_ITS_BIN = 15
# Nothing on a line is measured finer: numbers this near are one, and a width is no smaller.
_SAME, _FINEST_GRAIN, _NARROWEST = 1e-12, 1e-6, 1e-100
_ROUND = (1.0, 2.0, 5.0, 10.0)


@dataclass(frozen=True)
class Histogram:
    """``counts[i]`` numbers from ``edges[i]`` to below ``edges[i + 1]``; so many beyond.

    The last bin holds its upper edge too.
    """

    edges: tuple[float, ...]
    counts: tuple[int, ...]
    below: int = 0
    above: int = 0


def round_up(width: float) -> float:
    """The next of 1, 2, 5, 10, 20, 50, and so on, large and small."""
    width = max(width, _NARROWEST)
    power: float = 10.0 ** floor(log10(width))
    step = next((step for step in _ROUND if width <= step * power * (1 + 1e-9)), _ROUND[-1])
    return float(f"{step * power:.6g}")


def histogram(numbers: Numbers, low: float | None = None, high: float | None = None
              ) -> Histogram | None:
    """The histogram of numbers; None without any.

    Numbers with a smallest difference (a converter's counts) lie in the middle of bins that hold
    equally many of them. No bin holds numbers on both sides of a limit, ``low`` or ``high``.
    Numbers far away from nearly all others are only counted.
    """
    if not numbers.count:
        return None
    first, last = _view(numbers)
    edges = _edges(numbers, first, last, low, high)
    below = numbers.below(first)
    ends = [below, *(numbers.below(edge) for edge in edges[1:-1]), numbers.not_above(last)]
    return Histogram(tuple(edges), tuple(after - before for before, after in zip(ends, ends[1:])),
                     below, numbers.count - ends[-1])


def _view(numbers: Numbers) -> tuple[float, float]:
    """The smallest and the largest number that are shown."""
    different = numbers.different
    low, high = numbers.quantile(0.01), numbers.quantile(0.99)
    assert low is not None and high is not None
    if low == high:
        return different[0], different[-1]
    far = 2 * (high - low)
    return (different[bisect_left(different, low - far)],
            different[bisect_right(different, high + far) - 1])


def _edges(numbers: Numbers, first: float, last: float, low: float | None, high: float | None
           ) -> Sequence[float]:
    if last - first <= _SAME * max(abs(first), abs(last)):
        half = _half_of_one(first, low, high)
        return first - half, last + half
    shown = numbers.different[bisect_left(numbers.different, first):
                              bisect_right(numbers.different, last)]
    grain = _grain(shown)
    span = last - first
    wanted = min(max(_wanted_width(numbers), span / _MOST_BINS), span / _FEWEST_BINS)
    if span <= grain * _EACH_ITS_BIN:
        wanted = grain
    # Numbers that are a limit keep it; with a grain, no number lies on an edge.
    borders = [] if low is None else [low - grain / 2]
    if high is not None:
        borders.append(high + grain / 2 if grain else nextafter(high, inf))
    width = grain * max(1.0, round_up(wanted / grain)) if grain else round_up(wanted)
    inside = [border for border in borders if first < border < last]
    anchor = inside[0] if inside else first - grain / 2 if grain else 0.0
    before = ceil((anchor - first) / width - 1e-9)
    bins = before + int((last - anchor) / width) + 1
    edges = [anchor + width * (index - before) for index in range(bins + 1)]
    for border in inside[1:]:
        if all(abs(edge - border) > width * 1e-6 for edge in edges):
            edges.append(border)
    return sorted(edges)


def _half_of_one(number: float, low: float | None, high: float | None) -> float:
    """Half the width of the bin of a number that all are; narrow beside the limits."""
    if low is not None and high is not None and high > low:
        return (high - low) / (2 * _MOST_BINS)
    return (round_up(abs(number) / 100) if number else 1.0) / 2


def _wanted_width(numbers: Numbers) -> float:
    """Narrow for many numbers, wide for few; twice the middle half over the cube root."""
    low, high = numbers.quantile(0.25), numbers.quantile(0.75)
    assert low is not None and high is not None
    return 2.0 * (high - low) / cbrt(numbers.count)


def _grain(different: Sequence[float]) -> float:
    """What all numbers lie apart by a multiple of; 0 when that is not seen."""
    if len(different) > _MOST_DIFFERENT:
        return 0.0
    gaps = [after - before for before, after in zip(different, different[1:])]
    grain = float(f"{min(gaps):.9g}")
    if grain < (different[-1] - different[0]) * _FINEST_GRAIN:
        return 0.0
    if all(abs(gap / grain - round(gap / grain)) < 1e-3 for gap in gaps):
        return grain
    return 0.0
