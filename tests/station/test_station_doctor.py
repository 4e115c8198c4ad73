"""The doctor and the PC: ports, rights, holders, services, clock, disk; its words and status."""

from __future__ import annotations

import ctypes
import json
import os
import subprocess
import sys
from dataclasses import replace
from pathlib import Path
from types import SimpleNamespace
from typing import Any, Sequence

import pytest
from doctor_visit import FakeComputer, examined, visit
from serial.tools import list_ports
from station_peer import PATIENCE, Peer, Run, replying

from amt_station.cli import main
from amt_station.doctor import checks, computer, line_settings
from amt_station.doctor import port as doctor_port
from amt_station.doctor.checks import Check, examine
from amt_station.doctor.computer import NotKnown, User, kernel_clock_is_kept
from amt_station.doctor.finding import Finding, Level, error, exit_status, ok, unchecked, warning
from amt_station.errors import Held, NoPort, Refused, UsageProblem
from amt_station.link import Link
from amt_station.udev import rule

OK = "\r\nOK\r\n"


@pytest.fixture
def fake(tmp_path: Path) -> FakeComputer:
    """A PC on which all is well."""
    return FakeComputer(tmp_path / "pc")


@pytest.fixture
def no_ports(monkeypatch: pytest.MonkeyPatch) -> list[SimpleNamespace]:
    """The serial ports of this computer."""
    found: list[SimpleNamespace] = []
    monkeypatch.setattr(list_ports, "comports", lambda: list(found))
    return found


def one(findings: Sequence[tuple[str, Finding]], check: str) -> Finding:
    """The only finding of a check."""
    (found,) = [finding for name, finding in findings if name == check]
    return found


# the engine

@pytest.mark.parametrize("findings, status", [
    ([ok("a"), ok("b")], 0), ([ok("a"), unchecked("b")], 8), ([warning("a", ""), ok("b")], 8),
    ([ok("a"), warning("b", ""), error("c", "", 5), error("d", "", 7)], 5), ([], 8)])
def test_the_worst_is_the_status(findings: list[Finding], status: int) -> None:
    assert exit_status(findings) == status


def refuse(_: object) -> Sequence[Finding]:
    raise Refused("no", held=Held.TEXT)


def stay_silent(_: object) -> Sequence[Finding]:
    return []


def break_down(_: object) -> Sequence[Finding]:
    raise ZeroDivisionError("oops")


def not_let_in(_: object) -> Sequence[Finding]:
    raise PermissionError(13, "Permission denied", "/secret")


@pytest.mark.parametrize("function, level, text", [
    (refuse, Level.ERROR, "no"), (stay_silent, Level.UNCHECKED, "came to nothing"),
    (break_down, Level.UNCHECKED, "a defect of the station itself (ZeroDivisionError)"),
    (not_let_in, Level.UNCHECKED, "/secret: Permission denied"),
])
def test_a_check_that_fails_is_never_well(
        function: object, level: Level, text: str, fake: FakeComputer, tmp_path: Path,
        monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path))
    monkeypatch.setattr(checks, "tried", function, raising=False)
    table = [Check("tried", "amt_station.doctor.checks:tried"),
             Check("above", "amt_station.doctor.checks:tried", needs="tried"),
             Check("top", "amt_station.doctor.machine:disk", needs="above")]
    findings = list(examine(visit("", fake), table))
    found = one(findings, "tried")
    assert found.level is level and text in found.text and found.status
    for name, below in (("above", "tried"), ("top", "above")):
        assert one(findings, name) == unchecked(f"has to wait until this is right: {below}")


def test_a_part_that_is_missing_is_said(fake: FakeComputer) -> None:
    (found,) = [finding for _, finding in
                examine(visit("", fake), [Check("store", "amt_line.store.nowhere:store")])]
    assert found.level is Level.UNCHECKED and "a part of the software is missing" in found.text


def test_every_check_can_be_made() -> None:
    names = [check.name for check in checks.CHECKS]
    assert len(set(names)) == len(names)
    for number, check in enumerate(checks.CHECKS):
        assert not check.needs or check.needs in names[:number]


