"""What can be asked of the store, and what comes back: plain data, without a database."""

from __future__ import annotations

from dataclasses import dataclass
from datetime import datetime
from typing import NamedTuple, Sequence

UNFINISHED = "UNFINISHED"

# What the runs can be sorted by; a "-" in front turns it round.
SORTS = ("began", "dut", "verdict", "plan", "station", "slot", "operator", "seconds")


class RunRow(NamedTuple):
    """A run without its steps. ``verdict`` is "" while there is none; times are UTC texts."""

    id: int
    run: str
    dut: str
    verdict: str
    state: str
    exit_status: int | None
    plan: str
    plan_version: str
    plan_sha256: str
    plan_steps: int
    station: str
    slot: str
    operator: str
    port: str
    channel: str
    began: str
    ended: str | None
    seconds: float | None
    reason: str
    first_failed_step: str


@dataclass(frozen=True)
class Search:
    """A page of runs. ``text`` and ``dut`` are found anywhere, whatever the case of letters;
    ``verdict`` may be ``UNFINISHED``."""

    text: str = ""
    dut: str = ""
    verdict: str = ""
    plan: str = ""
    station: str = ""
    slot: str = ""
    since: datetime | None = None
    until: datetime | None = None
    sort: str = "-began"
    page: int = 1
    size: int = 50


@dataclass(frozen=True)
class Found:
    """A page of runs, and how many there are on all pages."""

    rows: Sequence[RunRow]
    total: int
