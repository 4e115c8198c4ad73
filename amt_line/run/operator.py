"""Whoever answers a run's questions: a terminal, answers given beforehand, or another driver."""

from __future__ import annotations

import uuid
from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable, Mapping, Protocol

_YES, _NO = ("yes", "y"), ("no", "n")


@dataclass(frozen=True)
class Question:
    """What is asked: ``text`` answered with yes or no, or with a text."""

    step: str
    text: str
    yes_or_no: bool
    picture: Path | None = None
    id: str = field(default_factory=lambda: uuid.uuid4().hex)


@dataclass(frozen=True)
class Answer:
    """What was answered, and by whom."""

    text: str
    by: str

    @property
    def yes(self) -> bool:
        """Whether it is a yes."""
        return self.text.lower() in _YES


def is_answer(question: Question, text: str) -> bool:
    """Whether a text answers the question."""
    if question.yes_or_no:
        return text.lower() in (*_YES, *_NO)
    return bool(text) and text.isprintable()


class Operator(Protocol):
    """Answers questions. ``check`` is to be called all the time: it raises when the run ends."""

    def expect(self, question: Question) -> None:
        """A question is about to be told to the views, and asked then."""

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """The answer, or None when there is nobody to ask."""

    def can_act(self) -> bool:
        """Whether somebody is there who can unplug a cable."""


class Nobody:
    """There is nobody to ask."""

    def expect(self, question: Question) -> None:
        """As in ``Operator``."""

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """As in ``Operator``."""
        return None

    def can_act(self) -> bool:
        """As in ``Operator``."""
        return False


class GivenAnswers:
    """Answers by the step's name, given beforehand; what is not among them is asked."""

    def __init__(self, given: Mapping[str, str], others: Operator) -> None:
        self._given = given
        self._others = others

    def expect(self, question: Question) -> None:
        """As in ``Operator``."""
        if question.step not in self._given:
            self._others.expect(question)

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """As in ``Operator``."""
        check()
        if question.step in self._given:
            return Answer(self._given[question.step], "given")
        return self._others.answer(question, check)

    def can_act(self) -> bool:
        """As in ``Operator``."""
        return self._others.can_act()
