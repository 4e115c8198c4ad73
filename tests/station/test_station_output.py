"""What the command prints: JSON, lists, and colour only where somebody looks at it."""

from __future__ import annotations

import json
import os
import pty
import re
import subprocess
from typing import Any, Iterator

import pytest
from station_peer import (PATIENCE, ROOT, Peer, Run, answering, error_packet, ok, replying,
                          sequence, station_command, station_environment)

from amt_station.wire.atoms import Atom
from amt_station.wire.envelope import ACKNOWLEDGEMENT

VERSION_ATOMS = (Atom.integer(19, 16), Atom.raw(18, b"\r1.2\n\n"))
ONE_LINE = re.compile(r"\Aamt-station: [^\n]+\n\Z")


def json_of(result: subprocess.CompletedProcess[str]) -> Any:
    return json.loads(result.stdout)


def test_json_of_a_request(peer: Peer, run_station: Run) -> None:
    peer.script = answering(*VERSION_ATOMS)
    document = json_of(run_station("--json", "-p", peer.path, "send", "45", "19=int:16"))
    seconds = document.pop("seconds")
    assert 0 < seconds < PATIENCE
    assert document == {
        "ok": True, "channel": "pc", "acknowledged": True, "result": 0, "stray": [],
        "request": {"id": 45, "name": "AMT_VERSION_CMD", "atoms": [
            {"id": 19, "name": "module", "type": "int", "value": 16}]},
        "answers": [{"id": 46, "name": "AMT_VERSION_RSPCMD", "atoms": [
            {"id": 19, "name": "module", "type": "int", "value": 16},
            {"id": 18, "name": "version", "type": "bytes", "value": "0d312e320a0a",
             "text": "\r1.2\n\n"},
            {"id": 1, "name": "result", "type": "int", "value": 0}]}],
        "values": {"module": 16, "version": "\r1.2\n\n", "result": 0}}


def test_json_of_a_typed_command(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(188, Atom.raw(154, b"\1"))],
                           [ACKNOWLEDGEMENT, ok(188, Atom.raw(154, b"\6"), Atom.integer(158, 99))])
    document = json_of(run_station("-p", peer.path, "wifi", "rx", "stop", "--json"))
    assert document["ok"] and document["command"] == "wifi rx stop"
    assert document["values"] == {"step": 6, "packets": 99, "result": 0}
    assert [before["values"]["step"] for before in document["before"]] == [1]


def test_json_of_an_at_text(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([b"\r\n^DSVER: 1.2\r\n\r\nOK\r\n"], [b"\r\n+CME ERROR: 100\r\n"])
    document = json_of(run_station("-p", peer.path, "at", "AT^DSVER", "--json"))
    assert document.pop("seconds") > 0
    assert document == {"ok": True, "sent": "AT^DSVER", "lines": ["^DSVER: 1.2"], "final": "OK",
                        "stray": []}
    result = run_station("-p", peer.path, "at", "AT^DSVER", "--json")
    assert result.returncode == 1 and ONE_LINE.match(result.stderr)
    assert json_of(result)["final"] == "+CME ERROR: 100"
    assert json_of(result)["error"]["kind"] == "refused"


@pytest.mark.parametrize("arguments, status, kind", [
    (["send", "nothing"], 2, "usage"), (["no-such-command"], 2, "usage"),
    (["-p", "/dev/no-such-port", "at", "AT"], 3, "no-port")])
def test_json_of_a_failure(arguments: list[str], status: int, kind: str,
                           run_station: Run) -> None:
    result = run_station(*arguments, "--json")
    assert result.returncode == status
    document = json_of(result)
    assert document["ok"] is False
    assert document["error"]["kind"] == kind
    assert document["error"]["message"] in result.stderr


def test_json_of_a_refusal_says_what_is_held(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([error_packet(0)])
    document = json_of(run_station("-p", peer.path, "--json", "at", "--force", 'AT^DBTADDR=""'))
    assert document["error"]["held"] == "text"
    assert (document["error"]["code"], document["error"]["response"]) == (1, 0)
    assert "recover" in document["error"]["advice"]


def test_recover(peer: Peer, run_station: Run) -> None:
    peer.script = replying("\r\nOK\r\n")
    result = run_station("-p", peer.path, "recover")
    assert (result.returncode, result.stdout, result.stderr) == (0, "clear\n", "")
    assert peer.raw == b"AT^DBTADDR=?\r"
    document = json_of(run_station("-p", peer.path, "recover", "--json"))
    assert document == {"ok": True, "attempts": 1, "late_answers": []}


def test_recover_from_a_held_packet_says_what_to_do(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    result = run_station("-p", peer.path, "recover")
    assert result.returncode == 1
    assert ONE_LINE.match(result.stderr) and "plug it in" in result.stderr


def test_commands_lists_every_request(run_station: Run) -> None:
    rows = json_of(run_station("commands", "--json"))
    version = next(row for row in rows if row["id"] == 45)
    assert (version["name"], version["command"], version["acknowledged"]) == (
        "AMT_VERSION_CMD", "version", True)
    text = run_station("commands").stdout
    for row in rows:
        assert re.search(rf"^{row['id']} +0x{row['id']:02X} +{row['command']} ", text, re.M)
        for operation in row["operations"]:
            assert re.search(rf"^{operation} ", text, re.M)
    assert "AT^DBTADDR?" in run_station("commands", "--at").stdout
    assert "AT^DSVER" in [row["text"] for row in json_of(run_station("commands", "--at",
                                                                     "--json"))]


def on_terminal(arguments: list[str], **environment: str) -> str:
    """Run the station with a terminal as its output and return what it shows."""
    master, slave = pty.openpty()
    with subprocess.Popen(station_command(*arguments), cwd=ROOT, stdout=slave, stderr=slave,
                          env=station_environment(**environment)) as process:
        os.close(slave)
        shown = b"".join(chunks_of(master))
        process.wait(timeout=PATIENCE)
    os.close(master)
    return shown.decode()


def chunks_of(fd: int) -> Iterator[bytes]:
    while True:
        try:
            data = os.read(fd, 4096)
        except OSError:
            return
        if not data:
            return
        yield data


@pytest.mark.parametrize("environment, coloured", [
    ({}, True), ({"NO_COLOR": "1"}, False), ({"TERM": "dumb"}, False)])
def test_colour_on_a_terminal_only(peer: Peer, environment: dict[str, str],
                                   coloured: bool) -> None:
    shown = on_terminal(["-p", peer.path, "--timeout", "0.2", "at", "AT"], **environment)
    assert ("\x1b" in shown) is coloured
    assert ("waiting for AT" in shown) is coloured
    assert "no final result for AT" in shown


def test_no_colour_off_a_terminal(peer: Peer, run_station: Run) -> None:
    result = run_station("-p", peer.path, "--timeout", "0.2", "at", "AT")
    assert "\x1b" not in result.stdout + result.stderr


@pytest.mark.parametrize("arguments", [["--help"], ["wifi", "--help"],
                                       ["wifi", "tx", "start", "--help"]])
def test_help(arguments: list[str], run_station: Run) -> None:
    result = run_station(*arguments)
    assert result.returncode == 0 and "Usage: amt-station" in result.stdout
