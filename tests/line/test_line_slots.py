"""Slots: a handset comes, is tested, goes; what is wrong in one slot stays there."""

from __future__ import annotations

import subprocess
import sys
import threading
import time
from datetime import datetime, timedelta, timezone
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, Script
from line_slots import PATIENCE, QUICK, Bench, battery
from station_peer import Peer

from amt_line.run.presence import Patience
from amt_line.run.stop import TERMINATED
from amt_station.wire.decoder import EnvelopeDecoder

SILENT = Script(texts={"AT+SILENT": []}, requests={224: []})
LAST = '[[always]]\nat = "AT+LAST"\nwhen = "connected"\n'


def test_handset_after_handset(tmp_path: Path, records: Path) -> None:
    with Bench(tmp_path, ADC) as bench:
        assert bench.wait("slot-state", state="waiting", text=f"no handset at {tmp_path}/A")
        first = battery(15)
        bench.sockets["A"].plug(first)
        bench.wait("slot-state", state="verdict")
        asked = len(first.asked)
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(battery(99))
        bench.wait("run-ended", 2)
        assert bench.end() == 130
    assert bench.verdicts("A") == ["PASS", "FAIL"]
    assert len(first.asked) == asked, "the same handset is not tested again"
    assert [event["state"] for event in bench.found("slot-state")][-1] == "ended"
    for event in bench.found("run-ended"):
        document = bench.record(event["run"])
        assert (document["slot"], document["verdict"]) == ("A", event["verdict"])


def test_a_handset_that_stays_is_tested_once(tmp_path: Path) -> None:
    script = battery(15)
    with Bench(tmp_path, ADC) as bench:
        bench.sockets["A"].plug(script)
        bench.wait("slot-state", state="verdict")
        count = len(script.asked)
        # Long enough for hundreds of looks.
        time.sleep(QUICK.look * 30)
        assert bench.verdicts("A") == ["PASS"] and len(script.asked) == count


def test_another_handset_between_two_looks(tmp_path: Path) -> None:
    with Bench(tmp_path, ADC, patience=Patience(look=0.2, answer=0.3)) as bench:
        bench.sockets["A"].plug(battery(15))
        bench.wait("slot-state", state="verdict")
        old = bench.sockets["A"].peer
        bench.sockets["A"].plug(battery(99))
        assert old is not None
        old.stop()
        old.close()
        bench.wait("run-ended", 2)
        assert bench.verdicts("A") == ["PASS", "FAIL"]


@pytest.mark.parametrize("step", ["[[step]]\nat = 'AT+SILENT'\n", "[[step]]\nwait = 60\n",
                                  "[[step]]\nask = 'White?'\n", "[[step]]\nname = 'never'\n"
                                  "at = 'AT'\nexpect = 'ERROR'\n"
                                  "retry = { times = 1000, delay = 60 }\n"])
def test_a_handset_that_is_pulled_out(tmp_path: Path, records: Path, step: str) -> None:
    with Bench(tmp_path, step + ADC + LAST, attended=True) as bench:
        script = Script(texts={"AT+SILENT": []})
        bench.sockets["A"].plug(script)
        bench.wait("step-began", number=1)
        if "ask" in step:
            bench.wait("question")
        start = time.monotonic()
        bench.sockets["A"].pull()
        ended = bench.wait("run-ended")
        # Two seconds on a machine with time; what the step waits for would take a minute.
        assert time.monotonic() - start < 20.0
        assert ended["verdict"] == "ABORTED" and ended["reason"].endswith("was pulled out")
        document = bench.record(ended["run"])
        assert (document["state"], document["verdict"]) == ("aborted", "ABORTED")
        first, *rest = [item["verdict"] for item in document["steps"]]
        # Between two attempts the verdict is that of the one before.
        assert first == "error" or (first == "fail" and "retry" in step)
        assert rest == ["skipped", "skipped"]
        assert "AT+LAST" not in script.asked and not bench.desk.questions()
        bench.sockets["A"].plug(battery(15))
        bench.wait("run-began", 2)


def test_a_port_that_may_go_is_not_pulled_out(tmp_path: Path) -> None:
    plan = "[[step]]\nwait = 0.1\nreconnect = 60\n" + ADC
    with Bench(tmp_path, plan, once=True) as bench:
        socket = bench.sockets["A"]
        socket.plug(Script())
        bench.wait("step-began", number=1)
        socket.pull()
        socket.plug(battery(15))
        assert bench.join() == 0
    assert bench.verdicts("A") == ["PASS"]


HOLD = """
import fcntl, sys
port = open(sys.argv[1], "r+b", buffering=0)
fcntl.flock(port, fcntl.LOCK_EX)
print("held", flush=True)
sys.stdin.read()
"""


