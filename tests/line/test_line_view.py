"""What is seen of a run: lines, a table on a terminal, and questions there."""

from __future__ import annotations

import io
import os
import pty
import re
import select
import subprocess
import time
from pathlib import Path
from typing import Iterator

import pytest
from line_bench import ADC, Bench, Script, adc, load, write_plan
from station_peer import ROOT, Peer, station_command, station_environment

from amt_line.view.banner import ROWS, banner
from amt_line.view.lines import LineView
from amt_station.wire import ACKNOWLEDGEMENT


def battery() -> Script:
    return Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})


class Screen:
    """The station on a terminal."""

    def __init__(self, *arguments: str) -> None:
        self.master, slave = pty.openpty()
        self.seen = ""
        self.process = subprocess.Popen(
            station_command(*arguments), cwd=ROOT, stdin=slave, stdout=slave, stderr=slave,
            env=station_environment(TERM="xterm", COLUMNS="100", LINES="30",
                                    PYTHONIOENCODING="utf-8"))
        os.close(slave)

    def until(self, words: str) -> str:
        """Read until these words stand on the screen."""
        end = time.monotonic() + 300
        while words not in self.seen:
            assert time.monotonic() < end, f"{words!r} is not in {self.seen!r}"
            if select.select([self.master], [], [], 1.0)[0]:
                try:
                    self.seen += os.read(self.master, 65536).decode("utf-8", "replace")
                except OSError:
                    break
        assert words in self.seen, self.seen
        return self.seen

    def type(self, line: str) -> None:
        """Type a line, or scan it."""
        self.seen = ""
        os.write(self.master, f"{line}\n".encode())

    def end(self) -> int:
        """Read to the end; the exit status."""
        try:
            while True:
                if select.select([self.master], [], [], 300)[0]:
                    self.seen += os.read(self.master, 65536).decode("utf-8", "replace")
        except OSError:
            pass
        return self.process.wait(300)


@pytest.fixture(name="screens")
def make_screens() -> Iterator[list[Screen]]:
    """Terminals that are taken away at the end."""
    made: list[Screen] = []
    yield made
    for screen in made:
        if screen.process.poll() is None:
            screen.process.kill()
            screen.process.wait()
        os.close(screen.master)


def test_lines(tmp_path: Path, peer: Peer) -> None:
    peer.script = battery()
    stream = io.StringIO()
    view = LineView(stream)
    Bench(load(tmp_path, ADC + "[[step]]\nat = 'AT'\nwhen = 'failed'\n"), peer, on_event=view).run()
    lines = [re.sub(r"\b\d+(\.\d+)? m?s\b", "T", line) for line in stream.getvalue().splitlines()]
    assert lines[:3] == ["[1/2] adc ...", "[1/2] adc: pass  T  adc 15",
                         "[2/2] AT: skipped  nothing has failed"]
    assert lines[4:9] == banner("PASS", wide=False)
    assert lines[-1] == "line: PASS (1 pass, 1 skipped) after T"


@pytest.mark.parametrize("word", ["PASS", "FAIL", "ERROR", "ABORTED"])
def test_every_verdict_has_its_letters(word: str) -> None:
    rows = banner(word)
    assert len(rows) == ROWS and all(rows) and max(map(len, rows)) >= 12 * len(word) - 8


def test_a_run_on_a_terminal(tmp_path: Path, peer: Peer, screens: list[Screen]) -> None:
    peer.script = battery()
    plan = write_plan(tmp_path, '[input.sn]\nprompt = "Scan the number"\npattern = "K[0-9]+"\n'
                      + ADC + '[[step]]\nname = "screen"\nask = "White?"\n'
                      + '[[step]]\nenter = "Label"\nname = "label"\n')
    screen = Screen("-p", peer.path, "run", str(plan), "--no-records")
    screens.append(screen)
    screen.until("Scan the number:")
    screen.type("X1")
    screen.until("is not of the form")
    screen.until("Scan the number:")
    screen.type("K1")
    screen.until("White? [yes/no]")
    screen.type("perhaps")
    screen.until("yes or no?")
    screen.type("yes")
    screen.until("Label:")
    screen.type("L1")
    assert screen.end() == 0
    assert "█████" in screen.seen and "PASS (3 pass)" in screen.seen
    assert "adc 15" in screen.seen


def test_no_is_no(tmp_path: Path, peer: Peer, screens: list[Screen]) -> None:
    peer.script = battery()
    screen = Screen("-p", peer.path, "run", "--no-records",
                    str(write_plan(tmp_path, '[[step]]\nask = "White?"\n')))
    screens.append(screen)
    screen.until("White? [yes/no]")
    screen.type("n")
    assert screen.end() == 1 and "the operator said no" in screen.seen


def test_the_end_of_input_is_no_answer(tmp_path: Path, peer: Peer, screens: list[Screen]) -> None:
    peer.script = battery()
    screen = Screen("-p", peer.path, "run", "--no-records",
                    str(write_plan(tmp_path, '[[step]]\nask = "White?"\n')))
    screens.append(screen)
    screen.until("White? [yes/no]")
    os.write(screen.master, b"\x04")
    assert screen.end() == 7 and "nobody to ask" in screen.seen


def test_control_c_at_a_question(tmp_path: Path, peer: Peer, screens: list[Screen]) -> None:
    script = battery()
    peer.script = script
    screen = Screen("-p", peer.path, "run", "--no-records", str(write_plan(
        tmp_path, '[[step]]\nask = "White?"\n[[always]]\nat = "AT+LAST"\n')))
    screens.append(screen)
    screen.until("White? [yes/no]")
    screen.process.send_signal(2)
    assert screen.end() == 130 and "ABORTED" in screen.seen and script.asked[-1] == "AT+LAST"
