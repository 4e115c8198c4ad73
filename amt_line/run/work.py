"""One attempt at one step: what is sent or asked, and how the values are judged."""

from __future__ import annotations

import time
from dataclasses import dataclass, field
from typing import Any, Callable, Mapping

from amt_line.plan import handset
from amt_line.plan.filled import Filled
from amt_line.plan.limits import Bounds, plain_number
from amt_line.plan.measure import Measure
from amt_line.plan.model import Kind, Step
from amt_line.plan.references import Scalar
from amt_line.run.operator import Answer, Operator, Question, is_answer
from amt_station.errors import Refused, StationError
from amt_station.link import Link
from amt_station.perform import perform
from amt_station.requests.operations import NamedValue
from amt_station.text import plain, printable

Document = dict[str, Any]
_EXIT_OWN_ERROR = 7
_MODEM_ERRORS = ("+CME", "+CMS", "+CME ERROR", "+CMS ERROR")


class StationTrouble(StationError):
    """The station itself cannot carry out the step; the handset has no part in it."""

    exit_status = _EXIT_OWN_ERROR
    kind = "station"


@dataclass(frozen=True)
class Value:
    """A value that a step brought."""

    measure: Measure
    raw: Scalar

    @property
    def scalar(self) -> Scalar:
        """The value as later steps and records have it: in its unit, without line ends."""
        exact = self.measure.exact(self.raw)
        return plain(exact) if isinstance(exact, str) else plain_number(exact)


@dataclass
class Outcome:
    """What came of an attempt."""

    values: list[Value] = field(default_factory=list)
    documents: list[Document] = field(default_factory=list)
    violations: list[str] = field(default_factory=list)


@dataclass(frozen=True)
class Tools:
    """What a step may use."""

    link: Callable[[], Link]
    operator: Operator
    check: Callable[[], None]
    sleep: Callable[[float], None]
    asked: Callable[[Question], None]
    answered: Callable[[Question, Answer | None], None]


def attempt(filled: Filled, tools: Tools) -> Outcome:
    """Carry the step out once and judge its values."""
    values = _WORK[filled.step.kind](filled, tools)
    outcome = Outcome(values)
    bounds = {bound.measure.name: bound for bound in filled.bounds}
    for value in values:
        outcome.documents.append(_judged(value, bounds.get(value.measure.name), outcome))
    found = {value.measure.name for value in values}
    for name in (*bounds, *filled.step.save):
        if name not in found:
            outcome.violations.append(f"the answer holds no {name}")
    return outcome


def _judged(value: Value, bounds: Bounds | None, outcome: Outcome) -> Document:
    measure, scalar = value.measure, value.scalar
    document: Document = {"name": measure.name, "value": scalar}
    if measure.unit:
        document["unit"] = measure.unit
    if measure.scale != 1:
        document["raw"] = value.raw
    word = measure.word(measure.exact(value.raw))
    if word:
        document["word"] = word
    if bounds is not None:
        judgement = bounds.judge(value.raw)
        document["limits"] = bounds.document()
        document["verdict"] = "fail" if judgement.reason else "pass"
        if judgement.marginal:
            document["marginal"] = True
        if judgement.reason:
            document["reason"] = judgement.reason
            outcome.violations.append(judgement.reason)
    return document


def _send(filled: Filled, tools: Tools) -> list[Value]:
    assert filled.prepared is not None
    step = filled.step
    if step.kind is Kind.AT and step.expect != "OK":
        return _expect_other(filled.prepared.text, step, tools)
    values = perform(tools.link(), filled.prepared, step.timeout).values
    return [Value(_measure(step, value), value.value) for value in values]


def _measure(step: Step, value: NamedValue) -> Measure:
    known = handset.measure(step.kind.value, step.subject, value.name)
    if isinstance(value.value, str):
        return Measure(value.name, numeric=False)
    return known or handset.unknown(value.name)


def _expect_other(text: str, step: Step, tools: Tools) -> list[Value]:
    """An AT text that is to be answered with something else than OK."""
    reply = tools.link().at(text, step.timeout)
    wanted = step.expect
    if not (reply.final == wanted
            or wanted in _MODEM_ERRORS and reply.final.startswith(wanted)):
        raise Refused(f"{printable(reply.sent)} was answered with {printable(reply.final)} "
                      f"instead of {wanted}")
    return [Value(handset.REPLY, "\n".join(reply.lines))]


def _ask(filled: Filled, tools: Tools) -> list[Value]:
    step = filled.step
    answer = _answer(Question(step.name, filled.text, True, step.picture), step, tools)
    if answer.yes is not step.wanted:
        raise Refused(f"the operator said {'yes' if answer.yes else 'no'}")
    return []


def _enter(filled: Filled, tools: Tools) -> list[Value]:
    step = filled.step
    answer = _answer(Question(step.name, filled.text, False), step, tools)
    return [Value(handset.ENTERED, answer.text)]


def _answer(question: Question, step: Step, tools: Tools) -> Answer:
    end = time.monotonic() + step.timeout if step.timeout is not None else None

    def check() -> None:
        tools.check()
        if end is not None and time.monotonic() > end:
            raise StationTrouble(f"the operator did not answer within {step.timeout:g} s")

    tools.operator.expect(question)
    tools.asked(question)
    answer = None
    try:
        answer = _heard(question, tools.operator.answer(question, check))
    finally:
        # The views are to take the question away, also when nobody has answered it.
        tools.answered(question, answer)
    return answer


def _heard(question: Question, answer: Answer | None) -> Answer:
    if answer is None:
        raise StationTrouble("there is nobody to ask: no terminal, and no --answer")
    if is_answer(question, answer.text):
        return answer
    if question.yes_or_no:
        raise StationTrouble(f"the answer {plain(answer.text)!r} is neither yes nor no")
    raise StationTrouble("the answer is not a text that can be shown")


def _wait(filled: Filled, tools: Tools) -> list[Value]:
    tools.sleep(filled.step.seconds)
    return []


_WORK: Mapping[Kind, Callable[[Filled, Tools], list[Value]]] = {
    Kind.COMMAND: _send, Kind.REQUEST: _send, Kind.AT: _send, Kind.ASK: _ask,
    Kind.ENTER: _enter, Kind.WAIT: _wait}
