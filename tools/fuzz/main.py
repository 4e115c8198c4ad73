"""Every fuzz target for a while, and the Python readers: `./dev fuzz [SECONDS]`."""

from __future__ import annotations

import argparse
import shutil
from concurrent.futures import ThreadPoolExecutor
from typing import Sequence

from tools.build import build
from tools.fuzz import properties as readers
from tools.fuzz import targets
from tools.fuzz.properties import Properties
from tools.fuzz.targets import Figures
from tools.project import CORES, PROJECT, note, say

FOUND = PROJECT / "build" / "fuzz-found"
SECONDS, NIGHTLY_HOURS = 60, 1.0
HEAD = ("target", "executions", "a second", "edges", "new edges", "inputs taken")


def run_target(name: str, seconds: int, is_grown: bool, executions: int = 0) -> Figures:
    """Run a target, and let its corpus grow by what it has found."""
    found = FOUND / name
    shutil.rmtree(found, ignore_errors=True)
    figures = targets.run(name, seconds, found, executions)
    if is_grown and not figures.is_finding:
        figures.grown = targets.grow(name, found, executions > 0)
    note(f"{name}: {'FINDING' if figures.is_finding else 'done'}")
    return figures


def table(rows: Sequence[Sequence[str]]) -> str:
    """Columns of one width each, the first to the left."""
    widths = [max(len(row[column]) for row in rows) for column in range(len(rows[0]))]
    return "\n".join("  ".join([row[0].ljust(widths[0]), *(
        cell.rjust(width) for cell, width in zip(row[1:], widths[1:]))]) for row in rows)


def describe(runs: Sequence[Figures]) -> str:
    """The table of all targets, and whether anything was found."""
    rows = [HEAD, *((figures.name, f"{figures.executions:,}",
                     f"{figures.executions / max(figures.seconds, 1e-9):,.0f}",
                     str(figures.edges), str(figures.new_edges), str(figures.grown))
                    for figures in runs)]
    total = sum(figures.executions for figures in runs)
    new = [figures.name for figures in runs if figures.new_edges > 0]
    wrong = [figures.name for figures in runs if figures.is_finding]
    return "\n".join([table(rows), "", f"{total:,} executions; new edges: "
                      f"{', '.join(new) or 'none'}; findings: {', '.join(wrong) or 'none'}"])


def describe_properties(properties: Properties) -> str:
    """The line of the Python readers."""
    held = "all held" if properties.status == readers.PASSED else "NOT ALL HELD"
    return (f"Python readers: {properties.examples:,} examples in {properties.rounds} rounds "
            f"of {properties.seconds:.0f} s: {held}")


def parse() -> argparse.Namespace:
    """The options."""
    parser = argparse.ArgumentParser(prog="./dev fuzz", description=__doc__)
    parser.add_argument("seconds", nargs="?", type=int, metavar="SECONDS",
                        help=f"for each target (default: {SECONDS})")
    parser.add_argument("--nightly", nargs="?", type=float, const=NIGHTLY_HOURS, metavar="HOURS",
                        help=f"so many hours for each target instead (default: {NIGHTLY_HOURS:g})")
    parser.add_argument("--executions", type=int, metavar="N",
                        help="so many executions of each target instead, however long they take, "
                        "without the sanitizers, and no Python; what has reached new edges then "
                        "runs with them")
    parser.add_argument("-j", "--jobs", type=int, default=CORES, metavar="N",
                        help="targets at once (default: %(default)s)")
    parser.add_argument("--grow", action="store_true",
                        help="take inputs that reach new edges into tests/fuzz/corpus")
    parser.add_argument("--target", action="append", choices=targets.names(),
                        help="only this one, and no Python; may be given again")
    options = parser.parse_args()
    lengths = (options.seconds, options.nightly, options.executions)
    if sum(length is not None for length in lengths) > 1:
        parser.error("one of SECONDS, --nightly and --executions")
    if options.executions is not None and not 0 < options.executions <= targets.MOST_EXECUTIONS:
        parser.error(f"the executions are a whole number from 1 to {targets.MOST_EXECUTIONS}")
    if options.nightly is not None:
        options.seconds = round(options.nightly * 3600)
    if options.seconds is None:
        options.seconds = SECONDS
    if options.seconds < 1:
        parser.error("the seconds are a whole number above 0")
    if options.jobs < 1:
        parser.error("the jobs are a whole number above 0")
    return options


def main() -> int:
    """Build the targets and run them; a finding is shown, and ends with a status of its own."""
    options = parse()
    executions = options.executions or 0
    for preset in (targets.PRESET, targets.PLAIN_PRESET)[:2 if executions else 1]:
        build(preset)
    FOUND.mkdir(parents=True, exist_ok=True)
    chosen = options.target or targets.names()
    each = f"{executions:,} executions" if executions else f"{options.seconds} s"
    say(f"{len(chosen)} targets, {each} each, {options.jobs} at once")
    pool = ThreadPoolExecutor(options.jobs)
    try:
        runs = list(pool.map(
            lambda name: run_target(name, options.seconds, options.grow, executions), chosen))
    finally:
        # Interrupted, it must not wait for what it has begun.
        pool.shutdown(wait=False, cancel_futures=True)
    wrong = [figures for figures in runs if figures.is_finding]
    for figures in wrong:
        print(f"\n{figures.name}:\n{figures.report}\n(its input: {FOUND}/{figures.name}-*)")
    print(describe(runs), flush=True)
    if options.target or executions:
        return 1 if wrong else 0
    properties = readers.run(options.seconds, options.jobs)
    if properties.status != readers.PASSED:
        print(properties.said.decode("utf-8", "replace"))
    print(describe_properties(properties))
    return 1 if wrong or properties.status != readers.PASSED else 0
