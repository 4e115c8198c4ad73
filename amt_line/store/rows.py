"""A record taken apart into the rows of the tables; what is no record is refused."""

from __future__ import annotations

import math
import re
from dataclasses import dataclass
from typing import Any, Mapping

from amt_line.run.record import VERSION
from amt_line.store.problems import BadRecord

Row = dict[str, Any]

_RUN = re.compile(r"[0-9a-f-]{36}\Z")
_UTC = re.compile(r"\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3}Z\Z")
_STATES = ("running", "ended", "aborted")
_VERDICTS = (None, "PASS", "FAIL", "ERROR", "ABORTED")
_STEP_VERDICTS = ("pass", "fail", "error", "skipped")
_LIMITS = ("min", "max", "marginal_min", "marginal_max")
_MOST = 2 ** 31 - 1
# What no database takes in a text: the zero byte, and halves of characters.
_UNSTORABLE = re.compile("[\0\ud800-\udfff]")


@dataclass(frozen=True)
class Rows:
    """The rows of one record, without the number that the database gives the run."""

    run: Row
    steps: list[Row]
    values: list[Row]


def rows_of(document: Mapping[str, Any]) -> Rows:
    """The rows; raises ``BadRecord`` when a field is missing or is something else."""
    version = document.get("record") if isinstance(document, dict) else None
    if version != VERSION or isinstance(version, bool):
        if isinstance(version, int) and version > VERSION:
            raise BadRecord(f"a record of version {version}; this program knows {VERSION}")
        raise BadRecord("no record of a run")
    try:
        steps = [_step(step) for step in _list(document, "steps")]
        values = [_value(step, position, value) for step in document["steps"]
                  for position, value in enumerate(_list(step, "values"))]
        run = _run(document)
        numbers = [step["number"] for step in steps]
    except (KeyError, TypeError, AttributeError) as error:
        raise BadRecord(f"no record of a run: {type(error).__name__} {error}") from error
    if len(set(numbers)) != len(numbers):
        raise BadRecord("no record of a run: two steps have one number")
    if run["state"] != "running" and run["verdict"] == "":
        raise BadRecord("no record of a run: it has ended without a verdict")
    return Rows(run, steps, values)


def _run(document: Mapping[str, Any]) -> Row:
    plan = document["plan"]
    failed = next((step["name"] for step in document["steps"]
                   if step["verdict"] in ("fail", "error")), "")
    return {
        "run": _formed(document, "run", _RUN), "dut": _text(document, "dut"),
        "verdict": _one_of(document, "verdict", _VERDICTS) or "",
        "state": _one_of(document, "state", _STATES),
        "exit_status": _optional(document, "exit_status", _whole),
        "plan": _text(plan, "title"), "plan_version": _text(plan, "version"),
        "plan_sha256": _text(plan, "sha256"), "plan_steps": _whole(plan, "steps"),
        **{name: _text(document, name)
           for name in ("station", "slot", "operator", "port", "channel", "reason")},
        "began": _formed(document, "began", _UTC),
        "ended": _optional(document, "ended", lambda record, name: _formed(record, name, _UTC)),
        "seconds": _optional(document, "seconds", _number), "first_failed_step": _clean(failed)}


def _step(step: Mapping[str, Any]) -> Row:
    return {"number": _whole(step, "number"),
            **{name: _text(step, name) for name in ("section", "name", "kind", "reason")},
            "verdict": _one_of(step, "verdict", _STEP_VERDICTS),
            "attempts": _whole(step, "attempts"), "began": _formed(step, "began", _UTC),
            "seconds": _number(step, "seconds")}


def _value(step: Mapping[str, Any], position: int, value: Mapping[str, Any]) -> Row:
    limits = value.get("limits", {})
    number, text = _measured(value["value"])
    return {"step": step["number"], "position": position, "step_name": _text(step, "name"),
            "name": _text(value, "name"), "number": number, "text": text,
            "unit": _clean(value.get("unit", "")),
            **{name: _bound(limits, name) for name in _LIMITS},
            "verdict": _clean(value.get("verdict", "")),
            "marginal": value.get("marginal", False) is True}


def _bound(limits: Mapping[str, Any], name: str) -> float | None:
    """A bound without end is none."""
    bound = _number(limits, name) if name in limits else None
    return bound if bound is not None and math.isfinite(bound) else None


def _measured(value: Any) -> tuple[float | None, str | None]:
    if isinstance(value, str):
        return None, _clean(value)
    if isinstance(value, bool) or not isinstance(value, (int, float)):
        raise TypeError("a value is neither a number nor a text")
    try:
        return (float(value), None) if math.isfinite(value) else (None, str(value))
    except OverflowError:
        return None, str(value)


def _clean(text: Any) -> str:
    if not isinstance(text, str):
        raise TypeError("a text is something else")
    if text.isprintable() and text.isascii():
        return text
    return _UNSTORABLE.sub(lambda match: f"\\u{ord(match.group()):04x}", text)


def _text(record: Mapping[str, Any], name: str) -> str:
    return _clean(record[name])


def _formed(record: Mapping[str, Any], name: str, form: re.Pattern[str]) -> str:
    text = _text(record, name)
    if not form.match(text):
        raise TypeError(f"{name} is not of its form")
    return text


def _one_of(record: Mapping[str, Any], name: str, words: tuple[Any, ...]) -> Any:
    if record[name] not in words:
        raise TypeError(f"{name} is none of its words")
    return record[name]


def _whole(record: Mapping[str, Any], name: str) -> int:
    number = record[name]
    if isinstance(number, bool) or not isinstance(number, int) or not 0 <= number <= _MOST:
        raise TypeError(f"{name} is no whole number")
    return number


def _number(record: Mapping[str, Any], name: str) -> float:
    number = record[name]
    if isinstance(number, bool) or not isinstance(number, (int, float)):
        raise TypeError(f"{name} is no number")
    try:
        return float(number)
    except OverflowError:
        raise TypeError(f"{name} is no number that fits") from None


def _optional(record: Mapping[str, Any], name: str, read: Any) -> Any:
    return None if record[name] is None else read(record, name)


def _list(record: Mapping[str, Any], name: str) -> list[Any]:
    items = record[name]
    if not isinstance(items, list):
        raise TypeError(f"{name} is no list")
    return items
