"""A run that keeps a trace of its line, and the same run again without a handset."""

from __future__ import annotations

import json
import re
from pathlib import Path

import pytest
from line_bench import ADC, Script, adc, write_plan
from station_peer import Peer, Run, station_command

from amt_station.requests.model import Channel
from amt_station.trace.dialogue import read_trace
from amt_station.trace.message import encode
from amt_station.wire import ACKNOWLEDGEMENT, Packet


@pytest.mark.parametrize("value, status", [(15, 0), (25, 1)])
def test_a_failure_is_one_file(value: int, status: int, tmp_path: Path, peer: Peer,
                               run_station: Run) -> None:
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, adc(value)]]})
    path = tmp_path / "x.trace"
    plan = ["run", str(write_plan(tmp_path, ADC)), "--no-records"]
    result = run_station("-p", peer.path, *plan, "--trace", str(path))
    assert result.returncode == status, result.stderr
    steps = read_trace(path).steps
    assert [step.action for step in steps[:3]] == ["station opens", "station says",
                                                   "station hears"]
    said = b"".join(encode(step.argument, Channel.PC) for step in steps
                    if step.action == "station says"
                    and isinstance(step.argument, (bytes, Packet)))
    assert said == peer.raw
    again = run_station("trace", "replay", str(path), "--", *station_command(*plan))
    assert again.returncode == status
    verdict = re.compile(r"line: (PASS|FAIL) \(.*?\)")
    assert verdict.findall(again.stdout) == verdict.findall(result.stdout) != []


def test_the_trace_is_of_the_plans_channel(tmp_path: Path, app_peer: Peer,
                                           run_station: Run) -> None:
    path = tmp_path / "x.trace"
    plan = write_plan(tmp_path, 'channel = "app"\n[[step]]\ncommand = "battery voltage"\n')
    run_station("-p", app_peer.path, "run", str(plan), "--no-records", "--trace", str(path),
                "--timeout", "0.1")
    assert read_trace(path).channel == "app"
    shown = json.loads(run_station("trace", "show", str(path), "--json").stdout)
    assert [event["packet"]["atoms"] for event in shown["events"]
            if event.get("action") == "station says"][0] == []
