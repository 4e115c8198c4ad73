"""A measured figure of `./dev bench`: its values over the runs, its goal, and whether it is met."""

import statistics
from dataclasses import dataclass, field
from typing import Literal, Sequence

Sense = Literal["at most", "at least", ""]


@dataclass
class Figure:
    """One figure: it is met when the median of its runs is as the goal wants it."""

    name: str
    unit: str = ""
    sense: Sense = ""
    goal: float = 0.0
    # What the figure is made of when the goal is missed.
    floor: str = ""
    digits: int = 2
    values: list[float] = field(default_factory=list)

    def add(self, value: float) -> None:
        """The value of one more run."""
        self.values.append(value)

    @property
    def median(self) -> float:
        """The figure itself."""
        return statistics.median(self.values)

    @property
    def is_measured(self) -> bool:
        """Whether there is any value."""
        return bool(self.values)

    @property
    def is_missed(self) -> bool:
        """Whether there is a goal, and the median is beyond it, or nothing could be measured."""
        if not self.sense:
            return False
        if not self.is_measured:
            return True
        return self.median > self.goal if self.sense == "at most" else self.median < self.goal

    def shown_goal(self) -> str:
        """The goal, for people."""
        return f"{self.sense} {self.goal:g}{self.unit}" if self.sense else ""

    def row(self) -> str:
        """A line of the table."""
        verdict = "" if not self.sense else "missed" if self.is_missed else "met"
        if not self.is_measured:
            return f"  {self.name:58}{'not measured':>30}  {self.shown_goal():17}{verdict}"
        spread = (min(self.values), self.median, max(self.values))
        cells = "".join(f"{value:10.{self.digits}f}" for value in spread)
        return f"  {self.name:58}{cells}  {self.shown_goal():17}{verdict}"


def show(title: str, figures: Sequence[Figure]) -> None:
    """A table of figures."""
    print(f"\n{title}\n  {'':58}{'minimum':>10}{'median':>10}{'maximum':>10}  goal")
    for figure in figures:
        print(figure.row(), flush=True)


def conclude(figures: Sequence[Figure]) -> int:
    """The last lines: which goals are missed and why; returns the exit status."""
    goals = [figure for figure in figures if figure.sense]
    missed = [figure for figure in goals if figure.is_missed]
    print(f"\n{len(goals) - len(missed)} of {len(goals)} goals are met.")
    for figure in missed:
        measured = f"{figure.median:.{figure.digits}f}{figure.unit}" if figure.is_measured else \
            "not measured"
        why = f" ({figure.floor})" if figure.floor else ""
        print(f"missed: {figure.name}: {measured}, goal {figure.shown_goal()}{why}")
    return 1 if missed else 0
