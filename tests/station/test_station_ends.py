"""How the command ends: true exit statuses, one line for the person, never a traceback."""

from __future__ import annotations

import contextlib
import json
import os
import pty
import re
import select
import signal
import subprocess
import sys
import threading
import time
from pathlib import Path

import pytest
from station_peer import (PATIENCE, ROOT, Peer, Run, error_packet, ok, replying, sequence,
                          station_command, station_environment)

from amt_station.cli import console, main
from amt_station.cli.options import Settings
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import EnvelopeDecoder, Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

ONE_LINE = re.compile(r"\Aamt-station: [^\n]+\n\Z")
OK = "\r\nOK\r\n"


@pytest.mark.parametrize("arguments, words", [
    ([], "Missing command"), (["wifi"], "Missing command"), (["wifi", "tx"], "Missing command"),
    (["--timeout", "inf", "at", "AT"], "finite"), (["--timeout", "nan", "at", "AT"], "finite"),
    (["--timeout", "1e999", "at", "AT"], "finite"), (["--timeout", "-1", "at", "AT"], "finite"),
    (["--baud", "9" * 30, "at", "AT"], "baud"), (["--baud", "0", "at", "AT"], "baud"),
    (["--pc", "--app", "at", "AT"], "contradict"), (["--pc", "at", "AT", "--app"], "contradict"),
    (["-p", "/dev/a", "at", "AT", "-p", "/dev/b"], "contradict"),
    (["--timeout", "1", "--timeout", "2", "at", "AT"], "contradict"),
    (["test-result", "write", "--station", "3", "--pass", "--fail"], "contradict"),
    (["version", "--module", "app", "--module", "l1"], "contradict"),
    (["imei", "write", "490154203237519"], "check digit"),
    (["imei", "write", "490000000000000.0"], "15 digits"),
    (["bt-address", "write", "ff:ff:ff:ff:ff:ff"], "broadcast"),
    (["version", "--module", "9" * 9000], "not a number"),
    (["send", "45", "19=str:x"], "of type int, not str"),
    (["send", "45", "module=str:x"], "--raw sends it"),
    (["send", "187", "154=bytes:0102"], "has 1 bytes"),
    (["at", ""], "empty AT text"), (["at", "AT\x1b[2J"], "control or unprintable"),
    (["\x1b[31mred"], "No such command"), (["at", "AT\r\nAT"], "control"),
    (["recover", "--plug-timeout", "nan"], "finite"),
])
def test_usage_sends_nothing(arguments: list[str], words: str, run_station: Run) -> None:
    result = run_station(*arguments, AMT_STATION_PORT="/dev/no-such-port")
    assert result.returncode == 2, result.stderr
    assert words in result.stderr and ONE_LINE.match(result.stderr)
    assert "\x1b" not in result.stderr


def test_send_takes_another_type_with_raw(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(46)])
    assert run_station("-p", peer.path, "send", "--raw", "45", "19=str:x").returncode == 0
    assert peer.raw == encode_envelope(Packet.decode(
        bytes.fromhex("0C 00 BB 2D 06 00 EE 13 02 01 00 78")))


def test_send_is_answered_for_what_it_asked(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, ok(46, Atom.integer(19, 17), Atom.raw(18, b"1"))])
    result = run_station("-p", peer.path, "--json", "send", "45", "module=software")
    assert result.returncode == 1 and "holds no module 16" in result.stderr
    assert json.loads(result.stdout)["error"]["kind"] == "incomplete-answer"


def test_force_is_said(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ok(6)])
    result = run_station("-p", peer.path, "imei", "write", "--force", "123")
    assert result.returncode == 0 and "forced: imei" in result.stderr


def test_a_read_that_brings_nothing(peer: Peer, run_station: Run) -> None:
    peer.script = replying(OK)
    for command in (["at", "AT^DBTADDR?"], ["pcba", "read"]):
        result = run_station("-p", peer.path, *command)
        assert result.returncode == 1 and "the answer holds no" in result.stderr


