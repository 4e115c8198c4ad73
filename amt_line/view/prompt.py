"""Asks at the terminal: for the inputs before a run, for answers during it."""

from __future__ import annotations

import os
import select
import sys
import termios
from typing import Callable, Sequence

from amt_line.plan.inputs import Input
from amt_line.plan.references import Scalar
from amt_line.run.operator import Answer, Question, is_answer
from amt_station.errors import StationError, UsageProblem
from amt_station.text import printable

_LOOK_SECONDS = 0.05
_LONGEST_LINE = 16384


class NobodyThere(UsageProblem):
    """The terminal's end of input instead of an answer."""


def there_is_a_terminal() -> bool:
    """Whether somebody can be asked."""
    try:
        return sys.stdin.isatty() and sys.stderr.isatty()
    except (AttributeError, ValueError):
        return False


class Terminal:
    """The person, or the scanner, at the terminal; a line is an answer."""

    def __init__(self) -> None:
        self._fd = sys.stdin.fileno()
        self._typed = b""

    def line(self, prompt: str, check: Callable[[], None] = lambda: None) -> str | None:
        """Show the prompt and read a line; None at the end of input."""
        print(f"{printable(prompt)} ", end="", file=sys.stderr, flush=True)
        while b"\n" not in self._typed:
            check()
            if not select.select([self._fd], [], [], _LOOK_SECONDS)[0]:
                continue
            try:
                data = os.read(self._fd, 4096)
            except OSError:
                data = b""
            if not data:
                print(file=sys.stderr)
                return None
            self._typed = (self._typed + data)[-_LONGEST_LINE:]
        line, _, self._typed = self._typed.partition(b"\n")
        return line.decode("utf-8", "surrogateescape").strip("\r")

    def forget_typed(self) -> None:
        """Drop what was typed before there was a question."""
        self._typed = b""
        try:
            termios.tcflush(self._fd, termios.TCIFLUSH)
        except termios.error:
            pass  # no terminal any more; the next reading says so

    def ask_inputs(self, inputs: Sequence[Input]) -> dict[str, Scalar]:
        """The values of these inputs; one that does not fit is asked for again."""
        return {item.name: self._ask_input(item) for item in inputs}

    def _ask_input(self, item: Input) -> Scalar:
        while True:
            line = self.line(f"{item.prompt}:")
            if line is None:
                raise NobodyThere(f"no value for the input {item.name}: the input has ended")
            try:
                return item.read(line)
            except StationError as error:
                print(printable(str(error)), file=sys.stderr)

    # during a run

    def expect(self, question: Question) -> None:
        """As in ``Operator``."""

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """As in ``Operator``."""
        prompt = question.text + (" [yes/no]" if question.yes_or_no else ":")
        if question.picture is not None:
            print(f"look at {printable(str(question.picture))}", file=sys.stderr)
        if question.yes_or_no:
            # A key pressed, or a code scanned, before there was a question is no answer to it.
            self.forget_typed()
        while (line := self.line(prompt, check)) is not None:
            if is_answer(question, line.strip()):
                return Answer(line.strip(), "terminal")
            print("yes or no?" if question.yes_or_no else "a text, please", file=sys.stderr)
        return None

    def can_act(self) -> bool:
        """As in ``Operator``."""
        return True
