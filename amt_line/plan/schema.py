"""The schema of plan files, made from the request table: for editors, and for the first check."""

from __future__ import annotations

from functools import lru_cache
from typing import Any

from amt_line.plan import handset
from amt_line.plan.inputs import FORMATS, LONGEST
from amt_line.plan.references import NAME
from amt_station.requests.model import Field

Schema = dict[str, Any]

# A line end behind it is no part of a name, but "$" would let it through.
_NAME_ONLY = f"^{NAME}$(?!\\n)"
_REFERENCE: Schema = {"type": "string", "pattern": r"\$\{"}
_TEXT: Schema = {"type": "string", "minLength": 1}
_SECONDS: Schema = {"type": "number", "exclusiveMinimum": 0, "maximum": 86400,
                    "description": "a number of seconds above 0, at most a day"}
_WHOLE = {"minimum": -0x80000000, "maximum": 0x7FFFFFFF}
_LARGEST = {"minimum": -1e18, "maximum": 1e18}

KIND_KEYS: dict[str, tuple[str, ...]] = {
    "command": ("with", "force"), "request": ("atoms", "force"), "at": ("expect", "force"),
    "ask": ("expect", "picture"), "enter": (), "wait": ()}
_ANSWERED = ("limits", "save", "timeout", "retry", "reconnect")
COMMON_KEYS = ("name", "stop", "when")
OTHER_KEYS: dict[str, tuple[str, ...]] = {
    "command": _ANSWERED, "request": _ANSWERED, "at": _ANSWERED,
    "ask": ("timeout", "retry", "reconnect"),
    "enter": ("limits", "save", "timeout", "retry"), "wait": ("reconnect",)}


def keys_of(kind: str) -> set[str]:
    """Every key that a step of this kind may have."""
    return {kind, *KIND_KEYS[kind], *OTHER_KEYS[kind], *COMMON_KEYS}


@lru_cache(maxsize=1)
def plan_schema() -> Schema:
    """The schema of a whole plan; whoever wants to change it takes a copy."""
    steps = {"type": "array", "items": {"$ref": "#/definitions/step"}}
    return {
        "$schema": "http://json-schema.org/draft-07/schema#",
        "title": "Test plan of amt-station",
        "type": "object", "additionalProperties": False, "required": ["step"],
        "properties": {
            "title": {**_TEXT, "description": "a text that names the plan"},
            "version": {**_TEXT, "description": "a text that tells the plan's versions apart"},
            "channel": {"enum": ["pc", "app"]},
            "deadline": _SECONDS,
            "dut": {**_TEXT, "description": "a text under which the record is filed"},
            "input": {"type": "object", "propertyNames": {"pattern": _NAME_ONLY},
                      "additionalProperties": {"$ref": "#/definitions/input"}},
            "setup": steps, "step": {**steps, "minItems": 1}, "always": steps},
        "definitions": {"input": _input(), "step": _step(), "limit": _limit(None),
                        "number": _limit(True), "text": _limit(False),
                        **{f"command {name}": _command(name)
                           for name in handset.command_names()}}}


def _input() -> Schema:
    return {"type": "object", "additionalProperties": False, "properties": {
        "prompt": {**_TEXT, "description": "a text that asks the operator"},
        "pattern": {**_TEXT, "description": "a regular expression of the whole value"},
        "format": {"enum": list(FORMATS)},
        "default": {"type": ["string", "integer"], "maxLength": LONGEST}}}


