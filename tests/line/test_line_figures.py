"""Statistics from the store, on both databases: against a count of the records themselves."""

from __future__ import annotations

import random
import statistics
from datetime import datetime, timedelta, timezone
from pathlib import Path
from typing import Any, Iterator, Sequence

import pytest
from postgresql import Cluster
from store_bench import BEGIN, record, stamp, step, unfinished, value

from amt_line.statistics.filter import Filter
from amt_line.statistics.figures import Statistics
from amt_line.statistics.yields import SlotKey, Yields
from amt_line.store import Store, StoreProblem
from amt_line.store.figures import (gather, history_query, parts_of, runs_query, steps_query,
                                    values_query)
from amt_line.store.tables import STEP_VALUES, STEPS

_PAGE = 4096
Record = dict[str, Any]


@pytest.fixture(name="store")
def open_store(store_url: str) -> Iterator[Store]:
    with Store.open(store_url) as opened:
        yield opened


def shift(count: int, seed: int = 7) -> list[Record]:
    """So many runs over some days, of everything that there is."""
    chance = random.Random(seed)
    return [_run(index, chance) for index in range(count)]


def _run(index: int, chance: random.Random) -> Record:
    at = index * 3600.0 + chance.random()
    verdict = chance.choice(["PASS", "PASS", "PASS", "FAIL", "ERROR", "ABORTED", None])
    title, version = chance.choice([("End", "7"), ("End", "8"), ("Audio", "1")])
    head = {"dut": chance.choice(["", *(f"K{number}" for number in range(count_of(index)))]),
            "station": chance.choice("AB"), "slot": chance.choice("12"),
            "plan": {"title": title, "version": version, "path": "p.toml", "steps": 2,
                     "sha256": version.zfill(64)},
            "steps": [_step(number, verdict, chance) for number in (1, 2)]}
    if verdict is None:
        return unfinished(at, **head)
    seconds = round(chance.uniform(5, 90), 3)
    return record(at, **head, verdict=verdict, seconds=seconds, ended=stamp(at + seconds))


def count_of(index: int) -> int:
    """Of so many handsets one is at hand."""
    return 2 + index // 3


def _step(number: int, verdict: str | None, chance: random.Random) -> Record:
    word = {"FAIL": "fail", "ERROR": "error"}.get(verdict or "", "pass") if number == 2 else "pass"
    number_seen = chance.choice([chance.randrange(8, 23), round(chance.gauss(15, 3), 3)])
    inside = 10 <= number_seen <= 20
    values = [value("adc", number_seen, unit="mV", limits={"min": 10, "max": 20},
                    verdict="pass" if inside else "fail", **({"marginal": True} if inside and
                                                             number_seen > 19 else {})),
              value("name", "a text"), value("free", number_seen)]
    return step(number, verdict=word, seconds=round(chance.random(), 4), values=values)


def judged(records: Sequence[Record]) -> list[Record]:
    return [one for one in records if one["verdict"] in ("PASS", "FAIL")]


def check_yields(found: Yields, chosen: Sequence[Record], every: Sequence[Record]) -> None:
    """Handset by handset, in the plainest way."""
    order = sorted(every, key=lambda one: (one["began"], one["run"]))
    handsets = {(one["dut"], one["plan"]["title"]) for one in judged(chosen) if one["dut"]}
    first = final = doubt = count = 0
    for dut, title in handsets:
        history = [one for one in order if (one["dut"], one["plan"]["title"]) == (dut, title)]
        begin = judged(history)[0]
        if begin["run"] not in {one["run"] for one in chosen}:
            continue
        count += 1
        first += begin["verdict"] == "PASS"
        final += history[-1]["verdict"] == "PASS"
        doubt += history[-1]["verdict"] not in ("PASS", "FAIL")
    assert (found.handsets, found.first_passed, found.final_passed, found.in_doubt) == (
        count, first, final, doubt)
    assert found.runs == len(chosen)
    assert found.retests == sum(bool(one["dut"]) for one in judged(chosen)) - count
    assert found.unfinished == sum(one["verdict"] is None for one in chosen)
    assert found.run_median == pytest.approx(statistics.median(
        one["seconds"] for one in judged(chosen)))


def check_values(found: Statistics, chosen: Sequence[Record], title: str, name: str) -> None:
    numbers = [entry["values"][0]["value"] for one in judged(chosen) for entry in one["steps"]
               if one["plan"]["title"] == title and entry["name"] == name]
    marks = [entry["values"][0] for one in judged(chosen) for entry in one["steps"]
             if one["plan"]["title"] == title and entry["name"] == name]
    figures = next(one for one in found.values if one.value.step.plan == title
                   and one.value.step.name == name and one.value.name == "adc")
    mean, deviation = statistics.mean(numbers), statistics.stdev(numbers)
    assert figures.spread.count == len(numbers) and figures.value.unit == "mV"
    assert figures.spread.mean == pytest.approx(mean)
    assert figures.spread.deviation == pytest.approx(deviation)
    assert (figures.spread.minimum, figures.spread.maximum) == (min(numbers), max(numbers))
    assert figures.capability.cp == pytest.approx(10 / (6 * deviation))
    assert figures.capability.cpk == pytest.approx(min(mean - 10, 20 - mean) / (3 * deviation))
    assert figures.marginal == sum(one.get("marginal", False) for one in marks)
    assert figures.failed == sum(one["verdict"] == "fail" for one in marks)


