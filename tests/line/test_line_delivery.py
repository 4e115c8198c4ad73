"""The delivery: in the background, in order, once, and never in a run's way."""

from __future__ import annotations

import os
import random
import shutil
import signal
import sqlite3
import threading
from pathlib import Path
from typing import Any, Iterator

import pytest
from store_bench import keep, record, runs_of, step, unfinished, until
from store_process import station

from amt_line.store import Delivery, Search, Store
from amt_line.store.gap import compare, deliver, find_gap, synchronise

FAST = (0.01, 0.05)


@pytest.fixture(autouse=True)
def state(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> Path:
    """The state directory is the test's."""
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    return tmp_path / "state" / "amt-station"


@pytest.fixture
def folder(tmp_path: Path) -> Path:
    """A directory for records."""
    return tmp_path / "records"


@pytest.fixture
def url(tmp_path: Path) -> str:
    """A database of the test's own."""
    return f"sqlite:///{tmp_path}/line.sqlite"


def delivered(url: str, *, count: int | None = None) -> list[str]:
    """The runs in the store, in the order in which they came."""
    with Store.open(url) as store:
        found = store.runs(Search(size=10_000))
        assert count is None or found.total == count
        return [row.run for row in sorted(found.rows)]


def test_a_record_goes_to_the_store(folder: Path, store_url: str) -> None:
    delivery = Delivery(store_url, folder)
    document = record()
    delivery.recorded(keep(folder, document))
    delivery.close(300)
    assert (delivery.state, delivery.lines()) == ("ok", [])
    assert delivered(store_url) == [document["run"]]
    with Store.open(store_url, create=False) as store:
        assert compare(store, folder).agree
        assert store.record(document["run"]) == document


def test_what_was_missed_goes_first_and_in_order(folder: Path, url: str) -> None:
    documents = [record(number * 0.25, dut=f"KEL{9 - number}") for number in range(10)]
    for document in reversed(documents[:9]):
        keep(folder, document)
    delivery = Delivery(url, folder)
    delivery.recorded(keep(folder, documents[9]))
    delivery.close(300)
    assert delivered(url) == [document["run"] for document in documents]


def test_a_run_left_in_the_middle_is_stored_as_it_is_and_later_whole(folder: Path,
                                                                     url: str) -> None:
    left, going = unfinished(0), unfinished(1, steps=[step(1)])
    keep(folder, left)
    keep(folder, going)
    delivery = Delivery(url, folder, FAST)
    until(lambda: delivery.state == "ok" and len(delivered(url)) == 2)
    end = record(1, run=going["run"], steps=[step(1), step(2)])
    delivery.recorded(keep(folder, end))
    delivery.close(300)
    with Store.open(url) as store:
        assert [row.state for row in store.runs(Search(sort="began")).rows] == ["running", "ended"]
        assert store.record(left["run"]) == left and store.record(going["run"]) == end
        # The process may also have been killed when its record was whole, but not delivered.
        keep(folder, record(0, run=left["run"]))
        assert len(find_gap(store, folder).names) == 1
        assert synchronise(store, folder).delivered == 1 and compare(store, folder).agree


def test_a_run_that_ends_just_while_its_beginning_is_delivered(
        folder: Path, url: str, monkeypatch: pytest.MonkeyPatch) -> None:
    at_it, goes_on = threading.Event(), threading.Event()

    def slow(store: Store, directory: Path, name: str) -> bool:
        new = deliver(store, directory, name)
        at_it.set()
        return goes_on.wait(300) and new

    monkeypatch.setattr("amt_line.store.delivery.deliver", slow)
    document = unfinished()
    keep(folder, document)
    delivery = Delivery(url, folder)
    assert at_it.wait(300)
    end = record(run=document["run"])
    delivery.recorded(keep(folder, end))
    goes_on.set()
    delivery.close(300)
    with Store.open(url) as store:
        assert store.record(end["run"]) == end


@pytest.mark.parametrize("text", [b"", b"{", b"\xff\xfe\0", b"[]", b'{"record": 99}',
                                  b'{"record": 1, "run": "x"}'])
def test_a_file_that_is_no_record_is_named_and_skipped(folder: Path, url: str,
                                                       text: bytes) -> None:
    documents = [record(1), record(3)]
    keep(folder, documents[0])
    bad = keep(folder, record(2))
    bad.write_bytes(text)
    delivery = Delivery(url, folder)
    delivery.recorded(keep(folder, documents[1]))
    delivery.close(300)
    assert delivered(url) == [document["run"] for document in documents]
    assert delivery.state == "ok"
    (line,) = delivery.lines()
    assert line.startswith(f"store: skipped {bad}: ")
    with Store.open(url) as store:
        assert list(compare(store, folder).bad) == [bad.name]


def test_what_is_no_file_of_a_record(folder: Path, url: str) -> None:
    document = record()
    renamed = keep(folder, document).rename(folder / "copy of it.json")
    (folder / "directory.json").mkdir()
    (folder / ".hidden.json").write_text("{", encoding="utf-8")
    (folder / "notes.txt").write_text("{", encoding="utf-8")
    (folder / os.fsdecode(b"\xff.json")).write_text("{", encoding="utf-8")
    (folder / "nowhere.json").symlink_to(folder / "gone")
    delivery = Delivery(url, folder)
    until(lambda: delivery.state == "ok" and delivered(url))
    delivery.close(300)
    assert delivered(url) == [document["run"]] and renamed.exists()
    assert delivery.bad_files == {"directory.json": "Is a directory"}


def test_a_database_that_is_away_gets_it_all_when_it_is_back(folder: Path, tmp_path: Path) -> None:
    place = tmp_path / "mounted"
    place.write_text("not yet", encoding="utf-8")
    url = f"sqlite:///{place}/line.sqlite"
    delivery = Delivery(url, folder, FAST)
    documents = [record(number) for number in range(5)]
    for document in documents:
        delivery.recorded(keep(folder, document))
    until(lambda: "because" in delivery.state)
    standing = delivery.standing
    assert standing.behind == 5 and standing.because == f"{place}: File exists"
    assert delivery.state == (f"behind: 5 records, since {standing.since}, because "
                              f"{place}: File exists")
    place.unlink()
    until(lambda: delivery.state == "ok")
    delivery.close(300)
    assert delivered(url) == [document["run"] for document in documents]


def test_what_is_missing_is_counted_over_several_starts(folder: Path, tmp_path: Path) -> None:
    place = tmp_path / "mounted"
    place.mkdir()
    url = f"sqlite:///{place}/line.sqlite"
    keep(folder, record(0))
    first = Delivery(url, folder)
    first.close(300)
    assert delivered(url, count=1)
    place.rename(tmp_path / "elsewhere")
    place.write_text("gone", encoding="utf-8")
    for number in (1, 2, 3):
        delivery = Delivery(url, folder)
        delivery.recorded(keep(folder, record(number)))
        delivery.close(300)
        records = "1 record is" if number == 1 else f"{number} records are"
        assert delivery.lines() == [
            f"store: {records} still to be delivered: {place}: File exists; the next run does it, "
            "or `amt-station store sync`"]
    place.unlink()
    (tmp_path / "elsewhere").rename(place)
    last = Delivery(url, folder)
    last.close(300)
    assert last.lines() == [] and delivered(url, count=4)


def test_a_locked_database_is_away(folder: Path, url: str, tmp_path: Path) -> None:
    Store.open(url).close()
    other = sqlite3.connect(tmp_path / "line.sqlite", isolation_level=None)
    other.execute("BEGIN IMMEDIATE")
    delivery = Delivery(url, folder, FAST)
    delivery.recorded(keep(folder, record()))
    until(lambda: "database is locked" in delivery.state)
    other.execute("ROLLBACK")
    until(lambda: delivery.state == "ok")
    delivery.close(300)
    assert delivered(url, count=1)
    other.close()


def test_a_database_that_was_taken_away_and_is_empty_again(folder: Path, url: str,
                                                           tmp_path: Path) -> None:
    delivery = Delivery(url, folder, FAST)
    delivery.recorded(keep(folder, record(0)))
    until(lambda: delivery.state == "ok" and delivered(url))
    for path in tmp_path.glob("line.sqlite*"):
        path.unlink()
    delivery.recorded(keep(folder, record(1)))
    delivery.close(300)
    assert delivery.lines() == [] and len(delivered(url)) == 2


def test_closing_does_not_wait_longer_than_it_may(folder: Path, url: str, tmp_path: Path) -> None:
    Store.open(url).close()
    other = sqlite3.connect(tmp_path / "line.sqlite", isolation_level=None)
    other.execute("BEGIN IMMEDIATE")
    delivery = Delivery(url, folder)
    delivery.recorded(keep(folder, record()))
    delivery.close(0.01)
    assert delivery.standing.behind == 1 and "1 record is still to be" in delivery.lines()[0]
    other.close()


def test_the_directory_vanishes(folder: Path, url: str) -> None:
    delivery = Delivery(url, folder, FAST)
    path = keep(folder, record())
    shutil.rmtree(folder)
    delivery.recorded(path)
    delivery.close(300)
    assert delivery.lines() == [] and delivered(url) == []


@pytest.fixture(params=range(3))
def dice(request: pytest.FixtureRequest) -> Iterator[Any]:
    """When to kill: otherwise in each test, the same in each run of it."""
    yield random.Random(request.param)


def test_a_station_killed_at_any_moment(folder: Path, url: str, dice: random.Random) -> None:
    for _ in range(2):
        process = station(url, folder, "A", 100)
        assert process.stdout is not None
        for _ in range(dice.randrange(1, 60)):
            process.stdout.readline()
        process.send_signal(signal.SIGKILL)
        process.wait(300)
        process.stdout.close()
    delivery = Delivery(url, folder)
    delivery.recorded(keep(folder, record(500)))
    until(lambda: delivery.state == "ok" and delivery.standing.behind == 0)
    delivery.close(300)
    assert delivery.lines() == []
    with Store.open(url) as store:
        assert compare(store, folder).agree
    runs = delivered(url)
    assert len(runs) == len(set(runs)) and set(runs) == runs_of(folder)
