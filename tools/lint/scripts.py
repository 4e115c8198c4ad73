"""The scripts: shell and Python."""

import shutil
import sys

from tools.lint.files import of_kind, shell_files
from tools.lint.verdict import Verdict, plain
from tools.project import PROJECT

CACHES = PROJECT / "build" / "mypy"

# Tests say what they take and give where a reader needs it, not everywhere.
RELAXED_TYPES = ("--allow-untyped-defs", "--allow-incomplete-defs", "--allow-untyped-calls",
                 "--allow-untyped-decorators", "--allow-any-generics", "--no-warn-return-any")

# Whose support files a folder of tests uses beside its own.
BORROWED = {"tests/line": ("tests/station",), "tests/cross": ("tests/system",)}


def check_shell(files: list[str]) -> Verdict:
    """Do the shell scripts do what they look like?"""
    return plain(shell_files(files), ["shellcheck", "-x"])


def check_style(files: list[str]) -> Verdict:
    """Is the Python laid out as agreed, and free of names that nobody uses?"""
    return plain(of_kind(files, ".py"), [sys.executable, "-m", "flake8"])


def type_runs(files: list[str]) -> dict[str, list[str]]:
    """The files of each run of mypy: a folder of tests is a root of its own."""
    folders: dict[str, list[str]] = {}
    for name in of_kind(files, ".py"):
        parts = name.split("/")
        folders.setdefault("/".join(parts[:2]) if parts[0] == "tests" else "", []).append(name)
    return folders


def look_at_types(folder: str, names: list[str]) -> Verdict:
    """Run mypy over the files of a folder, whose options, and so whose cache, are its own."""
    cache = CACHES / (folder.replace("/", "-") or "packages")
    command = [sys.executable, "-m", "mypy", "--no-error-summary", "--explicit-package-bases",
               f"--cache-dir={cache}", *(RELAXED_TYPES if folder else ())]
    places = (".", folder, *BORROWED.get(folder, ())) if folder else (".",)
    roots = ":".join(str(PROJECT / place) for place in places)
    verdict = plain(names, command, MYPYPATH=roots)
    if any("Traceback" in text or "INTERNAL ERROR" in text for text in verdict.findings):
        # It stumbles over what its cache says of modules that have gone.
        shutil.rmtree(cache, ignore_errors=True)
        verdict = plain(names, command, MYPYPATH=roots)
    return verdict


def check_types(files: list[str]) -> Verdict:
    """Do the Python types fit? Strictly, but for the tests."""
    verdict = Verdict(0)
    for folder, names in type_runs(files).items():
        one = look_at_types(folder, names)
        verdict.checked += one.checked
        verdict.findings += one.findings
    return verdict
