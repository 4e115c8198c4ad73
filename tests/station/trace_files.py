"""Traces for tests: written as text, read back, without their times."""

from __future__ import annotations

import re
from pathlib import Path

_TIME = re.compile(r"^@\S+ +", re.M)
_WIDTH = re.compile(r"^(station \w+) +", re.M)


def statements(path: Path) -> list[str]:
    """The lines of a trace but comments and the port's name, without times and columns."""
    text = _WIDTH.sub(r"\1 ", _TIME.sub("", path.read_text(encoding="ascii")))
    return [line for line in text.splitlines() if not line.startswith(("#", "station opens"))]


def comments(path: Path) -> list[str]:
    """The comments of a trace."""
    return [line for line in path.read_text(encoding="ascii").splitlines() if line[:1] == "#"]


def write(path: Path, *lines: str) -> Path:
    """Make a trace."""
    path.write_text("".join(f"{line}\n" for line in lines), encoding="utf-8")
    return path
