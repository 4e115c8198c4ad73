"""Ports: which there are, who holds one, which one is meant, and waiting for one."""

from __future__ import annotations

import json
import os
import subprocess
import sys
import threading
import time
from pathlib import Path
from types import SimpleNamespace

import pytest
from serial.tools import list_ports
from station_peer import PATIENCE, Peer, Run, replying, sequence

from amt_station import found_ports
from amt_station.cli import main
from amt_station.errors import NoAnswer, NoPort, UsageProblem
from amt_station.found_ports import Wanted, holders
from amt_station.link import Link
from amt_station.wire.decoder import EnvelopeDecoder

OK = "\r\nOK\r\n"


def usb(device: str, serial: str = "", pid: int = 0x5510) -> SimpleNamespace:
    return SimpleNamespace(device=device, description="handset", vid=0x1d6b, pid=pid,
                           serial_number=serial or None, location="1-2")


PLAIN = SimpleNamespace(device="/dev/ttyS0", description="n/a", vid=None, pid=None,
                        serial_number=None, location=None)


@pytest.fixture
def there(monkeypatch: pytest.MonkeyPatch) -> list[SimpleNamespace]:
    """The ports of this computer."""
    found = [PLAIN]
    monkeypatch.setattr(list_ports, "comports", lambda: list(found))
    return found


def test_the_only_one_on_usb_is_meant(there: list[SimpleNamespace], peer: Peer,
                                      capsys: pytest.CaptureFixture[str]) -> None:
    peer.script = replying(OK)
    assert main.run(["-p", "auto", "at", "AT"]) == 3
    there.append(usb(peer.path, "KEL1"))
    assert main.run(["-p", "auto", "at", "AT"]) == 0
    assert main.run(["--serial", "KEL1", "at", "AT"]) == 0
    assert main.run(["--vid-pid", "1D6B:5510", "at", "AT"]) == 0
    assert main.run(["--serial", "KEL2", "at", "AT"]) == 3
    assert "no port with serial number KEL2" in capsys.readouterr().err
    assert peer.raw == b"AT\r" * 3


def test_several_are_told_apart(there: list[SimpleNamespace],
                                capsys: pytest.CaptureFixture[str]) -> None:
    there += [usb("/dev/ttyACM0", "KEL1"), usb("/dev/ttyACM1", "KEL2", 0x5511)]
    assert main.run(["-p", "auto", "at", "AT"]) == 2
    assert "/dev/ttyACM0 (KEL1), /dev/ttyACM1 (KEL2)" in capsys.readouterr().err
    assert Wanted("KEL2").find().device == "/dev/ttyACM1"
    assert Wanted(vid_pid="1d6b:5510").find().device == "/dev/ttyACM0"
    with pytest.raises(NoPort):
        Wanted("KEL1", "1d6b:5511").find()


@pytest.mark.parametrize("arguments", [
    ["--vid-pid", "nonsense"], ["--vid-pid", "1d6b"], ["-p", "/dev/x", "--serial", "KEL1"],
    ["--serial", "A", "--serial", "B"]])
def test_what_cannot_be_meant(arguments: list[str], there: list[SimpleNamespace]) -> None:
    assert main.run([*arguments, "at", "AT"]) == 2


def test_the_list(there: list[SimpleNamespace], peer: Peer,
                  capsys: pytest.CaptureFixture[str]) -> None:
    there.append(usb(peer.path, "KEL1"))
    with subprocess.Popen([sys.executable, "-c", "import sys; sys.stdout.write('x');"
                           "sys.stdout.flush(); sys.stdin.read()"], stdin=subprocess.PIPE,
                          stdout=subprocess.PIPE, pass_fds=[peer.slave]) as process:
        assert process.stdout is not None and process.stdout.read(1) == b"x"
        assert process.pid in [holder.pid for holder in holders(peer.path)]
        assert main.run(["ports", "--json"]) == 0
        rows = json.loads(capsys.readouterr().out)
        assert main.run(["ports"]) == 0
        process.communicate(timeout=PATIENCE)
    assert [row["device"] for row in rows] == ["/dev/ttyS0", peer.path] or [
        row["device"] for row in rows] == [peer.path, "/dev/ttyS0"]
    row = next(row for row in rows if row["device"] == peer.path)
    assert (row["vid_pid"], row["serial"]) == ("1d6b:5510", "KEL1")
    assert process.pid in [holder["pid"] for holder in row["held_by"]]
    text = capsys.readouterr().out
    assert f"({process.pid})" in text and "1d6b:5510" in text


def test_a_busy_port_says_who_holds_it(peer: Peer, run_station: Run) -> None:
    with Link.open(peer.path):
        result = run_station("-p", peer.path, "at", "AT")
    assert result.returncode == 4
    assert f"({os.getpid()}) has it open" in result.stderr


def test_waiting_for_a_name(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    port = tmp_path / "port"
    result = run_station("-p", str(port), "wait", "--for", "0.3")
    assert result.returncode == 3 and "within 0.3 s" in result.stderr
    appearing = threading.Timer(0.3, port.symlink_to, [peer.path])
    appearing.start()
    result = run_station("-p", str(port), "wait", "--for", "30")
    appearing.join()
    assert (result.returncode, result.stdout) == (0, f"{port}\n")
    assert run_station("-p", str(port), "wait", "--for", "inf").returncode == 2


def test_waiting_for_what_is_meant(there: list[SimpleNamespace],
                                   monkeypatch: pytest.MonkeyPatch) -> None:
    with pytest.raises(NoPort):
        Wanted().wait(0.2)
    appearing = threading.Timer(0.3, there.append, [usb("/dev/ttyACM7")])
    appearing.start()
    assert Wanted().wait(PATIENCE).device == "/dev/ttyACM7"
    appearing.join()
    there.append(usb("/dev/ttyACM8"))
    with pytest.raises(UsageProblem, match="several"):
        Wanted().wait(PATIENCE)
    assert [port.usb for port in found_ports.found_ports()] == [True, True, False]


def test_a_link_goes_on_over_a_new_port(tmp_path: Path) -> None:
    first, second = Peer(EnvelopeDecoder()), Peer(EnvelopeDecoder())
    first.script = sequence([])
    second.script = sequence([b"\r\n+OLD: 1\r\n" + OK.encode()], [b"\r\n+X: 1\r\n" + OK.encode()])
    port = tmp_path / "port"
    port.symlink_to(first.path)
    with Link.open(str(port)) as link:
        with pytest.raises(NoAnswer):
            link.at("AT", 0.2)
        first.close()
        port.unlink()
        plugging = threading.Timer(0.3, port.symlink_to, [second.path])
        plugging.start()
        link.reconnect(PATIENCE)
        plugging.join()
        assert not link.in_step
        assert link.at("AT+X").lines == ["+X: 1"]
        assert second.raw == b"AT^DBTADDR=?\rAT+X\r"
        second.close()
        port.unlink()
        start = time.monotonic()
        with pytest.raises(NoPort):
            link.reconnect(0.3)
        assert time.monotonic() - start < PATIENCE


def test_a_port_that_cannot_be_opened_again(peer: Peer) -> None:
    from amt_station.port import FdPort

    with pytest.raises(UsageProblem, match="cannot be opened again"):
        Link(FdPort(peer.slave)).reconnect(1)


def test_a_closed_port_writes_into_nothing_else(peer: Peer, tmp_path: Path) -> None:
    link = Link.open(peer.path)
    link.close()
    with open(tmp_path / "another", "w+", encoding="ascii") as another:
        # It may have got the number that the port had.
        with pytest.raises(NoPort):
            link.at("AT")
        assert another.read() == ""
