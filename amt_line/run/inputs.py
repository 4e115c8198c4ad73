"""Where the inputs of a slot's runs come from: its rows, its own values, or whoever is asked."""

from __future__ import annotations

from collections import deque
from typing import Callable, Mapping, Sequence

from amt_line.plan.filled import check_with_inputs
from amt_line.plan.inputs import Input, known_values
from amt_line.plan.model import Plan
from amt_line.plan.references import Scalar
from amt_line.run.desk import INPUT, Desk, OpenQuestion, new_id
from amt_line.run.events import Stream
from amt_line.run.operator import Answer
from amt_station.errors import UsageProblem

# The column, or the value, that names a handset whose plan does not.
DUT = "dut"

Values = dict[str, Scalar]


class NoInputs(UsageProblem):
    """No row is left, and there is nobody to ask."""


class Supply:
    """The inputs of one slot, run by run."""

    def __init__(self, slot: str, plan: Plan, said: Mapping[str, str],
                 rows: Sequence[Mapping[str, str]], desk: Desk | None) -> None:
        """``said`` holds for every run of the slot; ``desk`` is None when nobody can be asked.

        Whatever is wrong with a value raises ``UsageProblem`` or ``PlanProblem`` now.
        """
        self._slot = slot
        self._plan = plan
        self._said = said
        self._rows = deque(rows)
        self._had_rows = bool(rows)
        self._desk = desk
        for number, row in enumerate(rows or [{}], start=1):
            self._check(row, f"slot {slot}, row {number}" if rows else f"slot {slot}")

    def _check(self, row: Mapping[str, str], where: str) -> None:
        try:
            values = known_values(self._plan.inputs, self._said, row)
        except UsageProblem as error:
            raise UsageProblem(f"{where}: {error}") from error
        missing = self._missing(values)
        if not missing:
            check_with_inputs(self._plan, values)
        elif self._desk is None:
            names = ", ".join(item.name for item in missing)
            raise UsageProblem(f"{where}: no value for {names}: give --inputs; there is no "
                               "terminal and no page to ask at")

    def _missing(self, values: Mapping[str, Scalar]) -> list[Input]:
        return [item for item in self._plan.inputs if item.name not in values]

    def needs_asking(self) -> bool:
        """Whether somebody has to be asked before the next run; ``NoInputs`` when nobody can."""
        missing = self._missing(self._known())
        if self._had_rows and not self._rows and not (missing and self._desk):
            raise NoInputs("no row of inputs is left")
        return bool(missing)

    def _known(self) -> Values:
        return known_values(self._plan.inputs, self._said, self._rows[0] if self._rows else {})

    def gather(self, stream: Stream, check: Callable[[], None]) -> tuple[Values, str]:
        """The values for the next run, and under what its record is filed.

        Asks for what is missing; ``check`` is called all the time meanwhile. The row is used up.
        Values that do not fit the plan together raise ``PlanProblem``.
        """
        values = self._known()
        for item in self._missing(values):
            values[item.name] = self._ask(item, stream, check)
        dut = check_with_inputs(self._plan, values)
        row = self._rows.popleft() if self._rows else {}
        return values, dut or row.get(DUT, "")

    def _ask(self, item: Input, stream: Stream, check: Callable[[], None]) -> Scalar:
        if self._desk is None:
            raise NoInputs(f"no value for {item.name}, and nobody to ask")
        question = OpenQuestion(new_id(), self._slot, "", INPUT, item.name, item.prompt)
        self._desk.open(question, item.read)
        answer: Answer | None = None
        stream.send("question", run="", id=question.id, kind=INPUT, name=item.name,
                    text=item.prompt, picture="")
        try:
            answer = self._desk.wait(question.id, check)
        finally:
            given = answer or Answer("", "")
            stream.send("answer", run="", id=question.id, name=item.name, text=given.text,
                        by=given.by)
        return item.read(answer.text)