def test_terminated(peer: Peer) -> None:
    with subprocess.Popen(station_command("-p", peer.path, "--json", "at", "AT"), cwd=ROOT,
                          env=station_environment(), stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, text=True) as process:
        peer.next()
        process.send_signal(signal.SIGTERM)
        out, talk = process.communicate(timeout=PATIENCE)
    assert (process.returncode, talk) == (143, "amt-station: terminated\n")
    assert json.loads(out)["error"]["kind"] == "terminated"


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_a_signal_at_any_moment_is_no_traceback(number: signal.Signals) -> None:
    for delay in range(12):
        with subprocess.Popen(station_command("commands"), cwd=ROOT, text=True,
                              env=station_environment(PYTHONVERBOSE="1"), stdout=subprocess.PIPE,
                              stderr=subprocess.PIPE) as process:
            assert process.stderr is not None
            # From the first import that the program makes itself on, and then ever later.
            for line in process.stderr:
                if "amt_station.cli" in line and (delay := delay - 1) < 0:
                    break
            process.send_signal(number)
            talk = process.communicate(timeout=PATIENCE)[1]
        assert "Traceback" not in talk
        assert process.returncode in (0, 128 + number, -number)


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_a_signal_in_the_first_import_that_takes_time(number: signal.Signals,
                                                      tmp_path: Path) -> None:
    # The first module that nothing has needed before stands still until the signal is there.
    (tmp_path / "click.py").write_text(
        "import os, sys, time\nos.write(1, b'x')\ntime.sleep(60)\n", encoding="utf-8")
    with subprocess.Popen(station_command("commands"), cwd=ROOT, stdout=subprocess.PIPE,
                          env=station_environment(PYTHONPATH=str(tmp_path)),
                          stderr=subprocess.PIPE) as process:
        assert process.stdout is not None and process.stdout.read(1) == b"x"
        process.send_signal(number)
        talk = process.communicate(timeout=PATIENCE)[1]
    assert process.returncode == 128 + number
    assert talk == b"amt-station: %s\n" % (
        b"interrupted" if number == signal.SIGINT else b"terminated")


def test_nothing_that_takes_time_is_imported_before_the_handlers() -> None:
    code = ("import sys; before = set(sys.modules); import amt_station.__main__; "
            "print(sorted(set(sys.modules) - before))")
    result = subprocess.run([sys.executable, "-I", "-c", f"import sys; sys.path.insert(0, "
                             f"{str(ROOT)!r}); import signal, __future__; {code}"], cwd=ROOT,
                            capture_output=True, text=True, timeout=60, check=True)
    assert result.stdout == "['amt_station', 'amt_station.__main__']\n"


@pytest.mark.parametrize("second", [signal.SIGINT, signal.SIGTERM])
def test_the_second_signal_ends_at_once(second: signal.Signals) -> None:
    code = ("import os, signal, sys, time; from amt_station.cli import main\n"
            "def stuck(said):\n"
            "    os.write(1, said); time.sleep(60)\n"
            "main.run = lambda arguments: stuck(b'x')\n"
            "main._end = lambda interrupt: stuck(b'y')\n"
            "main.main()")
    with subprocess.Popen([sys.executable, "-c", code], cwd=ROOT, env=station_environment(),
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE) as process:
        assert process.stdout is not None and process.stdout.read(1) == b"x"
        process.send_signal(signal.SIGINT)
        assert process.stdout.read(1) == b"y"
        process.send_signal(second)
        assert process.communicate(timeout=PATIENCE)[1] == b""
    assert process.returncode == 128 + second


def test_a_peer_that_does_not_read_is_no_answer(run_station: Run) -> None:
    master, slave = pty.openpty()
    try:
        # Fill what a terminal takes without a reader; the kernel makes room behind the first fill.
        os.set_blocking(slave, False)
        while select.select([], [slave], [], 0.5)[1]:
            with contextlib.suppress(BlockingIOError):
                os.write(slave, b"x" * 4096)
        start = time.monotonic()
        result = run_station("-p", os.ttyname(slave), "--timeout", "0.5", "at", "AT")
        assert time.monotonic() - start < PATIENCE
        assert result.returncode == 5 and "nobody takes what is sent" in result.stderr
    finally:
        os.close(master)
        os.close(slave)


def test_a_defect_is_one_line_and_a_file(tmp_path: Path, monkeypatch: pytest.MonkeyPatch,
                                         capsys: pytest.CaptureFixture[str]) -> None:
    def broken(self: Settings) -> None:
        raise KeyError("what nobody thought of")

    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path))
    monkeypatch.setattr(Settings, "open_link", broken)
    assert main.run(["at", "AT"]) == 7
    said = capsys.readouterr().err
    assert ONE_LINE.match(said) and "KeyError" in said and "Traceback" not in said
    (kept,) = (tmp_path / "amt-station").glob("defect-*.txt")
    assert str(kept) in said
    assert "what nobody thought of" in kept.read_text(encoding="utf-8")
    assert kept.stat().st_mode & 0o777 == 0o600


def test_hostile_text_is_escaped_on_both_streams(peer: Peer, run_station: Run) -> None:
    evil = "a\x1b[2J\u009b31m\u202eb\x07"
    peer.script = sequence([f"\r\n+X: {evil}\r\n\r\n+CME ERROR: {evil}\r\n".encode()])
    result = run_station("-p", peer.path, "at", "AT+X")
    for stream in (result.stdout, result.stderr):
        assert not set("\x1b\u009b\u202e\x07") & set(stream)
        assert "\\u202e" in stream and "\\x9b" in stream


@pytest.mark.parametrize("redirect, statuses", [
    (">&-", {0}), ("2>&-", {0}), (">&- 2>&- <&-", {0}), (">/dev/full", {7}), ("| true", {0}),
    (">/dev/full 2>&1", {7})])
