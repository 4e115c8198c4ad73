"""Run the test suites and count what they say: `./dev test`."""

import argparse
import shutil
import sys
import time
from pathlib import Path
from typing import Sequence

from tools import children
from tools.builder import Builder
from tools.ctest import run_ctest
from tools.project import PROJECT, note, say
from tools.repeat import repeat
from tools.results import Count, Results, read_results
from tools.suites import SUITES, Suite

RESULTS = PROJECT / "build" / "test-results"

TEST_SECONDS = 600


def run_pytest(suite: Suite, report: Path) -> Results:
    """Run a suite in Python, which tells of its failures itself."""
    command = [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider",
               f"--timeout={TEST_SECONDS}", f"--junitxml={report}", *suite.arguments]
    if sys.stdout.isatty():
        command.append("--color=yes")
    report.unlink(missing_ok=True)
    status = children.run(command, children.show, suite.environment)
    results = read_results(report)
    if status != 0 and results.count.failed == 0:
        note(f"{suite.name}: pytest ended with status {status}")
        results.count.failed = 1
    return results


def run_suite(suite: Suite) -> Count:
    """Run one suite on what is built. A runner that ends badly is a failed test."""
    RESULTS.mkdir(parents=True, exist_ok=True)
    report = RESULTS / f"{suite.name}.xml"
    say(f"suite {suite.name}")
    started = time.monotonic()
    if suite.arguments:
        results = run_pytest(suite, report)
    else:
        results = run_ctest(PROJECT / "build" / suite.preset, suite.name, report=report,
                            environment=suite.environment)
    note(f"suite {suite.name}: {results.count} in {time.monotonic() - started:.0f} s")
    return results.count


def run_suites(suites: Sequence[Suite]) -> Count:
    """Run suites one after another, while what the later ones need is being built."""
    builder = Builder([(suite.preset, suite.target) for suite in suites if suite.preset])
    builder.start()
    total = Count()
    for suite in suites:
        failure = builder.wait((suite.preset, suite.target)) if suite.preset else ""
        if failure:
            print(failure, file=sys.stderr)
            note(f"suite {suite.name} did not run")
            total.add(Count(failed=1))
        else:
            total.add(run_suite(suite))
    return total


def choose(parser: argparse.ArgumentParser, names: Sequence[str]) -> list[Suite]:
    """The suites that were asked for."""
    unknown = sorted(set(names) - {suite.name for suite in SUITES})
    if unknown:
        parser.error(f"no such suite: {', '.join(unknown)} "
                     f"(there are: {', '.join(suite.name for suite in SUITES)})")
    return [suite for suite in SUITES
            if (suite.name in names if names else not suite.is_extra)]


def counted(word: str) -> int:
    """A number of runs."""
    number = int(word)
    if number < 1:
        raise ValueError(word)
    return number


def main() -> int:
    """Run the chosen suites and print one line that counts them all."""
    parser = argparse.ArgumentParser(prog="./dev test", description="Run the tests.")
    parser.add_argument("suite", nargs="*", help="only these: " + ", ".join(
        suite.name + (" (not run unless named)" if suite.is_extra else "")
        for suite in SUITES))
    parser.add_argument("--repeat", type=counted, metavar="N",
                        help="run them N times in a row, and count each time")
    parser.add_argument("--beside", type=counted, metavar="M", default=0,
                        help="of these runs, the first M with a build running beside")
    options = parser.parse_args()
    suites = choose(parser, options.suite)
    if options.beside > (options.repeat or 0):
        parser.error("--beside M goes with --repeat N, and is no more than that")
    shutil.rmtree(RESULTS, ignore_errors=True)
    if options.repeat:
        total = repeat(suites, options.repeat, options.beside, run_suites)
    else:
        total = run_suites(suites)
    say("all suites" if len(suites) > 1 else f"suite {suites[0].name}")
    print(total, flush=True)
    return 1 if total.failed or not total.passed else 0
