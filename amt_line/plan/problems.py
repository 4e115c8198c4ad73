"""What is wrong with a plan: the file, the step and the key of each problem."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Any, Sequence

from amt_station.errors import UsageProblem
from amt_station.text import printable

_LONGEST_SHOWN = 80


@dataclass(frozen=True)
class Problem:
    """One thing that is wrong, and where."""

    place: str
    key: str
    reason: str

    def __str__(self) -> str:
        return ": ".join(part for part in (self.place, self.key, self.reason) if part)


class PlanProblem(UsageProblem):
    """A plan that cannot be carried out; every problem of it, the first one in the text."""

    kind = "plan"

    def __init__(self, path: str, problems: Sequence[Problem]) -> None:
        self.path = path
        self.problems = tuple(problems)
        more = f" (and {len(problems) - 1} more)" if len(problems) > 1 else ""
        super().__init__(f"{printable(path)}: {printable(str(problems[0]))}{more}")

    def lines(self) -> list[str]:
        """A line a problem."""
        return [printable(f"{self.path}: {problem}") for problem in self.problems]

    def details(self) -> dict[str, Any]:
        """The failure for ``--json``."""
        return {**super().details(), "problems": [
            {"file": self.path, "step": problem.place, "key": problem.key,
             "reason": printable(problem.reason)} for problem in self.problems]}


def shown(value: object) -> str:
    """A value as a message shows it, cut where it is long."""
    try:
        text = repr(value)
    except (ValueError, RecursionError):
        return "a value that is too large to show"
    return text if len(text) <= _LONGEST_SHOWN else text[:_LONGEST_SHOWN] + "..."
