"""Runs over a port that goes away and comes back: the whole daemon, a real unplugging."""

from __future__ import annotations

import json
import os
import signal
import subprocess
import sys
from pathlib import Path
from typing import IO, Any, Iterator

import pytest

from amt_simulator import Handset

ROOT = Path(__file__).resolve().parents[2]
PATIENCE = 300

CABLE = """
[[step]]
name = "before"
command = "battery adc"
stop = true

[[step]]
name = "cable"
wait = 0.2
reconnect = 120

[[step]]
name = "after"
command = "imei write"
with = { imei = "490154203237518" }

[[always]]
command = "test-result write"
with = { station = 3, verdict = "${verdict}" }
when = "connected"
"""


class Running:
    """A run in a process of its own, whose lines are read as they come."""

    def __init__(self, handset: Handset, folder: Path, plan: str, *options: str) -> None:
        path = folder / "plan.toml"
        path.write_text(plan, encoding="utf-8")
        self.records = folder / "records"
        self.process = subprocess.Popen(
            [sys.executable, "-m", "amt_station", *options, "run", str(path), "--records",
             str(self.records)],
            cwd=ROOT, env={**os.environ, "PYTHONPATH": str(ROOT), "PYTHONUNBUFFERED": "1"},
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True)
        assert self.process.stdout is not None
        self._lines: IO[str] = self.process.stdout
        self.seen = ""
        self.handset = handset

    def until(self, words: str) -> None:
        """Read on until a line holds these words."""
        for line in self._lines:
            self.seen += line
            if words in line:
                return
        raise AssertionError(f"no {words!r} in {self.seen}")

    def end(self) -> dict[str, Any]:
        """The record, when the run has ended."""
        self.seen += self._lines.read()
        status = self.process.wait(PATIENCE)
        (path,) = self.records.glob("*.json")
        record: dict[str, Any] = json.loads(path.read_text(encoding="utf-8"))
        assert status == record["exit_status"], self.seen
        return record


@pytest.fixture(name="running")
def make_running() -> Iterator[list[Running]]:
    """Runs that are ended at the latest with the test."""
    made: list[Running] = []
    yield made
    for run in made:
        if run.process.poll() is None:
            run.process.kill()
        run.process.communicate()


def replug(handset: Handset) -> None:
    """Pull the cable and put it back as fast as a hand can: the service has ended in between.

    Else the one that is about to end would answer at the new port, and the next one would not hear
    what is sent then.
    """
    ended = len(handset.exits())
    handset.usb.unplug()
    assert not os.path.lexists(handset.directory / "pc")
    assert handset.wait_exit(ended) == 0
    handset.usb.plug()
    assert os.path.lexists(handset.directory / "pc"), "another port under the same name"


def verdicts(record: dict[str, Any]) -> list[str]:
    """How each step ended."""
    return [step["verdict"] for step in record["steps"]]


def test_a_run_goes_on_over_an_unplugging(make_handset: Any, tmp_path: Path,
                                          running: list[Running]) -> None:
    handset = make_handset("pc", ports=True)
    port = handset.directory / "pc"
    run = Running(handset, tmp_path, CABLE, "-p", str(port))
    running.append(run)
    run.until("cable ...")
    replug(handset)
    record = run.end()
    assert (verdicts(record), record["verdict"]) == (["pass"] * 4, "PASS"), run.seen
    assert handset.text("/amt/imei.txt") == "490154203237518"
    assert handset.text("/amt/amt_result.txt").split("\n")[3] == "1"
    purposes = [exchange["purpose"] for exchange in record["steps"][1]["exchanges"]]
    assert "place" in purposes, "the link's place is found again before anything else is sent"


def test_a_cable_that_stays_out_ends_the_run(make_handset: Any, tmp_path: Path,
                                             running: list[Running]) -> None:
    handset = make_handset("pc", ports=True)
    run = Running(handset, tmp_path, CABLE.replace("120", "2"), "-p", str(handset.directory / "pc"))
    running.append(run)
    run.until("cable ...")
    handset.usb.unplug()
    record = run.end()
    assert verdicts(record) == ["pass", "error", "skipped", "skipped"], run.seen
    assert (record["verdict"], record["exit_status"]) == ("ERROR", 3)
    assert "was not back within 2 s" in record["reason"]


SILENT = """
[[step]]
name = "silent"
at = "AT+SILENT"
timeout = 3600
RECONNECT

[[step]]
name = "behind"
command = "battery adc"
"""


@pytest.mark.parametrize("key, expected, status", [
    ("", ["error", "skipped"], 3), ("reconnect = 120", ["error", "pass"], 3)])
def test_a_cable_that_nobody_expected(make_handset: Any, tmp_path: Path, running: list[Running],
                                      key: str, expected: list[str], status: int) -> None:
    """What was being waited for is an error; the run goes on only where the step says so."""
    handset = make_handset("pc", ports=True)
    handset.modem.open()
    run = Running(handset, tmp_path, SILENT.replace("RECONNECT", key), "-p",
                  str(handset.directory / "pc"))
    running.append(run)
    handset.modem.read_until(b"AT+SILENT\r")
    replug(handset)
    record = run.end()
    assert verdicts(record) == expected, run.seen
    assert (record["verdict"], record["exit_status"]) == ("ERROR", status)


MODE = """
channel = "app"

[[step]]
command = "mode enter"
with = { mode = 1 }
"""


def test_a_mode_change_leads_from_one_plan_to_the_next(make_handset: Any, tmp_path: Path,
                                                       running: list[Running]) -> None:
    """The app's plan ends with it; the PC line's waits for the port that comes with the cable."""
    handset = make_handset("packet", ports=True)
    port = handset.directory / "pc"
    first, second = tmp_path / "first", tmp_path / "second"
    first.mkdir()
    second.mkdir()
    running.append(Running(handset, first, MODE, "-p", str(handset.directory / "app")))
    record = running[0].end()
    assert record["verdict"] == "PASS", running[0].seen
    waiting = subprocess.Popen(
        [sys.executable, "-m", "amt_station", "-p", str(port), "wait", "--for", str(PATIENCE)],
        cwd=ROOT, stdout=subprocess.PIPE, text=True)
    handset.usb.plug()
    assert waiting.communicate(timeout=PATIENCE)[0] == f"{port}\n" and waiting.returncode == 0
    handset.wait_ready(path="pc")
    running.append(Running(handset, second, '[[step]]\ncommand = "battery adc"\n', "-p", str(port)))
    assert running[1].end()["verdict"] == "PASS", running[1].seen


def test_a_service_that_starts_again_is_found_again(make_handset: Any, tmp_path: Path,
                                                    running: list[Running]) -> None:
    """The port stays; what was sent into the pause passes nothing."""
    handset = make_handset("pc", ports=True)
    run = Running(handset, tmp_path, CABLE, "-p", str(handset.directory / "pc"))
    running.append(run)
    run.until("cable ...")
    handset.signal(signal.SIGTERM)
    assert handset.wait_exit() == 0
    record = run.end()
    assert (verdicts(record), record["verdict"]) == (["pass"] * 4, "PASS"), run.seen
