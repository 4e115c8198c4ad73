"""The way past the library's rows, for a million of them: straight to the driver."""

from __future__ import annotations

from typing import Any, Sequence

from sqlalchemy import Table, insert
from sqlalchemy.engine import Connection

Row = dict[str, Any]


def insert_many(connection: Connection, table: Table, rows: Sequence[Row]) -> None:
    """Insert rows that all have the same columns."""
    if not rows:
        return
    if connection.dialect.name != "sqlite":
        connection.execute(insert(table), rows)
        return
    names = list(rows[0])
    columns = ", ".join(f'"{name}"' for name in names)
    marks = ", ".join("?" * len(names))
    connection.exec_driver_sql(f"INSERT INTO {table.name} ({columns}) VALUES ({marks})",
                               [tuple(row.values()) for row in rows])
