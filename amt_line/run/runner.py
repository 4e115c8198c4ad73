"""Carries out a plan with one handset.

The runner knows neither views nor files: it tells a stream of events what happens and hands the
record's text to whoever keeps it. Nothing here belongs to the whole process, so several runners
may work side by side in threads.
"""

from __future__ import annotations

import logging
import time
import traceback
from dataclasses import dataclass, field
from typing import Any, Callable, Iterable, Mapping

from amt_line.plan.filled import references
from amt_line.plan.flow import VERDICT
from amt_line.plan.model import Plan, Section, Step, When
from amt_line.plan.references import Scalar
from amt_line.run.advice import advice_for
from amt_line.run.clock import utc_now
from amt_line.run.connection import Connection, OpenPort
from amt_line.run.events import Listener, Stream
from amt_line.run.exchanges import exchange_document, late_remarks
from amt_line.run.operator import Nobody, Operator
from amt_line.run.record import Document, Record, Where
from amt_line.run.record_file import Keeper, NoRecord, RecordLost
from amt_line.run.step_run import REPLUG_SECONDS, StepRun
from amt_line.run.stop import Abort, Aborted, Ended, Stop
from amt_line.run.taking_back import not_taken_back, told_again
from amt_line.run.tally import EXIT_FAIL, RunVerdict, Tally, Verdict
from amt_station.errors import Held, Refused, StationError
from amt_station.replug import UNPLUG_NOW

_LOG = logging.getLogger("amt_line")
_PASSED, _FAILED = "pass", "fail"


@dataclass(frozen=True)
class Setting:
    """What a run needs beside its plan."""

    open_port: OpenPort
    where: Where
    timeout: float | None = None
    operator: Operator = field(default_factory=Nobody)
    listeners: Iterable[Listener] = ()
    keep: Callable[[Record], Keeper] = lambda record: NoRecord()


