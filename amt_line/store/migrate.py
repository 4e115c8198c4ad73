"""Brings a database to the version that this program knows; a newer one is refused."""

from __future__ import annotations

import threading
from pathlib import Path

from sqlalchemy import inspect, text
from sqlalchemy.engine import Connection, Engine

from amt_line.store.engine import reading, writing
from amt_line.store.problems import StoreProblem
from amt_line.store.url import shown_url

HEAD = 1
VERSION_TABLE = "amt_store_version"
SCRIPTS = Path(__file__).parent / "migrations"

# alembic keeps what it is at in the module: in one process, one migration at a time.
_ONE = threading.Lock()

# One key for all stations: who migrates holds it, and the others wait.
_LOCK = 0x616D74
_EMPTY = 0


def bring_up_to_date(engine: Engine) -> None:
    """Make the tables, or migrate older ones. Two stations may do this at once."""
    with reading(engine) as connection:
        if _version(connection) == HEAD:
            return
    with writing(engine) as connection:
        if connection.dialect.name == "postgresql":
            connection.execute(text("SELECT pg_advisory_xact_lock(:key)"), {"key": _LOCK})
        if _version(connection) != HEAD:
            upgrade(connection, HEAD)


def check_version(engine: Engine) -> None:
    """Refuse all but the version that this program knows."""
    with reading(engine) as connection:
        version = _version(connection)
        if version != HEAD:
            raise StoreProblem(
                f"{_name(connection)}: " + (
                    "holds no records" if version == _EMPTY else
                    f"the database is of version {version}, this program wants {HEAD}; "
                    "`amt-station store sync` migrates it"))


def _version(connection: Connection) -> int:
    tables = inspect(connection).get_table_names()
    if VERSION_TABLE not in tables:
        if "runs" in tables or "records" in tables:
            raise StoreProblem(f"{_name(connection)}: the database holds tables of something "
                               "else")
        return _EMPTY
    words = connection.execute(text(f"SELECT version_num FROM {VERSION_TABLE}")).scalars().all()
    if not words:
        return _EMPTY
    if len(words) > 1 or not words[0].isdecimal():
        raise StoreProblem(f"{_name(connection)}: the database is of no version that can be read")
    if int(words[0]) > HEAD:
        raise StoreProblem(f"{_name(connection)}: the database is of version {int(words[0])}, this "
                           f"program knows {HEAD}; a newer amt-station is needed")
    return int(words[0])


def upgrade(connection: Connection, version: int) -> None:
    """Carry out the migrations up to ``version`` in the connection's transaction."""
    from alembic import command
    from alembic.config import Config

    config = Config()
    config.set_main_option("script_location", str(SCRIPTS).replace("%", "%%"))
    config.attributes["connection"] = connection
    with _ONE:
        command.upgrade(config, f"{version:04}")


def _name(connection: Connection) -> str:
    return shown_url(connection.engine.url.render_as_string(hide_password=True))
