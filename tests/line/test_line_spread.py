"""Spread, capability, histogram, steps: by hand, and against Python's own statistics."""

from __future__ import annotations

import statistics
from collections import Counter
from math import isclose

import pytest
from hypothesis import example, given
from hypothesis import strategies as st

from amt_line.statistics.figures import statistics_of, worst_first
from amt_line.statistics.filter import Filter
from amt_line.statistics.histogram import histogram, round_up
from amt_line.statistics.rows import Limits, NotPassed, Place, Rows, ValueCounts, ValueKey
from amt_line.statistics.spread import Capability, Numbers, Spread, capability
from amt_line.statistics.values import ValueFigures

NUMBERS = st.lists(st.floats(-1e6, 1e6) | st.integers(-50, 50).map(float), min_size=1, max_size=60)


def place(number: int = 1, name: str = "battery", file: str = "one", plan: str = "End") -> Place:
    return Place(plan, file, number, name)


def values(*keyed: tuple[Place, Limits, list[float]]) -> tuple[ValueFigures, ...]:
    rows = {ValueKey(where, "adc", "mV", limits): ValueCounts(Counter(numbers), 2, 1)
            for where, limits, numbers in keyed}
    return statistics_of(Rows(values=rows), Filter()).values


def test_a_worked_example() -> None:
    # Mean (2 + 4 + 4 + 4 + 5 + 5 + 7 + 9) / 8 = 40 / 8 = 5. Squares 9 + 1 + 1 + 1 + 0 + 0 + 4 + 16
    # = 32, over n - 1 = 7: deviation sqrt(32 / 7) = 2.13809. Limits -1 and 14:
    # Cp = 15 / (6 * 2.13809) = 1.16927; Cpk = (5 - -1) / (3 * 2.13809) = 0.93541.
    found = Numbers.of([2, 4, 4, 4, 5, 5, 7, 9]).spread()
    assert found is not None and found.deviation is not None
    assert (found.count, found.mean, found.minimum, found.maximum) == (8, 5, 2, 9)
    assert found.deviation == pytest.approx(2.13809, abs=1e-5)
    both = capability(found, -1, 14)
    assert both.cp == pytest.approx(1.16927, abs=1e-5)
    assert both.cpk == pytest.approx(0.93541, abs=1e-5)
    assert capability(found, -1, None) == Capability(None, both.cpk)
    # From above (14 - 5) / (3 * 2.13809) = 1.40312.
    assert capability(found, None, 14).cpk == pytest.approx(1.40312, abs=1e-5)
    # A mean out of limits is told as such: (4 - 5) / (3 * 2.13809) = -0.15590.
    assert capability(found, 0, 4).cpk == pytest.approx(-0.15590, abs=1e-5)


@pytest.mark.parametrize("numbers, deviation", [([5.0], None), ([0.1] * 3, 0.0)])
def test_what_does_not_spread_is_not_capable(numbers: list[float], deviation: float | None
                                             ) -> None:
    found = Numbers.of(numbers).spread()
    assert found == Spread(len(numbers), numbers[0], deviation, numbers[0], numbers[0])
    assert capability(found, 0, 10) == Capability()


def test_no_numbers_have_no_figures() -> None:
    none = Numbers.of([])
    assert none.spread() is None and none.quantile(0.5) is None and histogram(none) is None
    assert capability(Spread(9, 5, 1, 0, 9), None, None) == Capability()


@given(NUMBERS)
def test_spread_against_pythons_own(numbers: list[float]) -> None:
    found = Numbers.of(numbers).spread()
    assert found is not None and found.count == len(numbers)
    assert isclose(found.mean, statistics.mean(numbers), rel_tol=1e-9, abs_tol=1e-9)
    assert found.minimum == min(numbers) and found.maximum == max(numbers)
    assert found.minimum <= found.mean <= found.maximum or isclose(found.mean, found.maximum)
    if len(numbers) > 1:
        assert found.deviation is not None
        assert isclose(found.deviation, statistics.stdev(numbers), rel_tol=1e-9, abs_tol=1e-9)


def test_large_numbers_that_hardly_differ_keep_their_digits() -> None:
    numbers = [1e9 + offset for offset in (4.0, 7.0, 13.0, 16.0)]
    found = Numbers.of(numbers).spread()
    assert found is not None and found.mean == 1e9 + 10
    assert found.deviation == pytest.approx(statistics.stdev([4, 7, 13, 16]), rel=1e-12)


@given(NUMBERS, st.integers(1, 99))
def test_quantiles_against_pythons_own(numbers: list[float], percent: int) -> None:
    found = Numbers.of(numbers).quantile(percent / 100)
    assert found is not None
    wanted = numbers[0]
    if len(numbers) > 1:
        wanted = statistics.quantiles(numbers, n=100, method="inclusive")[percent - 1]
    assert isclose(found, wanted, rel_tol=1e-9, abs_tol=1e-6)
    assert Numbers.of(numbers).quantile(0.5) == pytest.approx(statistics.median(numbers))


