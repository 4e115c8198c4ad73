"""The database of records: put, found again, counted. Threads and processes may share it."""

from __future__ import annotations

import hashlib
import json
from typing import ContextManager, Iterable, Iterator, Mapping, NamedTuple, Sequence, TypeVar

from sqlalchemy import delete, func, insert, select, update
from sqlalchemy.engine import Connection, Engine
from sqlalchemy.exc import IntegrityError

from amt_line.run.clock import utc_now
from amt_line.run.record import Document, document_text
from amt_line.store import queries
from amt_line.store.engine import make_engine, reading, told, writing
from amt_line.store.fast import insert_many
from amt_line.store.migrate import bring_up_to_date, check_version
from amt_line.store.problems import BadRecord, StoreProblem
from amt_line.store.rows import Row, Rows, rows_of
from amt_line.store.search import Found, RunRow, Search
from amt_line.store.tables import RECORDS, RUNS, STEP_VALUES, STEPS
from amt_line.store.url import checked_url, shown_url

_BATCH = 500
_Item = TypeVar("_Item")


class Stored(NamedTuple):
    """What the database says of a record: its SHA-256, how far it has got, whence it came."""

    sha256: str
    state: str
    origin: str


class Store:
    """One database. Use ``open``; what goes wrong is ``StoreProblem``, ``StoreAway`` when the
    same may go well later."""

    def __init__(self, engine: Engine, url: str) -> None:
        self.url = shown_url(url)
        self._engine = engine

    @classmethod
    def open(cls, url: str, create: bool = True) -> Store:
        """Open a database: make or migrate it, or, without ``create``, take it only as it is.

        One of a newer version is refused.
        """
        checked = checked_url(url)
        engine = make_engine(checked, create)
        try:
            if create:
                with told(engine):
                    bring_up_to_date(engine)
            else:
                check_version(engine)
        except BaseException:
            engine.dispose()
            raise
        return cls(engine, checked)

    def close(self) -> None:
        """Give the connections back."""
        self._engine.dispose()

    def __enter__(self) -> Store:
        return self

    def __exit__(self, *_error: object) -> None:
        self.close()

    def looking(self) -> ContextManager[Connection]:
        """A transaction of one's own that only reads; all that it reads is of one moment."""
        return reading(self._engine, of_one_moment=True)

    def put(self, document: Document, origin: str = "", file: str = "") -> bool:
        """Put a record; False when it is there already, or one that has got further is."""
        return self.put_text(document_text(document), origin, file)

    def put_text(self, text: str, origin: str = "", file: str = "") -> bool:
        """Put a record as its file has it. ``origin`` is the directory, ``file`` the name in it.

        ``BadRecord`` when it is none.
        """
        rows, record = _taken_apart(text, origin, file)
        try:
            with writing(self._engine) as connection:
                return _put(connection, rows, record)
        except IntegrityError:
            pass
        # Somebody else has put the same run meanwhile.
        try:
            with writing(self._engine) as connection:
                return _put(connection, rows, record)
        except IntegrityError as error:
            raise StoreProblem(f"{self.url}: run {rows.run['run']} is not taken: "
                               f"{type(error.orig).__name__}") from error

    def put_new(self, texts: Iterable[str]) -> int:
        """Put many records quickly, of runs that are not there yet; how many they were."""
        count = 0
        for batch in _batches((_taken_apart(text, "", "") for text in texts), _BATCH):
            try:
                with writing(self._engine) as connection:
                    _put_batch(connection, batch)
            except IntegrityError as error:
                raise StoreProblem(f"{self.url}: one of the runs is there already") from error
            count += len(batch)
        return count

    def record(self, run: str) -> Document | None:
        """The record of a run."""
        text = self.record_text(run)
        return None if text is None else json.loads(text)

    def record_text(self, run: str) -> str | None:
        """The record of a run as its file has it."""
        wanted = select(RECORDS.c.document).join_from(RUNS, RECORDS).where(RUNS.c.run == run)
        with reading(self._engine) as connection:
            text: str | None = connection.execute(wanted).scalar_one_or_none()
        return text

    def runs(self, search: Search = Search()) -> Found:
        """A page of runs."""
        with reading(self._engine) as connection:
            total = connection.execute(queries.count(search)).scalar_one()
            rows = connection.execute(queries.page(search)).all()
        return Found([RunRow._make(row) for row in rows], int(total))

    def files_of(self, origin: str, names: Iterable[str]) -> dict[str, Stored]:
        """What is stored of a directory's files: of all from ``origin``, and of these names
        wherever they came from."""
        columns = (RECORDS.c.file, RECORDS.c.sha256, RUNS.c.state, RECORDS.c.origin)
        query = select(*columns).join_from(RUNS, RECORDS)
        with reading(self._engine) as connection:
            found = {row[0]: Stored._make(row[1:]) for row in
                     connection.execute(query.where(RECORDS.c.origin == origin))}
            for part in _batches((name for name in names if name not in found), _BATCH):
                found.update((row[0], Stored._make(row[1:])) for row in
                             connection.execute(query.where(RECORDS.c.file.in_(part))).all())
        return found

    def missing_of(self, origin: str, names: Sequence[str]) -> tuple[list[str], dict[str, str]]:
        """Which of a directory's files are not stored; of the others, those whose run has not
        ended, with the SHA-256 of what is stored."""
        unfinished = (select(RECORDS.c.file, RECORDS.c.sha256).join_from(RUNS, RECORDS)
                      .where(RUNS.c.verdict == ""))
        with reading(self._engine) as connection:
            result = connection.execute(select(RECORDS.c.file).where(RECORDS.c.origin == origin))
            # A directory of years holds many: they are taken as the driver has them.
            there = {row[0] for row in result.cursor.fetchall()}
            result.close()
            running = dict(connection.execute(unfinished).all())
            others = [name for name in names if name not in there]
            for part in _batches(others, _BATCH):
                there.update(connection.execute(
                    select(RECORDS.c.file).where(RECORDS.c.file.in_(part))).scalars())
        missing = [name for name in names if name not in there]
        return missing, {name: running[name] for name in names if name in running}

    def stored(self, run: str) -> Stored | None:
        """What is stored of a run."""
        query = select(RECORDS.c.sha256, RUNS.c.state, RECORDS.c.origin).join_from(RUNS, RECORDS)
        with reading(self._engine) as connection:
            row = connection.execute(query.where(RUNS.c.run == run)).one_or_none()
        return None if row is None else Stored._make(row)

    def words(self) -> dict[str, list[str]]:
        """The plans, stations and slots that there are, for a choice."""
        columns = {"plan": RUNS.c.plan, "station": RUNS.c.station, "slot": RUNS.c.slot}
        with reading(self._engine) as connection:
            return {name: list(connection.execute(select(column).distinct().order_by(column))
                               .scalars())
                    for name, column in columns.items()}


