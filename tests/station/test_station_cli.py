"""The command as people run it: exit statuses, one clear line, JSON, settings, colour."""

from __future__ import annotations

import json
import re
import signal
import subprocess

import pytest
from station_peer import (PATIENCE, ROOT, Peer, Run, answering, ok, replying, sequence,
                          station_command, station_environment)

from amt_station.link import Link
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

VERSION_ATOMS = (Atom.integer(19, 16), Atom.raw(18, b"\r1.2\n\n"))
ONE_LINE = re.compile(r"\Aamt-station: [^\n]+\n\Z")


def test_pass(peer: Peer, run_station: Run) -> None:
    peer.script = answering(*VERSION_ATOMS)
    result = run_station("-p", peer.path, "version", "--module", "software")
    assert (result.returncode, result.stdout) == (0, "module: 16 (software)\nversion: 1.2\n")
    assert re.fullmatch(r"AMT_VERSION_CMD: acknowledged, answered after [0-9.]+ ms\n",
                        result.stderr)
    assert peer.raw == encode_envelope(Packet(45, (Atom.integer(19, 16),)))


@pytest.mark.parametrize("arguments, status, words", [
    (["version"], 2, "needs module"),
    (["version", "--module", "chocolate"], 2, "nor one of product, software"),
    (["nonsense"], 2, "No such command 'nonsense'"),
    (["at"], 2, "Missing argument 'TEXT'"),
    (["--timeout", "0", "at", "AT"], 2, "timeout"),
    (["send", "no-such-thing"], 2, "no command 'no-such-thing'"),
    (["send", "256"], 2, "not a byte"),
    (["send", "45", "19"], 2, "ATOM=TYPE:VALUE"),
    (["send", "45", "19=16"], 2, "needs a type"),
    (["send", "45", "colour=int:1"], 2, "no atom 'colour'"),
    (["send", "45", "19=int:x"], 2, "atom 19"),
    (["send", "45", "19=bytes:0"], 2, "atom 19"),
    (["send", "45", "19=bool:256"], 2, "not a byte"),
    (["send", "45", "module=chocolate"], 2, "nor one of"),
    (["at", 'AT^DBTADDR=""'], 2, "known to refuse"),
    (["adb-serial", "write", "x" * 100], 2, "at most 99"),
    (["wifi", "tx", "start", "--channel", "256", "--rate", "1", "--power", "1"], 2, "above 255"),
    (["damt1", "allow"], 2, "app channel only"),
    (["--app", "power-off"], 2, "pc channel only"),
    (["--app", "at", "AT"], 2, "PC line only"),
    (["at", "AT"], 3, "no port named"),
])
def test_refused_before_the_port_is_touched(arguments: list[str], status: int, words: str,
                                            run_station: Run) -> None:
    port = {} if status == 3 else {"AMT_STATION_PORT": "/dev/no-such-port"}
    result = run_station(*arguments, **port)
    assert result.returncode == status
    assert words in result.stderr
    assert ONE_LINE.match(result.stderr)
    assert result.stdout == ""


def test_the_handset_says_no(peer: Peer, run_station: Run) -> None:
    peer.script = answering(code=1)
    result = run_station("-p", peer.path, "adb-serial", "read")
    assert (result.returncode, result.stdout) == (1, "")
    assert ONE_LINE.match(result.stderr)
    assert "refused with code 1" in result.stderr and "unplug the USB cable" in result.stderr


def test_no_port(run_station: Run) -> None:
    result = run_station("-p", "/dev/no-such-port", "at", "AT")
    assert (result.returncode, result.stdout) == (3, "")
    assert ONE_LINE.match(result.stderr) and "/dev/no-such-port" in result.stderr


def test_port_busy(peer: Peer, run_station: Run) -> None:
    with Link.open(peer.path):
        result = run_station("-p", peer.path, "at", "AT")
    assert (result.returncode, result.stdout) == (4, "")
    assert ONE_LINE.match(result.stderr) and "busy" in result.stderr
    assert peer.raw == b""


