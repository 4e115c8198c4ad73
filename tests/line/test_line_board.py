"""The board, the lines and the file of a line: made from its events, from nothing else."""

from __future__ import annotations

import copy
import io
import json
import os
import time
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, Script
from line_slots import PATIENCE, Bench, battery

from amt_line.view.block import BLOCK_ROWS, block_of, half_block
from amt_line.view.board import Board
from amt_line.view.event_file import EventFile
from amt_line.view.line_lines import LineLines
from amt_line.view.line_table import LineTable

PLAN = ADC + "[[step]]\nname = 'screen'\nask = 'White?'\n"


def told(folder: Path, values: dict[str, int], **options: Any) -> list[dict[str, Any]]:
    """The events of a line whose slots' handsets have these batteries."""
    with Bench(folder, PLAN, tuple(values), once=True, answers={"screen": "yes"},
               **options) as bench:
        for name, value in values.items():
            bench.sockets[name].plug(battery(value))
            bench.wait("run-ended", slot=name)
        bench.join()
        return list(bench.events)


def test_the_board_at_every_moment(tmp_path: Path) -> None:
    events = told(tmp_path, {"A": 15, "B": 99})
    board, moments = Board(), []
    for event in events:
        board.take(event)
        moments.append((event["event"], event["slot"], board.snapshot()["slots"]))
    assert json.loads(json.dumps(board.snapshot())) == board.snapshot()
    last = board.snapshot()
    assert last["counts"] == {"PASS": 1, "FAIL": 1, "ERROR": 0, "ABORTED": 0}
    one, two = last["slots"]
    assert (one["slot"], one["state"], one["run"], one["last"]["verdict"]) == (
        "A", "ended", "", "PASS")
    assert one["last"]["value"] is None and one["counts"]["PASS"] == 1
    assert two["last"]["step"] == "adc" and two["last"]["verdict"] == "FAIL"
    value = two["last"]["value"]
    assert (value["name"], value["value"], value["limits"]) == ("adc", 99, {"min": 10, "max": 20})
    began = next(slots for name, slot, slots in moments if (name, slot) == ("step-began", "B"))
    assert began[1]["step"]["name"] == "adc" and began[1]["steps"] == 2 and began[1]["run"]
    assert began[0]["last"]["verdict"] == "PASS", "the last verdict stays"
    asked = next(slots for name, slot, slots in moments if (name, slot) == ("question", "B"))
    assert (asked[1]["question"]["kind"], asked[1]["question"]["text"]) == ("yes-no", "White?")
    assert [step["verdict"] for step in asked[1]["ended_steps"]] == ["fail"]
    answered = next(slots for name, slot, slots in moments if (name, slot) == ("answer", "B"))
    assert answered[1]["question"] is None


def test_the_board_does_not_change_what_it_is_told(tmp_path: Path) -> None:
    events = told(tmp_path, {"A": 99})
    before, board = copy.deepcopy(events), Board()
    for event in events:
        board.take(event)
    board.snapshot()["slots"][0]["counts"]["PASS"] = 7
    assert events == before and board.counts["PASS"] == 0
    board.take({"event": "of tomorrow", "time": "", "slot": "Z"})
    assert list(board.slots) == ["A", "Z"]


def test_a_slot_of_a_record_that_was_never_ended_shows_no_run(tmp_path: Path) -> None:
    board = Board()
    for event in told(tmp_path, {"A": 15}):
        if event["event"] != "run-ended":
            board.take(event)
    (slot,) = board.snapshot()["slots"]
    assert (slot["state"], slot["run"], slot["last"], slot["step"]) == ("ended", "", None, None)


def test_lines(tmp_path: Path) -> None:
    stream = io.StringIO()
    view = LineLines(stream)
    for event in told(tmp_path, {"A": 15, "B\x1b": 99}):
        view(event)
    view.close()
    lines = stream.getvalue().splitlines()
    assert all("\x1b" not in line for line in lines)
    assert any(line.startswith("A: begins at ") for line in lines)
    assert "A: asks: White?" in lines
    assert any(line.startswith("A: *** PASS ***  line: PASS (2 pass) after ") for line in lines)
    assert any("[1/2] adc: fail" in line and line.endswith("adc 99 is above 20") for line in lines)
    assert any(line.endswith("first: adc: adc 99 is above 20") for line in lines)
    assert lines[-1] == "2 runs: 1 PASS, 1 FAIL, 0 ERROR, 0 ABORTED, 50 % passed"


class Wide(io.StringIO):
    """A stream that can show block letters."""

    encoding = "utf-8"


