"""CSV: one line a value, for spreadsheets and statistics."""

from __future__ import annotations

import csv
import io
from typing import Any, Iterator, Mapping, Sequence

from amt_line.report.records import verdict_word
from amt_station.text import printable

COLUMNS = (
    "run", "dut", "station", "operator", "slot", "plan", "plan_version", "run_verdict",
    "run_began", "section", "step_number", "step", "kind", "step_verdict", "attempts", "step_began",
    "step_seconds", "value", "number", "text", "unit", "word", "min", "max", "one_of", "matches",
    "value_verdict", "marginal")

# A spreadsheet would carry out a text that begins like this.
_FORMULA = ("=", "+", "-", "@")


def csv_text(records: Sequence[Mapping[str, Any]]) -> str:
    """All values of all records, with a line of column names."""
    out = io.StringIO()
    writer = csv.DictWriter(out, COLUMNS, restval="", lineterminator="\r\n")
    writer.writeheader()
    for record in records:
        for row in _rows(record):
            writer.writerow({name: _cell(cell) for name, cell in row.items()})
    return out.getvalue()


def _rows(record: Mapping[str, Any]) -> Iterator[dict[str, Any]]:
    run = {"run": record["run"], "dut": record["dut"], "station": record["station"],
           "operator": record["operator"], "slot": record["slot"],
           "plan": record["plan"]["title"], "plan_version": record["plan"]["version"],
           "run_verdict": verdict_word(record), "run_began": record["began"]}
    for step in record["steps"]:
        for value in step["values"]:
            yield {**run, "section": step["section"], "step_number": step["number"],
                   "step": step["name"], "kind": step["kind"], "step_verdict": step["verdict"],
                   "attempts": step["attempts"], "step_began": step["began"],
                   "step_seconds": step["seconds"], **_value(value)}


def _value(value: Mapping[str, Any]) -> dict[str, Any]:
    limits, content = value.get("limits", {}), value["value"]
    return {"value": value["name"], "number" if not isinstance(content, str) else "text": content,
            "unit": value.get("unit", ""), "word": value.get("word", ""),
            "min": limits.get("min", ""), "max": limits.get("max", ""),
            "one_of": " | ".join(map(str, limits.get("one_of", ()))),
            "matches": limits.get("matches", ""), "value_verdict": value.get("verdict", ""),
            "marginal": "yes" if value.get("marginal") else ""}


def _cell(cell: Any) -> Any:
    if not isinstance(cell, str):
        return cell
    text = printable(cell)
    return f"'{text}" if text.startswith(_FORMULA) else text
