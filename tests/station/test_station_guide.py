"""The scripting guide: its scripts are run, its commands exist."""

from __future__ import annotations

import re
import shlex
import subprocess
import sys
from pathlib import Path
from typing import Sequence

import pytest
from station_peer import ROOT, Peer, Run, ok, station_environment

from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

GUIDE = (ROOT / "docs" / "station.md").read_text(encoding="utf-8")
SCRIPTS = re.findall(r"```python\n(.*?)```", GUIDE, re.S)
COMMANDS = sorted(set(re.findall(r"^    (amt-station [^#\n]+?)\s*(?:#.*)?$", GUIDE, re.M)
                      + re.findall(r"`(amt-station [^`]+)`", GUIDE)))


class Line:
    """A handset that knows what the guide asks for."""

    def __init__(self, version: bytes = b"(KEL-1_4.2.1)", adc: int = 3700) -> None:
        self.version, self.adc, self.serial = version, adc, "none"

    def __call__(self, item: Item) -> Sequence[bytes]:
        if not isinstance(item, Frame):
            value = b"\r\n^DSVER: (KEL-1_4.2.1)\r\n" if b"DSVER" in item.raw else b""
            return [value + b"\r\nOK\r\n"]
        packet = item.packet
        atoms: list[Atom] = []
        if packet.command == 45:
            atoms = [Atom.integer(19, packet.get_int(19)), Atom.raw(18, self.version)]
        elif packet.command == 224:
            atoms = [Atom.integer(151, self.adc)]
        elif packet.command == 191 and packet.get_int(160):
            self.serial = str(packet.atoms[-1].value)
        elif packet.command == 191:
            atoms = [Atom.string(161, self.serial)]
        return [ACKNOWLEDGEMENT, ok(packet.command + 1, *atoms)]


def run_script(script: str, tmp_path: Path, *arguments: str) -> "subprocess.CompletedProcess[str]":
    path = tmp_path / "script.py"
    path.write_text(script, encoding="utf-8")
    return subprocess.run([sys.executable, str(path), *arguments], cwd=tmp_path,
                          env=station_environment(PYTHONPATH=str(ROOT)), capture_output=True,
                          text=True, timeout=60, check=False)


@pytest.mark.parametrize("version, adc, verdict, words", [
    (b"(KEL-1_4.2.1)", 3700, 1, "PASS"), (b"(KEL-1_4.2.1)", 2999, 2, "FAIL battery ADC"),
    (b"other", 3700, 2, "FAIL wrong software")])
def test_the_script_for_a_line(version: bytes, adc: int, verdict: int, words: str, peer: Peer,
                               tmp_path: Path) -> None:
    (script,) = [script for script in SCRIPTS if "sys.argv" in script]
    peer.script = Line(version, adc)
    result = run_script(script, tmp_path, peer.path, "KEL0000000042")
    assert result.stdout.startswith(words), result.stderr
    assert result.returncode == verdict - 1
    assert peer.raw.endswith(encode_envelope(
        Packet(91, (Atom.integer(39, 3), Atom.integer(36, verdict)))))


@pytest.mark.parametrize("script", [script for script in SCRIPTS if "ttyACM0" in script])
def test_the_short_scripts(script: str, peer: Peer, tmp_path: Path) -> None:
    peer.script = Line()
    result = run_script(script.replace("/dev/ttyACM0", peer.path), tmp_path)
    assert result.returncode == 0 and result.stdout, result.stderr


@pytest.mark.parametrize("command", COMMANDS)
def test_the_commands_are_commands(command: str, run_station: Run) -> None:
    words = [word for word in shlex.split(command)[1:] if word != "--help"]
    result = run_station(*words, "--help")
    assert result.returncode == 0 and "Usage: amt-station" in result.stdout, result.stderr