@given(NUMBERS, st.none() | st.integers(-40, 40), st.none() | st.integers(-40, 40))
@example([2.0, 1001.0, -1.1920928955078125e-07], None, None)
def test_a_histogram_counts_every_number_on_its_side(numbers: list[float], low: int | None,
                                                     high: int | None) -> None:
    found = histogram(Numbers.of(numbers), low, high)
    assert found is not None
    assert sum(found.counts) + found.below + found.above == len(numbers)
    assert list(found.edges) == sorted(found.edges) and len(found.edges) == len(found.counts) + 1
    assert len(found.counts) <= 45
    assert sum(found.counts) >= 0.97 * len(numbers)
    for index, count in enumerate(found.counts):
        first, last = found.edges[index], found.edges[index + 1]
        inside = [one for one in numbers if first <= one < last
                  or one == last and index == len(found.counts) - 1]
        # An edge is a rounded number: one beside it, against the width, may count as on it.
        beside = 1e-8 * (last - first)
        near = sum(isclose(one, edge, rel_tol=1e-9, abs_tol=beside) for one in numbers
                   for edge in (first, last))
        assert abs(len(inside) - count) <= near


def test_a_bin_lies_on_one_side_of_a_limit() -> None:
    counts = histogram(Numbers.of([float(one) for one in range(1000)]), 100.0, 899.0)
    assert counts is not None
    assert 99.5 in counts.edges and 899.5 in counts.edges
    below = sum(count for edge, count in zip(counts.edges, counts.counts) if edge < 99.5)
    above = sum(count for edge, count in zip(counts.edges, counts.counts) if edge >= 899.5)
    assert (below, above) == (100, 100)


@pytest.mark.parametrize("width, rounded", [(1, 1), (1.1, 2), (3, 5), (0.0007, 0.001), (60, 100),
                                            (50.00000000001, 50)])
def test_round_widths(width: float, rounded: float) -> None:
    assert round_up(width) == rounded


def test_a_step_keeps_its_name_in_another_version() -> None:
    # The newer file has a step more in front; "AT" stands in it twice.
    old = {place(1, "AT"): {1.0: 1}, place(2): {3.0: 2}}
    new = {place(1, "wait", "two"): {9.0: 1}, place(2, "AT", "two"): {2.0: 1},
           place(3, "battery", "two"): {5.0: 1}, place(4, "AT", "two"): {7.0: 1}}
    steps = statistics_of(Rows(steps={**old, **new}), Filter()).steps
    assert [(one.step.label, one.count, one.median, one.total) for one in steps] == [
        ("wait", 1, 9, 9), ("AT", 2, 1.5, 3), ("battery", 3, 3, 11), ("AT (2)", 1, 7, 7)]
    # Of 3, 3 and 5, 95 %: place (3 - 1) * 0.95 = 1.9, so 3 + 0.9 * (5 - 3) = 4.8.
    assert steps[2].p95 == pytest.approx(4.8)


def test_pareto_counts_each_failed_run_once() -> None:
    rows = [NotPassed(place(2, "radio"), "r1", "FAIL", "fail"),
            NotPassed(place(3, "screen"), "r1", "FAIL", "fail"),
            NotPassed(place(3, "screen"), "r2", "FAIL", "fail"),
            NotPassed(place(2, "radio"), "r3", "FAIL", "fail"),
            NotPassed(place(1, "battery"), "r4", "ERROR", "error"),
            NotPassed(place(3, "screen"), "r4", "ERROR", "fail")]
    found = statistics_of(Rows(not_passed=rows), Filter()).failures
    assert [(one.step.name, one.runs, one.failed, one.errors) for one in found] == [
        ("radio", 2, 2, 0), ("screen", 1, 3, 0), ("battery", 0, 0, 1)]


def test_a_value_has_a_row_for_each_pair_of_limits() -> None:
    found = values((place(), Limits(0, 10), [1, 2, 3]), (place(file="two"), Limits(0, 10), [4]),
                   (place(file="two"), Limits(0, 5), [5, 6]))
    assert [(one.limits, one.spread.count, one.marginal, one.failed) for one in found] == [
        (Limits(0, 5), 2, 2, 1), (Limits(0, 10), 4, 4, 2)]
    assert all(one.few and one.limited for one in found)


def test_limits_of_each_runs_own_are_no_limits_of_all() -> None:
    found = values(*((place(), Limits(0, high), [high / 2]) for high in range(1, 7)))
    assert len(found) == 1 and found[0].own_limits and found[0].limited
    assert found[0].capability == Capability() and found[0].spread.count == 6


def test_what_is_no_number_is_left_out() -> None:
    infinite = values((place(), Limits(), [1, float("inf"), float("nan"), 1e308]))
    assert infinite[0].spread.count == 1 and not infinite[0].limited
    assert not values((place(), Limits(), [float("inf")]))


def test_the_least_capable_come_first() -> None:
    found = values((place(1, "good"), Limits(0, 100), [49, 50, 51]),
                   (place(2, "bad"), Limits(0, 52), [49, 50, 51]),
                   (place(3, "same"), Limits(0, 9), [5, 5]), (place(4, "free"), Limits(), [1, 2]))
    assert [one.value.step.name for one in worst_first(found)] == ["bad", "good", "same"]
