"""Regular expressions of a plan, matched with a time limit.

An expression can take longer than the universe has; a line cannot wait for it.
"""

from __future__ import annotations

import re
from functools import lru_cache
from typing import Any

import regex

from amt_station.errors import StationError

SECONDS = 1.0
_LONGEST_PATTERN = 2000
_LONGEST_TEXT = 65536

# What is repeated so many times is compiled so many times: nested, that fills the memory.
_MOST_PARTS = 100_000
_PART = re.compile(r"\\.|\[\^?\]?(?:\\.|[^\]\\])*\]|\{(?P<low>\d*)(?:,(?P<high>\d*))?\}|.", re.S)


class PatternTooSlow(StationError):
    """A regular expression did not come to an end."""

    exit_status = 7
    kind = "pattern"


class BadPattern(ValueError):
    """A text that is no regular expression."""


@lru_cache(maxsize=256)
def compiled(pattern: str) -> Any:
    """The expression, or ``BadPattern`` with the reason."""
    if len(pattern) > _LONGEST_PATTERN:
        raise BadPattern(f"longer than {_LONGEST_PATTERN} characters")
    if _parts(pattern) > _MOST_PARTS:
        raise BadPattern(f"its counted repeats make more than {_MOST_PARTS} parts")
    try:
        return regex.compile(pattern)
    except (regex.error, ValueError, OverflowError, RecursionError, MemoryError) as error:
        raise BadPattern(str(error)) from error


def _parts(pattern: str) -> int:
    """How many parts a pattern has when its counted repeats are written out."""
    groups, last = [0], 0
    for part in _PART.finditer(pattern):
        if part[0] == "(":
            groups.append(1)
            continue
        if part[0] == ")" and len(groups) > 1:
            last = groups.pop()
        elif part["low"] or part["high"]:
            times = max(int(part["low"] or 0), int(part["high"] or 0))
            groups[-1] -= last
            last *= times
        else:
            last = 1
        groups[-1] += last
    return sum(groups)


def is_whole(pattern: str, text: str) -> bool:
    """Whether the pattern describes the whole text."""
    return _timed(pattern, text, "fullmatch")


def is_found(pattern: str, text: str) -> bool:
    """Whether the pattern describes some part of the text."""
    return _timed(pattern, text, "search")


def _timed(pattern: str, text: str, how: str) -> bool:
    if len(text) > _LONGEST_TEXT:
        raise PatternTooSlow(f"a text of {len(text)} characters is too long for a pattern")
    method = getattr(compiled(pattern), how)
    try:
        # Other handsets' threads go on meanwhile.
        return method(text, timeout=SECONDS, concurrent=True) is not None
    except TimeoutError:
        raise PatternTooSlow(f"the pattern {pattern!r} took longer than {SECONDS:g} s") from None
