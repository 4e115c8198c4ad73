"""What the unit and the system tests run of the daemon, by a build that counts."""

import json
import subprocess

from typing import Sequence

from tools.coverage.floors import FileCount, Share
from tools.project import CORES, PROJECT
from tools.suites import SYSTEM_WORKERS, Suite, system

BUILD = PROJECT / "build" / "coverage"
REPORT = PROJECT / "build" / "coverage-report"
ROOMS = ("amt", "pub")

# Counting makes a daemon slower, and it writes hundreds of files when it ends.
PATIENCE = {"HANDSET_TIME_SCALE": "12"}

# What is run in the place of what: the same unit tests once more would only cost their time.
REPLACED = "unit"
UNIT = Suite("unit-coverage", "coverage")
# Beside the others, as the sanitizer builds: without the tests of the programs on the PC.
SYSTEM = system("system-coverage", "coverage", SYSTEM_WORKERS, PATIENCE, is_beside=True)


def counting(suites: Sequence[Suite]) -> list[Suite]:
    """The suites with those that count; what earlier runs have counted is forgotten."""
    for path in BUILD.rglob("*.gcda"):
        path.unlink()
    return [*(UNIT if suite.name == REPLACED else suite for suite in suites), SYSTEM]


def _gcovr(*options: str) -> None:
    command = [
        "gcovr", "--root", str(PROJECT), str(BUILD), "-j", str(CORES),
        "--exclude-throw-branches", "--exclude-unreachable-branches",
        # The guard that each log record has: its other way is taken by a record in the middle of
        # another one, and tested once, where the guard is.
        "--exclude-branches-by-pattern", r".*\bPUB_LOG\(.*",
        # Counts of threads that meet in a branch can come out a little off.
        "--gcov-ignore-parse-errors"]
    for room in ROOMS:
        command += ["--filter", f"{PROJECT}/{room}/"]
    subprocess.run([*command, *options], cwd=PROJECT, check=True)


def report() -> tuple[list[FileCount], str]:
    """Write the report for people; what each file's counts are, and where the report is.

    Where nothing was counted there are no files, and no report.
    """
    if not any(BUILD.rglob("*.gcda")):
        return [], ""
    REPORT.mkdir(parents=True, exist_ok=True)
    page = REPORT / "index.html"
    _gcovr("--html-details", str(page), "--html-title", "vx-kel-amt",
           "--json-summary", str(REPORT / "summary.json"))
    summary = json.loads((REPORT / "summary.json").read_text())
    files = [FileCount(file["filename"], Share(file["line_covered"], file["line_total"]),
                       Share(file["branch_covered"], file["branch_total"]))
             for file in summary["files"]]
    return files, str(page.relative_to(PROJECT))
