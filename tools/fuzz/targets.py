"""One fuzz target: where it lies, a run of it, what the run has found, and how its corpus grows."""

from __future__ import annotations

import re
import time
from dataclasses import dataclass, field
from pathlib import Path

from tools import children
from tools.project import PROJECT

SOURCES = PROJECT / "tests" / "fuzz"
CORPORA = SOURCES / "corpus"
# Without the sanitizers a target runs many times faster, but sees only what it checks itself.
PRESET, PLAIN_PRESET = "fuzz", "fuzz-plain"
PROGRAMS = PROJECT / "build" / PRESET / "bin"
PLAIN_PROGRAMS = PROJECT / "build" / PLAIN_PRESET / "bin"
# The engine counts no further.
MOST_EXECUTIONS = 2 ** 31 - 1
SHOWN_BYTES = 6000

# An input that takes so long hangs; and nothing here needs so much.
INPUT_SECONDS, MEMORY_MIB = 25, 2048
EDGES = re.compile(rb"^#\d+\t(?:INITED|DONE) +cov: (\d+)", re.MULTILINE)
FIGURE = re.compile(rb"^stat::(\w+): +(\d+)", re.MULTILINE)


def names() -> list[str]:
    """Every target."""
    return sorted(path.name.removesuffix("-fuzz.cpp") for path in SOURCES.glob("*-fuzz.cpp"))


@dataclass
class Figures:
    """What a run of a target has come to."""

    name: str
    status: int = 0
    seconds: float = 0.0
    executions: int = 0
    # The edges that its corpus reached, and those that were reached in the end.
    edges_before: int = 0
    edges: int = 0
    # The corpus has so many inputs more than before.
    grown: int = 0
    said: bytes = field(default=b"", repr=False)

    @property
    def new_edges(self) -> int:
        """What only inputs of this run have reached."""
        return self.edges - self.edges_before

    @property
    def is_finding(self) -> bool:
        """Whether an input does what none may do, or the target did not run."""
        return self.status != 0 or self.executions == 0

    @property
    def report(self) -> str:
        """The end of what the target has said."""
        return self.said[-SHOWN_BYTES:].decode("utf-8", "replace")


def command(name: str, *words: str, is_plain: bool = False) -> list[str]:
    """The command line of a target."""
    return [str((PLAIN_PROGRAMS if is_plain else PROGRAMS) / f"{name}-fuzz"), *words]


def read_figures(name: str, said: bytes) -> Figures:
    """The figures in what a target has said."""
    edges = [int(found) for found in EDGES.findall(said)]
    told = {key.decode(): int(value) for key, value in FIGURE.findall(said)}
    return Figures(name, executions=told.get("number_of_executed_units", 0),
                   edges_before=edges[0] if edges else 0, edges=edges[-1] if edges else 0,
                   said=said)


def run(name: str, seconds: int, found: Path, executions: int = 0) -> Figures:
    """Run a target from its corpus; its new inputs, and what is wrong, lie in FOUND then.

    With EXECUTIONS it runs so often, however long it takes, without the sanitizers; what has taken
    new ways runs with them in the end.
    """
    found.mkdir(parents=True, exist_ok=True)
    length = f"-runs={executions}" if executions else f"-max_total_time={seconds}"
    said: list[bytes] = []
    began = time.monotonic()
    status = children.run(
        command(name, length, f"-timeout={INPUT_SECONDS}", f"-rss_limit_mb={MEMORY_MIB}",
                "-print_final_stats=1", f"-artifact_prefix={found.parent}/{name}-",
                str(found), str(CORPORA / name), is_plain=executions > 0),
        said.append, {"ASAN_OPTIONS": "detect_leaks=1"})
    figures = read_figures(name, b"".join(said))
    figures.status, figures.seconds = status, time.monotonic() - began
    if executions and status == 0:
        figures.status = replay(name, found, said)
        figures.said = b"".join(said)
    return figures


def replay(name: str, found: Path, said: list[bytes]) -> int:
    """Run what was found once more, with the sanitizers; the status, and in SAID their words."""
    return children.run(command(name, "-runs=0", f"-artifact_prefix={found.parent}/{name}-",
                                str(found), str(CORPORA / name)), said.append)


def grow(name: str, found: Path, is_plain: bool = False) -> int:
    """Take into the corpus what reaches edges that it does not; how many inputs that were.

    The edges are those of the build that has found them. The engine takes the smallest inputs
    first.
    """
    corpus = CORPORA / name
    corpus.mkdir(parents=True, exist_ok=True)
    before = len(list(corpus.iterdir()))
    children.run(command(name, "-merge=1", "-use_counters=0", str(corpus), str(found),
                         is_plain=is_plain), lambda piece: None)
    return len(list(corpus.iterdir())) - before
