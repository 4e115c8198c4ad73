"""A desk to try the documents' commands at: a handset, a home, and the files they speak of."""

from __future__ import annotations

import os
import re
import shlex
import subprocess
import sys
from pathlib import Path
from typing import Callable

from support.command import PATIENCE, PROJECT

PLAN = '''title = "End of line"
dut = "KEL0000000042"

[[step]]
name = "answers"
at = "AT^DSVER"
'''


class Desk:
    """A directory of its own. ``ports`` are the handset's for what the documents call theirs."""

    def __init__(self, folder: Path, find_port: Callable[[str], str]) -> None:
        self.folder = folder / "desk"
        self.home = folder / "home"
        programs = folder / "programs"
        for path in (self.folder, self.home, programs):
            path.mkdir()
        for name, arguments in (("amt-station", "-P -m amt_station"),
                                ("amt-handset", "-P -m amt_simulator"), ("python3", "")):
            program = programs / name
            program.write_text(f'#!/bin/sh\nexec {shlex.quote(sys.executable)} {arguments} "$@"\n',
                               encoding="utf-8")
            program.chmod(0o755)
        self._find_port = find_port
        self.environment = {
            name: value for name, value in os.environ.items()
            if not name.startswith(("AMT_STATION_", "XDG_", "PYTEST_", "NO_COLOR"))}
        # A busy machine needs longer for an answer than what waits for none by itself.
        self.environment |= {"AMT_STATION_TIMEOUT": "60", "HOME": str(self.home),
                             "PYTHONPATH": str(PROJECT),
                             "PATH": f"{programs}:{self.environment['PATH']}"}
        for name in ("PLAN", "end-of-line.toml"):
            self.write(name, PLAN)

    def write(self, name: str, text: str) -> None:
        """A file that is there before anything is typed."""
        (self.folder / name).write_text(text, encoding="utf-8")

    @property
    def state(self) -> Path:
        """Where the station keeps what outlives a command."""
        return self.home / ".local" / "state" / "amt-station"

    def meant(self, text: str) -> str:
        """A command line with a port, a database and files of this desk for those it names."""
        if re.search(r"PORT\b|/dev/tty(ACM|USB)0|\.\.\./pc", text):
            pc = self._find_port("pc")
            text = re.sub(r"(?<![A-Z_])PORT(?![A-Z_])|/dev/tty(ACM|USB)0|\.\.\./pc", pc, text)
        if re.search(r"\bAPP\b", text):
            text = re.sub(r"\bAPP\b", self._find_port("app"), text)
        text = re.sub(r"\bURL\b", f"sqlite:///{self.state}/line.sqlite", text)
        return text.replace("RECORD...", "RECORD")

    def run(self, text: str) -> "subprocess.CompletedProcess[str]":
        """Type a command line; what it exports is there for the next one."""
        text = self.meant(text)
        if text.startswith("export "):
            (setting,) = shlex.split(text)[1:]
            name, _, value = setting.partition("=")
            self.environment[name] = value
        text = text.replace("./dev ", f"{PROJECT}/dev ")
        return subprocess.run(["bash", "-o", "pipefail", "-c", text], cwd=self.folder,
                              env=self.environment, stdin=subprocess.DEVNULL, capture_output=True,
                              text=True, timeout=PATIENCE, check=False)
