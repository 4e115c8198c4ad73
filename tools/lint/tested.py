"""Which test holds which source: one of its name, or one that the architecture document names."""

import re
from pathlib import Path
from typing import Iterable

from tools.lint.files import cpp_files, of_kind, project_files
from tools.lint.verdict import Verdict
from tools.project import PROJECT

DOCUMENT = "docs/architecture.md"
# A row of the document's table: sources, or rooms of them, and the tests that hold them.
ROW = re.compile(r"^\| ((?:`[^`]+`(?:, )?)+) \| (.*`tests/.*) \|$", re.MULTILINE)
NAME = re.compile(r"`([^`]+)`")
HOUSE = ("amt/", "pub/", "platform/host/")


def read_rows(text: str) -> list[tuple[list[str], list[str]]]:
    """The sources and the tests of each row."""
    return [(NAME.findall(sources), [name for name in NAME.findall(tests)
                                     if name.startswith("tests/")])
            for sources, tests in ROW.findall(text)]


def compare(sources: Iterable[str], tests: Iterable[str],
            rows: Iterable[tuple[list[str], list[str]]], files: Iterable[str]) -> list[str]:
    """Sources that nothing is said to hold, and rows that name what is not there."""
    own = {Path(test).name for test in tests}
    there = list(files)
    named = [name for row in rows for name in row[0]]
    findings = [f"{source}: error: has no {Path(source).stem}-test.cpp, and {DOCUMENT} does not "
                "say which test holds it" for source in sources
                if f"{Path(source).stem}-test.cpp" not in own
                and not any(source == name or source.startswith(f"{name}/") for name in named)]
    findings += [f"{DOCUMENT}: error: {name} is not there"
                 for row in rows for name in [*row[0], *row[1]]
                 if not any(file == name or file.startswith(f"{name.rstrip('/')}/")
                            for file in there)]
    return findings


def check_tested(_files: list[str]) -> Verdict:
    """Has each source of the daemon, and of its stand-ins, a test that holds it?"""
    files = project_files()
    sources = [name for name in cpp_files(files, ".cpp") if name.startswith(HOUSE)]
    tests = [name for name in of_kind(files, "-test.cpp") if name.startswith("tests/unit/")]
    rows = read_rows((PROJECT / DOCUMENT).read_text())
    return Verdict(len(sources), compare(sources, tests, rows, files))
