"""Numbers sorted into bins of a round width."""

from __future__ import annotations

from bisect import bisect_left, bisect_right
from dataclasses import dataclass
from math import cbrt, ceil, floor, log10
from typing import Sequence

from amt_line.statistics.spread import Numbers

_MOST_BINS = 40
# Above this many different numbers, how far they lie apart at least says nothing.
_MOST_DIFFERENT = 1000
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
    power: float = 10.0 ** floor(log10(width))
    step = next((step for step in _ROUND if width <= step * power * (1 + 1e-9)), _ROUND[-1])
    return float(f"{step * power:.6g}")


def histogram(numbers: Numbers) -> Histogram | None:
    """The histogram of numbers; None without any.

    Numbers with a smallest difference (a converter's counts) lie in the middle of bins that hold
    equally many of them. Numbers far away from nearly all others are only counted.
    """
    if not numbers.count:
        return None
    first, last = _view(numbers)
    edges = _edges(numbers, first, last)
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


def _edges(numbers: Numbers, first: float, last: float) -> Sequence[float]:
    if first == last:
        half = (round_up(abs(first) / 100) if first else 1.0) / 2
        return first - half, first + half
    shown = numbers.different[bisect_left(numbers.different, first):
                              bisect_right(numbers.different, last)]
    grain = _grain(shown)
    wanted = max(_wanted_width(numbers), (last - first) / _MOST_BINS)
    if grain:
        # Half a grain before the first number: no number lies on an edge.
        width = grain * max(1.0, round_up(wanted / grain))
        start = first - grain / 2
        bins = int((last - start) / width) + 1
    else:
        width = round_up(wanted)
        start = floor(first / width) * width
        bins = max(1, ceil((last - start) / width))
    return [start + width * index for index in range(bins + 1)]


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
    if all(abs(gap / grain - round(gap / grain)) < 1e-3 for gap in gaps):
        return grain
    return 0.0