# the port

def test_a_port_that_is_not_there(fake: FakeComputer, tmp_path: Path,
                                  no_ports: list[SimpleNamespace]) -> None:
    findings = examined(str(tmp_path / "none"), fake)
    found = one(findings, "port")
    assert (found.level, found.status) == (Level.ERROR, 3)
    assert found.text == f"{tmp_path}/none: No such file or directory"
    assert found.advice.endswith("no serial port is there at all")
    for name in ("permission", "holder", "line settings", "answer", "mode", "request buffer"):
        assert one(findings, name).level is Level.UNCHECKED
    assert exit_status([finding for _, finding in findings]) == 3


@pytest.mark.parametrize("name", ["file", "."])
def test_what_is_no_port(name: str, fake: FakeComputer, tmp_path: Path) -> None:
    (tmp_path / "file").touch()
    found = one(examined(str(tmp_path / name), fake), "port")
    assert found.text.endswith("is no serial port") and found.status == 3


def test_a_device_that_is_no_port(fake: FakeComputer) -> None:
    found = one(examined("/dev/null", fake), "holder")
    assert "no port /dev/null" in found.text and found.status == 3


def test_which_port_it_is(fake: FakeComputer, peer: Peer, no_ports: list[SimpleNamespace]) -> None:
    no_ports.append(SimpleNamespace(device=peer.path, description="handset", vid=0x1d6b,
                                    pid=0x5510, serial_number="KEL1", location="1-2.3"))
    found = one(examined(peer.path, fake), "port")
    assert found == ok(f"{peer.path} is there (1d6b:5510, serial number KEL1, socket 1-2.3)")


@pytest.mark.parametrize("problem, level, status", [
    (NoPort("no port on USB is there"), Level.ERROR, 3),
    (UsageProblem("several ports on USB: a, b; choose one"), Level.UNCHECKED, 8)])
def test_no_port_was_named(problem: Exception, level: Level, status: int, fake: FakeComputer,
                           no_ports: list[SimpleNamespace]) -> None:
    def find() -> str:
        raise problem

    found = one(list(examine(replace(visit("", fake), find_port=find))), "port")
    assert (found.level, found.status, found.text) == (level, status, str(problem))


def test_a_url_is_no_port_of_this_pc(fake: FakeComputer) -> None:
    findings = examined("loop://", fake)
    for name in ("port", "permission", "holder", "line settings"):
        assert one(findings, name).level is Level.OK
    assert "sends back" in one(findings, "answer").text


@pytest.mark.parametrize("mode, groups, noted, advice", [
    (0o600, ["me"], ["me"], "--udev-rule | sudo tee"),
    (0o660, ["me"], ["me"], "`sudo usermod -aG dialout me`"),
    (0o660, ["me"], ["me", "dialout"], "log out and in again"),
    (0o660, ["dialout"], ["dialout"], "taken the right away"),
])
def test_no_permission(mode: int, groups: list[str], noted: list[str], advice: str,
                       fake: FakeComputer, peer: Peer, monkeypatch: pytest.MonkeyPatch) -> None:
    os.chmod(peer.path, mode)
    monkeypatch.setattr(doctor_port, "group_of", lambda path: "dialout")
    fake.set(may_use=lambda path: False,
             user=lambda: User("me", frozenset(groups), frozenset(noted)))
    found = one(examined(peer.path, fake), "permission")
    assert (found.level, found.status) == (Level.ERROR, 3)
    assert found.text == (f"me may not read and write {peer.path}, which is for group dialout with "
                          f"mode {mode:04o}")
    assert advice in found.advice


def test_this_user_is_known() -> None:
    user = computer.this_user()
    assert user.name and user.groups


# who holds it

def test_somebody_has_locked_it(fake: FakeComputer, peer: Peer) -> None:
    with Link.open(peer.path):
        found = one(examined(peer.path, fake), "holder")
    assert (found.level, found.status) == (Level.ERROR, 4)
    assert f"port {peer.path} is busy" in found.text and f"({os.getpid()})" not in found.advice