def test_no_answer(peer: Peer, run_station: Run) -> None:
    result = run_station("-p", peer.path, "--timeout", "0.3", "at", "AT")
    assert (result.returncode, result.stdout) == (5, "")
    assert ONE_LINE.match(result.stderr) and "within 0.3 s" in result.stderr


def test_bad_frame(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ok(46)[:-1] + b"\0"])
    result = run_station("-p", peer.path, "--timeout", "2", "version", "--module", "app")
    assert (result.returncode, result.stdout) == (6, "")
    assert ONE_LINE.match(result.stderr) and "checksum" in result.stderr


@pytest.mark.parametrize("options, stdout", [([], False), (["--json"], True)])
def test_interrupted(peer: Peer, options: list[str], stdout: bool) -> None:
    with subprocess.Popen(station_command("-p", peer.path, *options, "at", "AT"), cwd=ROOT,
                          env=station_environment(), stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, text=True) as process:
        peer.next()
        process.send_signal(signal.SIGINT)
        out, talk = process.communicate(timeout=PATIENCE)
    assert process.returncode == 130
    assert talk == "amt-station: interrupted\n"
    assert (json.loads(out)["error"]["kind"] == "interrupted") if stdout else out == ""


def test_settings_flag_before_environment_before_default(peer: Peer, run_station: Run) -> None:
    peer.script = replying("\r\nOK\r\n")
    wrong = {"AMT_STATION_PORT": "/dev/no-such-port"}
    assert run_station("at", "AT", AMT_STATION_PORT=peer.path).returncode == 0
    assert run_station("at", "AT", **wrong).returncode == 3
    assert run_station("-p", peer.path, "at", "AT", **wrong).returncode == 0
    assert run_station("at", "AT", "-p", peer.path, **wrong).returncode == 0


def test_channel_and_timeout_from_the_environment(app_peer: Peer, peer: Peer,
                                                  run_station: Run) -> None:
    app_peer.script = lambda item: (Packet(36, (Atom.integer(1, 0),)).encode(),)
    result = run_station("vibrator", "on", AMT_STATION_PORT=app_peer.path,
                         AMT_STATION_CHANNEL="app")
    assert (result.returncode, result.stdout) == (0, "")
    result = run_station("at", "AT", AMT_STATION_PORT=peer.path, AMT_STATION_TIMEOUT="0.25")
    assert result.returncode == 5 and "0.25 s" in result.stderr
    result = run_station("--pc", "at", "AT", AMT_STATION_PORT=peer.path,
                         AMT_STATION_CHANNEL="app", AMT_STATION_TIMEOUT="0.25")
    assert result.returncode == 5
    for name in ("AMT_STATION_CHANNEL", "AMT_STATION_TIMEOUT"):
        result = run_station("at", "AT", **{"AMT_STATION_PORT": peer.path, name: "much"})
        assert result.returncode == 2 and name in result.stderr


def test_send_shows_the_answer(peer: Peer, run_station: Run) -> None:
    peer.script = answering(*VERSION_ATOMS)
    for command in ("45", "0x2D", "AMT_VERSION_CMD", "version"):
        result = run_station("-p", peer.path, "send", command, "module=software")
        assert result.returncode == 0
        assert result.stdout.splitlines() == [
            "46 (0x2E) AMT_VERSION_RSPCMD", "  19  module   int    16",
            "  18  version  bytes  0d312e320a0a 1.2", "  1   result   int    0"]
    frame = encode_envelope(Packet(45, (Atom.integer(19, 16),)))
    assert peer.raw == frame * 4


