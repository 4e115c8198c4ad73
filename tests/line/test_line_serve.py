"""``amt-station serve``: the pages of records as a command."""

from __future__ import annotations

import json
import re
import signal
import socket
import subprocess
import urllib.error
import urllib.request
from pathlib import Path
from typing import Any, Iterator

import pytest
from line_documents import record
from line_page import PATIENCE
from station_peer import ROOT, Run, station_command, station_environment

from amt_line.store import Store


class Served:
    """The command in a process of its own."""

    def __init__(self, folder: Path, *arguments: str) -> None:
        self.process = subprocess.Popen(
            station_command("serve", *arguments), cwd=ROOT, text=True,
            env=station_environment(XDG_STATE_HOME=str(folder / "state")),
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE)
        assert self.process.stderr is not None
        self.said = [self.process.stderr.readline()]
        while not self.said[-1].startswith("page: "):
            assert self.said[-1], f"it has ended: {self.said}"
            self.said.append(self.process.stderr.readline())
        self.url = self.said[-1].removeprefix("page: ").strip()

    def get(self, path: str, cookie: str = "") -> tuple[int, str]:
        """Status and text of a page."""
        asked = urllib.request.Request(self.url.partition("?")[0] + path.lstrip("/"),
                                       headers={"Cookie": cookie} if cookie else {})
        try:
            with urllib.request.urlopen(asked, timeout=PATIENCE) as response:
                return response.status, response.read().decode()
        except urllib.error.HTTPError as error:
            return error.code, error.read().decode()

    def end(self, number: signal.Signals = signal.SIGTERM) -> tuple[int, str, str]:
        """End it: exit status, standard output, and what it still had to say."""
        self.process.send_signal(number)
        out, said = self.process.communicate(timeout=PATIENCE)
        return self.process.returncode, out, said


@pytest.fixture
def served(tmp_path: Path) -> Iterator[Any]:
    """Starts the command; whatever is still running at the end is killed."""
    started: list[Served] = []

    def serve(*arguments: str) -> Served:
        started.append(Served(tmp_path, *arguments))
        return started[-1]

    yield serve
    for one in started:
        if one.process.poll() is None:
            one.process.kill()
        one.process.communicate()


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGINT])
def test_records_are_served_until_a_signal(served: Any, tmp_path: Path,
                                           number: signal.Signals) -> None:
    url = f"sqlite:///{tmp_path / 'line.sqlite'}"
    with Store.open(url) as store:
        store.put(record(1))
    command = served("--store", url, "--http", "0", "--json")
    assert re.fullmatch(r"http://127\.0\.0\.1:\d+/", command.url)
    status, text = command.get("/runs")
    assert status == 200 and "KEL0000000001" in text
    assert command.get("/live")[0] == 404, "there is no line"
    status, out, said = command.end(number)
    assert (status, json.loads(out), said) == (0, {"ok": True, "url": command.url}, "")


def test_the_stations_own_store_is_the_default(served: Any, tmp_path: Path) -> None:
    command = served("--http", "0")
    assert "No run fits" in command.get("/runs")[1]
    assert (tmp_path / "state" / "amt-station" / "line.sqlite").is_file()
    assert command.end()[0] == 0


def test_on_another_address_a_token_is_printed_and_kept(served: Any, tmp_path: Path) -> None:
    first = served("--http", "0.0.0.0:0")
    token = first.url.partition("?token=")[2]
    assert re.fullmatch("[a-z2-9]{5}(-[a-z2-9]{5}){3}", token)
    assert first.get("/runs")[0] == 401
    assert first.get("/runs", f"amt-token={token}")[0] == 200
    assert first.end()[0] == 0
    path = tmp_path / "state" / "amt-station" / "page-token"
    assert path.read_text() == f"{token}\n" and path.stat().st_mode & 0o077 == 0
    again = served("--http", "0.0.0.0:0")
    assert again.url.partition("?token=")[2] == token
    again.end()


def test_a_database_that_is_away_is_said_so_and_served_later(served: Any, tmp_path: Path) -> None:
    command = served("--http", "0", "--store",
                     f"postgresql+psycopg2://nobody@/line?host={tmp_path}")
    assert len(command.said) == 2 and str(tmp_path) in command.said[0]
    assert command.get("/runs")[0] == 503
    assert command.get("/static/house.css")[0] == 200
    assert command.end()[0] == 0


@pytest.mark.parametrize("arguments, status, said", [
    (("--http", "x"), 2, "--http 'x': a port, or HOST:PORT, is needed"),
    (("--http", "no such host.invalid:0"), 2, "the page cannot be served there"),
    (("--store", "mysql://x"), 2, "is no database that can be used"),
    (("extra",), 2, "extra")])
def test_what_cannot_be_served_is_a_clear_error(run_station: Run, arguments: tuple[str, ...],
                                                status: int, said: str) -> None:
    ended = run_station("serve", *arguments)
    assert (ended.returncode, said in ended.stderr) == (status, True), ended.stderr
    assert len(ended.stderr.splitlines()) == 1


def test_a_port_in_use_is_a_clear_error(run_station: Run) -> None:
    with socket.create_server(("127.0.0.1", 0)) as other:
        ended = run_station("serve", "--http", str(other.getsockname()[1]))
    assert ended.returncode == 2 and "Address already in use" in ended.stderr
