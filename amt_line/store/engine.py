"""Connections to the database, set up the way the store needs them, and their failures told."""

from __future__ import annotations

from contextlib import contextmanager
from pathlib import Path
from typing import Any, Iterator

from sqlalchemy import create_engine, event
from sqlalchemy.engine import URL, Connection, Engine
from sqlalchemy.exc import (DatabaseError, DBAPIError, IntegrityError, InterfaceError,
                            InternalError, NoSuchModuleError, OperationalError, SQLAlchemyError)

from amt_line.store.problems import StoreAway, StoreProblem
from amt_line.store.url import shown_url, sqlite_path, without_secrets

# Another station's transaction takes milliseconds; who waits longer is told.
_BUSY_SECONDS = 5
_CONNECT_SECONDS = 3
_STATEMENT_MS = 600_000
_WRITE = "amt_write"


def make_engine(url: str, create: bool) -> Engine:
    """An engine for a URL from ``checked_url``; nothing is opened yet."""
    path = sqlite_path(url)
    try:
        if path is None:
            return create_engine(
                url, future=True, pool_pre_ping=True, pool_size=4,
                connect_args={"connect_timeout": _CONNECT_SECONDS, "keepalives_idle": 10,
                              "keepalives_interval": 5, "keepalives_count": 3,
                              "application_name": "amt-station"})
        return _sqlite_engine(path, create)
    except (SQLAlchemyError, ImportError, ValueError) as error:
        raise StoreProblem(f"{shown_url(url)}: {_reason(error, url)}") from error


def _sqlite_engine(path: Path, create: bool) -> Engine:
    if create:
        try:
            path.parent.mkdir(parents=True, exist_ok=True)
        except OSError as error:
            raise StoreAway(f"{error.filename or path}: {error.strerror}") from error
    elif not path.exists():
        raise StoreAway(f"{path}: no such database")
    engine = create_engine(URL.create("sqlite", database=str(path)), future=True,
                           connect_args={"timeout": _BUSY_SECONDS, "check_same_thread": False})
    event.listen(engine, "connect", _set_up_sqlite)
    event.listen(engine, "begin", _begin_sqlite)
    return engine


def _set_up_sqlite(connection: Any, _record: Any) -> None:
    # The driver would begin transactions where it likes; these are begun where they are meant.
    connection.isolation_level = None
    cursor = connection.cursor()
    cursor.execute("PRAGMA foreign_keys = ON")
    cursor.execute("PRAGMA journal_mode")
    if cursor.fetchone()[0] != "wal":
        _switch_to_wal(cursor)
    # What a power cut takes from the database stands in the records, and is delivered again.
    cursor.execute("PRAGMA synchronous = NORMAL")
    cursor.close()


def _switch_to_wal(cursor: Any) -> None:
    import sqlite3

    try:
        cursor.execute("PRAGMA journal_mode = WAL")
    except sqlite3.OperationalError:
        # Another process is at it, or nothing may be written: both are good without.
        pass


def _begin_sqlite(connection: Connection) -> None:
    # Who wants to write says so at once: two that both read first would get in each other's way.
    wants_to_write = connection.get_execution_options().get(_WRITE)
    connection.exec_driver_sql("BEGIN IMMEDIATE" if wants_to_write else "BEGIN")


@contextmanager
def reading(engine: Engine, of_one_moment: bool = False) -> Iterator[Connection]:
    """A transaction that only reads, each time what is there, or all as at its begin."""
    with told(engine), engine.connect() as connection:
        if of_one_moment and engine.dialect.name == "postgresql":
            # A transaction of SQLite is so by itself.
            connection = connection.execution_options(isolation_level="REPEATABLE READ")
        yield connection


@contextmanager
def writing(engine: Engine) -> Iterator[Connection]:
    """A transaction that is carried out whole or not at all."""
    with told(engine), engine.connect().execution_options(**{_WRITE: True}) as connection:
        with connection.begin():
            yield connection


@contextmanager
def told(engine: Engine) -> Iterator[None]:
    """Turn the library's failures into the store's."""
    try:
        yield
    except IntegrityError:
        raise
    except SQLAlchemyError as error:
        url = engine.url.render_as_string(hide_password=False)
        message = f"{shown_url(url)}: {_reason(error, url)}"
        raise (StoreAway if is_away(error) else StoreProblem)(message) from None


def is_away(error: Exception) -> bool:
    """Whether the same might go well later."""
    if isinstance(error, (OperationalError, InterfaceError, InternalError)):
        return True
    return isinstance(error, DBAPIError) and (error.connection_invalidated or
                                              type(error) is DatabaseError)


def _reason(error: Exception, url: str) -> str:
    if isinstance(error, (NoSuchModuleError, ImportError)):
        return "the driver psycopg2 is missing (Debian: python3-psycopg2)"
    cause = error.orig if isinstance(error, DBAPIError) and error.orig else error
    lines = [line.strip() for line in str(cause).splitlines() if line.strip()]
    return without_secrets(lines[0] if lines else type(cause).__name__, url)
