"""How much of the daemon the unit and the system tests run: `./dev coverage`."""

import argparse
import json
import subprocess

from tools.build import build
from tools.project import CORES, PROJECT, say
from tools.results import Count
from tools.run_tests import run_suite
from tools.suites import SYSTEM_WORKERS, Suite, system

BUILD = PROJECT / "build" / "coverage"
REPORT = PROJECT / "build" / "coverage-report"
ROOMS = ("amt", "pub")

# Counting makes a daemon slower, and it writes hundreds of files when it ends.
PATIENCE = {"HANDSET_TIME_SCALE": "12"}

SUITES = (
    Suite("unit-coverage", "coverage"),
    system("system-coverage", "coverage", SYSTEM_WORKERS, PATIENCE),
)


def forget_counts() -> None:
    """What earlier runs have counted."""
    for path in BUILD.rglob("*.gcda"):
        path.unlink()


def gcovr(*options: str) -> str:
    """Put the counts together for the daemon's own code."""
    command = [
        "gcovr", "--root", str(PROJECT), str(BUILD), "-j", str(CORES),
        "--exclude-throw-branches", "--exclude-unreachable-branches",
        # Counts of threads that meet in a branch can come out a little off.
        "--gcov-ignore-parse-errors"]
    for room in ROOMS:
        command += ["--filter", f"{PROJECT}/{room}/"]
    return subprocess.run([*command, *options], cwd=PROJECT, check=True, text=True,
                          stdout=subprocess.PIPE).stdout


def write_report() -> str:
    """Write the report for people; returns its verdict in two lines."""
    REPORT.mkdir(parents=True, exist_ok=True)
    print(gcovr("--txt", "--html-details", str(REPORT / "index.html"), "--html-title",
                "vx-kel-amt", "--json-summary", str(REPORT / "summary.json")), flush=True)
    summary = json.loads((REPORT / "summary.json").read_text())
    parts = []
    for kind in ("line", "function", "branch"):
        covered, total = summary[f"{kind}_covered"], summary[f"{kind}_total"]
        plural = {"branch": "branches"}.get(kind, f"{kind}s")
        parts.append(f"{plural} {100 * covered / total:.1f} % ({covered} of {total})")
    return (f"coverage of {' and '.join(ROOMS)}: {', '.join(parts)}\n"
            f"file by file: {(REPORT / 'index.html').relative_to(PROJECT)}")


def main() -> int:
    """Run the tests on the counting build and report."""
    parser = argparse.ArgumentParser(prog="./dev coverage", description=__doc__)
    parser.add_argument("--report-only", action="store_true",
                        help="report what the last run has counted")
    total = Count()
    if not parser.parse_args().report_only:
        build("coverage")
        forget_counts()
        for suite in SUITES:
            total.add(run_suite(suite))
    say("report")
    verdict = write_report()
    if total.failed:
        print(f"tests: {total}")
    print(verdict)
    return 1 if total.failed else 0
