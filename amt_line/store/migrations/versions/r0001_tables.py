"""The first tables: runs, their steps and values, and the records themselves."""

from typing import Any

import sqlalchemy as sa
from alembic import op

revision = "0001"
down_revision = None

TEXT = sa.String().with_variant(sa.String(collation="C"), "postgresql")
LONG = sa.Text()
NUMBER = sa.Float(53)


def _of_a_run() -> Any:
    return sa.Column("run_id", sa.Integer, sa.ForeignKey("runs.id", ondelete="CASCADE"),
                     primary_key=True, autoincrement=False)


def _needed(kind: Any, *names: str) -> list[Any]:
    return [sa.Column(name, kind, nullable=False) for name in names]


def _number_of(*names: str) -> list[Any]:
    return [sa.Column(name, sa.Integer, primary_key=True, autoincrement=False) for name in names]


def upgrade() -> None:
    """Make them in an empty database."""
    op.create_table(
        "runs", sa.Column("id", sa.Integer, primary_key=True),
        sa.Column("run", TEXT, nullable=False, unique=True),
        *_needed(TEXT, "dut", "verdict", "state"), sa.Column("exit_status", sa.Integer),
        *_needed(TEXT, "plan", "plan_version", "plan_sha256"), *_needed(sa.Integer, "plan_steps"),
        *_needed(TEXT, "station", "slot", "operator", "port", "channel", "began"),
        sa.Column("ended", TEXT), sa.Column("seconds", NUMBER), *_needed(LONG, "reason"),
        *_needed(TEXT, "first_failed_step"))
    op.create_table(
        "steps", _of_a_run(), *_number_of("number"),
        *_needed(TEXT, "section", "name", "kind", "verdict"), *_needed(sa.Integer, "attempts"),
        *_needed(TEXT, "began"), *_needed(NUMBER, "seconds"), *_needed(LONG, "reason"),
        sqlite_with_rowid=False)
    op.create_table(
        "step_values", _of_a_run(), *_number_of("step", "position"),
        *_needed(TEXT, "step_name", "name"), sa.Column("number", NUMBER), sa.Column("text", LONG),
        *_needed(TEXT, "unit"), sa.Column("min", NUMBER), sa.Column("max", NUMBER),
        sa.Column("marginal_min", NUMBER), sa.Column("marginal_max", NUMBER),
        *_needed(TEXT, "verdict"), *_needed(sa.Boolean, "marginal"), sqlite_with_rowid=False)
    op.create_table(
        "records", _of_a_run(), *_needed(LONG, "document"), *_needed(TEXT, "sha256", "origin"),
        *_needed(TEXT, "file", "stored"))
    op.create_index("runs_began", "runs", ["began"])
    for name in ("dut", "plan", "station", "verdict"):
        op.create_index(f"runs_{name}", "runs", [name, "began"])
    op.create_index("records_file", "records", ["file"])
    op.create_index("records_origin", "records", ["origin", "file"])