@pytest.mark.parametrize("command, advice", [
    ("cat", "end that program"), ("ModemManager", "--udev-rule"), ("brltty", "braille")])
def test_somebody_reads_along(command: str, advice: str, fake: FakeComputer) -> None:
    fake.process(4711, command, opens="/dev/null")
    fake.process(4712, "other", opens="/dev/zero")
    findings = examined("/dev/null", fake, open_port=lambda url: fake.port())
    found = one(findings, "holder")
    assert (found.level, found.status) == (Level.ERROR, 4)
    assert found.text.startswith(f"{command} (4711) has /dev/null open too")
    assert advice in found.advice
    assert one(findings, "answer").level is Level.UNCHECKED


# line settings

def test_settings_that_somebody_changes(fake: FakeComputer, peer: Peer) -> None:
    """What the port holds once it is open counts, whoever has made it so."""
    import termios

    from amt_station.port import SerialPort

    def disturbed(url: str) -> SerialPort:
        port = SerialPort(url)
        attributes = termios.tcgetattr(peer.slave)
        attributes[3] |= termios.ECHO
        attributes[0] |= termios.IXON
        attributes[4] = attributes[5] = termios.B9600
        termios.tcsetattr(peer.slave, termios.TCSANOW, attributes)
        return port

    found = one(examined(peer.path, fake, open_port=disturbed), "line settings")
    assert (found.level, found.status) == (Level.ERROR, 6)
    assert found.text == ("two characters stop and start the line (software flow control); what "
                          "the handset says is sent back to it (echo); the speed is not 115200 "
                          "baud")


def test_every_setting_is_looked_at() -> None:
    import termios

    good: list[Any] = [0, 0, termios.CS8 | termios.CREAD, 0, termios.B115200, termios.B115200, []]
    assert line_settings.wrong(good, 115200) == []
    # A speed that has no name cannot be compared.
    assert line_settings.wrong(good, 123456) == []
    for word, bits, text in [
            (2, termios.CSTOPB, "two stop bits"), (2, termios.PARENB, "parity"),
            (2, termios.CRTSCTS, "hardware"), (2, termios.CREAD, "receiving"),
            (2, termios.CS8 & ~termios.CS7, "8 bits"), (0, termios.ICRNL, "what comes is changed"),
            (1, termios.OPOST, "what is sent"), (3, termios.ICANON, "keyboard")]:
        bad = list(good)
        bad[word] ^= bits
        (found,) = line_settings.wrong(bad, 115200)
        assert text in found


# services that probe

@pytest.mark.parametrize("command", ["ModemManager", "brltty"])
def test_a_prober_runs(command: str, fake: FakeComputer) -> None:
    fake.process(77, command)
    found = one(examined("", fake), "probing services")
    assert (found.level, found.status) == (Level.WARNING, 8)
    assert found.text.startswith(f"{command} (77) runs, and ")
    assert f"sudo systemctl mask --now {command}.service" in found.advice


@pytest.mark.parametrize("states, level", [
    ({"ModemManager.service": "enabled"}, Level.WARNING),
    ({"brltty-udev.service": "static"}, Level.WARNING),
    ({"ModemManager.service": "masked", "brltty.service": "disabled"}, Level.OK),
    ({"ModemManager.service": "Failed to connect to bus"}, Level.UNCHECKED),
    ({"ModemManager.service": ""}, Level.UNCHECKED),
])
def test_a_prober_that_would_begin(states: dict[str, str], level: Level,
                                   fake: FakeComputer) -> None:
    fake.systemctl(states)
    found = one(examined("", fake), "probing services")
    assert found.level is level, found


