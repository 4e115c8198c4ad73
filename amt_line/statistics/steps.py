"""Steps: what they are called across versions of a plan, where runs fail, how long they take."""

from __future__ import annotations

from dataclasses import dataclass
from math import fsum
from typing import Iterable, Mapping, NamedTuple, Sequence

from amt_line.statistics.rows import ERROR, FAIL, NotPassed, Place, Rows
from amt_line.statistics.spread import MEDIAN, NEARLY_ALL, Numbers


class StepName(NamedTuple):
    """A step of the plans of a title; ``rank`` tells two of the same name in one plan apart."""

    plan: str
    name: str
    rank: int = 1

    @property
    def label(self) -> str:
        """The name, with the rank where it is needed."""
        return self.name if self.rank == 1 else f"{self.name} ({self.rank})"


@dataclass(frozen=True)
class StepTimes:
    """How long a step takes, all of its attempts together; ``total`` is the sum."""

    step: StepName
    count: int
    median: float
    p95: float
    total: float


@dataclass(frozen=True)
class Failures:
    """How often a step did not pass.

    ``runs`` are the failed runs of which it was the first step to fail, so that these add up to
    the failed runs; ``failed`` is how often it failed at all, ``errors`` how often it was an error.
    """

    step: StepName
    runs: int
    failed: int
    errors: int


class StepNames:
    """Names the places of steps.

    A step keeps its name when a newer plan has more steps before it; its number does not.
    """

    def __init__(self, places: Iterable[Place]) -> None:
        self._names: dict[Place, StepName] = {}
        self._order: dict[StepName, int] = {}
        ranks: dict[tuple[str, str, str], int] = {}
        for place in sorted(set(places)):
            same = (place.plan, place.file, place.name)
            ranks[same] = ranks.get(same, 0) + 1
            name = StepName(place.plan, place.name, ranks[same])
            self._names[place] = name
            self._order[name] = max(place.number, self._order.get(name, 0))

    def __getitem__(self, place: Place) -> StepName:
        return self._names[place]

    def order(self, name: StepName) -> tuple[str, int, StepName]:
        """A key that sorts steps as the plans have them."""
        return name.plan, self._order[name], name


def names_of(rows: Rows) -> StepNames:
    """The names of all steps that rows tell of."""
    return StepNames([*rows.steps, *(key.place for key in rows.values),
                      *(row.place for row in rows.not_passed)])


def step_times(rows: Mapping[Place, Mapping[float, int]], names: StepNames
               ) -> tuple[StepTimes, ...]:
    """The times of each step, in the order of the plans."""
    found: dict[StepName, dict[float, int]] = {}
    for place, counts in rows.items():
        together = found.setdefault(names[place], {})
        for seconds, times in counts.items():
            together[seconds] = together.get(seconds, 0) + times
    return tuple(_times(name, Numbers(found[name])) for name in sorted(found, key=names.order))


def _times(name: StepName, seconds: Numbers) -> StepTimes:
    median, nearly_all = seconds.quantile(MEDIAN), seconds.quantile(NEARLY_ALL)
    assert median is not None and nearly_all is not None
    total = fsum([each * times for each, times in zip(seconds.different, seconds.times)])
    return StepTimes(name, seconds.count, median, nearly_all, total)


def pareto(rows: Sequence[NotPassed], names: StepNames) -> tuple[Failures, ...]:
    """The steps that did not pass, the one that ended most runs first."""
    firsts: dict[str, NotPassed] = {}
    failed: dict[StepName, int] = {}
    errors: dict[StepName, int] = {}
    for row in rows:
        counts = errors if row.verdict == ERROR.lower() else failed
        name = names[row.place]
        counts[name] = counts.get(name, 0) + 1
        if row.run_verdict == FAIL and row.verdict == FAIL.lower() and (
                row.run not in firsts or row.place.number < firsts[row.run].place.number):
            firsts[row.run] = row
    ended: dict[StepName, int] = {}
    for row in firsts.values():
        name = names[row.place]
        ended[name] = ended.get(name, 0) + 1
    found = [Failures(name, ended.get(name, 0), failed.get(name, 0), errors.get(name, 0))
             for name in {**failed, **errors}]
    return tuple(sorted(found, key=lambda one: (-one.runs, -one.failed, -one.errors,
                                                names.order(one.step))))
