"""Run the test suites and count what they say: `./dev test`."""

import argparse
import queue
import shutil
import sys
import threading
import time
from pathlib import Path
from typing import Sequence

from tools import children
from tools.arguments import positive, refuse_unknown
from tools.builder import Builder
from tools.coverage import parts
from tools.ctest import run_ctest
from tools.project import PROJECT, say
from tools.repeat import repeat
from tools.results import Count, Results, read_results
from tools.suites import SUITES, Suite

RESULTS = PROJECT / "build" / "test-results"

# A test that takes longer hangs.
TEST_SECONDS = 600
LOOK_SECONDS = 0.2


def run_pytest(suite: Suite, report: Path, tell: children.Taker) -> Results:
    """Run a suite in Python, which tells of its failures itself."""
    command = [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider",
               f"--timeout={TEST_SECONDS}", f"--junitxml={report}", *suite.arguments]
    if sys.stdout.isatty():
        command.append("--color=yes")
    report.unlink(missing_ok=True)
    status = children.run(command, tell, suite.environment)
    results = read_results(report)
    if status != 0 and results.count.failed == 0:
        tell(f"{suite.name}: pytest ended with status {status}\n".encode())
        results.count.failed = 1
    return results


def run_suite(suite: Suite, tell: children.Taker = children.show) -> Count:
    """Run one suite on what is built. A runner that ends badly is a failed test."""
    RESULTS.mkdir(parents=True, exist_ok=True)
    report = RESULTS / f"{suite.name}.xml"
    tell(f"\n== suite {suite.name}\n".encode())
    started = time.monotonic()
    if suite.arguments:
        results = run_pytest(suite, report, tell)
    else:
        results = run_ctest(PROJECT / "build" / suite.preset, suite.name, report=report,
                            environment=suite.environment, tell=tell)
    seconds = time.monotonic() - started
    tell(f"   suite {suite.name}: {results.count} in {seconds:.0f} s\n".encode())
    return results.count


def run_built(suite: Suite, builder: Builder, is_watched: bool, tell: children.Taker) -> Count:
    """Run a suite as soon as its build is there; a build that fails is a failed test."""
    step = (suite.preset, suite.target)
    failure = builder.wait(step, is_watched) if suite.preset else ""
    if not failure:
        if suite.preset:
            tell(f"\n   {suite.target} of {suite.preset}: built in {builder.seconds(step):.0f} s"
                 .encode())
        return run_suite(suite, tell)
    tell(f"\n{failure}\n   suite {suite.name} did not run\n".encode(errors="backslashreplace"))
    return Count(failed=1)


class Beside(threading.Thread):
    """Suites that run while others are watched; what they say is kept until somebody has time."""

    def __init__(self, suites: Sequence[Suite], builder: Builder) -> None:
        super().__init__(daemon=True)
        self._suites = suites
        self._builder = builder
        self._said: "queue.SimpleQueue[bytes]" = queue.SimpleQueue()
        self.total = Count()
        self.error: BaseException | None = None

    def run(self) -> None:
        """Run them one after another."""
        try:
            for suite in self._suites:
                said: list[bytes] = []
                self.total.add(run_built(suite, self._builder, False, said.append))
                self._said.put(b"".join(said))
        except BaseException as error:
            self.error = error

    def show(self) -> None:
        """Show what the suites have said that have ended."""
        while not self._said.empty():
            children.show(self._said.get())


def run_suites(suites: Sequence[Suite]) -> Count:
    """Run suites, while what the later ones need is being built."""
    builder = Builder([(suite.preset, suite.target) for suite in suites if suite.preset])
    builder.start()
    watched = [suite for suite in suites if not suite.is_beside] or suites
    beside = Beside([suite for suite in suites if suite not in watched], builder)
    beside.start()
    total = Count()
    for suite in watched:
        total.add(run_built(suite, builder, True, children.show))
        beside.show()
    while beside.is_alive():
        beside.join(LOOK_SECONDS)
        beside.show()
    if beside.error is not None:
        raise beside.error
    total.add(beside.total)
    return total


def choose(parser: argparse.ArgumentParser, names: Sequence[str]) -> list[Suite]:
    """The suites that were asked for."""
    refuse_unknown(parser, "suite", names, [suite.name for suite in SUITES])
    return [suite for suite in SUITES
            if (suite.name in names if names else not suite.is_extra)]


def main() -> int:
    """Run the chosen suites and print one line that counts them all."""
    parser = argparse.ArgumentParser(prog="./dev test", description="Run the tests.")
    parser.add_argument("suite", nargs="*", help="only these: " + ", ".join(
        suite.name + (" (not run unless named)" if suite.is_extra else "")
        for suite in SUITES))
    parser.add_argument("--repeat", type=positive, metavar="N",
                        help="run them N times in a row, and count each time")
    parser.add_argument("--beside", type=positive, metavar="M", default=0,
                        help="of these runs, the first M with a build running beside")
    parser.add_argument("--coverage", action="store_true",
                        help="count what they run of the code, too; fails below the floors")
    options = parser.parse_args()
    suites = choose(parser, options.suite)
    if options.beside > (options.repeat or 0):
        parser.error("--beside M goes with --repeat N, and is no more than that")
    if options.coverage and (options.suite or options.repeat):
        parser.error("--coverage goes with all suites, once")
    shutil.rmtree(RESULTS, ignore_errors=True)
    if options.coverage:
        suites = parts.count(parts.PARTS, suites)
    if options.repeat:
        total = repeat(suites, options.repeat, options.beside, run_suites)
    else:
        total = run_suites(suites)
    is_held = not options.coverage or parts.hold(parts.PARTS)
    say("all suites" if len(suites) > 1 else f"suite {suites[0].name}")
    print(total if is_held else f"{total}; COVERAGE IS BELOW ITS FLOOR", flush=True)
    return 1 if total.failed or not total.passed or not is_held else 0
