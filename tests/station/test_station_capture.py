"""Captures of traces and their dissector, as tshark sees them."""

from __future__ import annotations

import os
import random
import subprocess
from pathlib import Path
from typing import Callable

import pytest
from station_peer import ROOT, Run, station_command, station_environment
from trace_files import write

from amt_station import wire
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name
from amt_station.trace.conversation import Spoken, events
from amt_station.trace.dialogue import read_trace
from amt_station.trace.dissector import dissector
from amt_station.trace.pcapng import Piece, capture, written
from amt_station.wire.checksum import checksum

# Only a machine that stands still takes so long.
LONG = 300.0
SEED = 20260930
MUTANTS = 400
DIALOGUES = sorted((ROOT / "tests" / "system" / "dialogues").glob("*.txt"))
MARKS = ("amtline.malformed", "amtline.checksum.bad")
REQUEST = wire.Packet(45, (wire.Atom.integer(19, 16),))
ANSWER = wire.Packet(46, (wire.Atom.integer(19, 16), wire.Atom.raw(18, b"1.2"),
                          wire.Atom.string(7, "x"), wire.Atom.boolean(8, 1),
                          wire.Atom.integer(1, 0)))

Shark = Callable[..., list[list[str]]]


@pytest.fixture
def shark(tmp_path: Path) -> Shark:
    """What tshark finds in a capture: a row a packet, the values of these fields."""
    def read(data: bytes, *fields: str) -> list[list[str]]:
        script, file = tmp_path / "line.lua", tmp_path / "line.pcapng"
        script.write_text(dissector(), encoding="ascii")
        file.write_bytes(data)
        wanted = [word for field in fields for word in ("-e", field)]
        done = subprocess.run(
            ["tshark", "-X", f"lua_script:{script}", "-r", str(file), "-2", "-T", "fields",
             *wanted, "-e", "_ws.lua.error"],
            env={**os.environ, "HOME": str(tmp_path)}, capture_output=True, text=True,
            timeout=LONG, check=False)
        assert done.returncode == 0 and "Lua" not in done.stderr, done.stderr
        rows = [line.split("\t") for line in done.stdout.splitlines()]
        assert all(row[-1] == "" for row in rows), [row[-1] for row in rows if row[-1]]
        return [row[:-1] for row in rows]

    return read


def test_a_capture_against_its_table(shark: Shark, run_station: Run, tmp_path: Path) -> None:
    path = write(
        tmp_path / "x.trace", "@2026-11-21T09:30:00Z channel pc", '@+0 station opens "/dev/x"',
        "@+0.25 station says packet AMT_VERSION_CMD 19=int:16",
        "@+0.5 station hears acknowledgement",
        'station hears packet AMT_VERSION_RSPCMD 19=int:16 18=bytes:"1\\n2" 1=int:0',
        r'@+1 station says "AT^DSVER\r"', r'@+1.5 station hears "\r\n+X\r\n"',
        r'@+1.75 station hears "\r\nOK\r\n"', "@+2 station says packet 174 140=int:1",
        "@+2.5 station hears packet 175 1=int:1", "@+3 station hears FF0102")
    file = tmp_path / "x.pcapng"
    done = run_station("trace", "export", str(path), "--pcapng", str(file))
    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")
    assert shark(file.read_bytes(), "frame.time_epoch", "amtline.direction", "amtline.command",
                 "amtline.command.name", "amtline.atom.name", "amtline.atom.word",
                 "amtline.checksum.status", "amtline.request_in", "amtline.response_in",
                 "amtline.time", "amtline.text", "amtline.result") == [
        ["1795253400.250000000", "0", "45", "AMT_VERSION_CMD", "module", "software", "1", "", "3",
         "", "", ""],
        ["1795253400.500000000", "1", "", "", "", "", "1", "1", "", "0.25", "", ""],
        ["1795253400.500000000", "1", "46", "AMT_VERSION_RSPCMD", "module,version,result",
         "software", "1", "1", "", "0.25", "", "0"],
        ["1795253401.000000000", "0", "", "", "", "", "", "", "5", "", r"AT^DSVER\r", ""],
        ["1795253401.500000000", "1", "", "", "", "", "", "4", "", "0.5", r"\r\n+X\r\n", ""],
        ["1795253401.750000000", "1", "", "", "", "", "", "4", "", "0.75", r"\r\nOK\r\n", ""],
        ["1795253402.000000000", "0", "174", "AMT_GPS_CONTROL_CMD", "operation", "start", "1",
         "", "8", "", "", ""],
        ["1795253402.500000000", "1", "175", "AMT_GPS_CONTROL_RSPCMD", "result", "", "1", "7",
         "", "0.5", "", "1"],
        ["1795253403.000000000", "1", "", "", "", "", "", "", "", "", "", ""]]
    marked = shark(file.read_bytes(), "frame.comment", "amtline.rest", "_ws.col.Info", *MARKS,
                   "amtline.refused")
    assert marked[0] == ['@+0 station opens "/dev/x"', "",
                         "-> 45 AMT_VERSION_CMD module=16 (software)", "", "", ""]
    assert marked[7][2:] == ["<- 175 AMT_GPS_CONTROL_RSPCMD result=1", "", "", "1"]
    assert marked[8][1:4] == ["ff0102", "<- [malformed: bytes that are neither a frame nor text]",
                              "1"]


