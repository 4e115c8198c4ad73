"""The time from the end of one run in a slot to the end of the next."""

from __future__ import annotations

from datetime import timedelta
from typing import Iterable

from amt_line.statistics.rows import Run

# A slot that stood idle for longer had a break, or nothing to do.
LONGEST_IDLE = timedelta(minutes=15)


def takts(runs: Iterable[Run]) -> dict[str, float]:
    """For each run the seconds since the run before it in its slot ended, breaks left out.

    Runs of all plans and verdicts count that have ended: each of them takes the slot's time.
    """
    slots: dict[tuple[str, str], list[Run]] = {}
    for run in runs:
        if run.ended is not None:
            slots.setdefault((run.station, run.slot), []).append(run)
    found = {}
    for ended in slots.values():
        ended.sort(key=lambda run: (run.ended, run.run))
        for before, run in zip(ended, ended[1:]):
            assert before.ended is not None and run.ended is not None
            if run.began - before.ended <= LONGEST_IDLE:
                found[run.run] = (run.ended - before.ended).total_seconds()
    return found
