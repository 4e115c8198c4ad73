"""Checks a plan's content against its schema, and says in plain words what is wrong where."""

from __future__ import annotations

import copy
from difflib import get_close_matches
from functools import lru_cache
from itertools import islice
from typing import Any, Iterable, Iterator, Mapping, Sequence

from jsonschema import Draft7Validator
from jsonschema.exceptions import ValidationError

from amt_line.plan import handset
from amt_line.plan.model import Section, place
from amt_line.plan.problems import Problem, shown
from amt_line.plan.schema import KIND_KEYS, plan_schema
from amt_station.text import shortened

_SECTIONS = tuple(section.value for section in Section)
_MOST = 50
_WHICH_KIND = f"needs exactly one of {', '.join(KIND_KEYS)}"


@lru_cache(maxsize=1)
def _validator() -> Any:
    """Checks all but what each command takes and brings."""
    schema = copy.deepcopy(plan_schema())
    step = schema["definitions"]["step"]
    step["allOf"] = [part for part in step["allOf"] if "$ref" not in part["then"]]
    return Draft7Validator(schema)


def schema_problems(content: Mapping[str, Any]) -> list[Problem]:
    """What the schema finds, one problem a key, in the order of the file."""
    problems: dict[tuple[str, str], Problem] = {}
    for error in islice(_errors(content), _MOST):
        for problem in _translate(error, content):
            problems[problem.place, problem.key] = problem
    unclear = {problem.place for problem in problems.values() if problem.reason == _WHICH_KIND}
    return [problem for problem in problems.values()
            if problem.place not in unclear or problem.reason == _WHICH_KIND]


def _errors(content: Mapping[str, Any]) -> Iterator[ValidationError]:
    yield from _validator().iter_errors(content)
    # To look for the one schema of a step's command is quicker than to try all of them.
    for section in _SECTIONS:
        steps = content.get(section)
        for number, step in enumerate(steps if isinstance(steps, list) else []):
            name = step.get("command") if isinstance(step, dict) else None
            if isinstance(name, str) and name in handset.command_names():
                part = {"$ref": f"#/definitions/command {name}"}
                for error in _validator().evolve(schema=part).iter_errors(step):
                    error.path.extendleft((number, section))
                    yield error


def where(path: Sequence[Any], content: Mapping[str, Any]) -> tuple[str, str]:
    """The step, and the key in it, that a path into the content leads to."""
    if len(path) >= 2 and path[0] in _SECTIONS and isinstance(path[1], int):
        step = content[path[0]][path[1]]
        name = step.get("name", "") if isinstance(step, dict) else ""
        return (place(str(path[0]), path[1] + 1, name if isinstance(name, str) else ""),
                _key(path[2:]))
    return "", _key(path)


def _key(path: Iterable[Any]) -> str:
    key = ""
    for part in path:
        key += f"[{part + 1}]" if isinstance(part, int) else f".{shortened(part)}"
    return key.lstrip(".")


def _translate(error: ValidationError, content: Mapping[str, Any]) -> list[Problem]:
    path = list(error.absolute_path)
    step, key = where(path, content)
    if "propertyNames" in error.absolute_schema_path:
        return _wrong_name(error, path, step, key)
    if error.validator == "additionalProperties":
        known = list(error.schema.get("properties", {}))
        return [Problem(step, _joined(key, name), _unknown(name, known, path))
                for name in error.instance if name not in known]
    if error.validator == "required":
        missing = [name for name in error.validator_value if name not in error.instance]
        return [Problem(step, _joined(key, name), "missing") for name in missing]
    return [Problem(step, key, _reason(error))]


def _joined(key: str, name: Any) -> str:
    return f"{key}.{shortened(str(name))}".lstrip(".")


def _wrong_name(error: ValidationError, path: Sequence[Any], step: str, key: str
                ) -> list[Problem]:
    name = str(error.instance)
    if error.validator != "enum":
        return [Problem(step, _joined(key, name), "this cannot be a variable's name")]
    if len(path) == 2:
        return [Problem(step, _joined(key, name), "a step of this kind has no such key")]
    return [Problem(step, _joined(key, name), _unknown(name, error.validator_value, path))]


def _unknown(name: str, known: Sequence[str], path: Sequence[Any]) -> str:
    near = get_close_matches(name, known, 1)
    some = f" (known: {', '.join(sorted(known))})" if known and len(known) < 12 else ""
    hint = f", did you mean {near[0]!r}?" if near else some
    if path and path[-1] in ("limits", "save"):
        return f"the answer has no such value{hint}"
    return f"unknown key{hint}"


def _reason(error: ValidationError) -> str:
    value, description = shown(error.instance), error.schema.get("description")
    if error.validator == "oneOf":
        return _WHICH_KIND
    if error.validator == "minProperties":
        return "is empty"
    if error.validator == "minItems":
        return "holds nothing"
    if error.validator == "enum":
        return _not_one_of(error)
    if error.validator == "type":
        return f"{value} is no {_types(error.validator_value)}"
    if error.validator in ("minLength",):
        return "is empty"
    if description:
        return f"{value} is not {description}"
    return f"{value}: {_BOUNDS.get(str(error.validator), 'cannot be')} {error.validator_value}"


_BOUNDS = {"minimum": "is below", "maximum": "is above", "exclusiveMinimum": "is not above",
           "maxLength": "is longer than", "pattern": "is not of the form",
           "const": "is not"}


def _types(wanted: Any) -> str:
    words = {"string": "text", "integer": "whole number", "number": "number", "array": "list",
             "object": "table", "boolean": "true or false"}
    return " or ".join(words.get(word, word) for word in
                       (wanted if isinstance(wanted, list) else [wanted]))


def _not_one_of(error: ValidationError) -> str:
    choices = [str(choice) for choice in error.validator_value]
    if isinstance(error.instance, str):
        near = get_close_matches(error.instance, choices, 1)
        if near:
            return f"no {shown(error.instance)}, did you mean {near[0]!r}?"
    if len(choices) > 12:
        return f"no {shown(error.instance)}; `amt-station commands` lists them"
    return f"{shown(error.instance)} is none of {', '.join(choices)}"
