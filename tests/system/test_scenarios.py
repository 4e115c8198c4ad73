"""The ready scenarios, each as a station sees it; `amt-handset run`, `scenarios`, `up --json`."""

import json
import os
import signal
import subprocess
import sys
from pathlib import Path
from typing import Any, Callable

import pytest

from amt_simulator import scenarios, visit
from amt_simulator.errors import HandsetError
from conftest import HandsetFactory
from support.command import COMMAND, PATIENCE, PROJECT, handset, output

STATION = [sys.executable, "-m", "amt_station"]
APP = ["--path", "packet"]

# What is asked of a handset in a scenario, on which path; the exit status, and words of what comes.
SEEN: dict[str, list[tuple[list[str], list[str], int, str]]] = {
    "slow-modem": [([], ["--json", "at", "AT^DMSN"], 0, "^DMSN: KEL0000000000001"),
                   (APP, ["board", "read"], 0, "board: KEL0000000000001")],
    "silent-modem": [([], ["--timeout", "1", "at", "AT^DMSN"], 5, "no final result for AT^DMSN")],
    "refusing-modem": [([], ["at", "AT^DMSN"], 1, "ERROR"),
                       ([], ["board", "read"], 1, "refused with code 10"),
                       (APP, ["board", "read"], 1, "refused with code 10")],
    "weak-battery": [([], ["battery", "adc"], 0, "adc: 700"),
                     (APP, ["battery", "voltage"], 0, "voltage: 3.31"),
                     (APP, ["battery", "temperature"], 0, "temperature: -1.2")],
    "failing-camera": [(APP, ["send", "139"], 1, "refused with code 1"),
                       (APP, ["send", "180", "112=int:1"], 1, "refused with code 1"),
                       (APP, ["send", "180", "112=int:2"], 1, "refused with code 1")],
    "failing-bluetooth": [([], ["at", "AT^DBTCTRL=1"], 1, "ERROR")],
    "full-card": [(APP, ["tf-card"], 0, "capacity: 1024")],
    "no-card": [(APP, ["tf-card"], 0, "capacity: 0")],
}


@pytest.mark.parametrize("name, options, words, status, text", [
    (name, *row) for name, rows in SEEN.items() for row in rows])
def test_what_the_station_sees(name: str, options: list[str], words: list[str], status: int,
                               text: str, base: Path, handset_build: "str | Path") -> None:
    done = handset("run", "--build", str(handset_build), "--scenario", name, *options, "--",
                   *STATION, *words)
    assert done.returncode == status and text in done.stdout + done.stderr, done
    if "--json" in words:
        assert json.loads(done.stdout)["seconds"] >= 2


def test_every_scenario_is_tried_and_says_what_it_shows() -> None:
    assert scenarios.names() == sorted(SEEN)
    lines = output("scenarios").splitlines()
    assert [line.split()[0] for line in lines] == scenarios.names()
    assert all(len(line.split()) > 4 for line in lines)


def test_a_full_card_has_no_room(make_handset: HandsetFactory) -> None:
    full = make_handset("packet", **scenarios.find("full-card").options)
    assert full.run(["/usr/bin/stat", "-f", "-c", "%a", "/storage/sdcard1"]).stdout == b"0\n"


def test_options_go_before_a_scenario(up) -> None:
    up("--scenario", "weak-battery", "--answer", "sarvo_battery=0 900", "--file",
       "/sys/class/power_supply/battery/temp", "--modem", "silent")
    assert output("show", "voltage") == "3310000\n"
    assert handset("show", "temperature").returncode == 1
    status = json.loads(output("status", "--json"))
    got = subprocess.run([*STATION, "-p", status["pc"], "battery", "adc"], cwd=PROJECT, text=True,
                         capture_output=True, check=False)
    assert got.stdout == "adc: 900\n"


# the files

@pytest.mark.parametrize("content, problem", [
    ("", "shows: one line that says what it shows is needed"),
    ("shows = 3\n", "shows: one line"), ('shows = "a\\nb"\n', "shows: one line"),
    ("shows = \n", "Invalid value"),
    ('shows = "x"\ncolour = 1\n', "colour: no such key; there are shows, answers, card"),
    ('shows = "x"\nmodem = "lazy"\n', "modem: 'lazy' is none of table, slow"),
    ('shows = "x"\npath = 3\n', "path: 3 is none of"),
    ('shows = "x"\ncard = "big"\n', "card: 'big' is not SIZE|none"),
    ('shows = "x"\ncard = 3\n', "card: 3 is no text"),
    ('shows = "x"\ncard-full = 1\n', "card-full: 1 is neither true nor false"),
    ('shows = "x"\nfiles = 1\n', "files: 1 is no table"),
    ('shows = "x"\nfiles."/a" = 1\n', "files: /a: 1 is no text"),
    ('shows = "x"\nmodem-answers.AT = "\\\\q"\n', "modem-answers: unknown escape \\q"),
])
def test_what_is_no_scenario(content: str, problem: str, tmp_path: Path) -> None:
    path = tmp_path / "mine.toml"
    path.write_text(content, "utf-8")
    with pytest.raises(HandsetError) as caught:
        scenarios.find(str(path))
    assert str(caught.value).startswith(f"{path}: {problem}")


