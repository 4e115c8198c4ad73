"""``amt-station line`` as it is typed: usage, exit status, signals, and what a kill leaves."""

from __future__ import annotations

import json
import os
import signal
import subprocess
import time
from pathlib import Path
from typing import Any, Iterator

import pytest
from line_bench import ADC, Script, write_plan
from line_slots import PATIENCE, Socket, battery
from station_peer import ROOT, Run, station_command, station_environment
from amt_station.cli.main import run as carry_out
from test_line_view import Screen, make_screens  # noqa: F401

INPUTS = "[input.sn]\npattern = 'K[0-9]+'\n"
WAIT = "[[step]]\nwait = 600\n[[always]]\nat = 'AT+LAST'\n"


@pytest.fixture(name="sockets")
def make_sockets(tmp_path: Path) -> Iterator[dict[str, Socket]]:
    """Places A and B."""
    made = {name: Socket(tmp_path / name) for name in "AB"}
    yield made
    for socket in made.values():
        socket.pull()


def slots(sockets: dict[str, Socket]) -> list[str]:
    return [f"--slot={name}={socket.path}" for name, socket in sockets.items()]


class Station:
    """The station on a line, in a process of its own, with its events."""

    def __init__(self, folder: Path, *arguments: str) -> None:
        self.path = folder / "events"
        self.path.touch()
        self.process = subprocess.Popen(
            station_command("line", *arguments, "--events", str(self.path)), cwd=ROOT,
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
            env=station_environment(XDG_STATE_HOME=str(folder / "state")))

    def events(self) -> list[dict[str, Any]]:
        """The whole lines so far."""
        text = self.path.read_text(encoding="utf-8")
        return [json.loads(line) for line in text.splitlines(keepends=True) if line[-1:] == "\n"]

    def wait(self, event: str, count: int = 1, **values: Any) -> dict[str, Any]:
        """The COUNT-th event with these values, as soon as it is there."""
        end = time.monotonic() + PATIENCE
        while True:
            found = [item for item in self.events() if item["event"] == event
                     and all(item.get(name) == value for name, value in values.items())]
            if len(found) >= count:
                return found[count - 1]
            assert time.monotonic() < end and self.process.poll() is None, self.events()[-10:]
            time.sleep(0.02)

    def end(self, number: int = signal.SIGTERM) -> tuple[int, str]:
        """Send a signal; the exit status and all that was said."""
        self.process.send_signal(number)
        said, _ = self.process.communicate(timeout=PATIENCE)
        return self.process.returncode, said


@pytest.mark.parametrize("arguments, words", [
    ([], "no slots: give --slot NAME=PORT"),
    (["--slot", "A=x", "--simulate", "2"], "--slot and --simulate contradict each other"),
    (["--slot", "A=x", "--slot", "B=x"], "slots A and B have one port"),
    (["--slot", "A=x", "--slot", "A=y"], "two slots have the name 'A'"),
    (["--slot", "A"], "a name, '=' and a port are needed"),
    (["--slots", "none.toml"], "none.toml: No such file"),
    (["--slot", "A=x"], "slot A: no value for sn: give --inputs; there is no terminal"),
    (["--simulate", "2"], "slot 1: no value for sn"),
    (["--slot", "A=x", "--inputs", "bad.csv"], "slot A, row 1: input sn: 'X1' is not of the form"),
    (["--slot", "B=x", "--inputs", "bad.csv"], "line 2: the line has no slot 'A'"),
    (["--slot", "A=x", "--answer", "screen=yes"], "--answer: the plan has no operator step"),
    (["--slot", "A=x", "-p", "y"], "a line has its ports by --slot or --slots"),
    (["--slot", "A=x", "--trace", "t"], "--trace is for one port"),
    (["--slot", "A=x", "--app"], "the plan is for the pc channel, --app contradicts it"),
    (["--slot", "A=x", "--replug", "1"], "--replug is for the handsets of --simulate"),
    (["--slot", "A=x", "--no-records", "--records", "r"], "contradict each other"),
    (["--slot", "A=x", "--no-records", "--store", "sqlite:///x"], "contradict each other"),
    (["--slot", "A=x", "--json", "--events", "-"], "both go to standard output"),
    (["--slot", "A=x", "--inputs", "good.csv", "--events", "no/such/file"],
     "--events no/such/file: No such file"),
    (["--slot", "A=x", "--inputs", "good.csv", "--records", "good.csv/r"],
     "no record can be written into"),
    (["--simulate", "0"], "0 is not in the range"),
])
def test_usage_is_told_and_nothing_is_sent(tmp_path: Path, arguments: list[str], words: str,
                                           monkeypatch: Any, capsys: Any) -> None:
    (tmp_path / "bad.csv").write_text("slot,sn\nA,X1\n", encoding="utf-8")
    (tmp_path / "good.csv").write_text("slot,sn\nA,K1\n", encoding="utf-8")
    plan = write_plan(tmp_path, "channel = 'pc'\n" + INPUTS + ADC)
    monkeypatch.chdir(tmp_path)
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    status = carry_out(["line", str(plan), *arguments])
    said = capsys.readouterr().err
    assert status == 2 and words in said and len(said.splitlines()) == 1, said


