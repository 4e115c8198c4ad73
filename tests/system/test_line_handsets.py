"""Slots of a line with the whole daemon: unplugged, restarting, with a silent modem, simulated."""

from __future__ import annotations

import json
import os
import signal
import subprocess
import sys
import time
from pathlib import Path
from typing import Any, Iterator

import pytest

from amt_simulator import Handset
from amt_simulator.waiting import scaled

ROOT = Path(__file__).resolve().parents[2]
PATIENCE = 300.0


class Line:
    """The station on a line, in a process of its own."""

    def __init__(self, folder: Path) -> None:
        self.folder = folder
        self.process: "subprocess.Popen[str] | None" = None

    def begin(self, plan: str, *arguments: str) -> None:
        """Begin to serve."""
        (self.folder / "plan.toml").write_text(plan, encoding="utf-8")
        (self.folder / "events").touch()
        self.process = subprocess.Popen(
            [sys.executable, "-m", "amt_station", "line", str(self.folder / "plan.toml"),
             "--events", str(self.folder / "events"), "--records", str(self.folder / "records"),
             *arguments], cwd=ROOT, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
            stderr=subprocess.STDOUT, text=True,
            env={**os.environ, "PYTHONPATH": str(ROOT),
                 "XDG_STATE_HOME": str(self.folder / "state")})

    def wait(self, event: str, count: int = 1, **values: Any) -> dict[str, Any]:
        """The COUNT-th event with these values, as soon as it is there."""
        end = time.monotonic() + PATIENCE
        while True:
            lines = (self.folder / "events").read_text(encoding="utf-8").splitlines(keepends=True)
            events = [json.loads(line) for line in lines if line.endswith("\n")]
            found = [item for item in events if item["event"] == event
                     and all(item.get(name) == value for name, value in values.items())]
            if len(found) >= count:
                return found[count - 1]
            assert time.monotonic() < end, events[-10:]
            time.sleep(0.02)

    def record(self, run: str) -> dict[str, Any]:
        """The record of a run."""
        documents = [json.loads(path.read_text(encoding="utf-8"))
                     for path in (self.folder / "records").glob("*.json")]
        (found,) = [document for document in documents if document["run"] == run]
        return dict(found)

    def end(self) -> tuple[int, str]:
        """Wait for its end; the status and what was said."""
        assert self.process is not None
        said, _ = self.process.communicate(timeout=PATIENCE)
        return self.process.returncode, said


@pytest.fixture(name="line")
def make_line(tmp_path: Path) -> Iterator[Line]:
    """A line that is not there any more at the end."""
    line = Line(tmp_path)
    yield line
    if line.process is not None and line.process.poll() is None:
        line.process.kill()
        line.process.communicate()


def slot(handset: Handset) -> str:
    """The handset's port as slot A."""
    return f"--slot=A={handset.directory / 'pc'}"


def test_a_handset_that_is_unplugged_in_the_middle(make_handset: Any, line: Line) -> None:
    handset = make_handset("pc", ports=True)
    line.begin("[[step]]\nat = 'AT'\n[[step]]\nwait = 600\n"
               "[[always]]\nat = 'AT'\nwhen = 'connected'\n", slot(handset))
    line.wait("step-began", number=2)
    start = time.monotonic()
    handset.usb.unplug()
    ended = line.wait("run-ended")
    assert time.monotonic() - start < scaled(2.0)
    document = line.record(ended["run"])
    assert (document["verdict"], document["state"]) == ("ABORTED", "aborted")
    assert document["reason"].endswith("the handset was pulled out")
    assert [step["verdict"] for step in document["steps"]] == ["pass", "error", "skipped"]
    handset.usb.plug()
    line.wait("step-began", 2, number=2)
    assert line.process is not None
    line.process.send_signal(signal.SIGTERM)
    assert line.end()[0] == 143


def test_a_modem_that_is_silent_is_an_error_of_its_steps_only(make_handset: Any, line: Line
                                                              ) -> None:
    handset = make_handset("pc", ports=True, modem="silent")
    line.begin("[[step]]\nat = 'AT+CGMM'\ntimeout = 1\n[[step]]\ncommand = 'battery adc'\n",
               slot(handset), "--once")
    status, said = line.end()
    assert status == 5, said
    document = line.record(line.wait("run-ended")["run"])
    assert [step["verdict"] for step in document["steps"]] == ["error", "pass"]
    assert document["verdict"] == "ERROR"


def test_a_handset_whose_service_restarts(make_handset: Any, line: Line) -> None:
    """The step that meets it is tried again, and what was lost passes nothing."""
    handset = make_handset("pc", ports=True)
    line.begin("[[step]]\nwait = 1\n[[step]]\ncommand = 'battery adc'\ntimeout = 2\n"
               "retry = { times = 100, delay = 0.3 }\n", slot(handset), "--once")
    line.wait("step-began", number=1)
    first = handset.pid
    handset.signal(signal.SIGKILL)
    status, said = line.end()
    assert status == 0, said
    assert handset.pid not in (0, first)
    assert line.record(line.wait("run-ended")["run"])["verdict"] == "PASS"


def test_simulated_handsets_in_the_slots(line: Line, request: pytest.FixtureRequest) -> None:
    if request.config.getoption("--handset-build") != "release":
        pytest.skip("the command simulates with the release build")
    line.begin("[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = 100, max = 4000 }\n",
               "--simulate", "2", "--once")
    status, said = line.end()
    assert status == 0, said
    ended = [line.wait("run-ended", slot=name) for name in ("1", "2")]
    assert [event["verdict"] for event in ended] == ["PASS", "PASS"]
    ports = [line.wait("slot-state", slot=name)["port"] for name in ("1", "2")]
    assert not any(Path(port).parent.exists() for port in ports), "they are taken down"
