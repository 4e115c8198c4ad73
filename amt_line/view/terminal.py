"""The view for a terminal: one table that fills, and the verdict large."""

from __future__ import annotations

import threading
import time
from typing import Any, Mapping, TextIO

from rich import box
from rich.align import Align
from rich.console import Console, Group, RenderableType
from rich.live import Live
from rich.panel import Panel
from rich.table import Table
from rich.text import Text

from amt_line.view.banner import banner
from amt_line.view.styles import STYLES
from amt_line.view.words import closing, step_remark, step_time
from amt_station.text import printable

_FRAMES_A_SECOND = 8
# Lines of the terminal that are not rows of the table.
_AROUND = 7


class TerminalView:
    """One table a run. Questions are put by whoever reads the answers, below the table."""

    def __init__(self, stream: TextIO) -> None:
        self._console = Console(file=stream, highlight=False, markup=False, emoji=False)
        self._lock = threading.Lock()
        self._rows: list[dict[str, Any]] = []
        self._title = ""
        self._current = 0
        self._live: Live | None = None

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        with self._lock:
            self._take(event)
        name = event["event"]
        if name in ("run-began", "answer"):
            self._show()
        elif name == "question":
            # The table comes back behind the answer.
            self.close()
        elif name == "notice":
            self.close()
            self._console.print(Text(printable(event["text"]), "bold yellow"))
            self._show()
        elif name == "step-ended" and self._live is None:
            self._show()
        elif name == "run-ended":
            self.close()
            self._console.print(self._table(self._rows))
            self._console.print(self._verdict(event))

    def _take(self, event: Mapping[str, Any]) -> None:
        name = event["event"]
        if name == "run-began":
            title = event["plan"]["title"]
            self._title = printable(f"{event['dut']}  {title}" if event["dut"] else title)
            self._rows = [dict(step) for step in event["steps"]]
        elif name in ("step-began", "step-again", "step-ended"):
            self._current = event["number"]
            self._rows[event["number"] - 1].update(event, since=time.monotonic())

    def _show(self) -> None:
        self._live = Live(get_renderable=self._window, console=self._console, transient=True,
                          refresh_per_second=_FRAMES_A_SECOND)
        self._live.start()

    def close(self) -> None:
        """Take the moving table away."""
        if self._live is not None:
            self._live.stop()
            self._live = None

    def _window(self) -> RenderableType:
        """The rows around the current step, as many as fit."""
        with self._lock:
            room = max(3, self._console.height - _AROUND)
            first = min(max(0, self._current - room + 2), max(0, len(self._rows) - room))
            return self._table(self._rows[first:first + room])

    def _table(self, rows: list[dict[str, Any]]) -> Table:
        table = Table(box=box.SIMPLE_HEAD, title=Text(self._title, "bold"), title_justify="left",
                      expand=True)
        table.add_column("#", justify="right", no_wrap=True)
        table.add_column("step", ratio=2, overflow="ellipsis", no_wrap=True)
        table.add_column("verdict", no_wrap=True, min_width=7)
        table.add_column("time", justify="right", no_wrap=True, min_width=6)
        table.add_column("value", ratio=3)
        for row in rows:
            table.add_row(*self._cells(row))
        return table

    def _cells(self, row: Mapping[str, Any]) -> list[Text]:
        number, name = Text(str(row["number"])), Text(printable(row["name"]))
        event = row.get("event")
        if event is None:
            return [number, name, Text(""), Text(""), Text("")]
        if event != "step-ended":
            seconds = f"{time.monotonic() - row['since']:.0f} s"
            again = f"attempt {row['attempt']}" if "attempt" in row else ""
            return [number, name, Text("...", STYLES["running"]), Text(seconds), Text(again)]
        return [number, name, Text(row["verdict"], STYLES[row["verdict"]]),
                Text(step_time(row)), Text(step_remark(row))]

    def _verdict(self, event: Mapping[str, Any]) -> RenderableType:
        word, width = str(event["verdict"]), self._console.width
        block = "#" if self._console.options.ascii_only else "█"
        letters = banner(word, block, wide=width > 14 * len(word) + 6)
        block_text = Text("\n".join(letters), no_wrap=True)
        panel = Panel(Align.center(block_text), style=STYLES[word], padding=(1, 2))
        return Group(panel, *(Text(line, "bold") for line in closing(event)))
