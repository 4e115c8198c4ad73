"""Everything that looks at a line: its table or its lines, the file of events, and the page."""

from __future__ import annotations

import os
import sys
from contextlib import ExitStack, contextmanager
from dataclasses import dataclass
from pathlib import Path
from typing import TYPE_CHECKING, Any, Callable, Iterator, Mapping, Protocol, TextIO

from amt_line.cli.page import open_page
from amt_line.run.desk import Desk
from amt_line.run.events import Stream
from amt_line.view.event_file import EventFile
from amt_line.view.line_lines import LineLines
from amt_station.cli import console
from amt_station.errors import UsageProblem

if TYPE_CHECKING:
    from amt_line.view.web import Page

STANDARD_OUTPUT = "-"


class View(Protocol):
    """A listener that people look at."""

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""

    def problem(self, text: str) -> None:
        """Say something that belongs to no slot."""

    def close(self) -> None:
        """Show the last state, and give the terminal back."""


@dataclass(frozen=True)
class Wanted:
    """Which views are wanted."""

    title: str
    events: str = ""
    http: str = ""
    json: bool = False
    store_url: str | None = None
    delivery: Callable[[], str] = lambda: "ok"


class Views:
    """The views of a line that are open. Enter before the first event, leave after the last."""

    def __init__(self, wanted: Wanted, stream: Stream, desk: Desk) -> None:
        self.lost_events = ""
        self._wanted = wanted
        self._stream = stream
        self._desk = desk
        self._main: View | None = None
        self._early: list[str] = []

    @property
    def attended(self) -> bool:
        """Whether somebody is there who can answer a question."""
        return bool(self._wanted.http) or has_keyboard()

    def problem(self, text: str) -> None:
        """Tell the person something that belongs to no slot."""
        if self._main is not None:
            self._main.problem(text)
        else:
            self._early.append(text)

    @contextmanager
    def open(self) -> Iterator[None]:
        """All views, closed in the end."""
        with ExitStack() as stack:
            if self._wanted.events:
                stack.enter_context(self._open_events())
            if self._wanted.http:
                page = open_page(self._wanted.http, self._desk, self._wanted.store_url,
                                 self._wanted.delivery)
                self._listen(page, stack)
                console.talk(f"page: {page.url}")
            self._main = self._open_main(stack)
            self._listen(self._main, stack)
            for text in self._early:
                self._main.problem(text)
            yield
        self._main = None

    def _listen(self, view: View | Page, stack: ExitStack) -> None:
        self._stream.listen(view)
        stack.callback(view.close)
        stack.callback(self._stream.leave, view)

    @contextmanager
    def _open_events(self) -> Iterator[None]:
        name = self._wanted.events
        path = None if name == STANDARD_OUTPUT else Path(name)
        file = EventFile(sys.stdout if path is None else _opened(path),
                         "--events" if path is None else name, self.problem,
                         path if path is not None and path.is_file() else None)
        self._stream.listen(file)
        try:
            yield
        finally:
            self._stream.leave(file)
            file.close()
            self.lost_events = file.failure

    def _open_main(self, stack: ExitStack) -> View:
        busy = self._wanted.json or self._wanted.events == STANDARD_OUTPUT
        stream = sys.stderr if busy else sys.stdout
        if not stream.isatty() or os.environ.get("TERM") == "dumb":
            lines = LineLines(stream)
            if has_keyboard():
                stack.enter_context(self._keyboard(lines))
            return lines
        return self._open_table(stream, stack)

    def _open_table(self, stream: TextIO, stack: ExitStack) -> View:
        from amt_line.view.keyboard import Keyboard
        from amt_line.view.line_table import LineTable

        if not has_keyboard():
            return LineTable(stream, self._wanted.title)
        tables: list[LineTable] = []

        def changed() -> None:
            for table in tables:
                table.refresh()

        keyboard = Keyboard(self._desk, changed)
        stack.callback(keyboard.close)
        typing = keyboard.typing
        tables.append(LineTable(stream, self._wanted.title,
                                lambda: (typing.prompt(), typing.text, typing.problem)))
        return tables[0]

    @contextmanager
    def _keyboard(self, lines: LineLines) -> Iterator[None]:
        from amt_line.view.keyboard import Keyboard

        told = [""]

        def changed() -> None:
            prompt = keyboard.typing.problem or keyboard.typing.prompt()
            if prompt and prompt != told[0]:
                lines.say(prompt)
            told[0] = prompt

        keyboard = Keyboard(self._desk, changed)
        try:
            yield
        finally:
            keyboard.close()


def has_keyboard() -> bool:
    """Whether somebody sits at a terminal."""
    try:
        return sys.stdin.isatty() and sys.stderr.isatty()
    except (AttributeError, ValueError):
        return False


def _opened(path: Path) -> TextIO:
    try:
        return path.open("a", encoding="utf-8")
    except OSError as error:
        raise UsageProblem(f"--events {path}: {error.strerror}") from error
