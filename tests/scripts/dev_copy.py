"""A project of one's own to run ./dev in: nothing of it touches the real one."""

import os
import shlex
import shutil
import stat
import sys
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]


class Copy:
    """A copy of ./dev and its tools, and programs of the test's in place of the system's."""

    def __init__(self, folder: Path) -> None:
        self.root = folder / "project"
        self.programs = folder / "programs"
        self.elsewhere = folder / "elsewhere"
        for path in (self.root, self.programs, self.elsewhere):
            path.mkdir()
        shutil.copy(ROOT / "dev", self.root)
        for name in ("tools", "amt_line", "amt_station", "amt_simulator"):
            shutil.copytree(ROOT / name, self.root / name,
                            ignore=shutil.ignore_patterns("__pycache__"))
        # Every package is there, unless a test says otherwise.
        self.program("dpkg-query", "echo install ok installed")
        self.program("apt-get", f"echo apt-get >>{folder}/calls; exit 1")
        self.program("cmake", f"echo cmake >>{folder}/calls; exit 1")
        self._calls = folder / "calls"

    def program(self, name: str, script: str) -> None:
        """Put a shell script in a program's place."""
        path = self.programs / name
        path.write_text(f"#!/bin/sh\n{script}\n")
        path.chmod(path.stat().st_mode | stat.S_IXUSR)

    def slow_program(self, name: str, began: Path) -> None:
        """Put one in a program's place that makes a file and then does not come to an end.

        One process: a shell between two of them forgets a signal that comes just then.
        """
        code = f"import pathlib, time; pathlib.Path({str(began)!r}).touch(); time.sleep(600)"
        self.program(name, f"exec {sys.executable} -c {shlex.quote(code)} 2>/dev/null")

    @property
    def calls(self) -> list[str]:
        """The calls of the programs that a test has not replaced."""
        return self._calls.read_text().split() if self._calls.exists() else []

    @property
    def environment(self) -> dict[str, str]:
        """Where the test's programs come first."""
        return {**os.environ, "PATH": f"{self.programs}:{os.environ['PATH']}"}