class Runner:
    """One run of one plan. ``run`` once; ``abort`` may be called from anywhere meanwhile."""

    def __init__(self, plan: Plan, inputs: Mapping[str, Scalar], dut: str,
                 setting: Setting) -> None:
        """The values of the inputs have been checked with ``check_with_inputs``."""
        self.plan = plan
        self.record = Record(plan, inputs, dut, setting.where)
        self.record_problem: RecordLost | None = None
        self.defect: Exception | None = None
        self._setting = setting
        self._stop = Stop(plan.deadline)
        self._tally = Tally()
        self._stream = Stream(setting.listeners, run=self.record.run, slot=setting.where.slot)
        self._connection = Connection(setting.open_port, plan.channel, setting.timeout,
                                      self._stop)
        self._variables: dict[str, Scalar] = dict(inputs)
        self._blocked = self._blocked_always = ""
        self._told_pass: list[tuple[Step, Document]] = []
        self._is_settled = False
        self._keeper: Keeper = NoRecord()
        self._start = time.monotonic()

    def abort(self, how: Abort) -> None:
        """End the run: the step at hand first, at the second call the always steps too."""
        self._stop.request(how)

    @property
    def view_failure(self) -> Exception | None:
        """What went wrong with a listener to the events."""
        return self._stream.failure

    @property
    def verdict(self) -> RunVerdict:
        """The verdict so far."""
        return self._tally.verdict()

    @property
    def exit_status(self) -> int:
        """The status that belongs to the verdict."""
        return self._tally.exit_status()

    def run(self) -> Document:
        """Carry the plan out and return the record. What goes wrong stands in it."""
        self._keeper = self._setting.keep(self.record)
        self._start = time.monotonic()
        self._tell_begin()
        try:
            self._go_through(self._first_steps)
            self._go_through(self._last_steps)
            self._go_through(self._settle)
        finally:
            self._connection.lose("the run has ended")
            self._end()
        return self.record.document()

    def _go_through(self, steps: Callable[[], None]) -> None:
        """Nothing that goes wrong in the first steps keeps the last ones from being done."""
        try:
            steps()
        except Exception as error:  # pylint: disable=broad-except
            self.note_defect(error)
            self._block(Verdict.ERROR, 7, f"the station's own error: {error!r}", "")

    def _first_steps(self) -> None:
        self._begin()
        for number, step in enumerate((*self.plan.setup, *self.plan.steps), start=1):
            self._do(step, number)
        self._note_abort()

    def _last_steps(self) -> None:
        if self.plan.always:
            self._make_safe()
        self._stop.begin_last_steps(hurry=self._tally.abort is not None or self._time_is_over())
        before = len(self.plan.setup) + len(self.plan.steps)
        for number, step in enumerate(self.plan.always, start=before + 1):
            self._do(step, number)
        self._note_abort()

    def _settle(self) -> None:
        """What the handset was told is what the run came to, and its record is safe."""
        self._close_record()
        self._note_abort()
        if self.verdict is not RunVerdict.PASS:
            self._take_back()
        self._is_settled = self.verdict is RunVerdict.PASS

    def _take_back(self) -> None:
        """A pass that was told too early is told again, as a fail."""
        for step, before in self._told_pass:
            self._stop.begin_last_steps(hurry=True)
            again = self._step_run(step, before["number"]).carry_out(self._known(step))
            self._tally.count_again(Verdict(before["verdict"]), Verdict(again["verdict"]))
            document = told_again(before, again)
            if again["verdict"] != Verdict.PASS.value:
                document["remarks"].append(not_taken_back(step.place))
                self._tally.advice += f"; {document['remarks'][-1]}"
            self.record.replace_step(before, document)
            self._stream.send("step-ended", **_event(document))

    def _tell_begin(self) -> None:
        head = self.record.head
        self._stream.send(
            "run-began", dut=head["dut"], plan=head["plan"], station=head["station"],
            operator=head["operator"], port=head["port"], channel=head["channel"],
            inputs=head["inputs"],
            steps=[{"number": number, "section": step.section.value, "name": step.name,
                    "kind": step.kind.value}
                   for number, step in enumerate(self.plan.every_step, start=1)])

    def _begin(self) -> None:
        """Open the port and find the link's place: nothing that is left over passes a step."""
        try:
            self._open()
        except Ended as error:
            self._block(Verdict.ERROR, 5, str(error), "")
        except StationError as error:
            refused = error.exit_status == EXIT_FAIL
            self._block(Verdict.FAIL if refused else Verdict.ERROR, error.exit_status, str(error),
                        getattr(error, "advice", ""))
        except Exception as error:  # pylint: disable=broad-except
            self.note_defect(error)
            self._block(Verdict.ERROR, 7, f"the station's own error: {error!r}", "")
        self.record.head["begin"] = self.exchanges()
        self.record.head["remarks"] = late_remarks(self.record.head["begin"])

    def _open(self) -> None:
        try:
            self._connection.open()
        except Refused as refusal:
            if refusal.held is Held.NOTHING or not self._setting.operator.can_act():
                raise
            self._stream.send("notice", number=1, text=UNPLUG_NOW)
            self._connection.reconnect(REPLUG_SECONDS, must_go=True)

    def _block(self, verdict: Verdict, status: int, reason: str, advice: str) -> None:
        """What follows is pointless."""
        self._blocked = self._blocked or reason
        self._tally.not_passed(verdict, status, reason, advice or advice_for(status, False))

    def note_defect(self, error: Exception) -> None:
        """An exception that nobody thought of: the run ends in order, and it is told later."""
        self.defect = self.defect or error
        _LOG.error("a defect of the station: %s", "".join(traceback.format_exception(error)))

    def exchanges(self) -> list[Document]:
        """What went over the port since the last call, for the record."""
        return [exchange_document(transcript)
                for transcript in self._connection.take_transcripts()]

    def _note_abort(self) -> None:
        how = self._stop.requested
        if how is not None and self._tally.abort is None:
            self._tally.abort = how
            self._block(Verdict.ERROR, how.exit_status, how.reason, "")

    def _time_is_over(self) -> bool:
        try:
            self._stop.check()
        except Aborted:
            return False
        except Ended:
            return True
        return False

    def _do(self, step: Step, number: int) -> None:
        self._note_abort()
        if step.section is Section.ALWAYS:
            self._stop.hurry()
        work = self._step_run(step, number)
        why_not = self._why_not(step)
        if why_not:
            document = work.skipped(why_not)
        else:
            known = self._known(step)
            document = work.carry_out(known)
            if known.get(VERDICT) == _PASSED and VERDICT in references(step):
                self._told_pass.append((step, document))
        self._finish(step, work, document)

    def _step_run(self, step: Step, number: int) -> StepRun:
        return StepRun(step, number, self._setting.operator, self._connection, self._stop,
                       self._stream, self)

    def _why_not(self, step: Step) -> str:
        if step.section is Section.ALWAYS:
            if self._stop.at_once:
                return "ended at once"
            if self._blocked_always:
                return self._blocked_always
        elif self._blocked:
            return self._blocked
        if step.when is When.CONNECTED:
            return self._not_connected()
        if not self._tally.allows(step.when):
            return ("something has failed" if step.when is When.PASSED
                    else "nothing has failed")
        return ""

    def _not_connected(self) -> str:
        """Why a step that needs the handset is skipped; a run that has lost it is no pass."""
        try:
            if self._connection.connected():
                return ""
        except Ended:
            return "the run ends"
        reason = "the handset is not connected"
        if not self._tally.failed:
            self._tally.not_passed(Verdict.ERROR, 5, reason, advice_for(5, False))
        return reason

    def _known(self, step: Step) -> dict[str, Scalar]:
        """The variables that the step may refer to."""
        if step.section is not Section.ALWAYS:
            return self._variables
        passed = self.verdict is RunVerdict.PASS
        return {**self._variables, VERDICT: _PASSED if passed else _FAILED}

    def _finish(self, step: Step, work: StepRun, document: Document) -> None:
        verdict = Verdict(document["verdict"])
        self._tally.count(verdict, step.section)
        if verdict is Verdict.PASS:
            self._variables.update(work.saved)
        elif verdict is not Verdict.SKIPPED:
            self._note_abort()
            self._tally.not_passed(verdict, document["exit_status"],
                                   f"{step.name}: {document['reason']}", document["advice"])
            self._stop_behind(step, work)
        self.record.add_step(document)
        self._stream.send("step-ended", **_event(document))
        self._keep()

    def _stop_behind(self, step: Step, work: StepRun) -> None:
        reason = work.obstacle
        if not reason and (step.stop or step.section is Section.SETUP):
            reason = f"{step.place} did not pass"
        if step.section is Section.ALWAYS:
            self._blocked_always = self._blocked_always or (reason if step.stop else "")
        elif reason:
            self._blocked = self._blocked or reason

    def _keep(self) -> None:
        try:
            self._keeper.put(self.record.text())
        except RecordLost as error:
            self._lose_record(error)

    def _make_safe(self) -> None:
        """Before a verdict is stored in the handset, all that led to it is on the disk."""
        try:
            self._keeper.flush()
        except RecordLost as error:
            self._lose_record(error)

    def _lose_record(self, error: RecordLost) -> None:
        if self.record_problem is None:
            self.record_problem = error
            self._block(Verdict.ERROR, error.exit_status, str(error),
                        "make room or mend the directory; the record stands on standard error")

    def _end(self) -> None:
        if not self._is_settled:
            self._close_record()
        head = self.record.head
        self._stream.send("run-ended", verdict=head["verdict"], dut=head["dut"],
                          exit_status=head["exit_status"], reason=head["reason"],
                          advice=head["advice"], seconds=head["seconds"],
                          counts=dict(self._tally.counts), plan=head["plan"])

    def _close_record(self) -> None:
        self._write_end()
        if self.record_problem is None:
            self._keep()
            self._make_safe()
            if self.record_problem is not None:
                self._write_end()

    def _write_end(self) -> None:
        if not self._tally.reason and self.verdict is RunVerdict.ERROR:
            self._block(Verdict.ERROR, 7, "no step was carried out", "see to the plan")
        aborted = self.verdict is RunVerdict.ABORTED
        self.record.end(state="aborted" if aborted else "ended", verdict=self.verdict.value,
                        exit_status=self.exit_status, reason=self._tally.reason,
                        advice=self._tally.advice, ended=utc_now(),
                        seconds=round(time.monotonic() - self._start, 6))


def _event(document: Mapping[str, Any]) -> dict[str, Any]:
    """A step's document without what went over the port."""
    return {name: value for name, value in document.items() if name != "exchanges"}
