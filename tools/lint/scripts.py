"""The scripts: shell and Python."""

import sys
from typing import Iterator

from tools.lint.files import of_kind, shell_files
from tools.lint.verdict import Verdict, plain
from tools.project import PROJECT

# Tests say what they take and give where a reader needs it, not everywhere.
RELAXED_TYPES = ("--allow-untyped-defs", "--allow-incomplete-defs", "--allow-untyped-calls",
                 "--allow-untyped-decorators", "--allow-any-generics", "--no-warn-return-any")


def check_shell(files: list[str]) -> Verdict:
    """Do the shell scripts do what they look like?"""
    return plain(shell_files(files), ["shellcheck", "-x"])


def check_style(files: list[str]) -> Verdict:
    """Is the Python laid out as agreed, and free of names that nobody uses?"""
    return plain(of_kind(files, ".py"), [sys.executable, "-m", "flake8"])


def type_runs(files: list[str]) -> Iterator[tuple[list[str], list[str], dict[str, str]]]:
    """Files, options and environment of each run of mypy: a folder of tests is its own root."""
    folders: dict[str, list[str]] = {}
    for name in of_kind(files, ".py"):
        parts = name.split("/")
        folders.setdefault("/".join(parts[:2]) if parts[0] == "tests" else "", []).append(name)
    for folder, names in folders.items():
        if folder:
            roots = f"{PROJECT}:{PROJECT / folder}"
            yield names, ["--explicit-package-bases", *RELAXED_TYPES], {"MYPYPATH": roots}
        else:
            yield names, ["--explicit-package-bases"], {"MYPYPATH": str(PROJECT)}


def check_types(files: list[str]) -> Verdict:
    """Do the Python types fit? Strictly, but for the tests."""
    verdict = Verdict(0)
    for names, options, environment in type_runs(files):
        one = plain(names, [sys.executable, "-m", "mypy", "--no-error-summary", *options],
                    **environment)
        verdict.checked += one.checked
        verdict.findings += one.findings
    return verdict
