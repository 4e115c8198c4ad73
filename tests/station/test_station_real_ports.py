"""The list of ports as the system has it: nothing of it is replaced but the system's own files."""

from __future__ import annotations

import json
import shutil
import subprocess
import sys
from pathlib import Path

import pytest
from station_peer import ROOT, Peer, replying, station_environment

OK = "\r\nOK\r\n"


def plug(system: Path, name: str, product: str, serial: str) -> None:
    """A serial port of a USB device, as the kernel shows it below /sys."""
    device = system / "devices" / "usb1" / f"1-{product[-1]}"
    interface = device / f"1-{product[-1]}:1.0"
    interface.mkdir(parents=True)
    for attribute, value in {"idVendor": "1d6b", "idProduct": product, "serial": serial,
                             "product": "handset", "bNumInterfaces": "1"}.items():
        (device / attribute).write_text(f"{value}\n", encoding="ascii")
    bus = system / "bus" / "usb"
    bus.mkdir(parents=True, exist_ok=True)
    (interface / "subsystem").symlink_to(Path("/sys/bus/usb"))
    (system / "class" / "tty" / name).mkdir(parents=True)
    (system / "class" / "tty" / name / "device").symlink_to(
        Path("/sys") / interface.relative_to(system))


class Computer:
    """This computer with other USB ports: the tree of /sys and the devices are of a test."""

    def __init__(self, folder: Path) -> None:
        self.system = folder / "sys"
        (self.system / "class" / "tty").mkdir(parents=True)
        self._devices: list[str] = []

    def plug(self, name: str, peer: Peer, product: str, serial: str) -> None:
        """A handset comes in."""
        plug(self.system, name, product, serial)
        self._devices += ["--dev-bind", peer.path, f"/dev/{name}"]

    def run(self, *arguments: str) -> "subprocess.CompletedProcess[str]":
        """What the program says there."""
        return subprocess.run(
            ["bwrap", "--bind", "/", "/", "--dev", "/dev", *self._devices, "--bind",
             str(self.system), "/sys", "--chdir", str(ROOT), sys.executable, *arguments],
            env=station_environment(), stdin=subprocess.DEVNULL, capture_output=True, text=True,
            timeout=300, check=False)

    def station(self, *arguments: str) -> "subprocess.CompletedProcess[str]":
        """``amt-station`` there."""
        return self.run("-m", "amt_station", *arguments)


@pytest.fixture
def computer(tmp_path: Path) -> Computer:
    """One without a handset, where this machine allows it."""
    made = Computer(tmp_path)
    if shutil.which("bwrap") is None or made.run("-c", "").returncode != 0:
        pytest.skip("this machine gives no namespace of its own for /sys and /dev")
    return made


def test_the_only_handset_is_found_and_talked_to(computer: Computer, peer: Peer) -> None:
    peer.script = replying(OK)
    assert computer.station("-p", "auto", "at", "AT").returncode == 3
    computer.plug("ttyACM0", peer, "5510", "KEL1")
    result = computer.station("-p", "auto", "at", "AT")
    assert (result.returncode, result.stdout) == (0, "OK\n"), result.stderr
    assert peer.raw == b"AT\r"
    waited = computer.station("wait", "--for", "60")
    assert (waited.returncode, waited.stdout) == (0, "/dev/ttyACM0\n"), waited.stderr


def test_several_are_listed_and_told_apart(computer: Computer, peer: Peer,
                                           app_peer: Peer) -> None:
    peer.script = replying(OK)
    computer.plug("ttyACM0", app_peer, "5511", "KEL1")
    computer.plug("ttyUSB3", peer, "5510", "KEL2")
    rows = json.loads(computer.station("ports", "--json").stdout)
    assert [(row["device"], row["vid_pid"], row["serial"]) for row in rows] == [
        ("/dev/ttyACM0", "1d6b:5511", "KEL1"), ("/dev/ttyUSB3", "1d6b:5510", "KEL2")]
    ambiguous = computer.station("-p", "auto", "at", "AT")
    assert ambiguous.returncode == 2 and "/dev/ttyACM0 (KEL1)" in ambiguous.stderr
    assert computer.station("--serial", "KEL2", "at", "AT").returncode == 0
    assert computer.station("--vid-pid", "1d6b:5510", "at", "AT").returncode == 0
    assert peer.raw == b"AT\r" * 2 and app_peer.raw == b""


def test_the_doctor_finds_the_only_one(computer: Computer, peer: Peer, app_peer: Peer,
                                       tmp_path: Path) -> None:
    own = ["--records", str(tmp_path), "--store", f"sqlite:///{tmp_path}/line.sqlite"]
    peer.script = replying(OK)
    computer.plug("ttyACM0", peer, "5510", "KEL1")
    told = json.loads(computer.station("doctor", "--json", *own).stdout)
    found = {row["check"]: row for row in told["findings"]}
    assert told["port"] == "/dev/ttyACM0"
    assert found["port"]["text"].startswith(
        "/dev/ttyACM0 is there (1d6b:5510, serial number KEL1, socket 1-0")
    assert [found[name]["level"] for name in ("permission", "holder", "line settings", "answer",
                                              "mode", "request buffer")] == ["ok"] * 6
    computer.plug("ttyUSB3", app_peer, "5511", "KEL2")
    several = computer.station("doctor", "--json", *own)
    told = json.loads(several.stdout)
    assert several.returncode == 8 and told["port"] is None
    assert told["findings"][0]["level"] == "not checked"
    assert "/dev/ttyACM0 (KEL1), /dev/ttyUSB3 (KEL2)" in told["findings"][0]["text"]
    assert app_peer.raw == b""
