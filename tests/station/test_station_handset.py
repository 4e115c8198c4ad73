"""The typed interface: methods, records, the log, the README's script, and the pytest plugin."""

from __future__ import annotations

import dataclasses
import logging
import re
import subprocess
import sys
from pathlib import Path
from typing import Any, Sequence

import pytest
from station_peer import ROOT, Peer, ok, replying, sequence, station_environment

import amt_station
from amt_station import (Channel, Handset, IncompleteAnswer, Module, NoPort, Refused, UsageProblem,
                         ValueProblem, Verdict, connect)
from amt_station.handset import records
from amt_station.handset.commands import Commands
from amt_station.handset_source import sources
from amt_station.link import Link
from amt_station.requests.table import operations
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item, Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

ORLA = (Atom.integer(19, 16), Atom.raw(18, b"ORLA 1.2"))


@pytest.mark.parametrize("name", sorted(sources()))
def test_the_generated_code_is_current(name: str) -> None:
    written = (ROOT / "amt_station" / "handset" / name).read_text(encoding="utf-8")
    assert written == sources()[name], "run: python3 -m amt_station.handset_source"


@pytest.mark.parametrize("path", [operation.path for _, operation in operations()],
                         ids=" ".join)
def test_every_typed_command_has_its_method(path: tuple[str, ...], link: Link) -> None:
    found: Any = Commands(link)
    for word in path:
        found = getattr(found, word.replace("-", "_"))
    assert callable(found) and found.__doc__


def test_a_method_gives_a_frozen_record(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(46, *ORLA)])
    result = Handset(link).version(module=Module.SOFTWARE)
    assert (result.version, result.module) == ("ORLA 1.2", Module.SOFTWARE)
    assert isinstance(result.module, Module)
    assert result.performed.exchange.seconds > 0
    with pytest.raises(dataclasses.FrozenInstanceError):
        result.version = "x"  # type: ignore[misc]


def test_units_stand_in_the_documentation(app_peer: Peer, app_link: Link) -> None:
    app_peer.script = lambda item: [Packet(10, (Atom.integer(5, 4012345),
                                                Atom.integer(1, 0))).encode()]
    assert Handset(app_link).battery.voltage().voltage == 4.012345
    source = Path(records.__file__).read_text(encoding="utf-8")
    assert '    voltage: float\n    """Battery voltage, in V."""' in source
    assert '    temperature: float\n    """Battery temperature, in °C."""' in source


def test_methods_take_what_the_table_names(peer: Peer, link: Link) -> None:
    peer.script = sequence([ok(92)], [ok(6)], [ok(6)])
    handset = Handset(link)
    handset.test_result.write(station=3, verdict=Verdict.PASS)
    handset.imei.write(imei="490154203237518")
    handset.imei.write(imei="123", force=True)
    packets = [item.packet for item in (peer.next(), peer.next(), peer.next())
               if isinstance(item, Frame)]
    assert packets == [Packet(91, (Atom.integer(39, 3), Atom.integer(36, 1))),
                       Packet(5, (Atom.string(21, "490154203237518"),)),
                       Packet(5, (Atom.string(21, "123"),))]


def test_wrong_values_send_nothing(peer: Peer, link: Link) -> None:
    handset = Handset(link)
    with pytest.raises(ValueProblem, match="check digit"):
        handset.imei.write(imei="490154203237519")
    with pytest.raises(ValueProblem, match="not a text"):
        handset.imei.write(imei=True)  # type: ignore[arg-type]
    with pytest.raises(UsageProblem, match="app channel only"):
        handset.battery.voltage()
    with pytest.raises(UsageProblem, match="finite"):
        handset.battery.adc(timeout=0)
    for timeout in ("1", 1e300, float("nan"), True):
        with pytest.raises(UsageProblem, match="finite"):
            handset.battery.adc(timeout=timeout)  # type: ignore[arg-type]
        with pytest.raises(UsageProblem, match="finite"):
            connect(peer.path, timeout=timeout)  # type: ignore[arg-type]
    assert peer.raw == b""


def test_texts(peer: Peer, link: Link) -> None:
    peer.script = sequence([b'\r\n^DBTADDR: "00:11:22:33:44:55"\r\n\r\nOK\r\n'], [b"\r\nOK\r\n"],
                           [b"\r\nERROR\r\n"])
    handset = Handset(link)
    assert handset.at("AT^DBTADDR?").lines == ('^DBTADDR: "00:11:22:33:44:55"',)
    assert handset.at("AT").lines == ()
    with pytest.raises(Refused):
        handset.at("AT+X")


def test_a_value_without_a_member_stays_a_number(peer: Peer, link: Link) -> None:
    peer.script = sequence([ok(90, Atom.integer(39, 3), Atom.integer(36, 7))])
    result = Handset(link).test_result.read(station=3)
    assert (result.station, result.verdict, result.description) == (3, 7, None)


def test_what_is_missing_is_an_error(peer: Peer, link: Link) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(225)])
    with pytest.raises(IncompleteAnswer):
        Handset(link).battery.adc()


def test_connect(app_peer: Peer) -> None:
    app_peer.script = lambda item: [Packet(36, (Atom.integer(1, 0),)).encode()]
    with connect(app_peer.path, channel="app", timeout=5) as handset:
        assert handset.link.channel is Channel.APP
        handset.vibrator.on()
    with pytest.raises(NoPort):
        connect("/dev/no-such-port")
    with pytest.raises(UsageProblem, match="neither pc nor app"):
        connect(app_peer.path, channel="modem")  # type: ignore[arg-type]