def test_once_with_a_fail(tmp_path: Path, sockets: dict[str, Socket], records: Path,
                          run_station: Run) -> None:
    sockets["A"].plug(battery(15))
    sockets["B"].plug(battery(99))
    table = tmp_path / "rows.csv"
    table.write_text("slot,sn\nA,K1\nB,K2\n", encoding="utf-8")
    result = run_station("line", str(write_plan(tmp_path, "dut = '${sn}'\n" + INPUTS + ADC)),
                         *slots(sockets), "--once", "--inputs", str(table), "--records",
                         str(records), "--station", "S", "--operator", "O", "--json")
    assert result.returncode == 1, result.stderr
    board = json.loads(result.stdout)
    assert (board["ok"], board["exit_status"]) == (False, 1)
    assert [slot["last"]["verdict"] for slot in board["slots"]] == ["PASS", "FAIL"]
    documents = [json.loads(path.read_text()) for path in sorted(records.glob("*.json"))]
    assert [(item["dut"], item["slot"], item["station"], item["operator"], item["verdict"])
            for item in documents] == [("K1", "A", "S", "O", "PASS"), ("K2", "B", "S", "O", "FAIL")]
    assert "B: *** FAIL ***" in result.stderr and "1 PASS, 1 FAIL" in result.stderr


@pytest.mark.parametrize("number, status", [(signal.SIGTERM, 143), (signal.SIGINT, 130)])
def test_a_signal_ends_all_slots_in_order(tmp_path: Path, sockets: dict[str, Socket],
                                          records: Path, number: int, status: int) -> None:
    scripts = {name: Script() for name in sockets}
    for name, socket in sockets.items():
        socket.plug(scripts[name])
    station = Station(tmp_path, str(write_plan(tmp_path, WAIT)), *slots(sockets), "--records",
                      str(records))
    for name in sockets:
        station.wait("step-began", slot=name)
    ended, said = station.end(number)
    assert ended == status, said
    assert "2 runs: 0 PASS, 0 FAIL, 0 ERROR, 2 ABORTED" in said
    assert all(script.asked[-1] == "AT+LAST" for script in scripts.values())
    assert {json.loads(path.read_text())["state"] for path in records.glob("*.json")} == {"aborted"}
    last = {event["slot"]: event["state"] for event in station.events()
            if event["event"] == "slot-state"}
    assert last == {"A": "ended", "B": "ended"}


@pytest.mark.parametrize("moment", ["run-began", "step-ended", "run-ended"])
def test_a_kill_at_any_moment_loses_nothing(tmp_path: Path, sockets: dict[str, Socket],
                                            records: Path, run_station: Run, moment: str) -> None:
    """What was begun is on the disk, whole; the next start goes on and doubles nothing."""
    plan = str(write_plan(tmp_path, ADC + "[[step]]\nat = 'AT+X'\n"))
    for socket in sockets.values():
        socket.plug(battery(15))
    station = Station(tmp_path, plan, *slots(sockets), "--records", str(records))
    station.wait(moment)
    status, _ = station.end(signal.SIGKILL)
    assert status == -signal.SIGKILL
    begun = {event["run"]: event for event in station.events() if event["event"] == "run-began"}
    ended = {event["run"] for event in station.events() if event["event"] == "run-ended"}
    found = {}
    for path in records.glob("*.json"):
        document = json.loads(path.read_text())
        found[document["run"]] = document["state"]
    assert set(begun) <= set(found), "a run that was told has its record"
    assert all(found[run] == "ended" for run in ended)
    for left in records.glob(".*"):
        left.unlink()
    result = run_station("line", plan, *slots(sockets), "--records", str(records), "--once")
    assert result.returncode == 0, result.stdout + result.stderr
    documents = [json.loads(path.read_text()) for path in records.glob("*.json")]
    assert len({document["run"] for document in documents}) == len(documents) == len(found) + 2


