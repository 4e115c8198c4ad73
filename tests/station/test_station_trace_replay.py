"""A trace played in a handset's place, and a line recorded in the middle."""

from __future__ import annotations

import os
import signal
import subprocess
import sys
from pathlib import Path
from typing import Any, Iterator

import pytest
from station_peer import (ROOT, Peer, Run, answering, replying, station_command,
                          station_environment)
from trace_files import comments, statements, write

from amt_station.errors import NoPort
from amt_station.handset import connect
from amt_station.handset.enums import Module
from amt_station.link import Link
from amt_station.requests.model import Channel
from amt_station.trace.dialogue import read_trace
from amt_station.trace.replay import Differs, Replay
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Text
from amt_station.wire.packet import Packet

AT = (r'station says "AT\r"', r'station hears "\r\nOK\r\n"')
VERSION = ("station says packet AMT_VERSION_CMD 19=int:16", "station hears acknowledgement",
           'station hears packet AMT_VERSION_RSPCMD 19=int:16 18=bytes:"1.2" 1=int:0')
STATION = [sys.executable, "-m", "amt_station"]
LONG = 60.0


def replay(path: Path, *lines: str, **options: Any) -> Replay:
    """The replay of a trace of these lines."""
    return Replay(read_trace(write(path / "x.trace", *lines)), **options)


# the library

def test_a_script_meets_the_same_answers(tmp_path: Path) -> None:
    with replay(tmp_path, "channel pc", *VERSION, *AT) as handset:
        with connect(handset.port) as station:
            assert station.version(module=Module.SOFTWARE).version == "1.2"
            assert station.at("AT").lines == ()
        assert handset.wait(LONG).done
        handset.check()


def test_a_station_that_says_something_else_is_hung_up_on(tmp_path: Path) -> None:
    with replay(tmp_path, "channel pc", *VERSION) as handset:
        with Link.open(handset.port, timeout=LONG) as link, pytest.raises(NoPort):
            link.request(Packet(45, (Atom.integer(19, 17),)))
        standing = handset.wait(LONG)
        assert not standing.done and standing.line == 2
        with pytest.raises(Differs) as caught:
            handset.check()
    assert str(caught.value) == (
        f"{tmp_path}/x.trace:2: the station says packet AMT_VERSION_CMD 19=int:17 instead of "
        "packet AMT_VERSION_CMD 19=int:16")


def test_a_station_that_says_more(tmp_path: Path) -> None:
    with replay(tmp_path, "channel pc", *AT) as handset:
        with Link.open(handset.port, timeout=LONG) as link:
            assert link.at("AT").ok
            with pytest.raises(NoPort):
                link.at("AT+X")
        assert handset.wait(LONG).difference == r'behind the last line the station says "AT+X\r"'


def test_on_the_app_channel_any_search_is_answered(tmp_path: Path) -> None:
    from amt_station.place import PacketSearch

    asked = Packet.decode(PacketSearch(os.getpid()).data).command
    with replay(tmp_path, "channel app", f"station says packet {asked}",
                f"station hears packet {asked + 1} 1=int:1", "station says packet 9",
                "station hears packet 10 5=int:3800000 1=int:0") as handset:
        with Link.open(handset.port, Channel.APP, LONG) as link:
            link.find_place()
            assert link.request(Packet(9)).answer.get_int(5) == 3800000
        assert handset.wait(LONG).done


def test_a_port_that_went_away_goes_away_again(tmp_path: Path) -> None:
    port = tmp_path / "port"
    with replay(tmp_path, "channel pc", 'station opens "/dev/x"', AT[0], "station loses",
                'station opens "/dev/x"', *AT, link=port) as handset:
        assert handset.port == str(port)
        with Link.open(str(port), timeout=LONG) as link:
            with pytest.raises(NoPort):
                link.at("AT")
            link.reconnect(LONG)
            link._in_step = True  # nothing was said to find a place
            assert link.at("AT").ok
        assert handset.wait(LONG).done
    assert not port.is_symlink()


def test_pauses_are_kept_when_wanted(tmp_path: Path) -> None:
    with replay(tmp_path, "@2026-11-21T09:30:00Z channel pc", f"@+1 {AT[0]}", f"@+1.4 {AT[1]}",
                timed=True) as handset:
        with Link.open(handset.port, timeout=LONG) as link:
            assert link.at("AT").seconds >= 0.4
        assert handset.wait(LONG).done


# the command

