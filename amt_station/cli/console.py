"""Talk with the person at the terminal, and data for whatever reads the output.

Whatever is shown may come from a handset, a plan or a command line, so it is escaped here, on both
streams: what acts on a terminal instead of being shown never reaches one.
"""

from __future__ import annotations

import os
import sys
from contextlib import contextmanager
from typing import Any, Iterator, TextIO

from amt_station.text import printable

_GREEN, _RED, _RESET = "\x1b[32m", "\x1b[31m", "\x1b[0m"


def prepare_streams() -> None:
    """Let no character that a stream cannot carry end the command; a closed stream swallows.

    A port that is opened must not get the descriptor of a closed stream: talk would go to it.
    """
    for number in (0, 1, 2):
        try:
            os.fstat(number)
        except OSError:
            os.open(os.devnull, os.O_RDWR)
    for name in ("stdout", "stderr"):
        stream = getattr(sys, name)
        if stream is None:
            setattr(sys, name, open(os.devnull, "w", encoding="utf-8"))
        elif hasattr(stream, "reconfigure"):
            stream.reconfigure(errors="backslashreplace")


def _coloured(stream: TextIO) -> bool:
    return stream.isatty() and not os.environ.get("NO_COLOR") and os.environ.get("TERM") != "dumb"


def good(text: str, stream: TextIO | None = None) -> str:
    """``text`` in green where colour is wanted."""
    return f"{_GREEN}{text}{_RESET}" if _coloured(stream or sys.stdout) else text


def bad(text: str, stream: TextIO | None = None) -> str:
    """``text`` in red where colour is wanted."""
    return f"{_RED}{text}{_RESET}" if _coloured(stream or sys.stdout) else text


def data(text: str, mark: str = "") -> None:
    """A line of data, on standard output; ``mark`` is put before it as it is."""
    print(mark + printable(text))


def data_json(value: Any) -> None:
    """One JSON document, on standard output; it holds ASCII only."""
    import json

    print(json.dumps(value, indent=2))


def talk(text: str, mark: str = "") -> None:
    """A line for the person, on standard error; ``mark`` is put before it as it is."""
    print(mark + printable(text), file=sys.stderr)


def complain(text: str) -> None:
    """The one line that says why the command failed, on standard error."""
    talk(f" {text}", bad("amt-station:", sys.stderr))


@contextmanager
def waiting(what: str) -> Iterator[None]:
    """Show what is being waited for, on a terminal only, and take it away again."""
    shown = _coloured(sys.stderr)
    if shown:
        print(f"waiting for {printable(what)} ...", end="", file=sys.stderr, flush=True)
    try:
        yield
    finally:
        if shown:
            print("\r\x1b[K", end="", file=sys.stderr, flush=True)
