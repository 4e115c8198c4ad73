"""What a check has found, and the exit status that all findings come to."""

from __future__ import annotations

from dataclasses import dataclass
from enum import Enum
from typing import Any, Sequence

from amt_station.errors import EXIT_DOUBT, EXIT_PASS


class Level(str, Enum):
    """How bad it is."""

    OK = "ok"
    UNCHECKED = "not checked"
    WARNING = "warning"
    ERROR = "error"


@dataclass(frozen=True)
class Finding:
    """One line: what is so, and what to do about it.

    ``status`` is the exit status that other commands end with for an error like this.
    """

    level: Level
    text: str
    advice: str = ""
    status: int = EXIT_PASS

    @property
    def blocks(self) -> bool:
        """Whether what stands on it cannot be looked at."""
        return self.level in (Level.ERROR, Level.UNCHECKED)

    def json(self, check: str) -> dict[str, Any]:
        """The finding of a check for ``--json``."""
        return {"check": check, "level": self.level.value, "text": self.text,
                "advice": self.advice or None, "exit_status": self.status}


def ok(text: str) -> Finding:
    """Looked at, and nothing is wrong."""
    return Finding(Level.OK, text)


def unchecked(text: str, advice: str = "") -> Finding:
    """Could not be looked at, which is no good news."""
    return Finding(Level.UNCHECKED, text, advice, EXIT_DOUBT)


def warning(text: str, advice: str) -> Finding:
    """Works for now, but is likely to go wrong."""
    return Finding(Level.WARNING, text, advice, EXIT_DOUBT)


def error(text: str, advice: str, status: int) -> Finding:
    """Commands fail because of this, with ``status``."""
    return Finding(Level.ERROR, text, advice, status)


def exit_status(findings: Sequence[Finding]) -> int:
    """That of the first error, from which the later ones may follow; else whether doubts are left.
    """
    errors = [finding for finding in findings if finding.level is Level.ERROR]
    return max((finding.status for finding in errors[:1] or findings), default=EXIT_DOUBT)
