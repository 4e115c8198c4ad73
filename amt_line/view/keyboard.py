"""Answers the questions of many slots at one terminal: the oldest first, Tab for the next one."""

from __future__ import annotations

import codecs
import os
import select
import sys
import termios
import threading
from typing import Any, Callable

from amt_line.run.desk import YES_NO, Desk, DeskProblem, NoSuchQuestion, OpenQuestion
from amt_station.text import printable

_LOOK_SECONDS = 0.05
_LONGEST_LINE = 4096


class Typing:
    """What is being typed, for which question. Pure but for the desk."""

    def __init__(self, desk: Desk) -> None:
        self.text = ""
        self.problem = ""
        self._desk = desk
        self._shown: OpenQuestion | None = None

    def question(self) -> OpenQuestion | None:
        """The question to be answered now; what was typed for another one is dropped."""
        there = self._desk.questions()
        if self._shown not in there:
            self._show(there[0] if there else None)
        return self._shown

    def _show(self, question: OpenQuestion | None) -> None:
        self._shown, self.text, self.problem = question, "", ""

    def prompt(self) -> str:
        """What is asked, with its slot; empty when nothing is."""
        question = self.question()
        if question is None:
            return ""
        more = len(self._desk.questions()) - 1
        others = f" (Tab: {more} more)" if more else ""
        how = " [yes/no]" if question.kind == YES_NO else ":"
        picture = f" (look at {question.picture})" if question.picture is not None else ""
        return printable(f"{question.slot}: {question.text}{picture}{others}{how}")

    def take(self, characters: str) -> None:
        """Take what was typed, or scanned."""
        for character in characters:
            # What was typed before there was a question is no answer to it.
            question = self.question()
            if question is None:
                continue
            if character in "\r\n":
                self._answer(question)
            elif character == "\t":
                self._next(question)
            elif character in "\x7f\b":
                self.text = self.text[:-1]
            elif character == "\x15":
                self.text = ""
            elif character.isprintable():
                self.text = (self.text + character)[-_LONGEST_LINE:]

    def _answer(self, question: OpenQuestion) -> None:
        text, self.text = self.text, ""
        try:
            self._desk.answer(question.id, text, "terminal")
        except NoSuchQuestion:
            self._show(None)
        except DeskProblem as problem:
            self.problem = str(problem)

    def _next(self, question: OpenQuestion) -> None:
        there = self._desk.questions()
        if question in there and len(there) > 1:
            self._show(there[(there.index(question) + 1) % len(there)])


class Keyboard:
    """Reads the terminal on a thread of its own. Each key is taken at once, signals stay.

    ``changed`` is called when there is another prompt or another character.
    """

    def __init__(self, desk: Desk, changed: Callable[[], None]) -> None:
        self.typing = Typing(desk)
        self._changed = changed
        self._fd = sys.stdin.fileno()
        self._decoder = codecs.getincrementaldecoder("utf-8")("replace")
        self._stop_read, self._stop_write = os.pipe()
        self._before: list[Any] = termios.tcgetattr(self._fd)
        self._make_raw()
        self._thread = threading.Thread(target=self._serve, name="keyboard", daemon=True)
        self._thread.start()

    def _make_raw(self) -> None:
        """No echo and no lines; Ctrl-C stays a signal."""
        mode: list[Any] = termios.tcgetattr(self._fd)
        mode[3] &= ~(termios.ICANON | termios.ECHO)
        termios.tcsetattr(self._fd, termios.TCSADRAIN, mode)

    def _serve(self) -> None:
        prompt = ""
        while True:
            ready = select.select([self._fd, self._stop_read], [], [], _LOOK_SECONDS)[0]
            if self._stop_read in ready:
                return
            if self._fd in ready:
                try:
                    data = os.read(self._fd, 4096)
                except OSError:
                    data = b""
                if not data:
                    return
                self.typing.take(self._decoder.decode(data))
            now = f"{self.typing.prompt()} {self.typing.text}{self.typing.problem}"
            if now != prompt:
                prompt = now
                self._changed()

    def close(self) -> None:
        """Give the terminal back as it was."""
        os.write(self._stop_write, b"x")
        self._thread.join()
        for fd in (self._stop_read, self._stop_write):
            os.close(fd)
        try:
            termios.tcsetattr(self._fd, termios.TCSADRAIN, self._before)
        except termios.error:
            pass  # no terminal any more
