"""The store: a record is put once, found again whole, and searched, in either database."""

from __future__ import annotations

import hashlib
from pathlib import Path
from typing import Any, Iterator

import pytest
from sqlalchemy import func, select
from store_bench import record, stamp, step, unfinished, value

from amt_line.run.record import document_text
from amt_line.store import BadRecord, Search, Store, StoreProblem
from amt_line.store.tables import RUNS, STEP_VALUES, STEPS


@pytest.fixture
def store(store_url: str) -> Iterator[Store]:
    """An empty store."""
    with Store.open(store_url) as opened:
        yield opened


def rows_of(store: Store, table: Any) -> list[Any]:
    """All rows of a table in their order."""
    with store.looking() as connection:
        return list(connection.execute(select(table).order_by(*table.primary_key)))


def test_a_record_is_put_once_and_comes_back_whole(store: Store) -> None:
    document = record()
    assert store.record(document["run"]) is None
    assert [store.put(document), store.put(document)] == [True, False]
    assert store.record(document["run"]) == document
    text = document_text(document)
    assert store.record_text(document["run"]) == text
    stored = store.stored(document["run"])
    assert stored is not None
    assert stored.sha256 == hashlib.sha256(text.encode("utf-8")).hexdigest()
    assert store.runs().total == 1


def test_a_run_that_goes_on_takes_the_place_of_what_it_was(store: Store) -> None:
    one = unfinished(steps=[step(1)])
    two = {**one, "steps": [step(1), step(2)]}
    end = record(run=one["run"], verdict="FAIL", exit_status=1, reason="step 2: too high",
                 steps=[step(1), step(2, verdict="fail"), step(3)])
    assert [store.put(one), store.put(two), store.put(one)] == [True, True, False]
    assert store.put(end) and not store.put(two)
    assert store.record(one["run"]) == end
    (row,) = store.runs().rows
    assert (row.state, row.verdict, row.exit_status, row.first_failed_step) == (
        "ended", "FAIL", 1, "step 2")
    assert [item.number for item in rows_of(store, STEPS)] == [1, 2, 3]
    assert len(rows_of(store, STEP_VALUES)) == 3


def test_an_ended_run_is_never_changed(store: Store) -> None:
    document = record()
    store.put(document)
    assert not store.put({**document, "verdict": "FAIL"})
    assert store.record(document["run"]) == document


def test_what_the_rows_hold(store: Store) -> None:
    limits = {"min": 10, "max": 20.5, "marginal_min": 12, "marginal_max": 19}
    store.put(record(steps=[
        step(1, section="setup", kind="at", values=[value("reply", "OK")]),
        step(2, verdict="fail", attempts=3, reason="adc 21 is above 20.5", seconds=1.25, values=[
            value("adc", 21, unit="mV", limits=limits, verdict="fail"),
            value("near", 19.5, limits=limits, verdict="pass", marginal=True),
            value("result", 0)])], verdict="FAIL", exit_status=1))
    (run,) = store.runs().rows
    assert (run.plan, run.plan_version, run.plan_steps, run.seconds, run.began) == (
        "line", "1", 1, 2.0, stamp(0))
    first, second = rows_of(store, STEPS)
    assert (first.run_id, first.section, first.kind, first.verdict) == (
        run.id, "setup", "at", "pass")
    assert (second.attempts, second.reason, second.seconds) == (3, "adc 21 is above 20.5", 1.25)
    reply, adc, near, result = rows_of(store, STEP_VALUES)
    assert (reply.number, reply.text, reply.min, reply.verdict) == (None, "OK", None, "")
    assert adc[1:] == (2, 0, "step 2", "adc", 21.0, None, "mV", 10.0, 20.5, 12.0, 19.0, "fail",
                       False)
    assert near.marginal and not adc.marginal and result.number == 0.0


HOSTILE = "a\0b\ud800\u202e\udcff<script>'; DROP TABLE runs; --\U0001f600"


def test_texts_and_numbers_that_no_column_takes(store: Store) -> None:
    huge = {"max": float("inf"), "min": -1}
    document = record(dut=HOSTILE, reason=HOSTILE, steps=[step(1, name=HOSTILE, values=[
        value("a", HOSTILE), value("b", 10 ** 400), value("c", 2 ** 64, limits=huge)])])
    assert store.put(document)
    assert store.record(document["run"]) == document
    text, large, number = rows_of(store, STEP_VALUES)
    assert text.text == HOSTILE.replace("\0", "\\u0000").replace("\ud800", "\\ud800").replace(
        "\udcff", "\\udcff")
    assert (large.number, large.text) == (None, str(10 ** 400))
    assert (number.number, number.min, number.max) == (2.0 ** 64, -1.0, None)
    assert store.runs(Search(dut="<script>'; drop")).total == 1


@pytest.mark.parametrize("text, words", [
    ("", "no record of a run: Expecting value"), ("[" * 100_000, "no record of a run: "),
    ("[]", "no record of a run"), ('{"record": 2}', "a record of version 2; this program knows 1"),
    ('{"record": true}', "no record of a run"), ('{"record": 1}', "KeyError 'steps'")])
def test_texts_that_are_no_records(tmp_path: Path, text: str, words: str) -> None:
    with Store.open(f"sqlite:///{tmp_path}/line.sqlite") as store:
        with pytest.raises(BadRecord) as caught:
            store.put_text(text)
        assert words in str(caught.value) and store.runs().total == 0


@pytest.mark.parametrize("change", [
    {"run": "x"}, {"run": "0" * 36 + "\n"}, {"began": "2026-11-20"}, {"began": None},
    {"verdict": "pass"}, {"verdict": None}, {"state": "stopped"}, {"seconds": "2"},
    {"exit_status": True}, {"dut": 1}, {"plan": None}, {"steps": [None]},
    {"steps": [step(), step()]}, {"steps": [step(verdict="PASS")]}, {"steps": [step(-1)]},
    {"steps": [step(seconds=10 ** 400)]}, {"steps": [step(values=[{"name": "a"}])]},
    {"steps": [step(values=[value("a", None)])]}, {"steps": [step(values=[value("a", True)])]},
    {"steps": [step(values=[value(limits={"min": "1"})])]},
    {"steps": [{**step(), "number": 2 ** 40}]}])
def test_records_with_a_field_that_is_something_else(tmp_path: Path,
                                                     change: dict[str, Any]) -> None:
    with Store.open(f"sqlite:///{tmp_path}/line.sqlite") as store:
        with pytest.raises(BadRecord, match="no record of a run"):
            store.put(record(**change))
        assert store.runs().total == 0


def test_many_new_records_at_once(store: Store) -> None:
    documents = [record(number, steps=[step(1), step(2)]) for number in range(1100)]
    assert store.put_new(map(document_text, documents)) == 1100
    assert store.runs().total == 1100
    assert store.record(documents[1000]["run"]) == documents[1000]
    assert len(rows_of(store, STEP_VALUES)) == 2200
    with pytest.raises(StoreProblem, match="is there already"):
        store.put_new([document_text(record()), document_text(documents[5])])
    assert store.runs().total == 1100


def test_who_looks_sees_one_moment(store: Store) -> None:
    store.put(record(0))
    with store.looking() as connection:
        counts = [connection.execute(select(func.count()).select_from(RUNS)).scalar_one()]
        store.put(record(1))
        counts.append(connection.execute(select(func.count()).select_from(RUNS)).scalar_one())
    assert counts == [1, 1] and store.runs().total == 2