def test_every_exported_name_is_there() -> None:
    for name in amt_station.__all__:
        assert getattr(amt_station, name).__name__ == name
    with pytest.raises(AttributeError):
        getattr(amt_station, "nonsense")


def test_the_log(peer: Peer, link: Link, caplog: pytest.LogCaptureFixture) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(46, *ORLA)], [ACKNOWLEDGEMENT, ok(46, *ORLA)])
    with caplog.at_level(logging.INFO, logger="amt_station"):
        Handset(link).version(module=Module.SOFTWARE)
    text = caplog.text
    assert "AMT_VERSION_CMD" in text and "ORLA 1.2" in text and "acknowledgement" in text
    assert "aa bb cc dd" not in text
    caplog.clear()
    with caplog.at_level(logging.DEBUG, logger="amt_station"):
        Handset(link).version(module=Module.SOFTWARE)
    assert caplog.text.count("aa bb cc dd") == 3, "request, acknowledgement and answer"


def test_nothing_is_logged_by_default(peer: Peer) -> None:
    peer.script = replying("\r\nOK\r\n")
    code = f"from amt_station import connect\nconnect({peer.path!r}).at('AT')"
    result = subprocess.run([sys.executable, "-c", code], cwd=ROOT, env=station_environment(),
                            capture_output=True, text=True, timeout=60, check=True)
    assert (result.stdout, result.stderr) == ("", "")


def readme_script() -> str:
    text = (ROOT / "amt_station" / "README.md").read_text(encoding="utf-8")
    (script,) = re.findall(r"```python\n(.*?)```", text, re.S)
    return str(script)


@pytest.mark.parametrize("version, verdict", [(b"(KEL-1 ORLA 1.2)", 1), (b"other", 2), (None, 2)])
def test_the_script_of_the_readme(version: bytes | None, verdict: int, peer: Peer) -> None:
    script = readme_script()
    assert len(script.strip().splitlines()) <= 10

    def answer(item: Item) -> Sequence[bytes]:
        if isinstance(item, Text):
            return [b"\r\nOK\r\n"]
        assert isinstance(item, Frame)
        if item.packet.command == 45:
            if version is None:
                return [ACKNOWLEDGEMENT, ok(46, Atom.integer(19, 16))]
            return [ACKNOWLEDGEMENT, ok(46, Atom.integer(19, 16), Atom.raw(18, version))]
        if item.packet.command == 224:
            return [ACKNOWLEDGEMENT, ok(225, Atom.integer(151, 3700))]
        return [ok(item.packet.command + 1)]

    peer.script = answer
    exec(compile(script.replace("/dev/ttyACM0", peer.path), "README", "exec"), {})
    written = Packet(91, (Atom.integer(39, 3), Atom.integer(36, verdict)))
    assert peer.raw.endswith(encode_envelope(written))


EXAMPLE = """
from amt_station import Module, Verdict, connect

with connect("/dev/ttyACM0") as handset:
    voltage: float = handset.battery.voltage().voltage
    version: str = handset.version(module=Module.SOFTWARE).version
    handset.test_result.write(station=3, verdict=Verdict.PASS)
    lines: tuple[str, ...] = handset.at("AT^DBTADDR?").lines
"""

WRONG = {
    "handset.battery.voltage().volts": "has no attribute",
    "handset.battery.volt()": "has no attribute",
    "handset.test_result.write(station='3', verdict=Verdict.PASS)": "incompatible type",
    "handset.version(module='software')": "incompatible type",
    "handset.imei.write()": "Missing named argument",
}


def test_the_types_are_checked(tmp_path: Path) -> None:
    source = EXAMPLE + "".join(f"    {line}\n" for line in WRONG)
    path = tmp_path / "line_script.py"
    path.write_text(source, encoding="utf-8")
    result = subprocess.run(
        [sys.executable, "-m", "mypy", "--strict", "--config-file", "/dev/null",
         "--ignore-missing-imports", "--cache-dir", str(ROOT / "build" / "mypy"), str(path)],
        cwd=tmp_path, env={**station_environment(), "MYPYPATH": str(ROOT)}, capture_output=True,
        text=True, timeout=300, check=False)
    found = [line.split(":", 3)[1:] for line in result.stdout.splitlines()
             if "line_script.py" in line and ": error:" in line]
    first = len(EXAMPLE.splitlines()) + 1
    assert [int(number) for number, *_ in found] == list(range(first, first + len(WRONG))), (
        result.stdout + result.stderr)
    for (*_, message), words in zip(found, WRONG.values()):
        assert words in message


PLUGIN_TEST = """
def test_version(handset):
    assert handset.at("AT").lines == ()
"""


def test_the_plugin_gives_a_handset_on_a_port(peer: Peer, tmp_path: Path) -> None:
    peer.script = replying("\r\nOK\r\n")
    (tmp_path / "test_line.py").write_text(PLUGIN_TEST, encoding="utf-8")
    result = subprocess.run(
        [sys.executable, "-m", "pytest", "-q", "-p", "amt_station.pytest_plugin",
         "-p", "no:cacheprovider", "--rootdir", str(tmp_path), "--amt-port", peer.path,
         str(tmp_path)],
        cwd=tmp_path, env=station_environment(PYTHONPATH=str(ROOT)), capture_output=True, text=True,
        timeout=120, check=False)
    assert result.returncode == 0, result.stdout + result.stderr
    assert peer.raw == b"AT^DBTADDR=?\rAT\r"
