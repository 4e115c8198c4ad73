"""Draws mutants over all files of the daemon: the same ones for the same seed and code."""

import random
from pathlib import Path
from typing import Iterator, Mapping

from tools.lint.files import cpp_files, of_kind, project_files
from tools.mutants.operators import Mutant, mutants_of
from tools.project import PROJECT

# The daemon, and what of the packages on the PC only computes.
ROOMS = ("amt/", "pub/")
PC_ROOMS = ("amt_station/wire/", "amt_station/requests/", "amt_line/plan/",
            "amt_line/statistics/")
EQUAL = Path(__file__).with_name("equal.txt")


def sources() -> dict[str, str]:
    """The daemon's sources by their paths."""
    return {path: (PROJECT / path).read_text() for path in cpp_files(project_files(), ".cpp")
            if path.startswith(ROOMS)}


def pc_sources() -> dict[str, str]:
    """Those of the packages on the PC."""
    return {path: (PROJECT / path).read_text() for path in of_kind(project_files(PC_ROOMS), ".py")}


def drawn(files: Mapping[str, str], seed: int) -> Iterator[Mutant]:
    """Mutants in the order in which they are tried; each comes once.

    A file's share is that of its code, and within a file each kind of defect has the same chance:
    a table of constants is not all that is tried.
    """
    rng = random.Random(seed)
    left = {path: _by_kind(path, source) for path, source in sorted(files.items())}
    weights = {path: len(source) for path, source in files.items()}
    while paths := [path for path, kinds in left.items() if kinds]:
        path = rng.choices(paths, [weights[path] for path in paths])[0]
        kinds = left[path]
        kind = rng.choice(sorted(kinds))
        yield kinds[kind].pop(rng.randrange(len(kinds[kind])))
        if not kinds[kind]:
            del kinds[kind]


def _by_kind(path: str, source: str) -> dict[str, list[Mutant]]:
    kinds: dict[str, list[Mutant]] = {}
    for mutant in mutants_of(path, source):
        kinds.setdefault(mutant.operator, []).append(mutant)
    return kinds


def known_equal(text: str) -> dict[str, str]:
    """Mutants that nobody can tell from the program, and why: `TEXT # REASON`, a line each.

    The text is `listed` of the mutant.
    """
    rows = (line.rsplit(" # ", 1) for line in text.splitlines()
            if line.strip() and not line.startswith("#"))
    return {row[0].strip(): row[1].strip() for row in rows}
