"""The tables as the newest version of the database has them; ``migrations`` leads there."""

from __future__ import annotations

from sqlalchemy import (Boolean, Column, Float, ForeignKey, Index, Integer, MetaData, String, Table,
                        Text)

METADATA = MetaData()

# Texts are ordered by their characters everywhere, not by a server's language.
_TEXT = String().with_variant(String(collation="C"), "postgresql")
_LONG = Text()
_NUMBER = Float(53)


def _of_a_run() -> Column[int]:
    return Column("run_id", Integer, ForeignKey("runs.id", ondelete="CASCADE"), primary_key=True,
                  autoincrement=False)


RUNS = Table(
    "runs", METADATA,
    Column("id", Integer, primary_key=True),
    Column("run", _TEXT, nullable=False, unique=True),
    Column("dut", _TEXT, nullable=False),
    Column("verdict", _TEXT, nullable=False),
    Column("state", _TEXT, nullable=False),
    Column("exit_status", Integer),
    Column("plan", _TEXT, nullable=False),
    Column("plan_version", _TEXT, nullable=False),
    Column("plan_sha256", _TEXT, nullable=False),
    Column("plan_steps", Integer, nullable=False),
    Column("station", _TEXT, nullable=False),
    Column("slot", _TEXT, nullable=False),
    Column("operator", _TEXT, nullable=False),
    Column("port", _TEXT, nullable=False),
    Column("channel", _TEXT, nullable=False),
    Column("began", _TEXT, nullable=False),
    Column("ended", _TEXT),
    Column("seconds", _NUMBER),
    Column("reason", _LONG, nullable=False),
    Column("first_failed_step", _TEXT, nullable=False))

STEPS = Table(
    "steps", METADATA, _of_a_run(),
    Column("number", Integer, primary_key=True, autoincrement=False),
    Column("section", _TEXT, nullable=False),
    Column("name", _TEXT, nullable=False),
    Column("kind", _TEXT, nullable=False),
    Column("verdict", _TEXT, nullable=False),
    Column("attempts", Integer, nullable=False),
    Column("began", _TEXT, nullable=False),
    Column("seconds", _NUMBER, nullable=False),
    Column("reason", _LONG, nullable=False),
    sqlite_with_rowid=False)

STEP_VALUES = Table(
    "step_values", METADATA, _of_a_run(),
    Column("step", Integer, primary_key=True, autoincrement=False),
    Column("position", Integer, primary_key=True, autoincrement=False),
    Column("step_name", _TEXT, nullable=False),
    Column("name", _TEXT, nullable=False),
    Column("number", _NUMBER),
    Column("text", _LONG),
    Column("unit", _TEXT, nullable=False),
    Column("min", _NUMBER),
    Column("max", _NUMBER),
    Column("marginal_min", _NUMBER),
    Column("marginal_max", _NUMBER),
    Column("verdict", _TEXT, nullable=False),
    Column("marginal", Boolean, nullable=False),
    sqlite_with_rowid=False)

# The record itself, byte by byte as its file has it; where that file lies, as its station says.
RECORDS = Table(
    "records", METADATA, _of_a_run(),
    Column("document", _LONG, nullable=False),
    Column("sha256", _TEXT, nullable=False),
    Column("origin", _TEXT, nullable=False),
    Column("file", _TEXT, nullable=False),
    Column("stored", _TEXT, nullable=False))

INDEXES = (
    Index("runs_began", RUNS.c.began),
    Index("runs_dut", RUNS.c.dut, RUNS.c.began),
    Index("runs_plan", RUNS.c.plan, RUNS.c.began),
    Index("runs_station", RUNS.c.station, RUNS.c.began),
    Index("runs_verdict", RUNS.c.verdict, RUNS.c.began),
    Index("records_file", RECORDS.c.file),
    Index("records_origin", RECORDS.c.origin, RECORDS.c.file))
