"""The database itself: its version, its settings, its indexes; what is none of a store's."""

from __future__ import annotations

import multiprocessing
import shutil
import sqlite3
from concurrent.futures import ThreadPoolExecutor
from pathlib import Path
from typing import Any, Callable

import pytest
from alembic.autogenerate.api import compare_metadata
from alembic.migration import MigrationContext
from sqlalchemy import text
from store_bench import record, step, value

from amt_line.run.record import document_text
from amt_line.store import Search, Store, StoreAway, StoreProblem, migrate
from amt_line.store.engine import make_engine, writing
from amt_line.store.migrate import HEAD, VERSION_TABLE, upgrade
from amt_line.store.queries import count, page
from amt_line.store.tables import METADATA
from amt_line.store.url import checked_url


@pytest.fixture
def path(tmp_path: Path) -> Path:
    """Where a SQLite database may be."""
    return tmp_path / "below" / "line.sqlite"


def execute(url: str, *statements: str) -> Any:
    """Do something to a database that no store would do; what the last one answers."""
    engine = make_engine(checked_url(url), True)
    with writing(engine) as connection:
        for statement in statements:
            result = connection.execute(text(statement))
        answer = result.all() if result.returns_rows else []
    engine.dispose()
    return answer


def test_the_migrations_lead_to_the_tables(store_url: str) -> None:
    with Store.open(store_url) as store, store.looking() as connection:
        context = MigrationContext.configure(connection, opts={"version_table": VERSION_TABLE})
        assert compare_metadata(context, METADATA) == []
        assert context.get_current_revision() == f"{HEAD:04}"


def test_a_newer_database_is_refused_and_left_alone(store_url: str) -> None:
    document = record()
    with Store.open(store_url) as store:
        store.put(document)
    execute(store_url, f"UPDATE {VERSION_TABLE} SET version_num = '{HEAD + 1:04}'")
    for create in (True, False):
        with pytest.raises(StoreProblem) as caught:
            Store.open(store_url, create)
        assert not isinstance(caught.value, StoreAway)
        assert (f": the database is of version {HEAD + 1}, this program knows {HEAD}; "
                "a newer amt-station is needed") in str(caught.value)
    execute(store_url, f"UPDATE {VERSION_TABLE} SET version_num = '{HEAD:04}'")
    with Store.open(store_url) as store:
        assert store.record(document["run"]) == document


@pytest.mark.parametrize("statements, words", [
    (["CREATE TABLE runs (distance INTEGER)"], "holds tables of something else"),
    ([f"CREATE TABLE {VERSION_TABLE} (version_num TEXT)",
      f"INSERT INTO {VERSION_TABLE} VALUES ('abc')"], "is of no version that can be read")])
def test_a_database_of_something_else(store_url: str, statements: list[str], words: str) -> None:
    execute(store_url, *statements)
    with pytest.raises(StoreProblem, match=words):
        Store.open(store_url)


def test_tables_of_others_may_stand_beside(store_url: str) -> None:
    execute(store_url, "CREATE TABLE alembic_version (version_num TEXT)",
            "INSERT INTO alembic_version VALUES ('feed')", "CREATE TABLE other (a INTEGER)")
    with Store.open(store_url) as store:
        assert store.put(record())
    assert execute(store_url, "SELECT version_num FROM alembic_version") == [("feed",)]


def test_an_empty_database_without_create(store_url: str, path: Path) -> None:
    execute(store_url, "CREATE TABLE other (a INTEGER)")
    with pytest.raises(StoreProblem, match="holds no records"):
        Store.open(store_url, create=False)
    with pytest.raises(StoreAway, match="no such database"):
        Store.open(f"sqlite:///{path}", create=False)
    assert not path.parent.exists()


def test_a_file_that_is_no_database(path: Path) -> None:
    path.parent.mkdir()
    path.write_text("no database at all, but long enough to be looked at" * 30, encoding="utf-8")
    with pytest.raises(StoreProblem, match="file is not a database"):
        Store.open(f"sqlite:///{path}")


def fails_behind_a_migration(monkeypatch: pytest.MonkeyPatch, url: str) -> None:
    """Open a store, and lose the power when it has been migrated, but not committed."""
    def fail(connection: Any, version: int) -> None:
        upgrade(connection, version)
        raise OSError("the power went")

    with monkeypatch.context() as patch:
        patch.setattr(migrate, "upgrade", fail)
        with pytest.raises(OSError, match="the power went"):
            Store.open(url)


def test_tables_that_were_not_finished_are_made_again(store_url: str,
                                                      monkeypatch: pytest.MonkeyPatch) -> None:
    fails_behind_a_migration(monkeypatch, store_url)
    with Store.open(store_url) as store:
        assert store.put(record())


def at_once(count: int, work: Callable[[], object]) -> None:
    """Do it in so many threads; what goes wrong in one goes wrong here."""
    with ThreadPoolExecutor(count) as threads:
        for future in [threads.submit(work) for _ in range(count)]:
            future.result(300)


def _open(url: str, ready: Any, results: Any) -> None:
    ready.wait()
    try:
        with Store.open(url) as store:
            store.put(record())
        results.put("")
    except Exception as error:  # pylint: disable=broad-except
        results.put(repr(error))


def test_several_stations_may_make_it_at_once(store_url: str) -> None:
    context = multiprocessing.get_context("spawn")
    ready, results = context.Barrier(2), context.Queue()
    processes = [context.Process(target=_open, args=(store_url, ready, results), daemon=True)
                 for _ in range(2)]
    for process in processes:
        process.start()
    assert [results.get(timeout=300) for _ in processes] == [""] * 2
    for process in processes:
        process.join(300)
    with Store.open(store_url) as store:
        assert store.runs().total == 2