def test_every_dialogue_is_dissected_as_it_is_decoded(shark: Shark) -> None:
    for channel in Channel:
        traces = [trace for trace in map(read_trace, DIALOGUES) if trace.line_channel is channel]
        found = [event for trace in traces for event in events(trace)
                 if isinstance(event, Spoken)]
        rows = shark(written(channel, [Piece(0, one.said, one.item.raw) for one in found]),
                     "amtline.command", "amtline.command.name", "amtline.atom.id",
                     "amtline.atom.length", "amtline.acknowledgement", *MARKS)
        assert len(rows) == len(found) > 30
        for one, row in zip(found, rows):
            assert row == _decoded(one.item), (one, row)


def _decoded(item: wire.Item) -> list[str]:
    """The row that tshark must give for an item."""
    if isinstance(item, wire.Frame):
        packet = item.packet
        return [str(packet.command), display_name(packet.command),
                ",".join(str(atom.id) for atom in packet.atoms),
                ",".join(str(len(atom.content)) for atom in packet.atoms), "", "", ""]
    if isinstance(item, wire.Acknowledgement):
        return ["", "", "", "", "1", "", ""]
    if isinstance(item, wire.Text):
        return [""] * 7
    is_summed_wrongly = isinstance(item.error, wire.ChecksumError)
    return ["", "", "", "", "", "" if is_summed_wrongly else "1", "1" if is_summed_wrongly else ""]


# what is damaged

def _mutant(chance: random.Random, whole: bytes, channel: Channel) -> bytes:
    """A frame with something wrong; often with a checksum that fits, so that the rest is read."""
    data = bytearray(whole)
    for _ in range(chance.randint(1, 3)):
        place = chance.randrange(len(data)) if data else 0
        match chance.randrange(5):
            case 0 if data:
                data[place] = chance.choice((0, 1, 0x7F, 0x80, 0xFF, data[place] ^ 1))
            case 1:
                del data[place:]
            case 2:
                data[place:place] = chance.randbytes(chance.randint(1, 9))
            case 3:
                del data[place:place + chance.randint(1, 4)]
            case _ if len(data) > 7:
                data[4] = chance.randrange(256)
    if channel is Channel.PC and chance.random() < 0.7 and len(data) > 16:
        data[4:8] = (len(data) - 8).to_bytes(4, "little")
        data[-4:] = checksum(bytes(data[:-4])).to_bytes(4, "little")
    return bytes(data)


def _is_whole(data: bytes, channel: Channel) -> bool:
    """Whether the station's own codec finds nothing wrong."""
    if channel is Channel.APP:
        try:
            return bool(wire.Packet.decode(data))
        except wire.WireError:
            return False
    decoder = wire.EnvelopeDecoder()
    items = [*decoder.feed(data), *decoder.give_up()]
    return bool(items) and not any(isinstance(item, wire.Skipped) for item in items)


@pytest.mark.parametrize("channel", list(Channel))
def test_what_is_damaged_is_marked(channel: Channel, shark: Shark) -> None:
    chance = random.Random(SEED)
    encode = wire.encode_envelope if channel is Channel.PC else wire.Packet.encode
    seeds = [encode(REQUEST), encode(ANSWER), encode(wire.Packet(10)), wire.ACKNOWLEDGEMENT,
             "AT^X=\u00fc\r".encode()]
    mutants = [_mutant(chance, chance.choice(seeds), channel) for _ in range(MUTANTS)]
    rows = shark(written(channel, [Piece(number, bool(number % 2), data)
                                   for number, data in enumerate(mutants)]), *MARKS)
    assert len(rows) == MUTANTS
    whole = [_is_whole(data, channel) for data in mutants]
    assert 5 < sum(whole) < MUTANTS - 100
    for data, row, is_whole in zip(mutants, rows, whole):
        assert any(row) is not is_whole, (data.hex(), row)


@pytest.mark.parametrize("head", ["", "01", "010000", "02000000", "01020000", "01000200",
                                  "01000000"])
def test_a_capture_of_something_else_is_marked(head: str, shark: Shark) -> None:
    data = bytes.fromhex(head)
    whole = written(Channel.PC, [Piece(0, True, b"")])
    block = whole.rindex(bytes.fromhex("01000000"))
    # The one packet of the file holds the head alone; other bytes of it take its place.
    changed = whole[:block] + data.ljust(4, b"\0") + whole[block + 4:]
    changed = changed[:block - 8] + len(data).to_bytes(4, "little") * 2 + changed[block:]
    if not data:
        changed = changed[:block] + changed[block + 4:]
        size = (len(changed) - (block - 28)).to_bytes(4, "little")
        changed = changed[:block - 24] + size + changed[block - 20:-4] + size
    ((malformed, _),) = shark(changed, *MARKS)
    assert malformed == "1"


# the command

def test_export_to_a_pipe(tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel app", "station says packet 7")
    done = subprocess.run(station_command("trace", "export", str(path), "--pcapng", "-"),
                          cwd=ROOT, env=station_environment(), capture_output=True, timeout=60,
                          check=True)
    assert done.stdout == capture(read_trace(path))


@pytest.mark.parametrize("target, words", [("/dev/full", "No space left on device"),
                                           ("/no/such/file", "No such file or directory")])
def test_export_that_cannot_be_written(target: str, words: str, run_station: Run,
                                       tmp_path: Path) -> None:
    path = write(tmp_path / "x.trace", "channel app", "station says packet 7")
    result = run_station("trace", "export", str(path), "--pcapng", target)
    assert (result.returncode, result.stderr) == (2, f"amt-station: {target}: {words}\n")


def test_the_dissector_is_printed(run_station: Run) -> None:
    assert run_station("trace", "dissector").stdout == dissector()


def test_names_come_from_the_catalogue() -> None:
    lines = dissector().splitlines()
    assert all(f'  [{number}] = "{display_name(number)}",' in lines for number in range(256))
    assert "-- TABLES" not in lines