def test_a_prober_that_is_kept_away(fake: FakeComputer, peer: Peer) -> None:
    fake.process(77, "ModemManager")
    fake.program("udevadm", "echo ID_MM_PORT_IGNORE=1; echo ID_BUS=usb")
    found = one(examined(peer.path, fake), "probing services")
    assert found == ok("ModemManager (77) runs, but is kept away from this port")
    fake.program("udevadm", "echo ID_MM_PORT_IGNORE=0")
    assert one(examined(peer.path, fake), "probing services").level is Level.WARNING


def test_without_systemd_only_processes_are_looked_at(fake: FakeComputer) -> None:
    fake.without("systemctl")
    assert one(examined("", fake), "probing services") == ok(
        "none of ModemManager, brltty runs here")


def test_hidden_processes_are_no_absent_ones(fake: FakeComputer) -> None:
    fake.hide_processes()
    found = [finding for name, finding in examined("", fake) if name == "probing services"]
    assert found and all(one.level is Level.UNCHECKED for one in found)


# clock and disk

def test_a_clock_that_was_set_back(fake: FakeComputer, tmp_path: Path) -> None:
    fake.set(now=lambda: 86400.0)
    found = one(examined("", fake), "clock")
    assert (found.level, found.status) == (Level.ERROR, 7)
    assert "the clock says 1970-01-02 00:00 UTC, but this program is of 20" in found.text


def test_a_clock_behind_a_record(fake: FakeComputer, tmp_path: Path) -> None:
    records = tmp_path / "records"
    records.mkdir()
    (records / "K1.json").touch()
    os.utime(records / "K1.json", (4e9, 4e9))
    found = one(examined("", fake, records=records), "clock")
    assert found.level is Level.ERROR and "but the record K1.json is of 2096-10-02" in found.text


def untold() -> bool:
    raise NotKnown("this system does not tell")


@pytest.mark.parametrize("kept, level", [(lambda: False, Level.WARNING), (untold, Level.UNCHECKED),
                                         (lambda: True, Level.OK)])
def test_a_clock_that_nothing_keeps(kept: object, level: Level, fake: FakeComputer) -> None:
    fake.set(clock_is_kept=kept)
    assert one(examined("", fake), "clock").level is level


def test_the_kernel_tells_of_its_clock(monkeypatch: pytest.MonkeyPatch) -> None:
    assert kernel_clock_is_kept() in (True, False)
    for state, kept in ((0, True), (1, True), (5, False)):
        monkeypatch.setattr(ctypes, "CDLL", lambda *_, state=state, **__: SimpleNamespace(
            adjtimex=lambda buffer: state))
        assert kernel_clock_is_kept() is kept
    monkeypatch.setattr(ctypes, "CDLL", lambda *_, **__: SimpleNamespace())
    with pytest.raises(NotKnown):
        kernel_clock_is_kept()


@pytest.mark.parametrize("free, level, status", [
    (10_000_000, Level.ERROR, 7), (500_000_000, Level.WARNING, 8),
    (5_000_000_000, Level.OK, 0)])
def test_room_for_records(free: int, level: Level, status: int, fake: FakeComputer,
                          tmp_path: Path) -> None:
    fake.set(free_bytes=lambda path: free)
    found = one(examined("", fake, records=tmp_path / "not" / "yet"), "disk")
    assert (found.level, found.status) == (level, status)
    assert f"{free // 1_000_000} MB are free for records in {tmp_path}/not/yet" == found.text
    assert not (tmp_path / "not").exists()


def test_records_that_cannot_be_written(fake: FakeComputer, tmp_path: Path) -> None:
    (tmp_path / "file").touch()
    found = one(examined("", fake, records=tmp_path / "file" / "records"), "disk")
    assert (found.level, found.status) == (Level.ERROR, 7)
    assert f"{tmp_path}/file is no directory" in found.text


# the command

def test_all_is_well(peer: Peer, tmp_path: Path, fake: FakeComputer,
                     monkeypatch: pytest.MonkeyPatch,
                     capsys: pytest.CaptureFixture[str]) -> None:
    peer.script = replying(OK)
    fake.install(monkeypatch, tmp_path)
    assert main.run(["-p", peer.path, "doctor"]) == 0
    said = capsys.readouterr()
    lines = said.out.splitlines()
    assert [line.split()[0] for line in lines] == ["ok"] * len(checks.CHECKS)
    assert said.err == "nothing is wrong\n"
    assert peer.raw == b"AT^DBTADDR=?\r"


