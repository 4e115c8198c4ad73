"""What differs from handset to handset: where its value comes from and what it may be."""

from __future__ import annotations

import csv
import re
from dataclasses import dataclass
from pathlib import Path
from typing import Mapping

from amt_line.plan import handset
from amt_line.plan.pattern import is_whole
from amt_line.plan.references import Scalar
from amt_station.errors import UsageProblem
from amt_station.text import printable

FORMATS = ("text", "int", "imei", "mac")
LONGEST = 4096
_INT = re.compile(r"[+-]?[0-9]{1,18}")
LARGEST_FILE = 64 * 1024 * 1024


@dataclass(frozen=True)
class Input:
    """One input of a plan; ``default`` is None when there is none."""

    name: str
    prompt: str
    format: str = "text"
    pattern: str = ""
    default: Scalar | None = None

    def read(self, given: Scalar) -> Scalar:
        """The value for what was typed, scanned or written; ``UsageProblem`` says what is wrong."""
        try:
            return self._checked(given)
        except ValueError as error:
            raise UsageProblem(f"input {self.name}: {error}") from error

    def _checked(self, given: Scalar) -> Scalar:
        text = str(given)
        if isinstance(given, (bool, float)) or (isinstance(given, int) and self.format != "int"):
            raise ValueError(f"{given!r} is no text")
        if not text:
            raise ValueError("empty")
        if len(text) > LONGEST:
            raise ValueError(f"{len(text)} characters, at most {LONGEST}")
        if not text.isprintable():
            raise ValueError(f"{printable(text)} holds a character that cannot be shown")
        if self.format == "int":
            if not _INT.fullmatch(text):
                raise ValueError(f"{text!r} is no whole number")
        else:
            handset.check_format(self.format, text)
        if self.pattern and not is_whole(self.pattern, text):
            raise ValueError(f"{text!r} is not of the form {self.pattern!r}")
        return int(text) if self.format == "int" else text


def row_of(path: Path, dut: str) -> dict[str, str]:
    """The row of an input file for one handset; empty cells are left out."""
    try:
        if path.stat().st_size > LARGEST_FILE:
            raise UsageProblem(f"{path}: larger than {LARGEST_FILE} bytes")
        with path.open(encoding="utf-8-sig", newline="") as file:
            return _find(csv.DictReader(file, strict=True), path, dut)
    except OSError as error:
        raise UsageProblem(f"{path}: {error.strerror}") from error
    except (UnicodeDecodeError, csv.Error) as error:
        raise UsageProblem(f"{path}: {error}") from error


def _find(rows: "csv.DictReader[str]", path: Path, dut: str) -> dict[str, str]:
    columns = list(rows.fieldnames or ())
    if "dut" not in columns:
        raise UsageProblem(f"{path}: no column 'dut'")
    if len(set(columns)) != len(columns):
        raise UsageProblem(f"{path}: two columns have one name")
    found = [row for row in rows if row["dut"] == dut]
    if len(found) != 1:
        how = "no row" if not found else f"{len(found)} rows"
        raise UsageProblem(f"{path}: {how} for dut {printable(dut)!r}")
    if None in found[0]:
        raise UsageProblem(f"{path}: the row of dut {printable(dut)!r} has more cells than columns")
    return {name: cell for name, cell in found[0].items() if cell}


def known_values(inputs: tuple[Input, ...], said: Mapping[str, str],
                 row: Mapping[str, str]) -> dict[str, Scalar]:
    """The inputs' values from the command line, else the file, else the default; checked."""
    wanted = {item.name for item in inputs}
    for name in said:
        if name not in wanted:
            raise UsageProblem(f"the plan has no input {printable(name)!r}")
    values: dict[str, Scalar] = {}
    for item in inputs:
        given = said.get(item.name, row.get(item.name))
        if given is not None:
            values[item.name] = item.read(given)
        elif item.default is not None:
            values[item.name] = item.default
    return values
