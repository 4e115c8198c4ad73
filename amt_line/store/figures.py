"""Statistics of what is in the store.

Rows are counted as they come, in the order in which they lie: the databases would have to sort a
million of them to group them, which takes longer than to read them. All questions of one call see
the same state of the database.
"""

from __future__ import annotations

from collections import Counter
from datetime import datetime
from typing import Any, Iterator, Mapping, NamedTuple, Sequence

from sqlalchemy import Table, select
from sqlalchemy.engine import Connection
from sqlalchemy.exc import DBAPIError

from amt_line.statistics.figures import Statistics, statistics_of
from amt_line.statistics.filter import Filter
from amt_line.statistics.rows import (Limits, NotPassed, Place, Rows, Run, ValueCounts,
                                      ValueKey)
from amt_line.store.queries import utc_text
from amt_line.store.store import Store
from amt_line.store.tables import RUNS, STEP_VALUES, STEPS

_RUN_COLUMNS = [RUNS.c[name] for name in (
    "run", "dut", "verdict", "plan", "plan_version", "station", "slot", "began", "ended",
    "seconds")]
_VALUE_KEY = ("step", "step_name", "name", "unit", "min", "max", "marginal_min", "marginal_max")
# How many runs are asked for at once.
_PART = 2000


def gather(store: Store, chosen: Filter = Filter()) -> Statistics:
    """The figures of the runs of a filter; what is wrong with the store is ``StoreProblem``."""
    with store.looking() as connection:
        return statistics_of(rows_for(connection, chosen), chosen)


def rows_for(connection: Connection, chosen: Filter) -> Rows:
    """The rows that the figures of a filter are made of."""
    runs = _runs(connection, chosen)
    steps = _StepReader(runs)
    for number, seconds, verdict, *step in _of_runs(connection, steps_query(), STEPS, runs):
        steps.take(number, seconds, verdict, tuple(step))
    return Rows(runs=[chosen_run.run for chosen_run in runs.values()],
                history=_history(connection, chosen, runs),
                beside=_beside(connection, chosen, runs), steps=steps.times(),
                not_passed=steps.not_passed, values=_values(connection, runs))


def runs_query(chosen: Filter) -> Any:
    """The runs of a filter."""
    return (select(RUNS.c.id, RUNS.c.plan_sha256, *_RUN_COLUMNS)
            .where(*_plans(chosen), *_slots_and_time(chosen)).order_by(RUNS.c.id))


def history_query(chosen: Filter) -> Any:
    """All runs of the filter's handsets with its plans, up to its end."""
    handsets = select(RUNS.c.dut).where(*_plans(chosen), *_slots_and_time(chosen),
                                        RUNS.c.dut != "").distinct()
    until = [] if chosen.until is None else [RUNS.c.began < utc_text(chosen.until)]
    plan = [RUNS.c.plan == chosen.plan] if chosen.plan else []
    return select(*_RUN_COLUMNS).where(RUNS.c.dut.in_(handsets), *plan, *until)


def steps_query() -> Any:
    """Steps that were carried out."""
    return select(STEPS.c.run_id, STEPS.c.seconds, STEPS.c.verdict, STEPS.c.number,
                  STEPS.c.name).where(STEPS.c.verdict != "skipped")


def values_query() -> Any:
    """Values that are numbers; what tells them apart stands behind."""
    failed = STEP_VALUES.c.verdict == "fail"
    return select(STEP_VALUES.c.run_id, STEP_VALUES.c.number, STEP_VALUES.c.marginal, failed,
                  *(STEP_VALUES.c[name] for name in _VALUE_KEY)
                  ).where(STEP_VALUES.c.number.is_not(None))


def parts_of(query: Any, table: Table, runs: Sequence[int]) -> Iterator[Any]:
    """The query for these runs, in parts whose rows memory holds easily; ``runs`` ascend."""
    column = table.c.run_id
    for start in range(0, len(runs), _PART):
        part = runs[start:start + _PART]
        if part[-1] - part[0] == len(part) - 1:
            yield query.where(column >= part[0], column <= part[-1])
        else:
            yield query.where(column.in_(part))


class _Chosen(NamedTuple):
    """A run of the filter; ``file`` is its plan's title and checksum."""

    run: Run
    file: tuple[str, str]


_Runs = Mapping[int, _Chosen]


def _plans(chosen: Filter) -> list[Any]:
    return [RUNS.c[name] == text for name in ("plan", "plan_version")
            if (text := getattr(chosen, name))]


