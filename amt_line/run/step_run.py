"""One step of a run: its attempts, what a failed one leaves behind, and its part of the record."""

from __future__ import annotations

import time
from contextlib import suppress
from typing import Any, Mapping, Protocol

from amt_line.plan.filled import Filled, Unfit, filled
from amt_line.plan.model import Kind, Step
from amt_line.plan.references import Scalar
from amt_line.run.advice import advice_for
from amt_line.run.clock import utc_now
from amt_line.run.connection import Connection
from amt_line.run.events import Stream
from amt_line.run.exchanges import late_remarks
from amt_line.run.operator import Answer, Operator, Question
from amt_line.run.stop import Aborted, Ended, Stop
from amt_line.run.tally import EXIT_FAIL, EXIT_OWN_ERROR, EXIT_PASS, Verdict
from amt_line.run.work import Outcome, StationTrouble, Tools, attempt
from amt_station.errors import Held, NoPort, Refused, StationError
from amt_station.replug import UNPLUG_NOW

Document = dict[str, Any]
EXIT_NO_ANSWER = 5
# How long somebody has to unplug the cable and plug it in again.
REPLUG_SECONDS = 60.0


class Owner(Protocol):
    """What a step tells its run."""

    def note_defect(self, error: Exception) -> None:
        """An exception that nobody thought of."""

    def exchanges(self) -> list[Document]:
        """What went over the port since the last call."""


