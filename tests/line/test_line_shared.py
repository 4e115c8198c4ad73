"""What slots share is taken in turn: by all that need it, in the order of coming."""

from __future__ import annotations

import random
import threading
import time
from pathlib import Path
from typing import Any

import pytest
from line_bench import Script, in_thread, problems
from line_slots import PATIENCE, Bench

from amt_line.run.shared import Shared

BOX = "[[step]]\nname = 'box'\nat = 'AT+X'\nneeds = ['shield-box']\n"


def no_end() -> None:
    """Nobody ends the waiting."""


class Queue:
    """Threads that want something, one behind the other."""

    def __init__(self) -> None:
        self.shared = Shared()
        self.got: list[str] = []
        self.told: dict[str, str] = {}
        self.gates: dict[str, threading.Event] = {}
        self.threads: list[threading.Thread] = []

    def want(self, who: str, *names: str) -> None:
        """Begin to want it, behind all who wanted it before."""
        self.gates[who] = threading.Event()
        queued = threading.Event()

        def check() -> None:
            queued.set()

        def work() -> None:
            with self.shared.taken(names, who, check,
                                   lambda text: self.told.update({who: text})):
                self.got.append(who)
                queued.set()
                assert self.gates[who].wait(PATIENCE)

        self.threads.append(in_thread(work))
        assert queued.wait(PATIENCE)

    def let_go(self, who: str) -> None:
        """Hand back what this one has."""
        self.gates[who].set()

    def until(self, *got: str) -> None:
        """Wait until exactly these have got it, in this order."""
        end = time.monotonic() + PATIENCE
        while self.got != list(got):
            assert time.monotonic() < end, (self.got, got)
            time.sleep(0.005)


def test_first_come_first_served() -> None:
    queue = Queue()
    for who in "ABCD":
        queue.want(who, "box")
    queue.until("A")
    assert queue.told == {"B": "waits for box, slot A came first",
                          "C": "waits for box, slot A came first",
                          "D": "waits for box, slot A came first"}
    for number, who in enumerate("ABCD", start=1):
        queue.until(*"ABCD"[:number])
        queue.let_go(who)


def test_who_needs_more_is_not_overtaken_for_ever() -> None:
    queue = Queue()
    queue.want("A", "box")
    queue.want("B", "box", "camera")
    queue.want("C", "camera")
    queue.want("D", "lamp")
    queue.until("A", "D")
    queue.let_go("A")
    queue.until("A", "D", "B")
    queue.let_go("B")
    queue.until("A", "D", "B", "C")
    for who in "CD":
        queue.let_go(who)


@pytest.mark.parametrize("error", [ValueError, KeyboardInterrupt])
def test_it_is_handed_back_on_every_way_out(error: Any) -> None:
    shared = Shared()

    def fail() -> None:
        raise error

    with pytest.raises(error), shared.taken(["box"], "A", no_end):
        with pytest.raises(error), shared.taken(["box"], "B", fail):
            raise AssertionError("nobody has it twice")
        raise error
    with shared.taken(["box"], "C", no_end) as waited:
        assert waited < PATIENCE


def test_no_deadlock_whatever_is_needed_together() -> None:
    shared, inside, turn = Shared(), dict.fromkeys("abcd", 0), threading.Lock()
    chance = random.Random(7)
    wants = [[chance.sample("abcd", chance.randint(1, 3)) for _ in range(30)] for _ in range(8)]

    def work(mine: list[list[str]]) -> None:
        for names in mine:
            with shared.taken(names, "", no_end):
                with turn:
                    for name in names:
                        inside[name] += 1
                        assert inside[name] == 1
                time.sleep(0)
                with turn:
                    for name in names:
                        inside[name] -= 1

    threads = [in_thread(lambda mine=mine: work(mine))  # type: ignore[misc]
               for mine in wants]
    for thread in threads:
        thread.join(PATIENCE)
        assert not thread.is_alive()
    assert set(inside.values()) == {0} and not shared._queue


def test_slots_take_the_box_in_turn(tmp_path: Path, records: Path) -> None:
    with Bench(tmp_path, BOX, ("A", "B", "C"), once=True) as bench:
        silent = Script(texts={"AT+X": []})
        bench.sockets["A"].plug(silent)
        bench.wait("step-began", slot="A")
        bench.sockets["B"].plug(Script())
        assert bench.wait("notice", slot="B")["text"] == "waits for shield-box, slot A came first"
        bench.sockets["C"].plug(Script())
        bench.wait("notice", slot="C")
        assert not list(bench.found("step-ended"))
        # Also one that fails, or is pulled out, lets go.
        bench.sockets["A"].pull()
        assert bench.join() == 3
    assert [event["slot"] for event in bench.found("step-ended")] == ["A", "B", "C"]
    waited = bench.record(bench.wait("run-ended", slot="B")["run"])["steps"][0]
    assert waited["verdict"] == "pass" and "for shield-box" in waited["remarks"][0]
    assert waited["seconds"] < float(waited["remarks"][0].split()[1]) + PATIENCE


def test_a_run_that_waits_for_the_box_can_be_ended(tmp_path: Path) -> None:
    with Bench(tmp_path, BOX, ("A", "B")) as bench:
        bench.sockets["A"].plug(Script(texts={"AT+X": []}))
        bench.wait("step-began", slot="A")
        bench.sockets["B"].plug(Script())
        bench.wait("notice", slot="B")
        bench.desk.stop("B")
        assert bench.wait("run-ended", slot="B")["verdict"] == "ABORTED"


@pytest.mark.parametrize("needs, reason", [
    ("'box'", "is no array"), ("[]", "holds nothing"), ("['']", "is empty"),
    ("['a', 'a']", "is not a list of names, each once"), ("[1]", "1 is no text"),
    ('["\\u0007"]', "cannot be shown")])
def test_needs_are_names(tmp_path: Path, needs: str, reason: str) -> None:
    found = problems(tmp_path, f"[[step]]\nat = 'AT'\nneeds = {needs}\n")
    assert len(found) == 1 and "needs" in found[0]
    assert reason.replace("no array", "no list") in found[0], found