def _slots_and_time(chosen: Filter) -> list[Any]:
    found = [RUNS.c[name] == text for name in ("station", "slot")
             if (text := getattr(chosen, name))]
    if chosen.since is not None:
        found.append(RUNS.c.began >= utc_text(chosen.since))
    if chosen.until is not None:
        found.append(RUNS.c.began < utc_text(chosen.until))
    return found


def _rows(connection: Connection, query: Any) -> Iterator[tuple[Any, ...]]:
    """The rows as the driver has them: the library's own rows take thrice as long."""
    result = connection.execute(query)
    errors = connection.dialect.dbapi.Error
    try:
        yield from result.cursor
    except errors as error:
        raise DBAPIError.instance(str(query), None, error, errors,
                                  dialect=connection.dialect) from error
    finally:
        result.close()


def _of_runs(connection: Connection, query: Any, table: Table, runs: _Runs
             ) -> Iterator[tuple[Any, ...]]:
    for part in parts_of(query, table, list(runs)):
        yield from _rows(connection, part)


def _run(row: Sequence[Any]) -> Run:
    run, dut, verdict, plan, version, station, slot, began, ended, seconds = row
    return Run(run, dut, verdict, plan, version, station, slot, datetime.fromisoformat(began),
               datetime.fromisoformat(ended) if ended else None, seconds)


def _runs(connection: Connection, chosen: Filter) -> dict[int, _Chosen]:
    runs: dict[int, _Chosen] = {}
    for number, sha256, *row in _rows(connection, runs_query(chosen)):
        run = _run(row)
        runs[number] = _Chosen(run, (run.plan, sha256))
    return runs


def _history(connection: Connection, chosen: Filter, runs: _Runs) -> list[Run]:
    if not (chosen.station or chosen.slot or chosen.plan_version or chosen.since):
        return [chosen_run.run for chosen_run in runs.values()]
    return [_run(row) for row in _rows(connection, history_query(chosen))]


def _beside(connection: Connection, chosen: Filter, runs: _Runs) -> list[Run]:
    if not (chosen.plan or chosen.plan_version):
        return [chosen_run.run for chosen_run in runs.values()]
    query = select(*_RUN_COLUMNS).where(*_slots_and_time(chosen))
    return [_run(row) for row in _rows(connection, query)]


class _StepReader:
    """Collects the times of steps of judged runs, and the steps of all runs that did not pass."""

    def __init__(self, runs: _Runs) -> None:
        self.not_passed: list[NotPassed] = []
        self._runs = runs
        self._found: dict[tuple[str, str], dict[tuple[Any, ...], list[float]]] = {
            chosen.file: {} for chosen in runs.values()}
        self._times = {number: self._found[chosen.file] for number, chosen in runs.items()
                       if chosen.run.judged}

    def take(self, number: int, seconds: float, verdict: str, step: tuple[Any, ...]) -> None:
        """The next step."""
        times = self._times.get(number)
        if times is not None:
            times.setdefault(step, []).append(seconds)
        if verdict != "pass":
            run, file = self._runs[number]
            self.not_passed.append(NotPassed(Place(*file, *step), run.run, run.verdict, verdict))

    def times(self) -> dict[Place, Mapping[float, int]]:
        """How often each step took how many seconds."""
        return {Place(*file, *step): Counter(seconds)
                for file, steps in self._found.items() for step, seconds in steps.items()}


class _Series:
    """A value as it comes."""

    def __init__(self) -> None:
        self.numbers: list[float] = []
        self.marginal = 0
        self.failed = 0


def _values(connection: Connection, runs: _Runs) -> dict[ValueKey, ValueCounts]:
    judged = {number: chosen for number, chosen in runs.items() if chosen.run.judged}
    found: dict[tuple[str, str], dict[Any, _Series]] = {
        chosen.file: {} for chosen in judged.values()}
    series = {number: found[chosen.file] for number, chosen in judged.items()}
    for row in _of_runs(connection, values_query(), STEP_VALUES, judged):
        of_file = series[row[0]]
        one = of_file.get(row[4:])
        if one is None:
            one = of_file[row[4:]] = _Series()
        one.numbers.append(row[1])
        if row[2] or row[3]:
            one.marginal += bool(row[2])
            one.failed += bool(row[3])
    return {ValueKey(Place(*file, step, step_name), name, unit, Limits(*limits)):
            ValueCounts(Counter(one.numbers), one.marginal, one.failed)
            for file, several in found.items()
            for (step, step_name, name, unit, *limits), one in several.items()}
