"""How a run ends when it is ended, killed, or loses what it stands on."""

from __future__ import annotations

import os
import threading
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, OK, Bench, Script, load, verdicts
from station_peer import Peer

from amt_line.run.connection import Connection
from amt_line.run.stop import INTERRUPTED
from amt_station.errors import NoPort
from amt_station.port import FdPort, Port
from amt_station.wire.decoder import Item


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