class StepRun:
    """Carries one step out. ``saved`` and ``obstacle`` hold afterwards."""

    def __init__(self, step: Step, number: int, operator: Operator, connection: Connection,
                 stop: Stop, stream: Stream, owner: Owner) -> None:
        self.saved: dict[str, Scalar] = {}
        self.obstacle = ""
        self._step = step
        self._connection = connection
        self._operator = operator
        self._stop = stop
        self._stream = stream
        self._owner = owner
        self._start = time.monotonic()
        self._document: Document = {
            "number": number, "section": step.section.value, "name": step.name,
            "kind": step.kind.value, "verdict": Verdict.SKIPPED.value, "attempts": 0,
            "began": utc_now(), "seconds": 0.0, "reason": "", "advice": "",
            "exit_status": EXIT_PASS, "forced": [], "values": [], "earlier": [],
            "exchanges": [], "remarks": []}
        if step.kind is not Kind.WAIT:
            self._document["subject"] = step.subject

    def skipped(self, reason: str) -> Document:
        """The step is not carried out."""
        self._document["reason"] = reason
        return self._document

    def carry_out(self, variables: Mapping[str, Scalar]) -> Document:
        """Carry the step out, as often as it may be tried."""
        self._tell("step-began", name=self._step.name, kind=self._step.kind.value,
                   section=self._step.section.value)
        for number in range(1, self._step.retries + 2):
            if number > 1:
                self._again(number)
            self._document["attempts"] = number
            self._try(variables)
            self._keep_exchanges(number)
            if self._document["verdict"] == Verdict.PASS.value or self.obstacle:
                break
        self._document["seconds"] = round(time.monotonic() - self._start, 6)
        return self._document

    def _tell(self, event: str, **values: Any) -> None:
        self._stream.send(event, number=self._document["number"], **values)

    def _again(self, number: int) -> None:
        """Wait before the next attempt, which tells it when the run ends meanwhile."""
        with suppress(Ended):
            self._stop.sleep(self._step.retry_delay)
        earlier = {"attempt": number - 1, "verdict": self._document["verdict"],
                   "reason": self._document["reason"]}
        self._document["earlier"].append(earlier)
        self._tell("step-again", attempt=number, reason=earlier["reason"])

    def _try(self, variables: Mapping[str, Scalar]) -> None:
        """One attempt, whatever comes of it."""
        try:
            self._stop.check()
            whole = self._fill(variables)
            self._document["forced"] = list(whole.prepared.forced) if whole.prepared else []
            outcome = attempt(whole, self._tools())
            self._take(outcome)
            self._come_back()
        except Aborted as error:
            self._set(Verdict.ERROR, str(error), self._stop_status())
            self.obstacle = str(error)
        except Ended as error:
            self._set(Verdict.ERROR, str(error), EXIT_NO_ANSWER)
            self.obstacle = str(error)
        except StationError as error:
            self._refused_or_lost(error)
        except Exception as error:  # pylint: disable=broad-except
            self._owner.note_defect(error)
            self._set(Verdict.ERROR, f"the station's own error: {error!r}", EXIT_OWN_ERROR)
            self.obstacle = str(self._document["reason"])

    def _come_back(self) -> None:
        """Behind a step that makes the port go away, wait for it once."""
        if self._step.reconnect is None:
            return
        try:
            self._connection.reconnect(self._step.reconnect)
        except NoPort as error:
            self._set(Verdict.ERROR, str(error), error.exit_status)
            self.obstacle = str(error)

    def _stop_status(self) -> int:
        how = self._stop.requested
        return how.exit_status if how else EXIT_OWN_ERROR

    def _fill(self, variables: Mapping[str, Scalar]) -> Filled:
        try:
            return filled(self._step, variables)
        except Unfit as error:
            raise StationTrouble(str(error)) from error

    def _tools(self) -> Tools:
        return Tools(self._connection.link, self._operator, self._stop.check, self._stop.sleep,
                     self._asked, self._answered)

    def _asked(self, question: Question) -> None:
        self._tell("question", name=question.step, text=question.text,
                   yes_or_no=question.yes_or_no,
                   picture=str(question.picture) if question.picture else "")

    def _answered(self, question: Question, answer: Answer) -> None:
        self._tell("answer", name=question.step, answer=answer.text, by=answer.by)
        self._document["answer"] = {"text": answer.text, "by": answer.by}

    def _take(self, outcome: Outcome) -> None:
        self._document["values"] = outcome.documents
        if outcome.violations:
            self._set(Verdict.FAIL, "; ".join(outcome.violations), EXIT_FAIL)
            return
        found = {value.measure.name: value.scalar for value in outcome.values}
        self.saved = {variable: found[name] for name, variable in self._step.save.items()}
        self._set(Verdict.PASS, "", EXIT_PASS)

    def _set(self, verdict: Verdict, reason: str, status: int, advice: str = "") -> None:
        if verdict is not Verdict.PASS:
            advice = advice or advice_for(status, self._step.kind is Kind.ASK)
            self.saved = {}
        self._document.update(verdict=verdict.value, reason=reason, exit_status=status,
                              advice=advice)

    def _refused_or_lost(self, error: StationError) -> None:
        """A no of the handset is a failure; everything else an error."""
        status = error.exit_status
        if status in (EXIT_PASS, 2):
            # Nothing was refused before anything was sent: here it is the station's own trouble.
            status = EXIT_OWN_ERROR
        verdict = Verdict.FAIL if status == EXIT_FAIL else Verdict.ERROR
        self._set(verdict, str(error), status, getattr(error, "advice", ""))
        try:
            self._mend(error)
        except Ended as end:
            self.obstacle = str(end)
        except StationError as failure:
            self.obstacle = str(failure)

    def _mend(self, error: StationError) -> None:
        """Leave the handset usable for what follows, or say why it is not."""
        if isinstance(error, NoPort):
            self._connection.lose(str(error))
            if self._step.reconnect is None:
                raise error
            self._connection.reconnect(self._step.reconnect)
        elif isinstance(error, Refused) and error.held is not Held.NOTHING:
            self._clear(error)

    def _clear(self, refusal: Refused) -> None:
        """A refusal that the handset holds would spoil every later step: flush it."""
        try:
            self._connection.link().recover()
        except StationError as failure:
            advice = getattr(failure, "advice", "") or refusal.advice
            if not self._operator.can_act():
                raise StationTrouble(advice or str(failure)) from failure
            self._tell("notice", text=UNPLUG_NOW)
            self._connection.reconnect(REPLUG_SECONDS, must_go=True)

    def _keep_exchanges(self, number: int) -> None:
        documents = self._owner.exchanges()
        self._document["exchanges"] += ({"attempt": number, **document} for document in documents)
        self._document["remarks"] += late_remarks(documents)