def test_a_port_that_somebody_else_holds(tmp_path: Path) -> None:
    peer = Peer(EnvelopeDecoder())
    peer.script = battery(15)
    with subprocess.Popen([sys.executable, "-c", HOLD, peer.path], stdin=subprocess.PIPE,
                          stdout=subprocess.PIPE) as other:
        assert other.stdout is not None and other.stdout.readline() == b"held\n"
        with Bench(tmp_path, ADC, once=True, ports={"A": peer.path}) as bench:
            held = bench.wait("slot-state", state="held")
            assert f"({other.pid})" in held["text"] and held["text"].endswith("has it open")
            assert peer.raw == b""
            other.communicate(timeout=PATIENCE)
            assert bench.join() == 0
    peer.close()


def test_somebody_who_reads_along_is_named_too(tmp_path: Path, monkeypatch: Any) -> None:
    monkeypatch.setattr("amt_station.found_ports._PSEUDO_TERMINALS", "/none")
    peer = Peer(EnvelopeDecoder())
    with subprocess.Popen([sys.executable, "-c", HOLD.replace("fcntl.flock(port, fcntl.LOCK_EX)",
                                                              ""), peer.path],
                          stdin=subprocess.PIPE, stdout=subprocess.PIPE) as other:
        assert other.stdout is not None and other.stdout.readline() == b"held\n"
        with Bench(tmp_path, ADC, once=True, ports={"A": peer.path}) as bench:
            held = bench.wait("slot-state", state="held")
            assert f"({other.pid})" in held["text"] and held["text"].endswith("has it open")
            other.communicate(timeout=PATIENCE)
            peer.script = battery(15)
            assert bench.join() == 0
    peer.close()


def test_a_port_that_stays_when_its_handset_goes(tmp_path: Path) -> None:
    peer = Peer(EnvelopeDecoder())
    peer.script = battery(15)
    with Bench(tmp_path, ADC, ports={"A": peer.path}) as bench:
        bench.wait("slot-state", state="verdict")
        assert bench.verdicts("A") == ["PASS"]
        peer.script = lambda item: ()
        bench.wait("slot-state", state="verdict", text=f"no handset answers at {peer.path}")
        peer.script = battery(99)
        bench.wait("run-ended", 2)
        assert bench.verdicts("A") == ["PASS", "FAIL"]
    peer.close()


def test_a_handset_that_does_not_answer_is_tested_all_the_same(tmp_path: Path) -> None:
    with Bench(tmp_path, ADC) as bench:
        bench.wait("slot-state", text=f"no handset at {tmp_path}/A")
        bench.sockets["A"].plug(lambda item: ())
        ended = bench.wait("run-ended")
        assert (ended["verdict"], ended["exit_status"]) == ("ERROR", 5)


def test_a_defect_in_one_slot_stops_no_other(tmp_path: Path, monkeypatch: Any) -> None:
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    bench = Bench(tmp_path, ADC, ("A", "B"))
    gather = bench.slots["A"]._supply.gather
    failures = [ZeroDivisionError("nobody thought of it")]

    def failing(*arguments: Any) -> Any:
        if failures:
            raise failures.pop()
        return gather(*arguments)

    monkeypatch.setattr(bench.slots["A"]._supply, "gather", failing)
    with bench:
        for socket in bench.sockets.values():
            socket.plug(battery(15))
        shown = bench.wait("slot-state", slot="A", state="defect")
        assert "ZeroDivisionError" in shown["text"] and "traceback" in shown["text"]
        bench.wait("run-ended", slot="B")
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(battery(15))
        bench.wait("run-ended", slot="A")
    assert bench.verdicts("A") == bench.verdicts("B") == ["PASS"]
    assert len(list((tmp_path / "state").rglob("defect-*"))) == 1


def test_a_record_that_cannot_be_begun(tmp_path: Path, records: Path) -> None:
    script = battery(15)
    with Bench(tmp_path, ADC) as bench:
        bench.records.write_text("no directory", encoding="utf-8")
        bench.sockets["A"].plug(script)
        shown = bench.wait("slot-state", state="defect")
        assert "no record can be written" in shown["text"] and 224 not in script.asked
        bench.records.unlink()
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(battery(15))
        bench.wait("run-ended", verdict="PASS")


def test_once_ends_also_where_no_run_could_begin(tmp_path: Path) -> None:
    with Bench(tmp_path, ADC, once=True) as bench:
        bench.records.write_text("no directory", encoding="utf-8")
        bench.sockets["A"].plug(battery(15))
        assert bench.join() == 7
    assert list(bench.found("slot-state", state="defect")) and bench.verdicts("A") == []


def test_a_defect_inside_of_a_run_is_shown_until_the_next_handset(tmp_path: Path,
                                                                  monkeypatch: Any) -> None:
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    failures = [ZeroDivisionError("nobody thought of it")]

    def failing(*_arguments: Any) -> None:
        if failures:
            raise failures.pop()

    bench = Bench(tmp_path, ADC)
    monkeypatch.setattr("amt_line.run.step_run.StepRun._fill", failing)
    with bench:
        bench.sockets["A"].plug(battery(15))
        assert "ZeroDivisionError" in bench.wait("slot-state", state="defect")["text"]
        ended = bench.wait("run-ended")
        assert (ended["verdict"], ended["exit_status"]) == ("ERROR", 7)
        bench.sockets["A"].pull()
        after = bench.wait("slot-state", state="verdict")
        assert after["text"] == f"no handset at {tmp_path}/A"


