"""References in a plan's values: ``${name}`` stands for a variable, ``$${`` for itself."""

from __future__ import annotations

import re
from typing import Any, Mapping

Scalar = bool | int | float | str

NAME = r"[A-Za-z_][A-Za-z0-9_-]*"
_NAME = re.compile(NAME)
_MARK = re.compile(r"\$\$\{|\$\{(?P<name>[^{}]*)\}|(?P<open>\$\{)")


def is_name(text: str) -> bool:
    """Whether this can name a variable."""
    return _NAME.fullmatch(text) is not None


def names(value: Any) -> list[str]:
    """The variables that a value refers to, in order; ``ValueError`` for a broken reference."""
    if not isinstance(value, str):
        return []
    found = []
    for mark in _MARK.finditer(value):
        name = mark.group("name")
        if mark.group("open"):
            raise ValueError("'${' without its '}' (write '$${' for the characters themselves)")
        if name is None:
            continue
        if not is_name(name):
            raise ValueError(f"'${{{name}}}' names no variable")
        found.append(name)
    return found


def only_reference(value: Any) -> str:
    """The variable that the value is nothing but a reference to; empty when there is more."""
    mark = _MARK.fullmatch(value) if isinstance(value, str) else None
    return (mark.group("name") or "") if mark else ""


def fill(value: Any, variables: Mapping[str, Scalar]) -> Any:
    """The value with its references replaced; one that is only a reference keeps its type."""
    if not isinstance(value, str):
        return value
    alone = only_reference(value)
    if alone:
        return variables[alone]
    return _MARK.sub(lambda mark: _text(variables[mark.group("name")])
                     if mark.group("name") is not None else "${", value)


def _text(value: Scalar) -> str:
    if isinstance(value, bool):
        return "yes" if value else "no"
    return value if isinstance(value, str) else str(value)
