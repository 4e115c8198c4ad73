"""A PostgreSQL cluster of the tests' own: an ordinary user's, in a temporary directory."""

from __future__ import annotations

import ctypes
import os
import shutil
import signal
import subprocess
import tempfile
import time
from pathlib import Path
from typing import Any
from urllib.parse import quote

import psycopg2

PASSWORD = "p%ss/w@rd:1"
_PATIENCE = 300.0
_LIBC = ctypes.CDLL(None)
_PR_SET_PDEATHSIG = 1
_PROGRAMS = sorted(Path("/usr/lib/postgresql").glob("*/bin"), key=lambda path: float(
    path.parent.name))


class Cluster:
    """Servers of one data directory, one after the other; killed and started as a test likes."""

    def __init__(self) -> None:
        assert _PROGRAMS, "PostgreSQL is missing (./dev setup installs it)"
        self._bin = _PROGRAMS[-1]
        # The name of a socket has a hundred characters at most.
        self.directory = Path(tempfile.mkdtemp(prefix="amt-pg-", dir="/tmp"))
        self._user: dict[str, Any] = {}
        if os.geteuid() == 0:
            # The server refuses to run as root.
            self._user = {"user": "postgres", "group": "postgres", "extra_groups": []}
            shutil.chown(self.directory, "postgres", "postgres")
        self._server: subprocess.Popen[bytes] | None = None
        self._databases = 0
        word = self.directory / "word"
        word.write_text(PASSWORD, encoding="utf-8")
        word.chmod(0o644)
        subprocess.run(
            [self._bin / "initdb", "-D", self.directory / "data", "-U", "amt", "-A",
             "scram-sha-256", "--pwfile", word, "-E", "UTF8", "--locale=C.UTF-8", "--no-sync"],
            check=True, capture_output=True, cwd=self.directory, timeout=_PATIENCE, **self._user)
        self.start()

    def start(self) -> None:
        """Start a server, and wait until it answers."""
        deadline = time.monotonic() + _PATIENCE
        while not self._comes_up(deadline):
            # What is left of a killed server may hold the memory for a moment.
            assert time.monotonic() < deadline, self._log()

    def _comes_up(self, deadline: float) -> bool:
        with (self.directory / "log").open("ab") as log:
            self._server = subprocess.Popen(
                [self._bin / "postgres", "-D", self.directory / "data", "-k", self.directory,
                 "-c", "listen_addresses=", "-c", "fsync=off", "-c", "shared_buffers=16MB"],
                stdin=subprocess.DEVNULL, stdout=log, stderr=log, cwd=self.directory,
                # Tests that are killed leave no server behind.
                preexec_fn=lambda: _LIBC.prctl(_PR_SET_PDEATHSIG, signal.SIGQUIT), **self._user)
        while self._server.poll() is None:
            assert time.monotonic() < deadline, self._log()
            try:
                self.connect("postgres").close()
                return True
            except psycopg2.OperationalError:
                time.sleep(0.02)
        return False

    def _log(self) -> str:
        return (self.directory / "log").read_text(encoding="utf-8", errors="replace")[-4000:]

    def connect(self, database: str) -> Any:
        """A connection beside the store's."""
        return psycopg2.connect(host=str(self.directory), user="amt", password=PASSWORD,
                                dbname=database)

    def new_database(self) -> str:
        """The URL of an empty database."""
        assert self._server is not None
        if self._server.poll() is not None:
            # A test that failed has left it like this.
            self.start()
        self._databases += 1
        name = f"line{self._databases}"
        connection = self.connect("postgres")
        connection.autocommit = True
        connection.cursor().execute(f"CREATE DATABASE {name}")
        connection.close()
        return self.url(name)

    def url(self, database: str) -> str:
        """How the store is told of a database."""
        return (f"postgresql+psycopg2://amt:{quote(PASSWORD, safe='')}@/{database}"
                f"?host={self.directory}")

    def end(self, how: signal.Signals = signal.SIGKILL) -> None:
        """End the server at once: SIGQUIT leaves no server process, SIGKILL only orphans."""
        assert self._server is not None
        self._server.send_signal(how)
        self._server.wait(_PATIENCE)

    def close(self) -> None:
        """End everything."""
        if self._server is not None and self._server.poll() is None:
            self.end(signal.SIGQUIT)
        shutil.rmtree(self.directory, ignore_errors=True)
