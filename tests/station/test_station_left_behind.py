"""What one process leaves behind on a port passes no step of the next one."""

from __future__ import annotations

import subprocess
import threading
from typing import Sequence

import pytest
from station_peer import PATIENCE, ROOT, Peer, Run, replying, station_command, station_environment

from amt_line.run.port import StoppablePort
from amt_line.run.stop import INTERRUPTED, Ended, Stop
from amt_station.errors import NoAnswer
from amt_station.link import Link
from amt_station.port import FdPort, SerialPort
from amt_station.wire.decoder import Item, Text

OK = b"\r\nOK\r\n"
FLUSH = b"AT^DBTADDR=?\r"
REMARK = "left out of step"


class SlowModem:
    """A handset whose modem answers the first text only when the search was answered long ago."""

    def __init__(self, peer: Peer) -> None:
        self.late = threading.Timer(0.5, peer.say, [OK])

    def __call__(self, item: Item) -> Sequence[bytes]:
        assert isinstance(item, Text)
        if "DBTADDR" in item.text:
            self.late.start()
            return [OK]
        return [b"\r\nERROR\r\n"] if "AT+B" in item.text else []


@pytest.mark.parametrize("ended", ["killed", "without an answer"])
def test_a_command_behind_one_that_lost_its_answer(ended: str, peer: Peer,
                                                   run_station: Run) -> None:
    modem = peer.script = SlowModem(peer)
    limit = ["--timeout", "0.3"] if ended != "killed" else []
    with subprocess.Popen(station_command("-p", peer.path, *limit, "at", "AT+A"), cwd=ROOT,
                          env=station_environment(), stderr=subprocess.PIPE) as process:
        peer.next()
        if ended == "killed":
            process.kill()
        process.communicate(timeout=PATIENCE)
    result = run_station("-p", peer.path, "at", "AT+B")
    modem.late.join()
    assert (result.returncode, result.stdout) == (1, "ERROR\n"), result.stderr
    assert REMARK in result.stderr
    assert peer.raw == b"AT+A\r" + FLUSH + b"AT+B\r"
    result = run_station("-p", peer.path, "at", "AT+B")
    assert REMARK not in result.stderr and peer.raw.count(FLUSH) == 1, "in step again"


def test_a_port_in_step_is_not_searched(peer: Peer, run_station: Run) -> None:
    peer.script = replying("\r\nOK\r\n")
    for _ in range(2):
        assert run_station("-p", peer.path, "at", "AT").stderr == ""
    assert peer.raw == b"AT\r" * 2


def test_a_run_that_is_ended_leaves_the_mark_too(peer: Peer) -> None:
    stop = Stop()
    with Link(StoppablePort(SerialPort(peer.path), stop)) as link:
        threading.Timer(0.2, stop.request, [INTERRUPTED]).start()
        with pytest.raises(Ended):
            link.at("AT")
    with Link.open(peer.path) as link:
        assert not link.in_step
        assert StoppablePort(link.port, Stop()).left_out_of_step()
        peer.script = replying("\r\nOK\r\n")
        link.find_place()
    with Link.open(peer.path) as link:
        assert link.in_step


def test_what_is_no_terminal_of_ours_has_no_past(peer: Peer) -> None:
    assert not StoppablePort(FdPort(peer.slave), Stop()).left_out_of_step()
    with Link.open("loop://") as link:
        with pytest.raises(NoAnswer):
            link.at("AT", 0.1)
        assert link.port.left_out_of_step() is False  # type: ignore[attr-defined]


def test_a_port_that_went_away_remembers_nothing(peer: Peer) -> None:
    port = SerialPort(peer.path)
    port.remember(True)
    assert port.left_out_of_step()
    peer.hang_up()
    port.remember(True)
    assert not port.left_out_of_step()
    port.close()
    port.remember(True)
    assert not port.left_out_of_step()
