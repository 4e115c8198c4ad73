"""Runs found in the store: by text, by field, by time; sorted, a page at a time."""

from __future__ import annotations

from datetime import timedelta
from typing import Iterator

import pytest
from store_bench import BEGIN, record, unfinished

from amt_line.store import Search, Store
from amt_station.errors import UsageProblem


def fill(store: Store) -> list[str]:
    """Six runs, two of each of three handsets."""
    runs = []
    for number in range(6):
        plan = {"title": "main" if number < 4 else "radio", "version": "1", "path": "",
                "sha256": "0" * 64, "steps": 1}
        document = record(number * 3600, dut=f"KEL_{number // 2}", plan=plan, slot=str(number % 2),
                          station="A" if number < 3 else "B", operator="Zoë",
                          seconds=float(10 - number))
        if number == 2:
            document.update(verdict="FAIL", exit_status=1, reason="battery: 100% empty")
        if number == 5:
            document = unfinished(5 * 3600, dut="KEL_2", plan=plan, slot="1", station="B")
        store.put(document)
        runs.append(document["run"])
    return runs


@pytest.fixture(scope="module", params=["sqlite", pytest.param(
    "postgresql", marks=pytest.mark.xdist_group("postgresql"))])
def filled(request: pytest.FixtureRequest, tmp_path_factory: pytest.TempPathFactory) -> Iterator[
        tuple[Store, list[str]]]:
    """A store with six runs, which are only looked at."""
    url = f"sqlite:///{tmp_path_factory.mktemp('store')}/line.sqlite" \
        if request.param == "sqlite" else request.getfixturevalue("postgresql").new_database()
    with Store.open(url) as store:
        yield store, fill(store)


@pytest.mark.parametrize("search, wanted", [
    (Search(), [5, 4, 3, 2, 1, 0]), (Search(sort="began"), [0, 1, 2, 3, 4, 5]),
    (Search(sort="began", size=2, page=2), [2, 3]), (Search(size=4, page=2), [1, 0]),
    (Search(page=9), []), (Search(sort="seconds"), [4, 3, 2, 1, 0, 5]),
    (Search(sort="-seconds"), [0, 1, 2, 3, 4, 5]), (Search(sort="-dut"), [5, 4, 3, 2, 1, 0]),
    (Search(sort="plan"), [0, 1, 2, 3, 4, 5]), (Search(sort="-station"), [5, 4, 3, 2, 1, 0]),
    (Search(sort="slot"), [0, 2, 4, 1, 3, 5]), (Search(sort="verdict"), [5, 2, 0, 1, 3, 4]),
    (Search(dut="kel_1"), [3, 2]), (Search(dut="_1"), [3, 2]), (Search(dut="KELX1"), []),
    (Search(text="100% EMPTY"), [2]), (Search(text="100_"), []), (Search(text="\\"), []),
    (Search(text="radio"), [5, 4]), (Search(verdict="PASS", sort="began"), [0, 1, 3, 4]),
    (Search(verdict="UNFINISHED"), [5]), (Search(plan="main", station="A"), [2, 1, 0]),
    (Search(slot="1"), [5, 3, 1]), (Search(since=BEGIN + timedelta(hours=4)), [5, 4]),
    (Search(until=BEGIN + timedelta(hours=1)), [0]),
    (Search(since=(BEGIN + timedelta(hours=5)).replace(tzinfo=None)), [5])])
def test_searching(filled: tuple[Store, list[str]], search: Search, wanted: list[int]) -> None:
    store, runs = filled
    found = store.runs(search)
    assert [runs.index(row.run) for row in found.rows] == wanted
    if (search.page, search.size) == (1, 50):
        assert found.total == len(wanted)
    elif not any((search.text, search.dut)):
        assert found.total == 6


def test_the_words_for_a_choice(filled: tuple[Store, list[str]]) -> None:
    assert filled[0].words() == {"plan": ["main", "radio"], "station": ["A", "B"],
                                 "slot": ["0", "1"]}


@pytest.mark.parametrize("search", [Search(sort="password"), Search(page=0), Search(size=0)])
def test_a_search_that_cannot_be(filled: tuple[Store, list[str]], search: Search) -> None:
    with pytest.raises(UsageProblem):
        filled[0].runs(search)
