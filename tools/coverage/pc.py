"""What the tests run of the station and of the line: their own processes, and the programs."""

import json
import os
import shutil
import subprocess
import sys
from dataclasses import replace
from pathlib import Path
from typing import Sequence

from tools.coverage.floors import FileCount, Share
from tools.project import PROJECT
from tools.suites import Suite

WORK = PROJECT / "build" / "coverage-pc"
REPORT = PROJECT / "build" / "coverage-pc-report"
PACKAGES = ("amt_station", "amt_line")
SETTINGS, STARTER, DATA = WORK / "settings.ini", WORK / "start", WORK / "counts"

# Where a process that counts finds its settings.
STARTS = "COVERAGE_PROCESS_START"

# The suites whose tests run the packages, or start what runs them.
NAMES = ("station",)


def _prepare() -> dict[str, str]:
    """What makes each Python that the tests start count as well."""
    shutil.rmtree(WORK, ignore_errors=True)
    STARTER.mkdir(parents=True)
    sources = "\n    ".join(str(PROJECT / name) for name in PACKAGES)
    SETTINGS.write_text(
        f"[run]\nparallel = true\nsigterm = true\ndata_file = {DATA}\n"
        f"concurrency = thread,multiprocessing\nsource =\n    {sources}\n"
        "[report]\nexclude_lines =\n    pragma: no cover\n    if TYPE_CHECKING:\n"
        "    raise NotImplementedError\n    ^\\s*\\.\\.\\.$\n")
    # Who takes the variable away is not counted, and imports nothing for it either.
    (STARTER / "sitecustomize.py").write_text(
        f"import os\nif '{STARTS}' in os.environ:\n    import coverage\n"
        "    coverage.process_startup()\n")
    paths = [str(STARTER), os.environ.get("PYTHONPATH", "")]
    return {STARTS: str(SETTINGS),
            "PYTHONPATH": os.pathsep.join(path for path in paths if path)}


def counting(suites: Sequence[Suite]) -> list[Suite]:
    """The suites; those of the packages count, in every process that they start."""
    environment = _prepare()
    return [replace(suite, environment={**suite.environment, **environment})
            if suite.name in NAMES else suite for suite in suites]


def _coverage(command: str, *options: str) -> None:
    subprocess.run([sys.executable, "-m", "coverage", command, f"--rcfile={SETTINGS}", *options],
                   cwd=PROJECT, check=True, stdout=subprocess.DEVNULL)


def _path(name: str) -> str:
    path = Path(name)
    return str(path.relative_to(PROJECT)) if path.is_absolute() else name


def report() -> tuple[list[FileCount], str]:
    """Write the report for people; what each file's counts are, and where the report is.

    Where nothing was counted there are no files, and no report.
    """
    if any(WORK.glob("counts.*")):
        _coverage("combine", "--quiet")
    if not DATA.is_file():
        return [], ""
    _coverage("html", "--quiet", "-d", str(REPORT))
    _coverage("json", "--quiet", "-o", str(REPORT / "summary.json"))
    summary = json.loads((REPORT / "summary.json").read_text())
    files = [FileCount(_path(name), Share(file["summary"]["covered_lines"],
                                          file["summary"]["num_statements"]), Share(0, 0))
             for name, file in summary["files"].items()]
    return files, str((REPORT / "index.html").relative_to(PROJECT))
