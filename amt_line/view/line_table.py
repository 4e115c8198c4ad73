"""A line's view for a terminal: a row a slot, its last verdict large, the shift's counts beside."""

from __future__ import annotations

import threading
import time
from typing import Any, Callable, Mapping, TextIO

from rich import box
from rich.console import Console, Group, RenderableType
from rich.live import Live
from rich.panel import Panel
from rich.progress_bar import ProgressBar
from rich.table import Table
from rich.text import Text

from amt_line.report.records import limits_text
from amt_line.view.banner import ROWS
from amt_line.view.block import BLOCK_ROWS, block_of
from amt_line.view.board import VERDICTS, Board, Document
from amt_line.view.styles import STYLES
from amt_line.view.words import counts_text
from amt_station.text import printable

_FRAMES_A_SECOND = 4
# Lines that are no rows: the head of the table, its title and its end, the prompt below.
_AROUND = 6
_BAR_WIDTH = 22
_WIDE = 110

Prompt = Callable[[], tuple[str, str, str]]


def _no_prompt() -> tuple[str, str, str]:
    return "", "", ""


class LineTable:
    """One table for the whole line, drawn anew a few times a second."""

    def __init__(self, stream: TextIO, title: str, prompt: Prompt = _no_prompt) -> None:
        """``prompt`` gives what is asked, what is typed, and what was wrong with the last try."""
        self._console = Console(file=stream, highlight=False, markup=False, emoji=False)
        self._turn = threading.Lock()
        self._board = Board()
        # By the clock that nobody sets: when each slot began what it does.
        self._since: dict[str, float] = {}
        self._title = title
        self._prompt = prompt
        self._problems: list[str] = []
        self._live = Live(get_renderable=self._window, console=self._console, transient=True,
                          refresh_per_second=_FRAMES_A_SECOND)
        self._live.start()

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        with self._turn:
            self._board.take(event)
            if event["event"] == "run-began":
                self._since[str(event.get("slot", ""))] = time.monotonic()

    def problem(self, text: str) -> None:
        """Show something that belongs to no slot."""
        with self._turn:
            self._problems.append(printable(text))

    def refresh(self) -> None:
        """Show at once what has changed."""
        self._live.refresh()

    def close(self) -> None:
        """Leave the table as it is at the end."""
        self._live.stop()
        self._console.print(self._whole(height=BLOCK_ROWS))

    # drawing

    def _window(self) -> RenderableType:
        slots = max(1, len(self._board.slots))
        room = self._console.height - _AROUND - len(self._problems)
        return self._whole(max(1, min(ROWS, room // slots - 1)))

    def _whole(self, height: int) -> RenderableType:
        if self._console.width < _WIDE:
            # The letters would take the room of the words.
            height = 1
        with self._turn:
            table = self._table(height)
            counts = dict(self._board.counts)
            below: list[RenderableType] = [Text(text, "bold red") for text in self._problems]
        question, typed, problem = self._prompt()
        if problem:
            below.append(Text(printable(problem), "bold yellow"))
        if question:
            below.append(Text.assemble((f"{question} ", "bold"), (printable(typed), "bold cyan"),
                                       ("_", "blink")))
        if self._console.width < _WIDE:
            return Group(table, Text(counts_text(counts), "bold"), *below)
        grid = Table.grid(expand=True, padding=(0, 1))
        grid.add_column(ratio=1)
        grid.add_column()
        grid.add_row(table, _shift(counts))
        return Group(grid, *below)

    def _table(self, height: int) -> Table:
        table = Table(box=box.SIMPLE_HEAD, title=Text(printable(self._title), "bold"),
                      title_justify="left", expand=True, show_lines=False,
                      padding=(0, 1, 1 if height > 1 else 0, 0))
        table.add_column("slot", no_wrap=True)
        table.add_column("state", no_wrap=True)
        table.add_column("handset", overflow="ellipsis", no_wrap=True)
        table.add_column("step", ratio=1, overflow="fold", min_width=_BAR_WIDTH)
        table.add_column("time", justify="right", no_wrap=True, min_width=6)
        table.add_column("last verdict", no_wrap=True)
        for slot in self._board.slots.values():
            table.add_row(*self._cells(slot, height))
        return table

    def _cells(self, slot: Document, height: int) -> list[RenderableType]:
        last = slot["last"]
        state = slot["state"]
        return [Text(printable(slot["slot"]), "bold"), Text(state, STYLES.get(state, "")),
                Text(printable(slot["dut"] or (last["dut"] if last else ""))),
                _with_bar(Text(_doing(slot)), slot), Text(self._elapsed(slot)),
                self._verdict(slot, height)]

    def _elapsed(self, slot: Document) -> str:
        if slot["run"]:
            return f"{time.monotonic() - self._since.get(slot['slot'], time.monotonic()):.0f} s"
        return f"{slot['last']['seconds']:.1f} s" if slot["last"] else ""

    def _verdict(self, slot: Document, height: int) -> Text:
        if slot["last"] is None:
            return Text("")
        word = slot["last"]["verdict"]
        lines = block_of(word, height, self._console.options.ascii_only)
        width = max(len(line) for line in lines)
        # While the next handset is tested, the block is not to be taken for its verdict.
        style = "dim" if slot["run"] else STYLES[word]
        return Text("\n").join(Text(f" {line:{width}} ", style) for line in lines)


def _doing(slot: Document) -> str:
    if slot["question"] is not None:
        return printable(f"asks: {slot['question']['text']}")
    if slot["run"]:
        step = slot["step"]
        number = step["number"] if step else len(slot["ended_steps"])
        name = f" {step['name']}" if step else ""
        notice = f": {slot['notice']}" if slot["notice"] else ""
        return printable(f"{number} of {slot['steps']}{name}{notice}")
    if slot["state"] in ("verdict", "ended") and (why := _why(slot["last"])):
        return why
    return printable(slot["text"])


def _with_bar(text: Text, slot: Document) -> RenderableType:
    if not slot["run"] or not slot["steps"]:
        return text
    return Group(text, _bar(slot))


def _bar(slot: Document) -> ProgressBar:
    return ProgressBar(total=slot["steps"], completed=len(slot["ended_steps"]), width=_BAR_WIDTH)


def _why(last: Document | None) -> str:
    if last is None or last["verdict"] == "PASS":
        return ""
    limits = limits_text(last["value"]).strip() if last["value"] else ""
    return printable(last["reason"] + (f" (allowed: {limits})" if limits else ""))


def _shift(counts: Mapping[str, int]) -> Panel:
    table = Table.grid(padding=(0, 2))
    table.add_column()
    table.add_column(justify="right")
    for verdict in VERDICTS:
        table.add_row(Text(f" {verdict} ", STYLES[verdict]), Text(str(counts[verdict]), "bold"))
    total = sum(counts.values())
    table.add_row(Text("in all"), Text(str(total)))
    table.add_row(Text("passed"), Text(f"{100 * counts['PASS'] / total:.0f} %" if total else ""))
    return Panel(table, title="shift", box=box.ROUNDED, expand=False)
