"""The doctor at a handset with the daemon in it: healthy, in another mode, holding a refusal."""

import json
import os
import subprocess
import sys
from pathlib import Path
from typing import Any

import pytest

from amt_simulator import Handset
from conftest import HandsetFactory

PROJECT = Path(__file__).resolve().parents[2]


class Station:
    """``amt-station`` with a state directory of its own."""

    def __init__(self, state: Path) -> None:
        self._environment = {
            **{name: value for name, value in os.environ.items()
               if not name.startswith("AMT_STATION_")}, "XDG_STATE_HOME": str(state)}

    def run(self, *arguments: str) -> "subprocess.CompletedProcess[str]":
        """Carry out a command line."""
        return subprocess.run([sys.executable, "-m", "amt_station", *arguments], cwd=PROJECT,
                              env=self._environment, capture_output=True, text=True, check=False)

    def findings(self, *arguments: str) -> tuple[int, dict[str, dict[str, Any]]]:
        """The exit status of the doctor, and what each check has found."""
        result = self.run("--json", *arguments, "doctor")
        told = json.loads(result.stdout)
        assert told["exit_status"] == result.returncode
        return result.returncode, {row["check"]: row for row in told["findings"]}


@pytest.fixture
def station(tmp_path: Path) -> Station:
    return Station(tmp_path)


def levels(found: dict[str, dict[str, Any]]) -> list[str]:
    """Of what concerns the handset."""
    return [found[name]["level"] for name in ("port", "permission", "holder", "line settings",
                                              "answer", "mode", "request buffer")]


def port(handset: Handset, line: str) -> str:
    return str(handset.directory / line)


def test_a_healthy_handset(make_handset: HandsetFactory, station: Station) -> None:
    status, found = station.findings("-p", port(make_handset("pc", ports=True), "pc"))
    # What keeps the clock of the machine that tests is its own business.
    assert levels(found) == ["ok"] * 7 and status in (0, 8)
    assert found["disk"]["text"].endswith("amt-station/records")
    assert found["store"]["level"] == "ok"


def test_a_handset_in_normal_mode(make_handset: HandsetFactory, station: Station) -> None:
    app = port(make_handset("packet", ports=True), "app")
    status, found = station.findings("-p", app)
    assert levels(found) == ["ok"] * 5 + ["error", "not checked"] and status == 5
    assert found["mode"]["text"] == "it serves the app channel here, not the PC line"
    status, found = station.findings("--app", "-p", app)
    assert levels(found) == ["ok"] * 7 and status in (0, 8)


def test_a_handset_in_the_test_mode(make_handset: HandsetFactory, station: Station) -> None:
    status, found = station.findings("--app", "-p", port(make_handset("pc", ports=True), "pc"))
    assert levels(found) == ["ok"] * 5 + ["error", "not checked"] and status == 5
    assert found["mode"]["text"] == "it serves the PC line here, not the app channel"


def test_a_refused_packet_is_found_until_the_cable_was_out(make_handset: HandsetFactory,
                                                           station: Station) -> None:
    pc = port(make_handset("pc", ports=True), "pc")
    assert station.run("-p", pc, "send", "193", "190=bool:1").returncode == 1
    status, found = station.findings("-p", pc)
    assert levels(found) == ["ok"] * 6 + ["error"] and status == 1
    assert "still holds the request AMT_BOARD_PCBA_CTRL_CMD" in found["request buffer"]["text"]
    assert "unplug the USB cable" in found["request buffer"]["advice"]


def test_a_refused_text_is_gone_with_the_question(make_handset: HandsetFactory,
                                                  station: Station) -> None:
    pc = port(make_handset("pc", ports=True), "pc")
    assert station.run("-p", pc, "at", "--force", "AT^DPCBACTRL=2").returncode == 1
    status, found = station.findings("-p", pc)
    assert levels(found) == ["ok"] * 7 and status in (0, 8)
    # Held, it would be refused once more.
    assert station.run("-p", pc, "at", "AT^DAMT1=2").returncode == 0


def test_a_handset_that_stands_still(make_handset: HandsetFactory, station: Station) -> None:
    handset = make_handset("pc", ports=True)
    handset.set_restart(False)
    handset.stop()
    status, found = station.findings("-p", port(handset, "pc"))
    assert levels(found) == ["ok"] * 4 + ["error"] + ["not checked"] * 2 and status == 5
    assert found["answer"]["text"] == "nothing comes back within 3 s"
