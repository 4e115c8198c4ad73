"""Whether the store of this station can be used, and has what it should have."""

from __future__ import annotations

import os
from typing import Sequence

from amt_line.store import Store, checked_url, shown_url
from amt_line.store.files import file_names
from amt_line.store.gap import find_gap
from amt_line.store.problems import StoreAway
from amt_line.store.url import sqlite_path
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, ok, warning
from amt_station.doctor.machine import records_directory
from amt_station.errors import EXIT_DEFECT

_SYNC = "`amt-station store sync` delivers them, and so does the next run"
_AWAY = ("start the database or mend the way to it; runs go on meanwhile, and what it misses is "
         "delivered when it is back")


def store(visit: Examination) -> Sequence[Finding]:
    """Open the database as it is, and compare it with the directory of records by names."""
    url, directory = checked_url(visit.store), records_directory(visit)
    names = file_names(directory) if directory.is_dir() else []
    path = sqlite_path(url)
    if path is not None and not path.exists():
        if names:
            return [warning(f"{path} is not there, but {_records(len(names))} are to be in it",
                            _SYNC)]
        return [ok(f"{path} is not there yet; the first run makes it")]
    if path is not None and not os.access(path, os.R_OK | os.W_OK):
        return [error(f"this user may not write to {path}", f"`ls -l {path}` says whose it is; or "
                      "say another one with --store", EXIT_DEFECT)]
    try:
        with Store.open(url, create=False) as database:
            gap = find_gap(database, directory)
    except StoreAway as problem:
        return [error(str(problem), _AWAY, problem.exit_status)]
    if gap.names:
        return [warning(f"{shown_url(url)} lacks {_records(len(gap.names))} of "
                        f"{_records(gap.files)} in {directory}", _SYNC)]
    return [ok(f"{shown_url(url)} answers and has all {_records(gap.files)} of {directory}")]


def _records(count: int) -> str:
    return "1 record" if count == 1 else f"{count} records"
