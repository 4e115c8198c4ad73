"""What statistics are made of, as a store hands it over."""

from __future__ import annotations

from dataclasses import dataclass, field
from datetime import datetime
from typing import Mapping, NamedTuple, Sequence

PASS, FAIL, ERROR, ABORTED = "PASS", "FAIL", "ERROR", "ABORTED"
JUDGED = (PASS, FAIL)


class Run(NamedTuple):
    """One run; ``verdict`` is empty while it has none. Times are UTC."""

    run: str
    dut: str
    verdict: str
    plan: str
    version: str
    station: str
    slot: str
    began: datetime
    ended: datetime | None
    seconds: float | None

    @property
    def judged(self) -> bool:
        """Whether the handset was found good or bad."""
        return self.verdict in JUDGED


class Place(NamedTuple):
    """A step in one plan file. ``file`` tells the plan's files apart, by whatever."""

    plan: str
    file: str
    number: int
    name: str


class NotPassed(NamedTuple):
    """A step that failed or was an error, in a run with this verdict."""

    place: Place
    run: str
    run_verdict: str
    verdict: str


class Limits(NamedTuple):
    """The bounds that a value was judged by; None where there was none."""

    low: float | None = None
    high: float | None = None
    near_low: float | None = None
    near_high: float | None = None


class ValueKey(NamedTuple):
    """A value of a step in one plan file, judged by these limits."""

    place: Place
    name: str
    unit: str
    limits: Limits


class ValueCounts(NamedTuple):
    """How often a value was which number, and how many were near, or out of limits."""

    numbers: Mapping[float, int]
    marginal: int = 0
    failed: int = 0


@dataclass(frozen=True)
class Rows:
    """Everything that the figures of a filter need.

    ``runs`` are those of the filter. ``history`` are all runs of their handsets with the same
    plans, at whatever station and time before the filter's end, those of the filter among them;
    ``beside`` are all runs in the slots of the filter in its time, whatever their plan. ``steps``
    is how often a step that was carried out took how many seconds. Steps and values are those of
    runs that were judged, the steps that did not pass those of all.
    """

    runs: Sequence[Run] = ()
    history: Sequence[Run] = ()
    beside: Sequence[Run] = ()
    steps: Mapping[Place, Mapping[float, int]] = field(default_factory=dict)
    not_passed: Sequence[NotPassed] = ()
    values: Mapping[ValueKey, ValueCounts] = field(default_factory=dict)
