"""The unit tests of a build, by ctest: how far they are, and which did not pass."""

import re
from pathlib import Path
from typing import Mapping

from tools import children
from tools.progress import Progress
from tools.project import CORES
from tools.results import Results, describe, read_results

# ctest's line for a test that has ended.
STEP = re.compile(rb"^ *(\d+)/(\d+) Test +#", re.MULTILINE)


def run_ctest(build: Path, name: str, *options: str, report: Path | None = None,
              environment: Mapping[str, str] | None = None,
              tell: children.Taker = children.show) -> Results:
    """Run the tests of a BUILD; TELL gets the failed ones with their output, and the skipped.

    A runner that ends badly without a failed test counts as one.
    """
    report = report or build / "unit.xml"
    report.unlink(missing_ok=True)
    progress = Progress(name)

    def take(piece: bytes) -> None:
        steps = STEP.findall(piece)
        if steps:
            progress.show(int(steps[-1][0]), int(steps[-1][1]))

    status = children.run(
        ["ctest", "--test-dir", str(build), "--no-tests=error", "-j", str(CORES),
         "--output-junit", str(report), *options], take, environment)
    progress.close()
    results = read_results(report)
    if results.failed or results.skipped:
        tell(f"{describe(results)}\n".encode(errors="backslashreplace"))
    if status != 0 and results.count.failed == 0:
        tell(f"{name}: ctest ended with status {status}\n".encode())
        results.count.failed = 1
    return results