def test_send_takes_every_type(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([encode_envelope(Packet(10))])
    result = run_station("-p", peer.path, "send", "9", "1=int:-2", "0x02=str:a=b:c", "3=bytes:00ff",
                         "4=bool:1")
    assert result.returncode == 0
    item = peer.next()
    assert isinstance(item, Frame)
    assert item.packet.atoms == (Atom.integer(1, -2), Atom.string(2, "a=b:c"),
                                 Atom.raw(3, b"\0\xff"), Atom.boolean(4, 1))


def test_send_shows_a_refusal_too(peer: Peer, run_station: Run) -> None:
    peer.script = answering(Atom.integer(36, 7), code=3)
    result = run_station("-p", peer.path, "send", "89", "station=3")
    assert result.returncode == 1
    assert "  36  verdict  int  7" in result.stdout.splitlines()
    assert "refused with code 3" in result.stderr


def test_an_answer_is_named_after_its_request(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ok(201)], [ACKNOWLEDGEMENT, ok(175)])
    lines = run_station("-p", peer.path, "send", "200").stdout.splitlines()
    assert lines == ["201 (0xC9) CELL_SWITCH_MODE_CMD", "  1  result  int  0"]
    lines = run_station("-p", peer.path, "send", "gps-test").stdout.splitlines()
    assert lines == ["175 (0xAF) AMT_GPS_CONTROL_RSPCMD", "  1  result  int  0"]


def test_typed_commands_send_what_the_table_says(peer: Peer, run_station: Run) -> None:
    peer.script = answering()
    port = {"AMT_STATION_PORT": peer.path}
    for arguments, packet in [
            (["test-result", "write", "--station", "3", "--pass"],
             Packet(91, (Atom.integer(39, 3), Atom.integer(36, 1)))),
            (["test-result", "write", "--station", "3", "--fail", "--description", "no sound"],
             Packet(91, (Atom.integer(39, 3), Atom.integer(36, 2), Atom.string(37, "no sound")))),
            (["adb-serial", "write", "ABC"],
             Packet(191, (Atom.integer(160, 1), Atom.integer(162, 3), Atom.string(161, "ABC")))),
            (["pcba", "write", "P-1"],
             Packet(193, (Atom.boolean(190, 2), Atom.string(191, "P-1")))),
            (["battery", "calibrate", "--a", "1", "--b", "-2", "--c", "3", "--d", "0x10"],
             Packet(226, (Atom.integer(146, 1), Atom.integer(147, -2), Atom.integer(148, 3),
                          Atom.integer(149, 16)))),
            (["gps", "stop"], Packet(174, (Atom.integer(140, 0),)))]:
        result = run_station(*arguments, **port)
        assert result.returncode == 0, result.stderr
        item = peer.next()
        assert isinstance(item, Frame) and item.packet == packet


def test_wifi_steps_start_the_chip_first(peer: Peer, run_station: Run) -> None:
    peer.script = answering()
    result = run_station("-p", peer.path, "wifi", "tx", "start", "--channel", "6", "--rate", "550",
                         "--power", "15")
    assert result.returncode == 0
    start = Packet(187, (Atom.raw(154, b"\1"),))
    transmit = Packet(187, (Atom.raw(154, b"\3"), Atom.raw(155, b"\6"),
                            Atom.raw(156, b"\x26\x02"), Atom.raw(157, b"\x0f\x00")))
    assert peer.raw == encode_envelope(start) + encode_envelope(transmit)


def test_a_refused_start_ends_the_wifi_step(peer: Peer, run_station: Run) -> None:
    peer.script = answering(code=1)
    assert run_station("-p", peer.path, "wifi", "tx", "stop").returncode == 1
    assert peer.raw == encode_envelope(Packet(187, (Atom.raw(154, b"\1"),)))


def test_a_reader_that_goes_away_is_no_traceback(run_station: Run) -> None:
    command = " ".join(station_command("commands")) + " | head -n 1"
    result = subprocess.run(["/bin/sh", "-c", command], cwd=ROOT, env=station_environment(),
                            capture_output=True, text=True, timeout=60, check=False)
    assert "Traceback" not in result.stderr
    assert len(result.stdout.splitlines()) == 1