def check_times(found: Statistics, chosen: Sequence[Record]) -> None:
    for times in found.steps:
        seconds = [entry["seconds"] for one in judged(chosen) for entry in one["steps"]
                   if (one["plan"]["title"], entry["name"]) == (times.step.plan, times.step.name)]
        assert times.count == len(seconds)
        assert times.median == pytest.approx(statistics.median(seconds))
        if len(seconds) > 1:
            wanted = statistics.quantiles(seconds, n=20, method="inclusive")[18]
            assert times.p95 == pytest.approx(wanted)


def test_figures_are_those_of_the_records(store: Store) -> None:
    records = shift(150)
    store.put_new(map(_text, records))
    found = gather(store)
    check_yields(found.all, records, records)
    for key, one in found.slots.items():
        chosen = [record for record in records
                  if (record["station"], record["slot"]) == tuple(key)]
        check_yields(one, chosen, records)
    for title in ("End", "Audio"):
        for name in ("step 1", "step 2"):
            check_values(found, records, title, name)
    check_times(found, records)
    assert {one.step.name: (one.runs, one.errors) for one in found.failures
            if one.step.plan == "Audio"} == {"step 2": tuple(
                sum(one["verdict"] == word and one["plan"]["title"] == "Audio" for one in records)
                for word in ("FAIL", "ERROR"))}
    assert [one.value.name for one in found.values if one.limited] == ["adc"] * 4


def _text(document: Record) -> str:
    from amt_line.run.record import document_text

    return document_text(document)


@pytest.mark.parametrize("chosen", [
    Filter(station="A"), Filter(slot="2"), Filter(plan="End"), Filter(plan_version="8"),
    Filter(since=BEGIN + timedelta(days=2)), Filter(until=BEGIN + timedelta(days=3)),
    Filter(plan="End", station="B", since=BEGIN + timedelta(days=1, hours=5),
           until=BEGIN + timedelta(days=5))])
def test_a_filter_keeps_the_history_of_its_handsets(store: Store, chosen: Filter) -> None:
    records = shift(150, seed=8)
    store.put_new(map(_text, records))
    until = chosen.until or datetime.max.replace(tzinfo=timezone.utc)
    since = chosen.since or BEGIN

    def fits(one: Record) -> bool:
        head = {**one, "plan": one["plan"]["title"], "plan_version": one["plan"]["version"]}
        words = all(getattr(chosen, name) in ("", head[name])
                    for name in ("plan", "plan_version", "station", "slot"))
        return words and since <= datetime.fromisoformat(one["began"])

    known = [one for one in records if datetime.fromisoformat(one["began"]) < until]
    found = gather(store, chosen)
    assert found.all.runs
    check_yields(found.all, [one for one in known if fits(one)], known)
    check_times(found, [one for one in known if fits(one)])


def test_an_empty_store_has_no_figures(store: Store) -> None:
    found = gather(store)
    assert found.all.runs == 0 and found.all.first_pass_yield is None
    assert not (found.values or found.steps or found.failures or found.days)


def test_takt_sees_the_runs_of_other_plans(store: Store) -> None:
    audio = {**record()["plan"], "title": "Audio"}
    store.put(record(0))
    store.put(record(60, plan=audio))
    store.put(record(180))
    # The ends: 2, 62, 182. The run of this plan came 120 s behind the one of the other.
    assert gather(store, Filter(plan="line")).all.takt == pytest.approx(120)
    assert gather(store).slots[SlotKey("bench 1", "1")].takt == pytest.approx(90)


def test_a_damaged_database_is_told(tmp_path: Path) -> None:
    path = tmp_path / "line.sqlite"
    with Store.open(f"sqlite:///{path}") as store:
        store.put_new(map(_text, shift(150)))
    whole = path.read_bytes()
    # One page with late values: the first rows are good, and then it breaks off.
    page = whole.rindex(b"step 2namea text") // _PAGE * _PAGE
    path.write_bytes(whole[:page] + bytes(_PAGE) + whole[page + _PAGE:])
    with Store.open(f"sqlite:///{path}", create=False) as store:
        with pytest.raises(StoreProblem, match="malformed"):
            gather(store)


def _plan(connection: Any, query: Any) -> str:
    whole = query.compile(connection, compile_kwargs={"literal_binds": True})
    return "\n".join(row[-1] for row in connection.exec_driver_sql(f"EXPLAIN QUERY PLAN {whole}"))


def test_indexes_are_used(tmp_path: Path) -> None:
    day = Filter(since=BEGIN, until=BEGIN + timedelta(days=1))
    with Store.open(f"sqlite:///{tmp_path}/line.sqlite") as store:
        store.put_new(map(_text, shift(60)))
        with store.looking() as connection:
            runs = _plan(connection, runs_query(day))
            assert "SEARCH runs USING INDEX runs_began (began>? AND began<?)" in runs
            history = _plan(connection, history_query(day))
            assert "SEARCH runs USING INDEX runs_dut (dut=?" in history and "SCAN" not in history
            for query, table in ((steps_query(), STEPS), (values_query(), STEP_VALUES)):
                for several in ([3, 4, 5], [3, 5, 9]):
                    part, = parts_of(query, table, several)
                    assert f"SEARCH {table.name} USING PRIMARY KEY (run_id" in _plan(
                        connection, part)
                assert len(list(parts_of(query, table, range(1, 4002)))) == 3


@pytest.mark.xdist_group("postgresql")
def test_both_databases_say_the_same(postgresql: Cluster, tmp_path: Path) -> None:
    texts = [_text(one) for one in shift(80, seed=9)]
    found = []
    for url in (postgresql.new_database(), f"sqlite:///{tmp_path}/line.sqlite"):
        with Store.open(url) as store:
            store.put_new(texts)
            found.append(gather(store))
    assert found[0] == found[1] and found[0].values