def _step() -> Schema:
    limits = {"type": "object", "minProperties": 1,
              "additionalProperties": {"$ref": "#/definitions/limit"}}
    variable = {"type": "string", "pattern": _NAME_ONLY,
                "description": "a name of letters, digits, '_' and '-'"}
    properties: Schema = {
        "name": {**_TEXT, "maxLength": 200},
        "command": {"enum": list(handset.command_names())},
        "with": {"type": "object", "additionalProperties": {
            "type": ["string", "integer"], "description": "a text or a whole number"}},
        "request": {**_TEXT, "description": "a request's number or name"},
        "atoms": {"type": "array", "items": {**_TEXT, "description": "ATOM=TYPE:VALUE"}},
        "at": {**_TEXT, "description": "an AT text"},
        "expect": {"type": ["string", "boolean"]},
        "ask": {**_TEXT, "description": "a question that is answered with yes or no"},
        "picture": {**_TEXT, "description": "a picture file beside the plan"},
        "enter": {**_TEXT, "description": "a text that asks the operator"},
        "wait": _SECONDS,
        "limits": limits,
        "save": {"if": {"type": "string"}, "then": variable,
                 "else": {"type": "object", "minProperties": 1,
                          "additionalProperties": variable}},
        "timeout": _SECONDS,
        "stop": {"type": "boolean"},
        "when": {"enum": ["passed", "failed", "connected"]},
        "retry": {"type": "object", "additionalProperties": False, "required": ["times"],
                  "properties": {"times": {"type": "integer", "minimum": 0, "maximum": 1000},
                                 "delay": {"type": "number", "minimum": 0, "maximum": 86400}}},
        "force": {"type": "boolean"},
        "reconnect": _SECONDS}
    chosen = [{"if": {"properties": {"command": {"const": name}}, "required": ["command"]},
               "then": {"$ref": f"#/definitions/command {name}"}}
              for name in handset.command_names()]
    kinds = [{"if": {"required": [kind]},
              "then": {"propertyNames": {"enum": sorted(keys_of(kind))}}} for kind in KIND_KEYS]
    return {"type": "object", "additionalProperties": False, "properties": properties,
            "oneOf": [{"required": [kind]} for kind in KIND_KEYS],
            "description": f"a step with exactly one of {', '.join(KIND_KEYS)}",
            "allOf": [*kinds, *chosen]}


def _command(name: str) -> Schema:
    command = handset.command(name)
    limits = {measure.name: {"$ref": f"#/definitions/{'number' if measure.numeric else 'text'}"}
              for measure in command.measures().values()}
    schema: Schema = {
        "description": command.operation.summary,
        "properties": {
            "limits": {"type": "object", "additionalProperties": False, "properties": limits},
            "save": {"type": "object", "propertyNames": {"enum": sorted(limits)}}},
        "if": {"properties": {"force": {"const": True}}, "required": ["force"]},
        "then": {"properties": {"with": _values(command, forced=True)}},
        "else": {"properties": {"with": _values(command, forced=False)}}}
    if command.needed:
        schema["required"] = ["with"]
    return schema


def _values(command: handset.Command, forced: bool) -> Schema:
    """The schema of what a command takes; ``forced`` goes past ranges, never past types."""
    return {"type": "object", "additionalProperties": False, "required": list(command.needed),
            "properties": {name: field_schema(field, forced)
                           for name, field in command.fields().items()}}


def field_schema(field: Field, forced: bool = False) -> Schema:
    """The schema of a value that is sent; how it is said in words is its description."""
    meaning = field.meaning + (f" ({field.unit})" if field.unit else "")
    if not field.numeric:
        return {**_TEXT, "description": f"a text: {meaning}"}
    bounds = {} if forced else {"minimum": field.low, "maximum": field.high}
    number: Schema = {"type": "integer", **_WHOLE}
    number.update({key: bound for key, bound in bounds.items() if bound is not None})
    words = [{"enum": list(field.choices)}] if field.choices else []
    said = f", or one of {', '.join(field.choices)}" if field.choices else ""
    return {"anyOf": [number, *words, _REFERENCE],
            "description": f"a whole number {number['minimum']} to {number['maximum']}{said}: "
                           f"{meaning}"}


def _limit(numeric: bool | None) -> Schema:
    """The schema of a limit: of a number, of a text, or of what is not known beforehand."""
    number: Schema = {"anyOf": [{"type": "number", **_LARGEST}, _TEXT],
                      "description": "a number, or a text with a number and its unit, or a word"}
    one: Schema = {"anyOf": [{"type": "number", **_LARGEST}, {"type": "string"}],
                   "description": "a number or a text"}
    if numeric is False:
        one = {"type": "string"}
    elif numeric:
        one = number
    keys: Schema = {"equals": one, "one_of": {"type": "array", "minItems": 1, "items": one},
                    "matches": {**_TEXT, "description": "a regular expression"}}
    if numeric is not False:
        keys.update({"min": number, "max": number, "marginal": {
            "type": "object", "additionalProperties": False, "minProperties": 1,
            "properties": {"min": number, "max": number}}})
    table = {"type": "object", "minProperties": 1, "additionalProperties": False,
             "properties": keys}
    return {"if": {"type": "object"}, "then": table, "else": one}
