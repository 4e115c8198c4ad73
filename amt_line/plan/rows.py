"""Rows of inputs for the slots of a line: each row is for one run of its slot, in order."""

from __future__ import annotations

import csv
from pathlib import Path
from typing import Iterable, Mapping

from amt_line.plan.inputs import LARGEST_FILE
from amt_station.errors import UsageProblem
from amt_station.text import printable

SLOT = "slot"

Rows = Mapping[str, list[dict[str, str]]]


def rows_of_slots(path: Path, slots: Iterable[str]) -> Rows:
    """The rows of an input file by their slot; empty cells are left out."""
    try:
        if path.stat().st_size > LARGEST_FILE:
            raise UsageProblem(f"{path}: larger than {LARGEST_FILE} bytes")
        with path.open(encoding="utf-8-sig", newline="") as file:
            return _sorted(csv.DictReader(file, strict=True), path, list(slots))
    except OSError as error:
        raise UsageProblem(f"{path}: {error.strerror}") from error
    except (UnicodeDecodeError, csv.Error) as error:
        raise UsageProblem(f"{path}: {error}") from error


def _sorted(table: "csv.DictReader[str]", path: Path, slots: list[str]) -> Rows:
    columns = list(table.fieldnames or ())
    if SLOT not in columns:
        raise UsageProblem(f"{path}: no column 'slot'")
    if len(set(columns)) != len(columns):
        raise UsageProblem(f"{path}: two columns have one name")
    rows: dict[str, list[dict[str, str]]] = {slot: [] for slot in slots}
    for row in table:
        where = f"{path}, line {table.line_num}"
        if None in row:
            raise UsageProblem(f"{where}: more cells than columns")
        slot = row.pop(SLOT)
        if slot not in rows:
            raise UsageProblem(f"{where}: the line has no slot {printable(slot)!r}")
        rows[slot].append({name: cell for name, cell in row.items() if cell})
    return rows
