"""Runs and handsets counted: first pass, final yield, retests, takt.

A handset is a name (``dut``) with the title of a plan. Its history is all of its runs with plans
of that title, in the order of their begin, whatever the version, station or slot: a plan made
milder, or a second station, gives no handset another first try.
"""

from __future__ import annotations

from dataclasses import dataclass
from datetime import date
from typing import Callable, Iterable, Mapping, NamedTuple, Sequence, TypeVar

from amt_line.statistics.rows import ABORTED, ERROR, FAIL, PASS, Rows, Run
from amt_line.statistics.spread import MEDIAN, NEARLY_ALL, Numbers
from amt_line.statistics.takt import takts

_Key = TypeVar("_Key", bound=tuple[object, ...])


@dataclass(frozen=True)
class Yields:
    """One group of runs. A handset is counted in the group that its first judged run lies in."""

    runs: int
    passed: int
    failed: int
    errors: int
    aborted: int
    unfinished: int
    unnamed: int
    handsets: int
    first_passed: int
    final_passed: int
    in_doubt: int
    retests: int
    run_median: float | None
    run_p95: float | None
    takt: float | None

    @property
    def first_pass_yield(self) -> float | None:
        """The share of handsets that passed at once; None without a handset."""
        return self.first_passed / self.handsets if self.handsets else None

    @property
    def final_yield(self) -> float | None:
        """The share of handsets whose last run is a PASS; None without a handset."""
        return self.final_passed / self.handsets if self.handsets else None


class PlanKey(NamedTuple):
    """The plans of a title."""

    plan: str


class StationKey(NamedTuple):
    """A station."""

    station: str


class SlotKey(NamedTuple):
    """A slot of a station; a station without slots has one without a name."""

    station: str
    slot: str


class DayKey(NamedTuple):
    """A day in the filter's time zone."""

    day: date


@dataclass(frozen=True)
class Fate:
    """What became of a handset: its first judged run, and its last one of any verdict."""

    first: str
    first_passed: bool
    final_passed: bool
    in_doubt: bool


def fates(history: Iterable[Run]) -> dict[tuple[str, str], Fate]:
    """The fate of each handset with a name that was judged at least once."""
    firsts: dict[tuple[str, str], Run] = {}
    lasts: dict[tuple[str, str], Run] = {}
    for run in sorted(history, key=lambda run: (run.began, run.run)):
        handset = (run.dut, run.plan)
        lasts[handset] = run
        if run.judged:
            firsts.setdefault(handset, run)
    return {handset: Fate(first.run, first.verdict == PASS, lasts[handset].verdict == PASS,
                          not lasts[handset].judged)
            for handset, first in firsts.items() if first.dut}


class Counter:
    """Counts groups of the runs of a filter."""

    def __init__(self, rows: Rows) -> None:
        self._runs = sorted(rows.runs, key=lambda run: (run.began, run.run))
        self._fates = fates(rows.history)
        self._takts = takts(rows.beside)

    def all(self) -> Yields:
        """All runs of the filter."""
        return self._count(self._runs)

    def groups(self, key: Callable[[Run], _Key]) -> Mapping[_Key, Yields]:
        """The runs of each group, in the order of the groups' keys."""
        found: dict[_Key, list[Run]] = {}
        for run in self._runs:
            found.setdefault(key(run), []).append(run)
        return {name: self._count(found[name]) for name in sorted(found)}

    def _count(self, runs: Sequence[Run]) -> Yields:
        verdicts = {word: 0 for word in (PASS, FAIL, ERROR, ABORTED)}
        unfinished = unnamed = retests = 0
        begun: list[Fate] = []
        for run in runs:
            if run.verdict in verdicts:
                verdicts[run.verdict] += 1
            else:
                unfinished += 1
            if not run.judged:
                continue
            if not run.dut:
                unnamed += 1
                continue
            fate = self._fates.get((run.dut, run.plan))
            if fate is not None and fate.first == run.run:
                begun.append(fate)
            else:
                retests += 1
        seconds = Numbers.of(run.seconds for run in runs
                             if run.judged and run.seconds is not None)
        gaps = Numbers.of(self._takts[run.run] for run in runs if run.run in self._takts)
        return Yields(
            runs=len(runs), passed=verdicts[PASS], failed=verdicts[FAIL], errors=verdicts[ERROR],
            aborted=verdicts[ABORTED], unfinished=unfinished, unnamed=unnamed,
            handsets=len(begun), first_passed=sum(fate.first_passed for fate in begun),
            final_passed=sum(fate.final_passed for fate in begun),
            in_doubt=sum(fate.in_doubt for fate in begun), retests=retests,
            run_median=seconds.quantile(MEDIAN), run_p95=seconds.quantile(NEARLY_ALL),
            takt=gaps.quantile(MEDIAN))