def test_events_on_standard_output(tmp_path: Path, sockets: dict[str, Socket], run_station: Run
                                   ) -> None:
    for socket in sockets.values():
        socket.plug(battery(15))
    result = run_station("line", str(write_plan(tmp_path, ADC)), *slots(sockets), "--once",
                         "--events", "-", "--no-records")
    assert result.returncode == 0, result.stderr
    events = [json.loads(line) for line in result.stdout.splitlines()]
    assert {event["slot"] for event in events if event["event"] == "run-ended"} == {"A", "B"}
    assert {event["event"] for event in events} >= {"slot-state", "run-began", "step-ended",
                                                    "run-ended"}
    assert "A: *** PASS ***" in result.stderr


def test_a_full_disk_for_the_events_costs_no_slot(tmp_path: Path, sockets: dict[str, Socket],
                                                  run_station: Run) -> None:
    for socket in sockets.values():
        socket.plug(battery(15))
    result = run_station("line", str(write_plan(tmp_path, ADC)), *slots(sockets), "--once",
                         "--events", "/dev/full", "--no-records")
    assert result.returncode == 7 and "2 runs: 2 PASS" in result.stdout
    assert "/dev/full: the events can no longer be written: No space left" in result.stderr


def test_a_full_disk_for_the_records(tmp_path: Path, sockets: dict[str, Socket]) -> None:
    """No run begins without its record; the slot shows it and goes on when there is room."""
    folder = tmp_path / "records"
    script = battery(15)
    station = Station(tmp_path, str(write_plan(tmp_path, ADC)), *slots(sockets), "--records",
                      str(folder))
    station.wait("slot-state", slot="A")
    folder.rmdir()
    folder.write_text("in the way")
    sockets["A"].plug(script)
    shown = station.wait("slot-state", state="defect")
    assert "no record can be written" in shown["text"] and 224 not in script.asked
    folder.unlink()
    sockets["A"].pull()
    sockets["A"].plug(battery(15))
    station.wait("run-ended", verdict="PASS")
    assert station.end()[0] == 143 and len(list(folder.glob("*.json"))) == 1


def test_questions_at_the_terminal_name_their_slot(tmp_path: Path, sockets: dict[str, Socket],
                                                   screens: list[Screen]) -> None:
    plan = write_plan(tmp_path, "[input.sn]\nprompt = 'Scan it'\npattern = 'K[0-9]+'\n" + ADC
                      + "[[step]]\nname = 'screen'\nask = 'White?'\n")
    sockets["A"].plug(battery(15))
    screen = Screen("line", str(plan), f"--slot=A={sockets['A'].path}", "--once", "--no-records")
    screens.append(screen)
    screen.until("A: Scan it:")
    screen.type("X1")
    screen.until("is not of the form")
    screen.type("K1")
    screen.until("A: White? [yes/no]")
    screen.type("yes")
    assert screen.end() == 0
    assert "PASS" in screen.seen and "1 runs: 1 PASS" in screen.seen


def test_clean_exit_gives_the_terminal_back(tmp_path: Path, sockets: dict[str, Socket],
                                            screens: list[Screen]) -> None:
    import termios

    screen = Screen("line", str(write_plan(tmp_path, ADC)), *slots(sockets), "--no-records")
    screens.append(screen)
    before = termios.tcgetattr(screen.master)[3]
    screen.until("no handset at")
    assert not termios.tcgetattr(screen.master)[3] & termios.ECHO
    screen.process.send_signal(signal.SIGINT)
    assert screen.end() == 130
    assert before & termios.ECHO
    assert os.isatty(screen.master)
