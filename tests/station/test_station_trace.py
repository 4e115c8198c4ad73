"""Traces: what is written while a line is used, and how such files are read, shown and compared."""

from __future__ import annotations

import json
import re
import signal
import subprocess
import time
from pathlib import Path

import pytest
from hypothesis import given
from hypothesis import strategies as st
from station_peer import (ROOT, Peer, Run, answering, error_packet, ok, replying,
                          sequence, station_command, station_environment)
from trace_files import comments, statements, write

from amt_station import wire
from amt_station.requests.model import Channel
from amt_station.trace import dialogue, message, words
from amt_station.trace.shown import shown_json, shown_lines
from amt_station.wire.atoms import Atom
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

DIALOGUES = sorted((ROOT / "tests" / "system" / "dialogues").glob("*.txt"))
VERSION = ("station says packet AMT_VERSION_CMD 19=int:16", "station hears acknowledgement",
           'station hears packet AMT_VERSION_RSPCMD 19=int:16 18=bytes:"1.2" 1=int:0')
ATOMS = (Atom.integer(19, 16), Atom.raw(18, b"1.2"))
LONG = 60.0
ONE_LINE = re.compile(r"\Aamt-station: [^\n]+\n\Z")


# written

def test_a_packet_and_its_answer(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    peer.script = answering(*ATOMS)
    path = tmp_path / "x.trace"
    result = run_station("-p", peer.path, "--trace", str(path), "version", "--module", "software")
    assert (result.returncode, result.stdout) == (0, "module: 16 (software)\nversion: 1.2\n")
    assert statements(path) == ["channel pc", *VERSION]
    assert comments(path) == [
        f"# A trace of amt-station 1.1: -p {peer.path} --trace {path} version --module software",
        "# ended with status 0"]
    first, second = path.read_text("ascii").splitlines()[1:3]
    assert re.fullmatch(r"@20\d\d-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{6}Z channel pc", first)
    assert re.fullmatch(rf'@\+0\.\d{{6}} +station opens "{peer.path}"', second)


def test_the_app_channel(app_peer: Peer, run_station: Run, tmp_path: Path) -> None:
    answer = Packet(10, (Atom.integer(5, 3800000), Atom.integer(1, 0)))
    app_peer.script = sequence([answer.encode()])
    path = tmp_path / "x.trace"
    result = run_station("-p", app_peer.path, "--app", "--trace", str(path), "battery", "voltage")
    assert result.returncode == 0
    assert statements(path) == [
        "channel app", "station says packet AMT_READ_BATTERY_CMD",
        "station hears packet AMT_READ_BATTERY_RSPCMD 5=int:3800000 1=int:0"]


def test_what_is_no_text_is_hexadecimal(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    peer.script = sequence([b'\x1b[2J"a\\b"\r\n\xff\x00# \xc3\xbc\r\nOK\r\n'])
    path = tmp_path / "x.trace"
    assert run_station("-p", peer.path, "--trace", str(path), "at", "AT").returncode == 0
    assert "".join(statements(path)[2:]).replace("station hears ", "") == \
        r'1B "[2J\"a\\b\"\r\n" FF00 "# " C3BC "\r\nOK\r\n"'
    assert path.read_text("ascii").isprintable() is False and \
        all(line.isprintable() for line in path.read_text("ascii").splitlines())


def test_a_failure_and_its_status(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    peer.script = sequence([error_packet(192)])
    path = tmp_path / "x.trace"
    assert run_station("-p", peer.path, "--trace", str(path), "adb-serial", "read").returncode == 1
    assert statements(path)[-1] == "station hears packet 192 1=int:1"
    assert comments(path)[-1] == "# ended with status 1"


def test_a_port_that_goes_away(peer: Peer, tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    with subprocess.Popen(station_command("-p", peer.path, "--trace", str(path), "at", "AT"),
                          cwd=ROOT, env=station_environment(), stderr=subprocess.PIPE,
                          text=True) as station:
        peer.received.get(timeout=LONG)
        peer.hang_up()
        _, talk = station.communicate(timeout=LONG)
        assert station.returncode == 3 and "went away" in talk
    assert statements(path) == ["channel pc", r'station says "AT\r"', "station loses"]


@pytest.mark.parametrize("number, status", [(signal.SIGINT, 130), (signal.SIGTERM, 143),
                                            (signal.SIGKILL, -9)])
def test_interrupted(number: int, status: int, peer: Peer, tmp_path: Path) -> None:
    peer.script = sequence([b"\r\n+X: 1\r\n"])
    path = tmp_path / "x.trace"
    with subprocess.Popen(station_command("-p", peer.path, "--trace", str(path), "at", "AT"),
                          cwd=ROOT, env=station_environment(), stderr=subprocess.PIPE,
                          text=True) as station:
        peer.received.get(timeout=LONG)
        end = time.monotonic() + LONG
        while "+X: 1" not in path.read_text("ascii") and time.monotonic() < end:
            time.sleep(0.01)
        station.send_signal(number)
        station.communicate(timeout=LONG)
        assert station.returncode == status
    assert statements(path) == ["channel pc", r'station says "AT\r"',
                                r'station hears "\r\n+X: 1\r\n"']
    dialogue.read_trace(path)
    assert (comments(path)[-1] == f"# ended with status {status}") is (status > 0)


def test_a_full_disk_changes_no_status(peer: Peer, run_station: Run) -> None:
    peer.script = replying("\r\nERROR\r\n")
    result = run_station("-p", peer.path, "--trace", "/dev/full", "at", "AT")
    assert (result.returncode, result.stdout) == (1, "ERROR\n")
    assert ("amt-station: the trace /dev/full could not be written: No space left on device\n"
            in result.stderr)
    peer.script = replying("\r\nOK\r\n")
    result = run_station("-p", peer.path, "--trace", "/dev/full", "at", "AT")
    assert (result.returncode, result.stdout) == (0, "OK\n")
    assert ONE_LINE.match(result.stderr)


def test_a_file_that_may_not_grow_ends_with_a_whole_line(peer: Peer, tmp_path: Path) -> None:
    peer.script = sequence([b"\r\n" + b"x" * 3000 + b"\r\n\r\nOK\r\n"])
    path = tmp_path / "x.trace"
    line = station_command("-p", peer.path, "--trace", str(path), "at", "AT")
    result = subprocess.run(["/bin/sh", "-c", 'ulimit -f 2; exec "$@"', "sh", *line], cwd=ROOT,
                            env=station_environment(PYTHONDONTWRITEBYTECODE="1"),
                            capture_output=True, text=True, timeout=LONG, check=False)
    assert result.returncode == 0 and "could not be written: File too large" in result.stderr
    assert statements(path) == ["channel pc", r'station says "AT\r"']
    dialogue.read_trace(path)


def test_a_trace_is_never_written_over(peer: Peer, run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "mine")
    result = run_station("-p", peer.path, "--trace", str(path), "at", "AT")
    assert (result.returncode, peer.raw) == (2, b"")
    assert f"{path}: this file is there already" in result.stderr
    assert path.read_text("ascii") == "mine\n"
    result = run_station("-p", peer.path, "--trace", str(tmp_path / "no" / "x"), "at", "AT")
    assert (result.returncode, peer.raw) == (2, b"")
    assert "No such file or directory" in result.stderr and ONE_LINE.match(result.stderr)


def test_without_a_port_there_is_no_trace(run_station: Run, tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    assert run_station("-p", "/dev/no-such", "--trace", str(path), "at", "AT").returncode == 3
    assert run_station("--trace", str(path), "commands").returncode == 0
    assert not path.exists()


@pytest.mark.parametrize("channel", list(Channel))
@given(data=st.one_of(
    st.binary(max_size=200), st.text(max_size=60).map(lambda text: text.encode("utf-8", "replace")),
    st.lists(st.sampled_from([ACKNOWLEDGEMENT, ok(46, *ATOMS), Packet(7).encode(), b"AT\r", b"\xee",
                              encode_envelope(Packet(200, (Atom.string(1, "\u202e\\\" #"),
                                                           Atom.boolean(2, 7),
                                                           Atom.raw(3, b"\0a"))))])).map(b"".join)))
def test_what_is_written_is_read_back_byte_for_byte(data: bytes, channel: Channel) -> None:
    lines = message.write_messages(data, channel)
    assert all(line.isascii() and line.isprintable() for line in lines)
    read = [message.parse_message(words.tokens(line)) for line in lines]
    assert b"".join(message.encode(one, channel) for one in read) == data


# read

@pytest.mark.parametrize("content, problem", [
    (b"", ":1: there is no channel"),
    (b"channel pc\nstation says \"AT\n", ":2: a quote that is not closed"),
    (b"channel pc\n\nstation hears AABBC\n", ":3: AABBC is neither quoted text nor hexadecimal"),
    (b"channel pc\nstation hears AABB", ":2: the last line has no end"),
    (b"channel pc\nstation says \"AT\\r\"\n\xff\xfe\n", ":3: this is no text"),
    (b"\x00\x01\x02\n", ":1: the channel comes first"),
    (b"channel pc\n@+1.5\n", ":2: a time and nothing behind it"),
    (b"channel pc\n@soon station loses\n", ":2: @soon is neither a moment nor, with a +, seconds"),
    (b"@2026-13-01T00:00:00Z channel pc\n", ":1: @2026-13-01T00:00:00Z is neither"),
    (b"channel pc\nstation hears packet 7 " + b'1=bytes:"x"*9000\n', ":2: a packet of 9011 bytes"),
    (b'channel pc\nstation hears "x"*9999999\n', ":2: 9999999 bytes at once"),
    (b'channel pc\nstation hears "x"*99999999\n', ":2: "),
    (b"channel pc\nstation sings\n", ":2: no such statement"),
])
@pytest.mark.parametrize("command", ["show", "diff", "replay"])
def test_a_damaged_trace(content: bytes, problem: str, command: str, run_station: Run,
                         tmp_path: Path) -> None:
    path = tmp_path / "x.trace"
    path.write_bytes(content)
    good = write(tmp_path / "good.trace", "channel pc")
    result = run_station("trace", command, *[str(good)] * (command == "diff"), str(path))
    assert (result.returncode, result.stdout) == (2, "")
    assert f"{path}{problem}" in result.stderr and ONE_LINE.match(result.stderr)


def test_a_trace_that_is_not_there(run_station: Run, tmp_path: Path) -> None:
    result = run_station("trace", "show", str(tmp_path))
    assert (result.returncode, result.stderr) == (2, f"amt-station: {tmp_path}: Is a directory\n")


# shown

def test_show(run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "@2026-11-21T09:30:00Z channel pc",
                 '@+0.0 station opens "/dev/x"', f"@+0.001 {VERSION[0]}", f"@+0.0025 {VERSION[1]}",
                 "@+0.1025 station hears AABBCCDD1F00", "@+0.1125 station hears 0000020000",
                 r'@+1 station says "AT\r"', r'@+1.5 station hears 1B "[2J" "\r\nOK\r\n"')
    result = run_station("trace", "show", str(path))
    assert (result.returncode, result.stderr) == (0, "")
    assert result.stdout.splitlines() == [
        "pc channel, begun 2026-11-21 09:30:00 UTC",
        '   0.000000                 station opens "/dev/x"',
        "   0.001000     +1.0 ms  -> 45 (0x2D) AMT_VERSION_CMD",
        "                              19  module  int  16",
        "   0.002500     +1.5 ms  <- acknowledgement",
        "   0.112500   +110.0 ms  <- 11 bytes skipped: the frame was not completed",
        r"   1.000000   +887.5 ms  -> text AT\r",
        "   1.500000   +500.0 ms  <- 1 bytes skipped: bytes that are neither a frame nor text",
        r"   1.500000     +0.0 ms  <- text [2J\r\nOK\r\n"]


def test_a_frame_in_two_pieces_is_shown_whole(tmp_path: Path) -> None:
    frame = ok(46, *ATOMS).hex()
    path = write(tmp_path / "x.trace", "channel pc", VERSION[0], f"station hears {frame[:40]}",
                 f"station hears {frame[40:]}")
    shown = shown_json(dialogue.read_trace(path))["events"]
    assert [event["kind"] for event in shown] == ["packet", "packet"]
    assert [atom["name"] for atom in shown[1]["packet"]["atoms"]] == ["module", "version", "result"]
    assert (shown[1]["line"], shown[1]["seconds"]) == (4, None)


def test_show_as_json(run_station: Run, tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "@2026-11-21T09:30:00Z channel pc", f"@+0.5 {VERSION[0]}")
    document = json.loads(run_station("--json", "trace", "show", str(path)).stdout)
    assert (document["channel"], document["begun"]) == ("pc", "2026-11-21T09:30:00+00:00")
    event, = document["events"]
    assert (event["seconds"], event["action"], event["packet"]["name"]) == (
        0.5, "station says", "AMT_VERSION_CMD")


@pytest.mark.parametrize("path", DIALOGUES, ids=lambda path: path.stem)
def test_every_dialogue_can_be_shown(path: Path) -> None:
    read = dialogue.read_trace(path)
    lines = list(shown_lines(read))
    assert lines[0] == f"{read.channel} channel" and all(line.isprintable() for line in lines)
    said = [step for step in read.steps if step.action == dialogue.SAYS]
    assert len([line for line in lines if line.startswith("->")]) >= len(said) > 0


def test_the_guides_trace_is_shown_as_the_guide_says(run_station: Run, tmp_path: Path) -> None:
    guide = (ROOT / "docs" / "station.md").read_text(encoding="utf-8")
    (content,) = re.findall(r"```trace\n(.*?)```", guide, re.S)
    (shown,) = re.findall(r"```shown\n(.*?)```", guide, re.S)
    path = tmp_path / "field.trace"
    path.write_text(content, encoding="utf-8")
    assert run_station("trace", "show", str(path)).stdout == shown


# compared

def test_diff_knows_neither_times_nor_pieces(run_station: Run, tmp_path: Path) -> None:
    frame = ok(46, *ATOMS).hex()
    first = write(tmp_path / "1", "@2026-11-21T09:30:00Z channel pc", *VERSION,
                  r'station says "AT\r"', r'station hears "\r\nOK\r\n"')
    second = write(tmp_path / "2", "channel pc  # other", f"@+1 {VERSION[0]}",
                   f"station hears {ACKNOWLEDGEMENT.hex()}{frame[:20]}",
                   f"@+9 station hears {frame[20:]}",
                   r'station says "AT\r"', r'station hears "\r\nO"', r'station hears "K\r\n"')
    result = run_station("trace", "diff", str(first), str(second))
    assert (result.returncode, result.stdout, result.stderr) == (0, "", "")


def test_diff_names_file_and_line(run_station: Run, tmp_path: Path) -> None:
    first = write(tmp_path / "1", "channel pc", r'station says "AT\r"',
                  r'station hears "\r\nOK\r\n"', *VERSION)
    second = write(tmp_path / "2", "channel pc", r'station says "AT\r"',
                   r'station hears 1B "\r\nOK\r\n"', *VERSION[:2])
    result = run_station("trace", "diff", str(first), str(second))
    assert result.returncode == 1
    assert result.stdout.splitlines() == [
        f"+ {second}:3: <- 1 bytes skipped: bytes that are neither a frame nor text [1b]",
        f"- {first}:6: <- 46 (0x2E) AMT_VERSION_RSPCMD; 19  module   int    16; "
        "18  version  bytes  312e32 1.2; 1   result   int    0"]
    document = json.loads(run_station("--json", "trace", "diff", str(first), str(second)).stdout)
    assert document["ok"] is False
    assert [(one["in"], one["line"]) for one in document["differences"]] == [("second", 3),
                                                                             ("first", 6)]


def test_diff_of_two_channels(run_station: Run, tmp_path: Path) -> None:
    first, second = (write(tmp_path / name, f"channel {name}") for name in ("pc", "app"))
    result = run_station("trace", "diff", str(first), str(second))
    assert result.returncode == 1
    assert result.stdout == f"- {first}:1: channel pc\n+ {second}:1: channel app\n"


def test_any_search_for_the_place_is_the_same(run_station: Run, tmp_path: Path) -> None:
    from amt_station.place import PacketSearch

    def search(name: str, turn: int, code: int = 1) -> Path:
        asked = wire.Packet.decode(PacketSearch(turn).data).command
        return write(tmp_path / name, "channel app", f"station says packet {asked}",
                     f"station hears packet {asked + 1} 1=int:{code}")

    first, second, third = search("1", 0), search("2", 1), search("3", 1, 2)
    assert first.read_text("ascii") != second.read_text("ascii")
    assert run_station("trace", "diff", str(first), str(second)).returncode == 0
    assert run_station("trace", "diff", str(first), str(third)).returncode == 1
