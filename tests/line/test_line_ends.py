"""How a run ends when it is ended, killed, or loses what it stands on."""

from __future__ import annotations

import os
import shutil
import subprocess
import threading
import time
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, OK, Bench, Script, adc, load, verdicts, write_plan
from station_peer import ROOT, Peer, station_command, station_environment

from amt_line.report.records import load_record
from amt_line.run.connection import Connection
from amt_line.run.stop import INTERRUPTED, Stop
from amt_station.errors import NoPort
from amt_station.port import FdPort, Port
from amt_station.wire import ACKNOWLEDGEMENT
from amt_station.wire.decoder import EnvelopeDecoder, Frame, Item

WRITE_VERDICT = ("[[always]]\ncommand = 'test-result write'\n"
                 "with = { station = 3, verdict = '${verdict}' }\n")


class Deaf:
    """A handset that answers once and then reads nothing more, not a byte."""

    def __init__(self, peer: Peer) -> None:
        self._peer = peer
        # Of its own, so that nothing is changed at the station's end.
        self._end = os.open(peer.path, os.O_WRONLY | os.O_NONBLOCK | os.O_NOCTTY)
        self.full = threading.Event()

    def __call__(self, item: Item) -> list[bytes]:
        self._peer.cease()
        try:
            while True:
                os.write(self._end, b"x" * 512)
        except BlockingIOError:
            self.full.set()
        return [OK]

    def close(self) -> None:
        """Give the end back."""
        os.close(self._end)


def test_a_port_that_stays_away_is_waited_for_once(tmp_path: Path, peer: Peer,
                                                   monkeypatch: pytest.MonkeyPatch) -> None:
    waits: list[float] = []
    reconnect = Connection.reconnect

    def counted(self: Connection, seconds: float, must_go: bool = False) -> None:
        waits.append(seconds)
        reconnect(self, seconds, must_go)

    def open_port() -> Port:
        if waits:
            raise NoPort("no port /dev/x")
        return FdPort(peer.slave)

    monkeypatch.setattr(Connection, "reconnect", counted)
    peer.script = Script()
    plan = load(tmp_path, "[[step]]\nat = 'AT'\nreconnect = 0.4\n" + ADC)
    document = Bench(plan, peer, open_port=open_port).run()
    assert verdicts(document) == ["error", "skipped"] and document["exit_status"] == 3
    assert "was not back within 0.4 s: no port /dev/x" in document["reason"] and waits == [0.4]


def test_a_write_that_nobody_takes_is_ended_too(tmp_path: Path, peer: Peer) -> None:
    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["number"] == 1:
            threading.Timer(0.2, lambda: bench.abort(INTERRUPTED)).start()

    peer.script = deaf = Deaf(peer)
    bench = Bench(load(tmp_path, "[[step]]\nat = 'AT'\ntimeout = 3600\n"), peer, on_event=stop)
    document = bench.run()
    deaf.close()
    assert deaf.full.is_set()
    assert document["verdict"] == "ABORTED" and document["steps"][0]["reason"] == "interrupted"


@pytest.mark.parametrize("lines", [1, 2, 7, 30, 61, 100])
def test_a_run_that_is_killed_at_any_moment_leaves_a_whole_record(
        tmp_path: Path, peer: Peer, records: Path, lines: int) -> None:
    """Power cuts look like this. What is half written has another name."""
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})
    plan = write_plan(tmp_path, ADC * 100 + "[[step]]\nwait = 3600\n")
    with subprocess.Popen(
            station_command("-p", peer.path, "run", str(plan), "--records", str(records)),
            cwd=ROOT, env=station_environment(PYTHONUNBUFFERED="1"), stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE, stderr=subprocess.DEVNULL) as process:
        assert process.stdout is not None
        for _ in range(lines):
            assert process.stdout.readline()
        process.kill()
    for path in records.glob(".*.new"):
        path.unlink()
    (path,) = records.iterdir()
    record = load_record(path)
    assert (record["state"], record["verdict"], record["ended"]) == ("running", None, None)
    assert all(step["verdict"] == "pass" for step in record["steps"])


# a pass that is none

def stored(script: Script, peer: Peer) -> list[int]:
    """The verdicts that the handset was told, one after the other."""
    decoder = EnvelopeDecoder()
    told = [item.packet for item in decoder.feed(peer.raw)
            if isinstance(item, Frame) and item.packet.command == 91]
    assert len(told) == script.asked.count(91)
    return [packet.get_int(36) for packet in told]


LATER = WRITE_VERDICT + "[[always]]\nname = 'later'\nat = 'AT+LATER'\n"


