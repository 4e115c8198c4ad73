"""Look at every source file without running it: `./dev lint`."""

import argparse
import sys
import time

from tools.lint.cpp import check_format, check_tidy
from tools.lint.files import changed_since, has_commit, project_files, relative
from tools.lint.scripts import check_shell, check_style, check_types
from tools.lint.structure import check_structure
from tools.lint.tested import check_tested
from tools.lint.verdict import Check
from tools.project import die, note

CHECKS: dict[str, Check] = {
    "structure": check_structure,
    "tested": check_tested,
    "clang-format": check_format,
    "shellcheck": check_shell,
    "flake8": check_style,
    "mypy": check_types,
    "clang-tidy": check_tidy,
}

# These look at the whole house, whichever files the caller means.
WHOLE = ("structure", "tested")


def choose_files(paths: list[str], since: str | None) -> list[str]:
    """The files that the caller means."""
    files = project_files([relative(path) for path in paths])
    if not files:
        die("no file of the project there")
    if since is None:
        return files
    if not has_commit(since):
        note(f"this clone has no commit {since}: all files are looked at")
        return files
    return sorted(set(files).intersection(changed_since(since)))


def main() -> int:
    """Run every check and give one verdict."""
    parser = argparse.ArgumentParser(prog="./dev lint", description=__doc__)
    parser.add_argument("path", nargs="*", help="only files below these")
    parser.add_argument("--since", metavar="COMMIT",
                        help="only files that have changed since a commit: HEAD, HEAD~1 ...")
    parser.add_argument("--check", action="append", choices=CHECKS,
                        help="only this check, or these (given more than once)")
    options = parser.parse_args()
    chosen = options.check or list(CHECKS)
    files = choose_files(options.path, options.since)
    failed, checked = [], 0
    for name in chosen:
        print(f"== {name}", file=sys.stderr, end="", flush=True)
        started = time.monotonic()
        verdict = CHECKS[name](files)
        checked += 0 if name in WHOLE else verdict.checked
        print(f": {verdict.checked} files in {time.monotonic() - started:.0f} s", file=sys.stderr)
        if verdict.findings:
            failed.append(name)
            print("\n".join(verdict.findings), flush=True)
    if failed:
        print(f"FAIL: {', '.join(failed)}")
        return 1
    if not checked and not options.since and not set(WHOLE).issuperset(chosen):
        die(f"no check looks at files of this kind: {', '.join(files[:5])}"
            f"{' ...' if len(files) > 5 else ''}")
    print(f"PASS: {len(files)} files, {len(chosen)} checks")
    return 0
