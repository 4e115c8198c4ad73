"""What a browser is told: all of it, once, whatever becomes of the connection."""

from __future__ import annotations

import asyncio
import json
import random
import socket
import time
from typing import Any, Iterator

import pytest
from hypothesis import given, settings
from hypothesis import strategies as st
from line_page import ToldLine, until
from line_watch import Watcher

from amt_line.view.board import Board
from amt_line.view.web.changes import Changes, shown
from amt_line.view.web.live import Pace


@pytest.fixture
def line() -> Iterator[ToldLine]:
    """A line that is only told, with its page."""
    told = ToldLine()
    yield told
    told.close()


def read_until(watcher: Watcher, slots: dict[str, Any], condition: Any) -> dict[str, Any]:
    """Keep what a browser keeps until a condition holds; the last event."""
    while True:
        told = watcher.read()
        if watcher.kind == "snapshot":
            slots.clear()
        slots.update({slot["slot"]: slot for slot in told["slots"]})
        if condition():
            return told


def test_a_browser_gets_everything_first_and_then_what_changes(line: ToldLine) -> None:
    line.slot("A")
    line.slot("B")
    with Watcher(line.page) as watcher:
        first = watcher.read()
        assert (watcher.kind, [slot["slot"] for slot in first["slots"]]) == ("snapshot", ["A", "B"])
        assert first["token"] and first["version"] and first["ended"] == []
        run = line.began("B")
        slots: dict[str, Any] = {}
        told = read_until(watcher, slots, lambda: slots.get("B", {}).get("run"))
        assert (watcher.kind, list(slots)) == ("change", ["B"])
        assert "token" not in told
        line.step("B", run, 1)
        line.step_ended("B", run, 1)
        line.step("B", run, 2, "version")
        read_until(watcher, slots, lambda: slots["B"]["step"] and slots["B"]["verdicts"] == "p"
                   and slots["B"]["step"]["name"] == "version")
        line.ended("B", run, "FAIL", reason="version: no")
        ended: list[Any] = []
        read_until(watcher, slots, lambda: slots["B"]["last"])
        with Watcher(line.page) as other:
            ended = other.read()["slots"]
        assert ended[1]["last"]["verdict"] == "FAIL"
        assert slots["B"]["last"] == ended[1]["last"]


def test_how_long_a_run_takes_is_told_by_the_monotonic_clock(line: ToldLine) -> None:
    line.slot("A")
    line.began("A")
    with Watcher(line.page) as watcher:
        first = watcher.read()["slots"][0]["elapsed"]
    with Watcher(line.page) as watcher:
        second = watcher.read()["slots"][0]["elapsed"]
    assert 0 <= first <= second < 60


@pytest.mark.parametrize("how", ["header", "query"])
def test_after_a_lost_connection_only_what_is_new_is_told(line: ToldLine, how: str) -> None:
    line.slot("A")
    run = line.began("B")
    with Watcher(line.page) as watcher:
        watcher.read()
        seen = watcher.last_id
    line.ended("B", run, "PASS")
    again = (Watcher(line.page, last_id=seen) if how == "header"
             else Watcher(line.page, query=f"?since={seen}"))
    with again as watcher:
        told = watcher.read()
        assert watcher.kind == "change" and told["token"]
        assert [slot["slot"] for slot in told["slots"]] == ["B"], "A has not changed"
        assert told["ended"] == [{"slot": "B", "verdict": "PASS"}], "told once, not lost"
        seen = watcher.last_id
    with Watcher(line.page, last_id=seen) as watcher:
        told = watcher.read()
        assert (told["slots"], told["ended"]) == ([], []), "nothing twice"


@pytest.mark.parametrize("seen", ["other.3", "x", ".", "", "9", "{epoch}.", "{epoch}.-1",
                                  "{epoch}.x", "{epoch}.99999999999999999999", "{epoch}.\u0662"])
def test_an_id_of_another_life_gets_everything(line: ToldLine, seen: str) -> None:
    line.slot("A")
    with Watcher(line.page) as watcher:
        watcher.read()
        epoch = watcher.last_id.partition(".")[0]
    with Watcher(line.page, last_id=seen.replace("{epoch}", epoch)) as watcher:
        told = watcher.read()
    assert watcher.kind == "snapshot" and len(told["slots"]) == 1


def test_no_text_acts_on_whoever_reads_it(line: ToldLine) -> None:
    line.slot("A", text="a\u202eb\u2066c\x1b[31m\nd\x00\u200fe")
    with Watcher(line.page) as watcher:
        text = watcher.read()["slots"][0]["text"]
    assert text == "a\\u202eb\\u2066c\\x1b[31m\\nd\\x00\\u200fe"
    assert shown({"a": ["\u202e", 1, None, True]}) == {"a": ["\\u202e", 1, None, True]}


