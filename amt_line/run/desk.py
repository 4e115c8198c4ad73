"""The desk of a line: questions of all its slots lie open here until somebody answers them.

The terminal and the page both answer through it; the first answer counts. A slot's thread asks and
waits, any other thread may look and answer.
"""

from __future__ import annotations

import threading
import uuid
from dataclasses import dataclass
from pathlib import Path
from typing import Callable

from amt_line.run.operator import Answer, Question, is_answer
from amt_station.errors import StationError, UsageProblem

YES_NO, TEXT, INPUT = "yes-no", "text", "input"
LONGEST_ANSWER = 4096
_LOOK_SECONDS = 0.05

Fits = Callable[[str], object]


class DeskProblem(UsageProblem):
    """What was wanted of the desk cannot be done."""


class NoSuchQuestion(DeskProblem):
    """It was never asked, it has been answered, or its run has ended."""


class NotAnAnswer(DeskProblem):
    """The text does not answer the question; the question stays open."""


class NoSuchSlot(DeskProblem):
    """The line has no such slot."""


@dataclass(frozen=True)
class OpenQuestion:
    """A question that waits for its answer; ``run`` is empty for an input before a run."""

    id: str
    slot: str
    run: str
    kind: str
    name: str
    text: str
    picture: Path | None = None


class _Asked:
    """A question at the desk, and its answer once there is one."""

    def __init__(self, question: OpenQuestion, fits: Fits) -> None:
        self.question = question
        self.fits = fits
        self.answer: Answer | None = None


class Desk:
    """All that the slots of a line ask."""

    def __init__(self) -> None:
        self._changed = threading.Condition()
        self._asked: dict[str, _Asked] = {}
        self._stops: dict[str, Callable[[], None]] = {}

    # the slots' side

    def add_slot(self, slot: str, stop: Callable[[], None]) -> None:
        """A slot of the line; ``stop`` ends what it does for its handset."""
        self._stops[slot] = stop

    def open(self, question: OpenQuestion, fits: Fits) -> None:
        """Lay a question on the desk; ``fits`` raises ``StationError`` for a text that is none."""
        with self._changed:
            self._asked[question.id] = _Asked(question, fits)

    def wait(self, question_id: str, check: Callable[[], None]) -> Answer:
        """The answer to a question that lies open, which is taken away then, however this ends.

        ``check`` is called all the time; what it raises ends the waiting.
        """
        try:
            while True:
                check()
                with self._changed:
                    answer = self._asked[question_id].answer
                    if answer is not None:
                        return answer
                    self._changed.wait(_LOOK_SECONDS)
        finally:
            self.withdraw(question_id)

    def withdraw(self, question_id: str) -> None:
        """Nobody wants the answer any more."""
        with self._changed:
            self._asked.pop(question_id, None)

    def ask(self, slot: str, run: str, name: str, text: str, kind: str,
            picture: Path | None, check: Callable[[], None]) -> Answer:
        """Ask and wait; whoever tells the views of a question opens it first and waits then."""
        question = OpenQuestion(new_id(), slot, run, kind, name, text, picture)
        self.open(question, fits_kind(kind))
        return self.wait(question.id, check)

    # the views' side

    def questions(self) -> list[OpenQuestion]:
        """What waits for an answer, the oldest first."""
        with self._changed:
            return [asked.question for asked in self._asked.values() if asked.answer is None]

    def answer(self, question_id: str, text: str, by: str) -> None:
        """Answer a question; raises ``NoSuchQuestion`` or ``NotAnAnswer``."""
        text = text.strip()
        with self._changed:
            asked = self._open_one(question_id)
        if len(text) > LONGEST_ANSWER:
            raise NotAnAnswer(f"{len(text)} characters, at most {LONGEST_ANSWER}")
        try:
            # Outside of the lock: a pattern may take its time.
            asked.fits(text)
        except StationError as error:
            raise NotAnAnswer(str(error)) from error
        with self._changed:
            self._open_one(question_id).answer = Answer(text, by)
            self._changed.notify_all()

    def stop(self, slot: str) -> None:
        """End the slot's run, which is ABORTED, or its asking for inputs."""
        stop = self._stops.get(slot)
        if stop is None:
            raise NoSuchSlot("the line has no such slot")
        stop()

    def picture(self, question_id: str) -> Path:
        """The file of the picture that belongs to an open question."""
        with self._changed:
            picture = self._open_one(question_id).question.picture
        if picture is None:
            raise NoSuchQuestion("the question has no picture")
        return picture

    def _open_one(self, question_id: str) -> _Asked:
        asked = self._asked.get(question_id)
        if asked is None or asked.answer is not None:
            raise NoSuchQuestion("there is no such question any more")
        return asked


def new_id() -> str:
    """An id for a question."""
    return uuid.uuid4().hex


def fits_kind(kind: str) -> Fits:
    """What a text has to be to answer a question of this kind."""
    question = Question("", "", kind == YES_NO)

    def fits(text: str) -> None:
        if not is_answer(question, text):
            raise NotAnAnswer("yes or no is needed" if question.yes_or_no
                              else "a text that can be shown is needed")
    return fits


class DeskOperator:
    """Puts the questions of a slot's runs on the desk."""

    def __init__(self, desk: Desk, slot: str) -> None:
        self._desk = desk
        self._slot = slot
        # The run that asks; set by whoever starts it.
        self.run = ""

    def expect(self, question: Question) -> None:
        """As in ``Operator``: it lies on the desk before a view hears of it."""
        kind = YES_NO if question.yes_or_no else TEXT
        self._desk.open(OpenQuestion(question.id, self._slot, self.run, kind, question.step,
                                     question.text, question.picture), fits_kind(kind))

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """As in ``Operator``."""
        return self._desk.wait(question.id, check)

    def can_act(self) -> bool:
        """As in ``Operator``."""
        return True