def test_odd_outputs_are_no_traceback(redirect: str, statuses: set[int], peer: Peer) -> None:
    peer.script = replying("\r\n" + "x" * 200 + "\r\n\r\nOK\r\n")
    command = " ".join(station_command("-p", peer.path, "at", "AT")) + " " + redirect
    result = subprocess.run(["/bin/sh", "-c", command], cwd=ROOT, env=station_environment(),
                            capture_output=True, text=True, timeout=60, check=False)
    assert result.returncode in statuses, result.stderr
    assert "Traceback" not in result.stderr and "Exception" not in result.stderr
    assert peer.raw == b"AT\r", "no talk goes to the handset instead"


@pytest.mark.parametrize("environment", [
    {"PYTHONIOENCODING": "ascii"}, {"LC_ALL": "C", "PYTHONUTF8": "0", "PYTHONCOERCECLOCALE": "0"},
    {"HOME": "", "XDG_STATE_HOME": "x"}, {"COLUMNS": "-5", "LINES": "x"}, {"TERM": ""},
    {"LANG": "xx_YY.nonsense", "LC_ALL": "nonsense"}])
def test_odd_environments_are_no_traceback(environment: dict[str, str], peer: Peer,
                                           run_station: Run) -> None:
    peer.script = replying("\r\n+X: grün \u4e2d\r\n\r\nOK\r\n")
    result = run_station("-p", peer.path, "at", "AT+X", **environment)
    assert result.returncode == 0 and "+X: gr" in result.stdout
    assert run_station("--help", **environment).returncode == 0


@pytest.mark.parametrize("name, value, status", [
    ("AMT_STATION_TIMEOUT", "inf", 2), ("AMT_STATION_TIMEOUT", "nan", 2),
    ("AMT_STATION_TIMEOUT", "-1", 2), ("AMT_STATION_CHANNEL", "\udcff", 2),
    ("AMT_STATION_PORT", "\udcff\x1b", 3), ("_AMT_STATION_COMPLETE", "nonsense", 1)])
def test_odd_settings_are_one_line(name: str, value: str, status: int, run_station: Run) -> None:
    result = run_station("at", "AT", **{"AMT_STATION_PORT": "/dev/no-such-port", name: value})
    assert result.returncode == status
    assert "Traceback" not in result.stderr and "\x1b" not in result.stderr


def test_completion_and_version(run_station: Run) -> None:
    script = run_station(_AMT_STATION_COMPLETE="bash_source")
    assert script.returncode == 0 and "_amt_station_completion" in script.stdout
    words = run_station(_AMT_STATION_COMPLETE="bash_complete", COMP_WORDS="amt-station wi",
                        COMP_CWORD="1")
    assert words.stdout.split() == ["plain,wifi", "plain,wifi-address"]
    assert re.fullmatch(r"amt-station, version \d+\.\d+\S*\n", run_station("--version").stdout)


def test_only_what_is_used_is_imported() -> None:
    code = ("import sys; from amt_station.cli import main; main.run(['at', 'AT', '-p', '/dev/x']);"
            "print([name for name in ('amt_line', 'jsonschema', 'rich', 'jinja2', 'tomllib', "
            "'amt_simulator', 'asyncio', 'xml', 'json', "
            "'amt_station.trace') if name in sys.modules])")
    # What counts coverage imports for itself.
    environment = {name: value for name, value in station_environment().items()
                   if not name.startswith("COVERAGE_")}
    result = subprocess.run([sys.executable, "-c", code], cwd=ROOT, env=environment,
                            capture_output=True, text=True, timeout=60, check=True)
    assert result.stdout == "[]\n"


# recover --wait

def test_recover_waits_for_the_cable(tmp_path: Path) -> None:
    first, second = (Peer(EnvelopeDecoder()) for _ in range(2))
    first.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    second.script = replying(OK)
    port = tmp_path / "port"
    port.symlink_to(first.path)

    def plug() -> None:
        assert isinstance(first.next(), Text)
        port.unlink()
        first.close()
        port.symlink_to(second.path)

    plugging = threading.Thread(target=plug)
    plugging.start()
    try:
        result = subprocess.run(station_command("-p", str(port), "recover", "--wait"), cwd=ROOT,
                                env=station_environment(), capture_output=True, text=True,
                                timeout=60, check=False)
    finally:
        plugging.join()
        second.close()
    assert (result.returncode, result.stdout) == (0, "clear\n"), result.stderr
    assert "unplug the USB cable" in result.stderr and "the port is back" in result.stderr


def test_recover_does_not_wait_for_ever(peer: Peer, run_station: Run) -> None:
    peer.script = sequence([ACKNOWLEDGEMENT, error_packet(194)])
    result = run_station("-p", peer.path, "recover", "--wait", "--plug-timeout", "0.3")
    assert result.returncode == 3 and "not unplugged in time" in result.stderr


def test_marks_are_not_escaped(capsys: pytest.CaptureFixture[str]) -> None:
    console.data("a\x1bb", "\x1b[1m")
    assert capsys.readouterr().out == "\x1b[1ma\\x1bb\n"