@pytest.mark.parametrize("answer, expected", [(OK, [1]), (b"\r\nERROR\r\n", [1, 2])])
def test_a_pass_is_taken_back_when_the_run_is_none(tmp_path: Path, peer: Peer, records: Path,
                                                   answer: bytes, expected: list[int]) -> None:
    peer.script = script = Script(texts={"AT+LATER": [answer]})
    document = Bench(load(tmp_path, "[[step]]\nat = 'AT'\n" + LATER), peer, records=records).run()
    assert stored(script, peer) == expected
    assert [step["number"] for step in document["steps"]] == [1, 2, 3]
    told = document["steps"][1]
    assert (document["verdict"], told["verdict"]) == ("PASS" if answer == OK else "FAIL", "pass")
    assert told["attempts"] == len(expected)
    assert [exchange["attempt"] for exchange in told["exchanges"]] == [*range(1, len(expected) + 1)]
    (path,) = records.glob("*.json")
    assert load_record(path) == document


def test_a_pass_is_taken_back_when_its_record_is_lost(tmp_path: Path, peer: Peer,
                                                      records: Path) -> None:
    """The directory vanishes when nothing but the last writing is left."""
    peer.script = script = Script()

    def vanish(event: dict[str, Any]) -> None:
        if event["event"] == "step-ended" and event["section"] == "always" and records.is_dir():
            bench.file.flush()  # type: ignore[union-attr]
            shutil.rmtree(records)

    bench = Bench(load(tmp_path, "[[step]]\nat = 'AT'\n" + WRITE_VERDICT), peer, records=records,
                  on_event=vanish)
    document = bench.run()
    assert stored(script, peer) == [1, 2]
    assert (document["verdict"], document["exit_status"]) == ("ERROR", 7)


def test_a_pass_is_taken_back_when_the_run_is_ended_behind_it(tmp_path: Path, peer: Peer) -> None:
    peer.script = script = Script(texts={"AT+LATER": []})

    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["name"] == "later":
            bench.abort(INTERRUPTED)

    bench = Bench(load(tmp_path, "[[step]]\nat = 'AT'\n" + LATER), peer, on_event=stop)
    document = bench.run()
    assert document["verdict"] == "ABORTED" and stored(script, peer) == [1, 2]


def test_a_pass_that_cannot_be_taken_back_is_told(tmp_path: Path, peer: Peer) -> None:
    """Ended at once: nothing more is sent."""
    peer.script = script = Script(texts={"AT+LATER": []})

    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["name"] == "later":
            bench.abort(INTERRUPTED)
            bench.abort(INTERRUPTED)

    bench = Bench(load(tmp_path, "[[step]]\nat = 'AT'\n" + LATER), peer, on_event=stop)
    document = bench.run()
    assert document["verdict"] == "ABORTED" and stored(script, peer) == [1]
    words = "may have stored a pass in the handset, and the run is none"
    assert words in document["advice"] and words in document["steps"][1]["remarks"][-1]


def test_a_handset_that_is_lost_in_silence_is_no_pass(tmp_path: Path, peer: Peer) -> None:
    """An answer that passed left the link in doubt; then nobody answers any more."""
    peer.script = Script()

    def fall_silent(event: dict[str, Any]) -> None:
        if event["event"] == "step-ended" and event["number"] == 1:
            peer.script = lambda item: ()
            # As an answer too many does, when it comes at once.
            bench.runner._connection.link().doubt()  # type: ignore[union-attr]

    bench = Bench(load(tmp_path, "[[step]]\nat = 'AT'\n" + ADC + "when = 'connected'\n"), peer,
                  on_event=fall_silent)
    document = bench.run()
    assert verdicts(document) == ["pass", "skipped"]
    assert (document["verdict"], document["exit_status"]) == ("ERROR", 5)


def test_a_deadline_between_two_attempts_is_an_error(tmp_path: Path, peer: Peer,
                                                     monkeypatch: pytest.MonkeyPatch) -> None:
    sleep = Stop.sleep

    def over(self: Stop, seconds: float) -> None:
        if seconds == 60:
            self._end = time.monotonic()
        sleep(self, seconds)

    monkeypatch.setattr(Stop, "sleep", over)
    peer.script = Script(texts={"AT+NO": [b"\r\nERROR\r\n"]})
    document = Bench(load(tmp_path, "deadline = 3600\n[[step]]\nat = 'AT+NO'\n"
                          "retry = { times = 1, delay = 60 }\n"), peer).run()
    (step,) = document["steps"]
    assert (step["verdict"], document["exit_status"]) == ("error", 5)
    assert "deadline of 3600 s" in step["reason"] and step["earlier"][0]["verdict"] == "fail"
