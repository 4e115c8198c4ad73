"""How numbers are spread: mean, deviation, quantiles, capability."""

from __future__ import annotations

from bisect import bisect_left, bisect_right
from dataclasses import dataclass
from itertools import accumulate
from math import fsum, sqrt
from typing import Iterable, Mapping

MEDIAN, NEARLY_ALL = 0.5, 0.95


@dataclass(frozen=True)
class Spread:
    """Numbers in short. One number alone has no deviation."""

    count: int
    mean: float
    deviation: float | None
    minimum: float
    maximum: float


@dataclass(frozen=True)
class Capability:
    """How well numbers keep within their limits; None where it cannot be said."""

    cp: float | None = None
    cpk: float | None = None


class Numbers:
    """Numbers in their order, each different one with how often it was seen.

    A line measures the same few numbers over and over.
    """

    def __init__(self, counts: Mapping[float, int]) -> None:
        self.different = sorted(counts)
        self.times = [counts[number] for number in self.different]
        self._ends = list(accumulate(self.times))

    @classmethod
    def of(cls, numbers: Iterable[float]) -> Numbers:
        """Single numbers."""
        counts: dict[float, int] = {}
        for number in numbers:
            counts[number] = counts.get(number, 0) + 1
        return cls(counts)

    @property
    def count(self) -> int:
        """How many they are."""
        return self._ends[-1] if self._ends else 0

    def below(self, bound: float) -> int:
        """How many are smaller than a bound."""
        return self._up_to(bisect_left(self.different, bound))

    def not_above(self, bound: float) -> int:
        """How many are a bound or smaller."""
        return self._up_to(bisect_right(self.different, bound))

    def _up_to(self, index: int) -> int:
        return self._ends[index - 1] if index else 0

    def spread(self) -> Spread | None:
        """Their spread; None without any.

        Sums are of differences, first to the smallest number, then to the mean: numbers that
        hardly differ lose no digits by being large.
        """
        if not self.count:
            return None
        least, pairs = self.different[0], list(zip(self.different, self.times))
        mean = least + fsum([(number - least) * times for number, times in pairs]) / self.count
        deviation = None
        if self.count > 1:
            squares = fsum([(number - mean) ** 2 * times for number, times in pairs])
            deviation = sqrt(squares / (self.count - 1))
        return Spread(self.count, mean, deviation, least, self.different[-1])

    def quantile(self, share: float) -> float | None:
        """The number that this share of the numbers does not exceed; None without any.

        Between two numbers that are next to each other it is as far from the one to the other as
        the share falls between their places.
        """
        if not self.count:
            return None
        place = (self.count - 1) * share
        lower = int(place)
        low, high = self._at(lower), self._at(min(lower + 1, self.count - 1))
        return low + (high - low) * (place - lower)

    def _at(self, index: int) -> float:
        return self.different[bisect_left(self._ends, index + 1)]


def capability(numbers: Spread, low: float | None, high: float | None) -> Capability:
    """Cp and Cpk with the deviation of all the numbers; with one limit there is no Cp.

    Numbers that do not differ, or fewer than two of them, say nothing about a spread.
    """
    if not numbers.deviation or (low is None and high is None):
        return Capability()
    sides = []
    if low is not None:
        sides.append((numbers.mean - low) / (3 * numbers.deviation))
    if high is not None:
        sides.append((high - numbers.mean) / (3 * numbers.deviation))
    cp = None
    if low is not None and high is not None:
        cp = (high - low) / (6 * numbers.deviation)
    return Capability(cp, min(sides))