@pytest.mark.parametrize("width", [80, 140])
def test_the_table_shows_every_slot_and_the_shift(tmp_path: Path, monkeypatch: Any, width: int
                                                  ) -> None:
    monkeypatch.setenv("COLUMNS", str(width))
    monkeypatch.setenv("LINES", "40")
    stream = Wide()
    table = LineTable(stream, "End of line", lambda: ("B: White? [yes/no]", "ye", "yes or no"))
    for event in told(tmp_path, {"A": 15, "B": 99}):
        table(event)
    table.problem("the events can no longer be written")
    table.close()
    shown = stream.getvalue()
    for word in ("End of line", "A ", "B ", "above", "B: White? [yes/no]",
                 "yes or no", "the events can no longer be written"):
        assert word in shown, (word, shown)
    squeezed = "".join(shown.split())
    assert "adc:adc99isabove20" in squeezed if width == 140 else "FAIL" in shown
    assert all((line in shown) == (width == 140) for line in half_block("FAIL"))
    assert ("shift" in shown) == (width == 140)
    assert width == 140 or "2 runs: 1 PASS, 1 FAIL" in shown


def test_blocks_are_as_large_as_there_is_room() -> None:
    assert len(block_of("PASS", 9, False)) == 5 and "█" in block_of("PASS", 5, False)[0]
    assert len(block_of("ABORTED", 4, False)) == BLOCK_ROWS == 3
    assert block_of("PASS", 2, False) == block_of("PASS", 4, True) == ["PASS"]
    assert len(set(map(len, half_block("FAIL")))) == 1


# the file of events

def test_events_in_a_file(tmp_path: Path) -> None:
    events = told(tmp_path, {"A": 15})
    problems: list[str] = []
    path = tmp_path / "events"
    file = EventFile(path.open("a", encoding="utf-8"), str(path), problems.append, path)
    for event in events:
        file(event)
    file.close()
    assert [json.loads(line) for line in path.read_text(encoding="utf-8").splitlines()] == events
    assert not problems and not file.failure
    for event in events:
        assert {"event", "time", "slot"} <= set(event)


def wait_for(problems: list[str]) -> str:
    """What was said, as soon as something is."""
    end = time.monotonic() + PATIENCE
    while not problems:
        assert time.monotonic() < end
        time.sleep(0.01)
    return problems[0]


def test_a_full_disk_ends_the_file_and_nothing_else() -> None:
    problems: list[str] = []
    with open("/dev/full", "w", encoding="utf-8") as full:
        file = EventFile(full, "/dev/full", problems.append)
        for _ in range(3):
            file({"event": "notice"})
        assert wait_for(problems) == ("/dev/full: the events can no longer be written: No space "
                                      "left on device")
        file.close()
        assert len(problems) == 1 and file.failure
        os.dup2(os.open(os.devnull, os.O_WRONLY), full.fileno())


@pytest.mark.parametrize("replaced", [False, True])
def test_a_file_that_is_taken_away_is_told(tmp_path: Path, replaced: bool) -> None:
    path = tmp_path / "events"
    problems: list[str] = []
    file = EventFile(path.open("a", encoding="utf-8"), str(path), problems.append, path)
    other = tmp_path / "other"
    other.touch()
    path.unlink()
    if replaced:
        other.rename(path)
    file({"event": "notice"})
    assert ("replaced" if replaced else "taken away") in wait_for(problems)
    file.close()


def test_a_reader_that_stands_still_stops_nobody(monkeypatch: Any) -> None:
    monkeypatch.setattr("amt_line.view.event_file._MOST_WAITING", 50)
    problems: list[str] = []
    read, write = os.pipe()
    with open(write, "w", encoding="utf-8") as stream:
        file = EventFile(stream, "pipe", problems.append)
        for _ in range(100):
            file({"event": "notice", "text": "x" * 65536})
        assert "nobody reads them any more" in wait_for(problems)
        os.close(read)
        file.close(PATIENCE)
        os.dup2(os.open(os.devnull, os.O_WRONLY), stream.fileno())


def test_a_view_that_fails_harms_no_slot(tmp_path: Path) -> None:
    bench = Bench(tmp_path, ADC, once=True)

    def fail(event: Any) -> None:
        raise ValueError("a view")

    bench.on_event = fail
    with bench:
        bench.sockets["A"].plug(battery(15))
        assert bench.join() == 0
    assert isinstance(bench.shop.stream.failure, ValueError)


def test_all_views_see_one_order(tmp_path: Path) -> None:
    seen: list[list[Any]] = [[], []]
    bench = Bench(tmp_path, "[[step]]\nat = 'AT'\n" * 10, ("A", "B", "C", "D"), once=True)
    for events in seen:
        bench.shop.stream.listen(events.append)
    with bench:
        for socket in bench.sockets.values():
            socket.plug(Script())
        assert bench.join() == 0
    assert seen[0] == seen[1] == bench.events
    assert [event["time"] for event in bench.events] == sorted(
        event["time"] for event in bench.events)
