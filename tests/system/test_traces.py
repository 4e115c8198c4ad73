"""A trace of the daemon itself: shown, replayed without it, and held as a dialogue."""

import os
import subprocess
import sys
from contextlib import ExitStack
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_station.trace.dialogue import read_trace
from support.session import Session

PROJECT = Path(__file__).resolve().parents[2]
SESSIONS = {
    "packet": ["version", "--module", "software"],
    "text": ["at", "AT^DSVER"],
    "refused": ["send", "45", "19=int:3"],
}


def station(*arguments: str) -> "subprocess.CompletedProcess[str]":
    """Run ``amt-station``; it needs no more than a minute even where nothing answers."""
    env = {name: value for name, value in os.environ.items()
           if not name.startswith("AMT_STATION_")}
    return subprocess.run([sys.executable, "-m", "amt_station", *arguments], cwd=PROJECT, env=env,
                          capture_output=True, text=True, check=False)


@pytest.mark.parametrize("name", SESSIONS)
def test_a_field_failure_becomes_a_test(name: str, make_handset: HandsetFactory,
                                        tmp_path: Path) -> None:
    handset = make_handset("pc", ports=True)
    path = tmp_path / "field.trace"
    first = station("-p", str(handset.directory / "pc"), "--trace", str(path), *SESSIONS[name])
    assert first.returncode == (name == "refused"), first.stderr
    again = station("trace", "replay", str(path), "--", sys.executable, "-m", "amt_station",
                    *SESSIONS[name])
    assert (again.returncode, again.stdout) == (first.returncode, first.stdout)
    handset.stop()
    handset.start()
    handset.wait_ready()
    dialogue = read_trace(path)
    with ExitStack() as cleanup:
        Session(handset, dialogue, cleanup).hold(dialogue)


def test_a_trace_in_the_middle_is_that_of_the_station(make_handset: HandsetFactory,
                                                      tmp_path: Path) -> None:
    handset = make_handset("packet", ports=True)
    handset.app.open()
    own, middle = tmp_path / "own.trace", tmp_path / "middle.trace"
    result = station("--app", "-p", str(handset.directory / "app"), "trace", "listen", str(middle),
                     "--", sys.executable, "-m", "amt_station", "--trace", str(own), "battery",
                     "voltage")
    assert result.returncode == 0, result.stderr
    compared = station("trace", "diff", str(own), str(middle))
    assert (compared.returncode, compared.stdout) == (0, "")
    assert len([step for step in read_trace(middle).steps if step.action != "station opens"]) == 2
