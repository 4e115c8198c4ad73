"""What records need of the PC: the right time, and room."""

from __future__ import annotations

import os
from datetime import datetime, timezone
from pathlib import Path
from typing import Sequence

from amt_station import state
from amt_station.doctor.computer import NotKnown
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, ok, unchecked, warning
from amt_station.errors import EXIT_DEFECT

_MEGABYTE = 1_000_000
_LITTLE = 1000 * _MEGABYTE
_TOO_LITTLE = 50 * _MEGABYTE
# Files may come from a machine whose clock is a little ahead.
_TOLERANCE = 120.0

_SET = ("`sudo timedatectl set-ntp true`, or name the factory's time server in "
        "/etc/systemd/timesyncd.conf")


def records_directory(visit: Examination) -> Path:
    """Where the records of this station go."""
    return visit.records or state.records_directory()


def clock(visit: Examination) -> Sequence[Finding]:
    """Whether the clock can be right, and something keeps it so."""
    now = visit.computer.now()
    shown = _shown(now)
    latest, what = _latest(records_directory(visit))
    if now < latest - _TOLERANCE:
        return [error(f"the clock says {shown}, but {what} is of {_shown(latest)}: records would "
                      f"be filed under a wrong time", f"set the clock: {_SET}", EXIT_DEFECT)]
    try:
        kept = visit.computer.clock_is_kept()
    except NotKnown as problem:
        return [unchecked(f"the clock says {shown}; {problem}")]
    if not kept:
        return [warning(f"the clock says {shown}, but nothing keeps it right", _SET)]
    return [ok(f"the clock says {shown} and is kept right")]


def _shown(moment: float) -> str:
    return f"{datetime.fromtimestamp(moment, timezone.utc):%Y-%m-%d %H:%M} UTC"


def _latest(records: Path) -> tuple[float, str]:
    """The latest moment that must have been, and what tells of it."""
    known = [(os.stat(__file__).st_mtime, "this program")]
    try:
        with os.scandir(records) as entries:
            known += [(entry.stat().st_mtime, f"the record {entry.name}") for entry in entries]
    except FileNotFoundError:
        pass
    return max(known)


def disk(visit: Examination) -> Sequence[Finding]:
    """Whether records can be written, and for how long."""
    wanted = records_directory(visit)
    directory = next(path for path in (wanted, *wanted.absolute().parents) if path.exists())
    if not directory.is_dir() or not os.access(directory, os.W_OK | os.X_OK):
        return [error(f"no record can be written to {wanted}: {directory} is no directory that "
                      "this user may write to", f"`ls -ld {directory}` says whose it is; or say "
                      "another place with --records", EXIT_DEFECT)]
    free = visit.computer.free_bytes(directory)
    text = f"{free / _MEGABYTE:.0f} MB are free for records in {wanted}"
    if free < _TOO_LITTLE:
        return [error(text, "make room: nothing is run without its record", EXIT_DEFECT)]
    if free < _LITTLE:
        return [warning(text, "make room before the line stops for it")]
    return [ok(text)]