def test_replay_for_a_command(run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel pc", *VERSION)
    wanted = [*STATION, "version", "--module", "software"]
    result = run_station("trace", "replay", str(path), "--", *wanted)
    assert (result.returncode, result.stdout) == (0, "module: 16 (software)\nversion: 1.2\n")
    result = run_station("trace", "replay", str(path), "--", "sh", "-c",
                         'echo "$AMT_STATION_CHANNEL"; exec "$@"', "sh", *wanted, "--json")
    assert result.returncode == 0 and result.stdout.startswith("pc\n{\n")


def test_a_command_that_says_something_else(run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel pc", *VERSION)
    result = run_station("trace", "replay", str(path), "--", *STATION, "at", "AT")
    assert result.returncode == 3
    assert result.stderr.splitlines()[-1] == (
        rf'amt-station: {path}:2: the station says "AT\r" instead of packet AMT_VERSION_CMD '
        "19=int:16")


@pytest.mark.parametrize("command, status, words", [
    (["true"], 1, ":2: the station did not come so far"),
    (["sh", "-c", "exit 9"], 9, ""), (["sh", "-c", "kill -9 $$"], 137, ""),
    (["/no/such/program"], 2, "/no/such/program: No such file or directory")])
def test_the_status_of_the_command(command: list[str], status: int, words: str, run_station: Run,
                                   tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel pc", *AT)
    result = run_station("trace", "replay", str(path), "--", *command)
    assert result.returncode == status and words in result.stderr


@pytest.fixture
def started() -> Iterator[Any]:
    """Start ``amt-station``; its process, and the port that it prints."""
    running: list[subprocess.Popen[str]] = []

    def start(*arguments: str) -> "tuple[subprocess.Popen[str], str]":
        process = subprocess.Popen(station_command(*arguments), cwd=ROOT, text=True,
                                   env=station_environment(), stdout=subprocess.PIPE,
                                   stderr=subprocess.PIPE)
        running.append(process)
        assert process.stdout is not None
        return process, process.stdout.readline().strip()

    yield start
    for process in running:
        process.kill()
        process.communicate()


def test_replay_prints_its_port(started: Any, run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel pc", *VERSION, *AT)
    process, port = started("trace", "replay", str(path))
    assert run_station("-p", port, "version", "--module", "software").returncode == 0
    assert run_station("-p", port, "at", "AT").stdout == "OK\n"
    _, talk = process.communicate(timeout=LONG)
    assert (process.returncode, talk) == (0, "the whole trace was played\n")


def test_a_replay_that_is_interrupted(started: Any, tmp_path: Path) -> None:
    process, _ = started("trace", "replay", str(write(tmp_path / "x.trace", "channel pc", *AT)))
    process.send_signal(signal.SIGINT)
    _, talk = process.communicate(timeout=LONG)
    assert (process.returncode, talk) == (130, "amt-station: interrupted\n")


def test_a_link_that_is_there_already(run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel pc", *AT)
    result = run_station("trace", "replay", str(path), "--link", str(path), "--", "true")
    assert (result.returncode, result.stdout) == (2, "")
    assert f"--link {path}: File exists" in result.stderr


# in the middle

def test_listen_for_a_command(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    peer.script = answering(Atom.integer(19, 16), Atom.raw(18, b"1.2"))
    path = tmp_path / "x.trace"
    result = run_station("-p", peer.path, "trace", "listen", str(path), "--", *STATION, "version",
                         "--module", "software")
    assert (result.returncode, result.stdout) == (0, "module: 16 (software)\nversion: 1.2\n")
    heard = [line for line in statements(path) if "hears" not in line]
    assert heard == ["channel pc", VERSION[0]]
    played = run_station("trace", "replay", str(path), "--", *STATION, "version", "--module",
                         "software")
    assert played.stdout == result.stdout


def test_a_large_request_goes_on_in_one_piece(peer: Peer, run_station: Run, started: Any,
                                              tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    process, port = started("-p", peer.path, "trace", "listen", str(path))
    big = Packet(201, (Atom.raw(7, bytes(range(256)) * 15),))
    with Link.open(port, timeout=LONG) as link:
        peer.script = answering(acknowledged=False)
        link.request(big)
    item = peer.received.get(timeout=LONG)
    assert isinstance(item, Frame) and item.packet == big
    process.send_signal(signal.SIGINT)
    _, talk = process.communicate(timeout=LONG)
    assert (process.returncode, talk) == (0, "")
    said = [line for line in statements(path) if "says" in line]
    assert [line[:49] for line in said] == ["station says packet CELL_SWITCH_MODE_CMD 7=bytes:"]
    assert comments(path)[-1] == "# listened no longer"


def test_a_line_that_dies_while_it_is_listened_to(peer: Peer, started: Any,
                                                  tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    process, port = started("-p", peer.path, "trace", "listen", str(path))
    peer.script = replying("\r\nOK\r\n")
    with Link.open(port, timeout=LONG) as link:
        assert link.at("AT").ok
        assert isinstance(peer.received.get(timeout=LONG), Text)
        peer.hang_up()
        _, talk = process.communicate(timeout=LONG)
        assert process.returncode == 3 and "went away" in talk
        with pytest.raises(NoPort):
            link.at("AT")
    assert statements(path) == ["channel pc", *AT, "station loses"]


def test_listening_without_a_port_leaves_nothing(run_station: Run, tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    assert run_station("-p", "/dev/no-such", "trace", "listen", str(path)).returncode == 3
    assert run_station("trace", "listen", str(path)).returncode == 3
    assert not path.exists()