def test_a_browser_that_does_not_read_is_given_up_and_delays_nobody() -> None:
    line = ToldLine(pace=Pace(gather=0.0, beat=0.1, patience=0.5))
    try:
        for number in range(64):
            line.slot(str(number), text="x" * 4000)
        lazy = socket.socket()
        lazy.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
        lazy.connect(("127.0.0.1", line.page.port))
        lazy.sendall(f"GET /live HTTP/1.1\r\nHost: 127.0.0.1:{line.page.port}\r\n\r\n".encode())
        until(lambda: line.page.watching == 1, "the lazy browser")
        with Watcher(line.page) as watcher:
            watcher.read()
            slowest, number = 0.0, 0

            def told_more() -> bool:
                nonlocal slowest, number
                number += 1
                begin = time.monotonic()
                for slot in range(64):
                    line.slot(str(slot), text="x" * 4000 + str(number))
                slowest = max(slowest, time.monotonic() - begin)
                watcher.read()
                return line.page.watching == 1

            until(told_more, "the lazy browser given up")
            assert slowest < 5, "the line waits for no browser"
        lazy.close()
    finally:
        line.close()


def test_a_browser_that_goes_away_leaves_nothing(line: ToldLine) -> None:
    import os

    def descriptors() -> int:
        return len(os.listdir("/proc/self/fd"))

    with Watcher(line.page) as watcher:
        watcher.read()
    until(lambda: line.page.watching == 0, "no browser")
    before = descriptors()
    for _ in range(20):
        with Watcher(line.page) as watcher:
            watcher.read()
    until(lambda: line.page.watching == 0, "no browser")
    until(lambda: descriptors() <= before, "no descriptor left")


SLOTS = st.sampled_from("ABC")
EVENT = st.one_of(
    st.tuples(SLOTS, st.just("slot-state"), st.sampled_from(["waiting", "asking", "held"])),
    st.tuples(SLOTS, st.just("run-began"), st.integers(0, 9).map(str)),
    st.tuples(SLOTS, st.just("run-ended"), st.sampled_from(["PASS", "FAIL"])),
    st.tuples(SLOTS, st.just("question"), st.integers(0, 9).map(str)),
    st.tuples(SLOTS, st.just("answer"), st.integers(0, 9).map(str)))


def event_of(slot: str, kind: str, word: str) -> dict[str, Any]:
    """An event as a line sends it."""
    plan = {"title": "plan"}
    events: dict[str, dict[str, Any]] = {
        "slot-state": {"state": word, "text": word, "port": ""},
        "run-began": {"run": word, "dut": word, "plan": plan, "steps": [1], "port": ""},
        "run-ended": {"verdict": word, "dut": "", "plan": plan, "reason": "", "advice": "",
                      "seconds": 1},
        "question": {"id": word, "kind": "text", "name": "", "text": word, "picture": ""},
        "answer": {"id": word, "text": "", "by": ""}}
    return {"event": kind, "slot": slot, "time": "2026-01-31T00:00:00.000Z", "run": "r",
            **events[kind]}


@settings(max_examples=60)
@given(st.lists(st.one_of(EVENT, st.none()), max_size=40), st.integers())
def test_whatever_is_missed_the_browser_has_the_board(script: list[Any], seed: int) -> None:
    chance = random.Random(seed)
    loop = asyncio.new_event_loop()
    try:
        changes, told, ended = Changes(Board(), loop), [], []
        page: dict[str, Any] = {}
        version: int | None = None
        for entry in script:
            if entry is not None:
                changes.take(event_of(*entry))
                if entry[1] == "run-ended":
                    told.append({"slot": entry[0], "verdict": entry[2]})
                continue
            loop.run_until_complete(asyncio.sleep(0))
            if chance.random() < 0.5:
                news = json.loads(json.dumps(changes.since(version)))
                if version is None:
                    ended += told
                version = changes.version
                page.update({slot["slot"]: slot for slot in news["slots"]})
                ended += news["ended"]
        loop.run_until_complete(asyncio.sleep(0))
        news = changes.since(version)
        page.update({slot["slot"]: slot for slot in news["slots"]})
        whole = changes.since(None)

        def timeless(slots: Any) -> list[Any]:
            return sorted(({**slot, "elapsed": slot["elapsed"] is None} for slot in slots),
                          key=lambda slot: str(slot["slot"]))

        assert timeless(page.values()) == timeless(whole["slots"])
        assert version is None or ended + news["ended"] == told, "each verdict once"
    finally:
        loop.close()