def test_a_scenario_that_is_not_there(base: Path, tmp_path: Path) -> None:
    done = handset("up", "--scenario", "wet-camera")
    assert (done.returncode, done.stderr.splitlines()) == (1, [
        f"amt-handset: no scenario wet-camera; there are {', '.join(scenarios.names())}"])
    done = handset("run", "--scenario", str(tmp_path / "x.toml"), "--", "true")
    assert done.returncode == 1 and "x.toml: No such file or directory" in done.stderr


def test_a_scenario_of_ones_own(base: Path, tmp_path: Path, handset_build: "str | Path") -> None:
    path = tmp_path / "mine.toml"
    path.write_text('shows = "x"\npath = "packet"\n[modem-answers]\n'
                    "'AT^DMSN' = '\\r\\n^DMSN: MINE\\r\\n\\r\\nOK\\r\\n'\n", "utf-8")
    done = handset("run", "--build", str(handset_build), "--scenario", str(path), "--", *STATION,
                   "board", "read")
    assert (done.returncode, done.stdout) == (0, "board: MINE\n"), done


# run

def run(build: "str | Path", *words: str) -> "subprocess.CompletedProcess[str]":
    return handset("run", "--build", str(build), *words)


def test_several_handsets_for_a_command(base: Path, handset_build: "str | Path") -> None:
    station = " ".join(STATION)
    done = run(handset_build, "--n", "3", "--", "sh", "-ec", f"""
        test "$AMT_STATION_PORT" = "$AMT_STATION_PORT_1" -a "$HANDSET_DIR" = "$HANDSET_DIR_1"
        test -z "$AMT_STATION_PORT_4" -a "$AMT_STATION_CHANNEL" = pc
        for number in 1 2 3; do
            eval "port=\\$AMT_STATION_PORT_$number"
            {station} -p "$port" adb-serial write ADB$number 2>&-
        done
        {station} adb-serial read 2>&-; {station} -p $AMT_STATION_PORT_3 adb-serial read 2>&-
        {" ".join(COMMAND)} --dir "$HANDSET_DIR_2" get a.b || echo none
        exit 7""")
    assert (done.returncode, done.stdout) == (7, "serial: ADB1\nserial: ADB3\nnone\n"), done.stderr
    assert not list(base.iterdir())


@pytest.mark.parametrize("command, status, text", [
    (["true"], 0, ""), (["sh", "-c", "kill -9 $$"], 137, ""),
    (["/no/such/program"], 2, "/no/such/program: No such file or directory")])
def test_the_status_of_the_command(command: list[str], status: int, text: str, base: Path,
                                   handset_build: "str | Path") -> None:
    done = run(handset_build, "--", *command)
    assert done.returncode == status and text in done.stderr
    assert not list(base.iterdir())


def test_a_handset_without_a_port(base: Path, handset_build: "str | Path",
                                  tmp_path: Path) -> None:
    path = tmp_path / "mine.toml"
    path.write_text('shows = "No cable."\nusb-state = "DISCONNECTED"\n', "utf-8")
    done = run(handset_build, "--scenario", str(path), "--", "true")
    assert done.returncode == 1 and "its cable is not in" in done.stderr
    assert not list(base.iterdir())


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGINT])
def test_signals_reach_the_command(number: int, base: Path, handset_build: "str | Path",
                                   tmp_path: Path) -> None:
    begun = tmp_path / "begun"
    os.mkfifo(begun)
    shell = f"trap 'exit 5' TERM INT; echo > {begun}; while :; do sleep 0.1; done"
    with subprocess.Popen([*COMMAND, "run", "--build", str(handset_build), "--", "sh", "-c", shell],
                          cwd=PROJECT, stdin=subprocess.DEVNULL) as process:
        try:
            begun.read_text("utf-8")
            process.send_signal(number)
            assert process.wait(PATIENCE) == 5
        finally:
            process.kill()
    assert not list(base.iterdir())


def test_a_signal_before_the_command_is_known_reaches_it(monkeypatch: pytest.MonkeyPatch) -> None:
    """The command may tell that it runs before the process that has started it knows its id."""
    real = subprocess.Popen

    class Early(real):  # type: ignore[valid-type, misc]
        def __init__(self, *words: Any, **options: Any) -> None:
            os.kill(os.getpid(), signal.SIGTERM)
            super().__init__(*words, **options)

    monkeypatch.setattr(subprocess, "Popen", Early)
    assert visit.run(["sleep", str(PATIENCE)], dict(os.environ)) == 128 + signal.SIGTERM


# up --json

def test_up_for_programs(base: Path, handset_build: "str | Path",
                         take_down: "Callable[..., subprocess.Popen[str]]") -> None:
    process = take_down("up", "--json", "--build", str(handset_build), "--scenario", "no-card")
    assert process.stdout is not None
    document = json.loads(process.stdout.readline())
    assert (document["ok"], document["scenario"], document["path"]) == (True, "no-card", "pc")
    assert document["pid"] == process.pid and sorted(document["ports"]) == ["app", "pc"]
    assert all(Path(document[name]).exists() for name in ("log", "files", "stand_ins"))
    process.terminate()
    assert process.communicate(timeout=PATIENCE)[0] == ""


@pytest.fixture
def take_down(base: Path):
    """Start the command; it ends with the test."""
    started: list[subprocess.Popen[str]] = []

    def start(*words: str) -> "subprocess.Popen[str]":
        started.append(subprocess.Popen([*COMMAND, *words], cwd=PROJECT, text=True,
                                        stdin=subprocess.DEVNULL, stdout=subprocess.PIPE))
        return started[-1]

    yield start
    for process in started:
        process.terminate()
        process.communicate(timeout=PATIENCE)
