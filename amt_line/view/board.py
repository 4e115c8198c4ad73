"""What stands on the board of a line: the state of every slot, made from the events alone.

``snapshot()`` is what a page gets before the events::

    {"slots": [{
         "slot": "A",
         "state": "waiting" | "asking" | "running" | "verdict" | "held" | "defect" | "ended",
         "text": "why it waits, who holds the port, what went wrong",
         "port": "/dev/ttyACM0",
         "dut": "KEL1", "plan": "End of line", "run": "uuid",   of the run that goes on, or ""
         "began": "UTC of that run's begin, or of the state's, or ''",
         "steps": 30,                  of the run, 0 without one
         "step": {"number": 3, "name": "adc", "kind": "command", "began": "UTC", "attempt": 1}
                 or null,              the step at hand
         "ended_steps": [{"number": 1, "name": "AT", "verdict": "pass", "seconds": 0.01}],
         "notice": "what the operator is to do now, or ''",
         "question": {"id", "run", "kind": "yes-no" | "text" | "input", "name", "text",
                      "picture": "file name or ''"} or null,
         "last": {"verdict": "PASS" | "FAIL" | "ERROR" | "ABORTED", "run", "dut", "plan", "reason",
                  "advice", "seconds", "ended": "UTC",
                  "step": "name of the first step that did not pass, or ''",
                  "value": {"name", "value", "unit", "limits": {...}, "reason"} or null}
                 or null,              of the last run that ended; stays until the next one ends
         "counts": {"PASS": 3, "FAIL": 1, "ERROR": 0, "ABORTED": 0}}],
     "counts": {"PASS": 7, "FAIL": 1, "ERROR": 0, "ABORTED": 0}}
"""

from __future__ import annotations

import copy
from typing import Any, Callable, Mapping

VERDICTS = ("PASS", "FAIL", "ERROR", "ABORTED")

Document = dict[str, Any]
Event = Mapping[str, Any]


def _no_counts() -> dict[str, int]:
    return dict.fromkeys(VERDICTS, 0)


class SlotBoard:
    """One slot's part of the board. ``document`` has the form that ``snapshot`` shows."""

    def __init__(self, slot: str) -> None:
        self.document: Document = {
            "slot": slot, "state": "waiting", "text": "", "port": "", "dut": "", "plan": "",
            "run": "", "began": "", "steps": 0, "step": None, "ended_steps": [], "notice": "",
            "question": None, "last": None, "counts": _no_counts()}
        # The first step that did not pass, and its value that did not.
        self._blamed: Document = {"step": "", "value": None}

    def take(self, event: Event) -> None:
        """Take the next event of this slot; one of an unknown kind changes nothing."""
        change = _CHANGES.get(str(event["event"]))
        if change is not None:
            change(self, event)

    def _slot_state(self, event: Event) -> None:
        state = event["state"]
        self.document.update(state=state, text=event["text"],
                             port=event.get("port") or self.document["port"])
        if state != "running":
            self._forget_run()
            self.document["began"] = event["time"]

    def _forget_run(self) -> None:
        self.document.update(dut="", plan="", run="", steps=0, step=None, ended_steps=[],
                             notice="", began="")

    def _run_began(self, event: Event) -> None:
        self._forget_run()
        self._blamed = {"step": "", "value": None}
        self.document.update(state="running", text="", dut=event["dut"], run=event.get("run", ""),
                             plan=event["plan"]["title"], began=event["time"],
                             steps=len(event["steps"]), port=event["port"])

    def _step_began(self, event: Event) -> None:
        self.document["notice"] = ""
        self.document["step"] = {"number": event["number"], "name": event["name"],
                                 "kind": event["kind"], "began": event["time"], "attempt": 1}

    def _step_again(self, event: Event) -> None:
        if self.document["step"] is not None:
            self.document["step"]["attempt"] = event["attempt"]

    def _step_ended(self, event: Event) -> None:
        self.document["ended_steps"].append(
            {name: event[name] for name in ("number", "name", "verdict", "seconds")})
        self.document.update(step=None, notice="")
        if event["verdict"] in ("fail", "error") and not self._blamed["step"]:
            failing = (value for value in event["values"] if value.get("verdict") == "fail")
            self._blamed = {"step": event["name"], "value": next(failing, None)}

    def _notice(self, event: Event) -> None:
        self.document["notice"] = event["text"]

    def _question(self, event: Event) -> None:
        self.document["question"] = {"run": "", **{
            name: event[name] for name in ("id", "run", "kind", "name", "text", "picture")
            if name in event}}

    def _answer(self, event: Event) -> None:
        question = self.document["question"]
        if question is not None and question["id"] == event["id"]:
            self.document["question"] = None

    def _run_ended(self, event: Event) -> None:
        value = self._blamed["value"]
        shown = None if value is None else {
            "name": value["name"], "value": value["value"], "unit": value.get("unit", ""),
            "limits": value.get("limits", {}), "reason": value.get("reason", "")}
        self.document["counts"][event["verdict"]] += 1
        self.document["last"] = {
            "verdict": event["verdict"], "run": event.get("run", ""), "dut": event["dut"],
            "plan": event["plan"]["title"], "reason": event["reason"], "advice": event["advice"],
            "seconds": event["seconds"], "ended": event["time"], "step": self._blamed["step"],
            "value": shown}
        self.document.update(step=None, question=None, notice="")


_CHANGES: Mapping[str, Callable[[SlotBoard, Event], None]] = {
    "slot-state": SlotBoard._slot_state, "run-began": SlotBoard._run_began,
    "step-began": SlotBoard._step_began, "step-again": SlotBoard._step_again,
    "step-ended": SlotBoard._step_ended, "notice": SlotBoard._notice,
    "question": SlotBoard._question, "answer": SlotBoard._answer,
    "run-ended": SlotBoard._run_ended}


class Board:
    """All slots of a line, in the order in which they were first heard of.

    Pure: nothing here knows the time, threads or files; whoever shares a board guards it.
    """

    def __init__(self) -> None:
        self._slots: dict[str, SlotBoard] = {}

    def take(self, event: Event) -> None:
        """Take the next event."""
        name = str(event.get("slot", ""))
        if name not in self._slots:
            self._slots[name] = SlotBoard(name)
        self._slots[name].take(event)

    @property
    def slots(self) -> dict[str, Document]:
        """Every slot's document by its name; not to be changed."""
        return {name: slot.document for name, slot in self._slots.items()}

    @property
    def counts(self) -> dict[str, int]:
        """The verdicts of all slots since the line was started."""
        return {verdict: sum(slot.document["counts"][verdict] for slot in self._slots.values())
                for verdict in VERDICTS}

    def snapshot(self) -> Document:
        """The whole board as a JSON document of its own."""
        return {"slots": copy.deepcopy(list(self.slots.values())), "counts": self.counts}