NEXT = """
import sqlalchemy as sa
from alembic import op

revision = "%s"
down_revision = "%s"


def upgrade():
    op.add_column("runs", sa.Column("shift", sa.String(), nullable=False, server_default=""))
    op.execute("UPDATE runs SET shift = CASE WHEN began LIKE '%%T06:00:0%%' THEN 'early' "
               "ELSE 'late' END")
    op.create_index("runs_shift", "runs", ["shift"])
"""


@pytest.fixture
def a_version_later(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> Callable[[], None]:
    """From its call on, this is the next version of the program."""
    scripts = tmp_path / "migrations %d"
    shutil.copytree(migrate.SCRIPTS, scripts, ignore=shutil.ignore_patterns("__pycache__"))
    later = scripts / "versions" / "later.py"
    later.write_text(NEXT % (f"{HEAD + 1:04}", f"{HEAD:04}"), encoding="utf-8")

    def begin() -> None:
        monkeypatch.setattr(migrate, "SCRIPTS", scripts)
        monkeypatch.setattr(migrate, "HEAD", HEAD + 1)
    return begin


def test_an_older_database_is_migrated_with_all_that_is_in_it(
        store_url: str, a_version_later: Callable[[], None],
        monkeypatch: pytest.MonkeyPatch) -> None:
    documents = [record(number) for number in range(20)]
    with Store.open(store_url) as store:
        store.put_new(map(document_text, documents))
    a_version_later()
    with pytest.raises(StoreProblem) as caught:
        Store.open(store_url, create=False)
    assert (f"the database is of version {HEAD}, this program wants {HEAD + 1}; "
            "`amt-station store sync` migrates it") in str(caught.value)
    at_once(4, lambda: Store.open(store_url).close())
    assert execute(store_url, "SELECT shift, count(*) FROM runs GROUP BY shift ORDER BY shift") \
        == [("early", 10), ("late", 10)]
    with Store.open(store_url, create=False) as store:
        assert [store.record(document["run"]) for document in documents] == documents
        assert store.put(record()) and not store.put(documents[0])
    monkeypatch.undo()
    with pytest.raises(StoreProblem, match=f"is of version {HEAD + 1}, this program knows {HEAD}"):
        Store.open(store_url)


def test_a_migration_that_was_interrupted_is_done_again(
        store_url: str, a_version_later: Callable[[], None],
        monkeypatch: pytest.MonkeyPatch) -> None:
    with Store.open(store_url) as store:
        store.put(record())
    a_version_later()
    fails_behind_a_migration(monkeypatch, store_url)
    assert execute(store_url, f"SELECT version_num FROM {VERSION_TABLE}") == [(f"{HEAD:04}",)]
    with Store.open(store_url) as store:
        assert store.runs().total == 1
    assert execute(store_url, "SELECT shift FROM runs") == [("early",)]


def test_the_same_records_from_several_threads(store_url: str) -> None:
    documents = [record(number) for number in range(30)]
    new: list[int] = []
    with Store.open(store_url) as store:
        at_once(4, lambda: new.append(sum(store.put(document) for document in documents)))
        assert sum(new) == 30 and len(new) == 4 and store.runs().total == 30


def test_sqlite_is_set_up_for_several_processes(path: Path) -> None:
    with Store.open(f"sqlite:///{path}") as store:
        with store.looking() as connection:
            settings = [connection.exec_driver_sql(f"PRAGMA {name}").scalar_one()
                        for name in ("journal_mode", "foreign_keys", "busy_timeout")]
        assert settings == ["wal", 1, 5000]
        store.put(record())
    connection = sqlite3.connect(path)
    connection.execute("PRAGMA foreign_keys = ON")
    connection.execute("DELETE FROM runs")
    for table in ("steps", "step_values", "records"):
        assert connection.execute(f"SELECT count(*) FROM {table}").fetchone() == (0,)
    connection.close()


def test_a_place_with_odd_characters(tmp_path: Path) -> None:
    path = tmp_path / "Linie 3%20 ä#:@" / "a&b=c.sqlite"
    with Store.open(f"sqlite:///{path}") as store:
        store.put(record())
    assert path.exists()


@pytest.mark.parametrize("search, index", [
    (Search(), "runs_began"), (Search(sort="began", verdict="FAIL"), "runs_verdict"),
    (Search(plan="line"), "runs_plan"), (Search(station="bench 1"), "runs_station"),
    (Search(sort="dut"), "runs_dut")])
def test_searching_uses_the_indexes(path: Path, search: Search, index: str) -> None:
    with Store.open(f"sqlite:///{path}") as store, store.looking() as connection:
        for query in (page(search), *([count(search)] if search.plan else [])):
            compiled = query.compile(connection, compile_kwargs={"literal_binds": True})
            plan = connection.exec_driver_sql(f"EXPLAIN QUERY PLAN {compiled}").all()
            assert f"INDEX {index}" in plan[0][3]
            assert search.sort != "-began" or len(plan) == 1, "nothing has to be sorted"


def test_values_of_a_run_lie_together(path: Path) -> None:
    with Store.open(f"sqlite:///{path}") as store, store.looking() as connection:
        for table in ("steps", "step_values", "records"):
            plan = connection.exec_driver_sql(
                f"EXPLAIN QUERY PLAN SELECT * FROM {table} WHERE run_id BETWEEN 5 AND 9").all()
            assert len(plan) == 1 and plan[0][3].startswith(f"SEARCH {table} USING ")
            assert "PRIMARY KEY" in plan[0][3]


def test_a_large_record(store_url: str) -> None:
    document = record(steps=[step(number, values=[value(f"v{at}", at) for at in range(100)])
                             for number in range(1, 201)])
    with Store.open(store_url) as store:
        assert store.put(document) and store.record(document["run"]) == document
