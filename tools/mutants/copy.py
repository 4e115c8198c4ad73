"""A copy of the project, in which something may be broken."""

import os
import re
import shutil
import sys
from pathlib import Path
from typing import Mapping, Sequence

from tools import children
from tools.project import PROJECT, git

COPY = PROJECT / "build" / "mutants"
# A test of something broken that takes longer hangs, which is a way to be found.
TEST_SECONDS = 120


def _is_same(source: Path, target: Path) -> bool:
    if source.is_symlink() or target.is_symlink():
        return target.is_symlink() and os.readlink(source) == os.readlink(target)
    return target.is_file() and source.read_bytes() == target.read_bytes()


def bring_up_to_date() -> None:
    """Bring the copy to what the project is; what is unchanged stays, and need not be built."""
    listed = git("ls-files", "-z", "--cached", "--others", "--exclude-standard")
    names = {name for name in listed.split("\0") if name and os.path.lexists(PROJECT / name)}
    for name in names:
        source, target = PROJECT / name, COPY / name
        if not _is_same(source, target):
            target.parent.mkdir(parents=True, exist_ok=True)
            target.unlink(missing_ok=True)
            shutil.copy(source, target, follow_symlinks=False)
    for path in COPY.rglob("*"):
        inside = path.relative_to(COPY)
        if (inside.parts[0] != "build" and "__pycache__" not in inside.parts
                and not path.is_dir() and str(inside) not in names):
            path.unlink()


def quietly(command: Sequence[str],
            environment: Mapping[str, str] | None = None) -> tuple[int, str]:
    """Run a command in the copy: its status, and what it has said."""
    said: list[bytes] = []
    status = children.run(command, said.append, environment, COPY)
    return status, b"".join(said).decode(errors="replace")


def failing_test(*arguments: str, environment: Mapping[str, str] | None = None) -> str:
    """The name of a test in Python that fails; empty when all pass, or there is none."""
    status, said = quietly(
        [sys.executable, "-m", "pytest", "-q", "-x", "-p", "no:cacheprovider",
         f"--timeout={TEST_SECONDS}", *arguments],
        {"CI": "1", **(environment or {})})
    if status in (0, 5):
        return ""
    found = re.search(r"^(?:FAILED|ERROR) (\S+)", said, re.MULTILINE)
    return found.group(1) if found else f"pytest, with status {status}"