def _taken_apart(text: str, origin: str, file: str) -> tuple[Rows, Row]:
    try:
        data = text.encode("utf-8")
        document = json.loads(text)
    except (ValueError, RecursionError) as error:
        raise BadRecord(f"no record of a run: {error}") from error
    return rows_of(document), {
        "document": text, "sha256": hashlib.sha256(data).hexdigest(), "origin": origin,
        "file": file, "stored": utc_now()}


def _put(connection: Connection, rows: Rows, record: Row) -> bool:
    there = connection.execute(
        select(RUNS.c.id, RUNS.c.state, RECORDS.c.sha256,
               select(func.count()).select_from(STEPS).where(STEPS.c.run_id == RUNS.c.id)
               .scalar_subquery())
        .join_from(RUNS, RECORDS).where(RUNS.c.run == rows.run["run"])
        .with_for_update(of=RUNS)).one_or_none()
    if there is None:
        number = connection.execute(insert(RUNS), rows.run).inserted_primary_key[0]
    else:
        number, state, sha256, steps = there
        if sha256 == record["sha256"] or state != "running":
            _adopt(connection, number, sha256, record)
            return False
        if rows.run["state"] == "running" and len(rows.steps) <= steps:
            return False
        for table in (STEP_VALUES, STEPS, RECORDS):
            connection.execute(delete(table).where(table.c.run_id == number))
        connection.execute(update(RUNS).where(RUNS.c.id == number), rows.run)
    _put_parts(connection, [(number, rows, record)])
    return True


def _adopt(connection: Connection, number: int, sha256: str, record: Row) -> None:
    """A record that came without a file gets the name of its file."""
    if record["file"] and sha256 == record["sha256"]:
        connection.execute(
            update(RECORDS).where(RECORDS.c.run_id == number, RECORDS.c.file == ""),
            {"file": record["file"], "origin": record["origin"]})


def _put_batch(connection: Connection, batch: list[tuple[Rows, Row]]) -> None:
    insert_many(connection, RUNS, [rows.run for rows, _ in batch])
    runs = [rows.run["run"] for rows, _ in batch]
    numbers: Mapping[str, int] = dict(connection.execute(
        select(RUNS.c.run, RUNS.c.id).where(RUNS.c.run.in_(runs))).all())
    _put_parts(connection, [(numbers[rows.run["run"]], rows, record) for rows, record in batch])


def _put_parts(connection: Connection, runs: list[tuple[int, Rows, Row]]) -> None:
    for table, parts in (
            (RECORDS, [{"run_id": number, **record} for number, _, record in runs]),
            (STEPS, [{"run_id": number, **step} for number, rows, _ in runs
                     for step in rows.steps]),
            (STEP_VALUES, [{"run_id": number, **value} for number, rows, _ in runs
                           for value in rows.values])):
        insert_many(connection, table, parts)


def _batches(items: Iterable[_Item], size: int) -> Iterator[list[_Item]]:
    batch: list[_Item] = []
    for item in items:
        batch.append(item)
        if len(batch) == size:
            yield batch
            batch = []
    if batch:
        yield batch
