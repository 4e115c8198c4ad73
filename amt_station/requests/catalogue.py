"""Names of the command ids, read from the one catalogue that the daemon is built from."""

from __future__ import annotations

import os
import re
from functools import lru_cache
from typing import Mapping

UNDEFINED = "(undefined)"

_CATALOGUE = os.path.join(os.path.dirname(__file__), "amt-command.def")
_ROW = re.compile(r"^AMT_COMMAND\(\s*(0x[0-9A-Fa-f]{2})\s*,\s*([A-Z][A-Z0-9_]*)\s*\)\s*(?://.*)?$")


def parse_catalogue(text: str) -> dict[int, str]:
    """Return id to name for the rows of ``text``, in the order they stand."""
    names: dict[int, str] = {}
    for number, line in enumerate(text.splitlines(), start=1):
        line = line.strip()
        if not line or line.startswith("//"):
            continue
        row = _ROW.match(line)
        if row is None:
            raise ValueError(f"catalogue line {number} is not a row: {line!r}")
        command, name = int(row[1], 16), row[2]
        if command in names:
            raise ValueError(f"catalogue line {number} repeats id {row[1]}")
        names[command] = name
    return names


@lru_cache(maxsize=1)
def command_names() -> Mapping[int, str]:
    """Id to name, only for the ids that have one."""
    with open(_CATALOGUE, encoding="ascii") as catalogue:
        return parse_catalogue(catalogue.read())


@lru_cache(maxsize=1)
def command_ids() -> Mapping[str, int]:
    """Name to id."""
    return {name: command for command, name in command_names().items()}


def command_name(command: int) -> str:
    """The name of any id from 0 to 255; ``(undefined)`` for an id without one."""
    return command_names().get(command, UNDEFINED)
