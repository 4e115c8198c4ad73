"""Talk with the person at the terminal, and data for whatever reads the output."""

from __future__ import annotations

import json
import os
import sys
from contextlib import contextmanager
from typing import Any, Iterator, TextIO

_GREEN, _RED, _RESET = "\x1b[32m", "\x1b[31m", "\x1b[0m"


def _coloured(stream: TextIO) -> bool:
    return stream.isatty() and not os.environ.get("NO_COLOR") and os.environ.get("TERM") != "dumb"


def good(text: str, stream: TextIO | None = None) -> str:
    """``text`` in green where colour is wanted."""
    return f"{_GREEN}{text}{_RESET}" if _coloured(stream or sys.stdout) else text


def bad(text: str, stream: TextIO | None = None) -> str:
    """``text`` in red where colour is wanted."""
    return f"{_RED}{text}{_RESET}" if _coloured(stream or sys.stdout) else text


def data(text: str) -> None:
    """A line of data, on standard output."""
    print(text.encode("utf-8", "backslashreplace").decode("utf-8"))


def data_json(value: Any) -> None:
    """One JSON document, on standard output."""
    print(json.dumps(value, indent=2))


def talk(text: str) -> None:
    """A line for the person, on standard error."""
    print(text.encode("utf-8", "backslashreplace").decode("utf-8"), file=sys.stderr)


def complain(text: str) -> None:
    """The one line that says why the command failed, on standard error."""
    talk(f"{bad('amt-station:', sys.stderr)} {text}")


@contextmanager
def waiting(what: str) -> Iterator[None]:
    """Show what is being waited for, on a terminal only, and take it away again."""
    shown = _coloured(sys.stderr)
    if shown:
        print(f"waiting for {what} ...", end="", file=sys.stderr, flush=True)
    try:
        yield
    finally:
        if shown:
            print("\r\x1b[K", end="", file=sys.stderr, flush=True)
