"""Reading the log while it grows, and waiting with deadlines."""

import re
import threading
import time
from pathlib import Path

import pytest

from amt_simulator import HandsetTimeout, Log
from amt_simulator.waiting import SCALE_VARIABLE, wait_until

LINES = """11-21 08:00:00.123 2 17 D vx-kel-amt: first: (data_len = 1) -- 0D
11-21 08:00:00.124 2 18 D (null): fb open failed!\\n
11-21 08:00:00.125 3 3 D vx-kel-pub:\x20
garbage
11-21 08:00:00.126 3 3 D vx-kel-amt: last
"""


@pytest.fixture
def log(tmp_path: Path) -> Log:
    """A log of a few lines."""
    path = tmp_path / "log.txt"
    path.write_text(LINES + "11-21 08:00:00.127 3 3 D vx-kel-amt: cut of")
    return Log(path)


def test_records(log: Log) -> None:
    """Each complete line is a record with its fields; the others are passed over."""
    records = log.records()
    assert [(r.pid, r.tid, r.tag, r.text) for r in records] == [
        (2, 17, "vx-kel-amt", "first: (data_len = 1) -- 0D"),
        (2, 18, "(null)", "fb open failed!\\n"),
        (3, 3, "vx-kel-pub", ""), (3, 3, "vx-kel-amt", "last")]
    assert records[0].time == "11-21 08:00:00.123" and records[0].priority == "D"


def test_texts_by_tag_and_place(log: Log) -> None:
    """In order, of one tag, behind a place."""
    assert log.texts("vx-kel-amt") == ["first: (data_len = 1) -- 0D", "last"]
    assert log.texts(after=log.records()[1].end) == ["", "last"]
    assert log.mark() == log.path.stat().st_size


def test_waiting_finds_what_is_there_and_what_comes(log: Log) -> None:
    """Also a record that was half written at first."""
    assert log.wait("first").tid == 17
    assert log.wait(re.compile(r"^l.st$")).text == "last"
    later = threading.Timer(0.1, lambda: log.path.open("a").write("f\n"))
    later.start()
    assert log.wait("cut off", after=log.records()[-1].end).text == "cut off"
    later.join()


def test_a_wait_in_vain_tells_the_end_of_the_log(log: Log) -> None:
    """So that a failed test shows what happened instead."""
    with pytest.raises(HandsetTimeout, match=r"(?s)waited in vain.*'first'.*log ends.*cut of"):
        log.wait("first", after=log.records()[0].end, timeout=0.05)


def test_a_log_that_is_not_there(tmp_path: Path) -> None:
    """It is empty."""
    log = Log(tmp_path / "none")
    assert (log.records(), log.mark(), log.texts()) == ([], 0, [])


def test_what_happened_before_the_deadline_counts() -> None:
    """However late the machine is to look: the attempt after the deadline decides."""
    attempts = []

    def attempt() -> bool:
        attempts.append(time.monotonic())
        time.sleep(0.1)
        return len(attempts) == 2

    assert wait_until(attempt, "a slow thing", timeout=0.05)


def test_deadlines_scale(monkeypatch: pytest.MonkeyPatch) -> None:
    """A slow build gets more time by a variable."""
    monkeypatch.setenv(SCALE_VARIABLE, "10")
    start = time.monotonic()
    with pytest.raises(HandsetTimeout):
        wait_until(lambda: None, "nothing", timeout=0.03)
    assert 0.3 <= time.monotonic() - start < 3
