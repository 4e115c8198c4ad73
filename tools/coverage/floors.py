"""What the tests must run at least, as a table, and whether they have."""

from dataclasses import dataclass
from typing import Sequence


@dataclass(frozen=True)
class Share:
    """So many of so many."""

    covered: int
    total: int

    def __add__(self, other: "Share") -> "Share":
        return Share(self.covered + other.covered, self.total + other.total)

    @property
    def percent(self) -> float:
        """Nothing at all is covered whole."""
        return 100 * self.covered / self.total if self.total else 100.0

    def __str__(self) -> str:
        return f"{self.percent:.2f} % ({self.covered} of {self.total})"


@dataclass(frozen=True)
class FileCount:
    """What of a file the tests have run."""

    path: str
    lines: Share
    branches: Share


@dataclass(frozen=True)
class Floor:
    """The least that is run of the files whose paths begin so; in percent."""

    name: str
    begins: tuple[str, ...]
    lines: float
    branches: float


# What a wrong byte on a line would come from is run whole.
DAEMON = (
    Floor("frame and atoms", ("amt/amt-packet.",), 100, 100),
    Floor("envelope and conversion", ("amt/amt-convert",), 100, 100),
    Floor("checksum", ("amt/amt-checksum.",), 100, 100),
    Floor("dispatch", ("amt/amt-handle/reader/dispatch.",), 100, 100),
    Floor("registry", ("amt/amt-handle/reader/registry.",), 100, 100),
    Floor("the daemon", ("amt/", "pub/"), 97, 90),
)

PC = (
    Floor("the station", ("amt_station/",), 95, 0),
    Floor("the line", ("amt_line/",), 95, 0),
)


@dataclass(frozen=True)
class Result:
    """What is run of a floor's files."""

    floor: Floor
    lines: Share
    branches: Share
    # A floor below which no file lies holds nothing up.
    is_empty: bool

    @property
    def holds(self) -> bool:
        """Whether nothing is below the floor."""
        return (not self.is_empty and self.lines.percent >= self.floor.lines
                and self.branches.percent >= self.floor.branches)

    def __str__(self) -> str:
        if self.is_empty:
            return f"{self.floor.name}: no file of it was counted"
        parts = [f"lines {self.lines}, floor {self.floor.lines:g} %"]
        if self.branches.total:
            parts.append(f"branches {self.branches}, floor {self.floor.branches:g} %")
        return f"{self.floor.name}: {'; '.join(parts)}{'' if self.holds else '  BELOW'}"


def _total(shares: Sequence[Share]) -> Share:
    return sum(shares, Share(0, 0))


def judge(floors: Sequence[Floor], files: Sequence[FileCount]) -> list[Result]:
    """What is run of each floor's files."""
    results = []
    for floor in floors:
        below = [file for file in files if file.path.startswith(floor.begins)]
        results.append(Result(floor, _total([file.lines for file in below]),
                              _total([file.branches for file in below]),
                              not any(file.lines.total for file in below)))
    return results
