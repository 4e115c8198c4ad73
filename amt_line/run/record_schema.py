"""The schema of records, version by version; a record names its version itself."""

from __future__ import annotations

from typing import Any

from amt_line.run.record import VERSION

Schema = dict[str, Any]

_TEXT: Schema = {"type": "string"}
_SECONDS: Schema = {"type": "number", "minimum": 0, "maximum": 1e300}
_HEX: Schema = {"type": "string", "pattern": "^([0-9a-f]{2})*$"}
_UTC: Schema = {"type": "string",
                "pattern": r"^\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3}Z$"}
# What no float holds is no number of a handset, and nothing can draw it.
_LARGEST: Schema = {"minimum": -1e300, "maximum": 1e300}
_SCALAR: Schema = {"type": ["string", "number", "boolean"], **_LARGEST}
_STATUS: Schema = {"enum": [0, 1, 2, 3, 4, 5, 6, 7, 130, 143]}
_STEP_VERDICT: Schema = {"enum": ["pass", "fail", "error", "skipped"]}


def _table(properties: Schema, optional: Schema | None = None) -> Schema:
    return {"type": "object", "additionalProperties": False, "required": sorted(properties),
            "properties": {**properties, **(optional or {})}}


def _nullable(schema: Schema) -> Schema:
    return {"anyOf": [schema, {"type": "null"}]}


def _kind(kind: str, **properties: Schema) -> Schema:
    return _table({"kind": {"const": kind}, **properties})


_ATOM = _table({"id": {"type": "integer"}, "name": _nullable(_TEXT), "type": _TEXT,
                "value": {"type": ["string", "integer"]}}, {"text": _TEXT})
_PACKET = _table({"id": {"type": "integer"}, "name": _TEXT,
                  "atoms": {"type": "array", "items": _ATOM}})
_DECODED: Schema = {"oneOf": [
    _kind("packet", packet=_PACKET), _kind("acknowledgement"), _kind("text", text=_TEXT),
    _kind("skipped", bytes=_HEX, why=_TEXT)]}
_RECEIVED = _table({"seconds": _SECONDS, "bytes": _HEX, "decoded": _DECODED}, {"late": _TEXT})
_EXCHANGE = _table(
    {"purpose": {"enum": ["request", "text", "place"]}, "what": _TEXT, "began": _UTC,
     "seconds": _SECONDS, "sent": _HEX, "sent_decoded": {"type": "array", "items": _DECODED},
     "received": {"type": "array", "items": _RECEIVED}, "error": _TEXT},
    {"attempt": {"type": "integer", "minimum": 1},
     "bytes_not_kept": {"type": "integer", "minimum": 0}})
_NUMBER: Schema = {"type": "number", **_LARGEST}
_VALUE_ITSELF: Schema = {"type": ["string", "number"], **_LARGEST}
_LIMITS: Schema = {"type": "object", "additionalProperties": False, "properties": {
    "min": _NUMBER, "max": _NUMBER, "marginal_min": _NUMBER, "marginal_max": _NUMBER,
    "one_of": {"type": "array", "items": _VALUE_ITSELF}, "matches": _TEXT}}
_VALUE = _table(
    {"name": _TEXT, "value": _VALUE_ITSELF},
    {"unit": _TEXT, "raw": {"type": ["string", "integer"]}, "word": _TEXT, "limits": _LIMITS,
     "verdict": {"enum": ["pass", "fail"]}, "marginal": {"const": True}, "reason": _TEXT})
_VALUE["dependentRequired"] = {"limits": ["verdict"]}
_STEP = _table(
    {"number": {"type": "integer", "minimum": 1},
     "section": {"enum": ["setup", "step", "always"]}, "name": _TEXT,
     "kind": {"enum": ["command", "request", "at", "ask", "enter", "wait"]},
     "verdict": _STEP_VERDICT, "attempts": {"type": "integer", "minimum": 0}, "began": _UTC,
     "seconds": _SECONDS, "reason": _TEXT, "advice": _TEXT, "exit_status": _STATUS,
     "forced": {"type": "array", "items": _TEXT},
     "values": {"type": "array", "items": {"$ref": "#/$defs/value"}},
     "earlier": {"type": "array", "items": _table(
         {"attempt": {"type": "integer", "minimum": 1}, "verdict": _STEP_VERDICT,
          "reason": _TEXT})},
     "exchanges": {"type": "array", "items": {"$ref": "#/$defs/exchange"}},
     "remarks": {"type": "array", "items": _TEXT}},
    {"subject": _TEXT, "answer": _table({"text": _TEXT, "by": _TEXT})})


def record_schema() -> Schema:
    """The schema of the records that this version writes."""
    return {
        "$schema": "https://json-schema.org/draft/2020-12/schema",
        "title": f"Record of a run of amt-station, version {VERSION}",
        "$defs": {"value": _VALUE, "exchange": _EXCHANGE, "step": _STEP},
        **_table({
            "record": {"const": VERSION}, "run": {"type": "string", "pattern": "^[0-9a-f-]{36}$"},
            "state": {"enum": ["running", "ended", "aborted"]},
            "verdict": _nullable({"enum": ["PASS", "FAIL", "ERROR", "ABORTED"]}),
            "exit_status": _nullable(_STATUS), "reason": _TEXT, "advice": _TEXT, "dut": _TEXT,
            "station": _TEXT, "operator": _TEXT, "slot": _TEXT, "port": _TEXT,
            "channel": {"enum": ["pc", "app"]},
            "tool": _table({"name": _TEXT, "version": _TEXT}),
            "plan": _table({"title": _TEXT, "version": _TEXT, "path": _TEXT,
                            "sha256": {"type": "string", "pattern": "^[0-9a-f]{64}$"},
                            "steps": {"type": "integer", "minimum": 1}}),
            "inputs": {"type": "object", "additionalProperties": _SCALAR},
            "began": _UTC, "ended": _nullable(_UTC), "seconds": _nullable(_SECONDS),
            "begin": {"type": "array", "items": {"$ref": "#/$defs/exchange"}},
            "remarks": {"type": "array", "items": _TEXT},
            "steps": {"type": "array", "items": {"$ref": "#/$defs/step"}}})}