def test_one_line_each_and_json(peer: Peer, tmp_path: Path, fake: FakeComputer,
                                monkeypatch: pytest.MonkeyPatch,
                                capsys: pytest.CaptureFixture[str]) -> None:
    peer.script = replying("\r\nERROR\r\n")
    fake.set(clock_is_kept=lambda: False)
    fake.install(monkeypatch, tmp_path)
    assert main.run(["-p", peer.path, "doctor"]) == 1
    said = capsys.readouterr()
    assert len(said.out.splitlines()) == len(checks.CHECKS)
    assert said.err == "1 error, 2 not checked, 1 warning\n"
    assert main.run(["-p", peer.path, "doctor", "--json"]) == 1
    told = json.loads(capsys.readouterr().out)
    assert (told["ok"], told["exit_status"], told["port"], told["channel"]) == (
        False, 1, peer.path, "pc")
    by_name = {row["check"]: row for row in told["findings"]}
    assert by_name["port"] == {"check": "port", "level": "ok", "text": f"{peer.path} is there",
                               "advice": None, "exit_status": 0}
    assert by_name["answer"]["exit_status"] == 1 and by_name["answer"]["advice"]
    assert by_name["mode"]["level"] == "not checked" and by_name["clock"]["level"] == "warning"


@pytest.mark.parametrize("arguments", [["-p", "/dev/x", "--serial", "KEL1", "doctor"],
                                       ["--vid-pid", "nonsense", "doctor"],
                                       ["doctor", "--timeout", "0"], ["doctor", "more"],
                                       ["--vid-pid", "x", "doctor", "--udev-rule"]])
def test_usage_is_no_finding(arguments: list[str], run_station: Run) -> None:
    result = run_station(*arguments)
    assert (result.returncode, result.stdout) == (2, "")


def test_the_rule_file_is_printed(run_station: Run) -> None:
    printed = run_station("doctor", "--udev-rule")
    assert (printed.returncode, printed.stdout) == (0, rule())
    narrow = run_station("--vid-pid", "1D6B:5510", "doctor", "--udev-rule")
    assert narrow.stdout == rule("1d6b:5510") != rule()


def test_a_traced_visit(peer: Peer, tmp_path: Path, run_station: Run) -> None:
    peer.script = replying(OK)
    trace = tmp_path / "visit.trace"
    result = run_station("-p", peer.path, "--trace", str(trace), "doctor",
                         XDG_STATE_HOME=str(tmp_path))
    assert result.returncode in (0, 8), result.stdout
    assert r'station says  "AT^DBTADDR=?\r"' in trace.read_text(encoding="utf-8")


def test_a_real_holder_is_named(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    code = ("import sys, serial; port = serial.Serial(sys.argv[1], exclusive=True);"
            "print('held', flush=True); sys.stdin.read()")
    with subprocess.Popen([sys.executable, "-c", code, peer.path], stdin=subprocess.PIPE,
                          stdout=subprocess.PIPE, text=True) as process:
        assert process.stdout is not None and process.stdout.readline() == "held\n"
        result = run_station("-p", peer.path, "doctor", XDG_STATE_HOME=str(tmp_path))
        process.communicate(timeout=PATIENCE)
    assert result.returncode == 4, result.stdout
    assert f"({process.pid})" in result.stdout and "has it open" in result.stdout
    assert peer.raw == b""


def test_a_url_that_opens_a_device_somehow(fake: FakeComputer, peer: Peer) -> None:
    peer.script = replying(OK)
    findings = examined(f"spy://{peer.path}?file=/dev/null", fake)
    assert one(findings, "port").level is Level.WARNING
    assert "is not looked at" in one(findings, "port").text
    assert one(findings, "answer").level is Level.OK
