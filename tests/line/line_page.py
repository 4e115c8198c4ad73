"""What the tests of the page need: a page with its desk, and a line that is only told."""

from __future__ import annotations

import threading
import time
from pathlib import Path
from typing import Any, Callable

from amt_line.run.desk import Desk, OpenQuestion, fits_kind, new_id
from amt_line.run.events import Stream
from amt_line.run.operator import Answer
from amt_line.view.web.address import Address
from amt_line.view.web.live import Pace
from amt_line.view.web.server import Page

PLAN = {"title": "End of line", "version": "7", "path": "end.toml", "sha256": "0" * 64, "steps": 4}
STEPS = ("battery ADC", "version", "screen", "label")
PATIENCE = 120.0


def until(condition: Callable[[], Any], what: str) -> Any:
    """What the condition gives once it gives something."""
    end = time.monotonic() + PATIENCE
    while not (found := condition()):
        assert time.monotonic() < end, f"in vain: {what}"
        time.sleep(0.01)
    return found


class ToldLine:
    """A page whose line's events are sent by the test."""

    def __init__(self, port: int = 0, **values: Any) -> None:
        self.desk = Desk()
        self.stream = Stream()
        given: dict[str, Any] = {"pace": Pace(gather=0.02, beat=0.2), **values}
        self.page = Page(Address(port=port), desk=self.desk, **given)
        self.stream.listen(self.page)
        self.stopped: list[str] = []
        self._runs = 0
        self._asked: list[Asked] = []

    def close(self) -> None:
        """End the page, and whatever still waits for an answer."""
        for asked in self._asked:
            asked.give_up()
        self.page.close()

    # what happens on the line

    def slot(self, name: str, state: str = "waiting", text: str = "") -> None:
        """A slot's state."""
        self.desk.add_slot(name, lambda: self.stopped.append(name))
        self.stream.send("slot-state", slot=name, state=state, text=text, port=f"/dev/tty{name}")

    def began(self, name: str, dut: str = "KEL0000000042", steps: tuple[str, ...] = STEPS) -> str:
        """A run begins; its id."""
        self._runs += 1
        run = f"00000000-0000-4000-8000-{self._runs:012d}"
        self.desk.add_slot(name, lambda: self.stopped.append(name))
        self.stream.send("slot-state", slot=name, state="running", text="", port=f"/dev/tty{name}")
        self.stream.send(
            "run-began", slot=name, run=run, dut=dut, plan=PLAN, station="bench", operator="me",
            port=f"/dev/tty{name}", channel="pc", inputs={},
            steps=[{"number": number, "section": "step", "name": step, "kind": "command"}
                   for number, step in enumerate(steps, start=1)])
        return run

    def step(self, name: str, run: str, number: int, title: str = "battery ADC") -> None:
        """A step begins."""
        self.stream.send("step-began", slot=name, run=run, number=number, name=title,
                         kind="command", section="step")

    def step_ended(self, name: str, run: str, number: int, verdict: str = "pass",
                   title: str = "battery ADC", **values: Any) -> None:
        """A step has ended."""
        self.stream.send("step-ended", **{
            "slot": name, "run": run, "number": number, "name": title, "kind": "command",
            "section": "step", "verdict": verdict, "seconds": 0.2, "values": [], "attempts": 1,
            "reason": "", "advice": "", "remarks": [], "forced": [], "earlier": [], **values})

    def ended(self, name: str, run: str, verdict: str = "PASS", dut: str = "KEL0000000042",
              reason: str = "", advice: str = "") -> None:
        """The run has ended."""
        self.stream.send("run-ended", slot=name, run=run, verdict=verdict, dut=dut,
                         exit_status=0, reason=reason, advice=advice, seconds=12.4, counts={},
                         plan=PLAN)
        self.stream.send("slot-state", slot=name, state="verdict", text="",
                         port=f"/dev/tty{name}")

    def ask(self, name: str, text: str, kind: str = "yes-no", run: str = "",
            picture: Path | None = None, fits: Callable[[str], object] | None = None) -> Asked:
        """A question is asked, and waits for its answer in a thread."""
        asked = Asked(self, OpenQuestion(new_id(), name, run, kind, "question", text, picture),
                      fits or fits_kind(kind))
        self._asked.append(asked)
        return asked


class Asked:
    """A question that waits."""

    def __init__(self, line: ToldLine, question: OpenQuestion,
                 fits: Callable[[str], object]) -> None:
        self.question = question
        self.answer: Answer | None = None
        self._line = line
        self._given_up = threading.Event()
        line.desk.open(question, fits)
        line.stream.send("question", slot=question.slot, run=question.run, id=question.id,
                         kind=question.kind, name=question.name, text=question.text,
                         picture=question.picture.name if question.picture else "")
        self._thread = threading.Thread(target=self._wait, daemon=True)
        self._thread.start()

    def _wait(self) -> None:
        try:
            self.answer = self._line.desk.wait(self.question.id, self._check)
        except TimeoutError:
            pass
        given = self.answer or Answer("", "")
        self._line.stream.send("answer", slot=self.question.slot, run=self.question.run,
                               id=self.question.id, text=given.text, by=given.by)

    def _check(self) -> None:
        if self._given_up.is_set():
            raise TimeoutError

    def text(self) -> str:
        """The answer, waited for."""
        self._thread.join(PATIENCE)
        assert self.answer is not None, "nobody has answered"
        return self.answer.text

    def by(self) -> str:
        """Who has answered."""
        assert self.answer is not None
        return self.answer.by

    def give_up(self) -> None:
        """The run has ended; nobody wants the answer any more."""
        self._given_up.set()
        self._thread.join(PATIENCE)