# the end

def test_all_slots_end_in_order(tmp_path: Path, records: Path) -> None:
    plan = "[[step]]\nwait = 600\n[[always]]\nat = 'AT+LAST'\n"
    scripts = {name: Script() for name in "ABC"}
    with Bench(tmp_path, plan, ("A", "B", "C", "D")) as bench:
        for name, script in scripts.items():
            bench.sockets[name].plug(script)
            bench.wait("step-began", slot=name)
        assert bench.end(TERMINATED) == 143
    for name, script in scripts.items():
        assert bench.verdicts(name) == ["ABORTED"] and script.asked[-1] == "AT+LAST"
    assert bench.verdicts("D") == []
    assert len(list(bench.found("slot-state", state="ended"))) == 4


def test_the_second_request_ends_all_at_once(tmp_path: Path, records: Path) -> None:
    plan = "[[step]]\nwait = 600\n[[always]]\nat = 'AT+SILENT'\n[[always]]\nat = 'AT+LAST'\n"
    script = Script(texts={"AT+SILENT": []})
    with Bench(tmp_path, plan) as bench:
        bench.sockets["A"].plug(script)
        bench.wait("step-began", number=1)
        bench.line.end(TERMINATED)
        bench.wait("step-began", number=2)
        assert bench.end(TERMINATED) == 143
    assert bench.verdicts("A") == ["ABORTED"] and "AT+LAST" not in script.asked


def test_the_stop_button_pressed_twice_is_pressed_once(tmp_path: Path, records: Path) -> None:
    script = Script()
    with Bench(tmp_path, "[[step]]\nwait = 600\n[[always]]\nat = 'AT+LAST'\n") as bench:
        bench.sockets["A"].plug(script)
        bench.wait("step-began", number=1)
        bench.desk.stop("A")
        bench.desk.stop("A")
        ended = bench.wait("run-ended")
        assert (ended["verdict"], ended["reason"]) == ("ABORTED", "stopped by the operator")
        assert script.asked[-1] == "AT+LAST"
        bench.desk.stop("A")
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(Script())
        bench.wait("run-began", 2)


def test_once_ends_with_the_first_that_was_no_pass(tmp_path: Path) -> None:
    with Bench(tmp_path, ADC, ("A", "B"), once=True) as bench:
        bench.sockets["A"].plug(battery(99))
        bench.wait("run-ended", slot="A")
        bench.sockets["B"].plug(battery(15))
        assert bench.join() == 1
    assert (bench.verdicts("A"), bench.verdicts("B")) == (["FAIL"], ["PASS"])


def test_slots_never_wait_for_each_other(tmp_path: Path) -> None:
    """One stands still in its step; the other tests handset after handset."""
    with Bench(tmp_path, "[[step]]\nat = 'AT+X'\ntimeout = 600\n", ("A", "B")) as bench:
        bench.sockets["A"].plug(Script(texts={"AT+X": []}))
        bench.wait("step-began", slot="A")
        for number in range(1, 4):
            bench.sockets["B"].plug(Script())
            bench.wait("run-ended", number, slot="B")
            bench.sockets["B"].pull()
        assert bench.verdicts("A") == [] and bench.verdicts("B") == ["PASS"] * 3


def test_nothing_is_left_behind(tmp_path: Path) -> None:
    before = threading.active_count()
    with Bench(tmp_path, ADC, once=True) as bench:
        bench.sockets["A"].plug(battery(15))
        assert bench.join() == 0
    assert threading.active_count() <= before


def test_a_clock_that_is_set_back(tmp_path: Path, records: Path, monkeypatch: Any) -> None:
    """An hour at every look: durations, order and verdict do not come from it."""
    moment = [datetime(2026, 10, 25, 12, tzinfo=timezone.utc)]

    class Clock:
        @staticmethod
        def now(_zone: Any) -> datetime:
            moment[0] -= timedelta(hours=1)
            return moment[0]

    monkeypatch.setattr("amt_line.run.clock.datetime", Clock)
    with Bench(tmp_path, "[[step]]\nwait = 0.2\n" + ADC, once=True) as bench:
        bench.sockets["A"].plug(battery(15))
        assert bench.join() == 0
    document = bench.record(bench.wait("run-ended")["run"])
    assert document["began"] > document["ended"], "so the clock says"
    assert 0.2 <= document["steps"][0]["seconds"] <= document["seconds"] < PATIENCE
    assert all(exchange["seconds"] >= 0 for exchange in document["steps"][1]["exchanges"])
    assert document["verdict"] == "PASS"
