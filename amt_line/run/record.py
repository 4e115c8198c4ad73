"""The record of a run: one document that is its truth, from begin to end."""

from __future__ import annotations

import json
import uuid
from dataclasses import dataclass
from typing import Any, Mapping

from amt_line.plan.model import Plan
from amt_line.plan.references import Scalar
from amt_line.run.clock import utc_now

VERSION = 1

Document = dict[str, Any]


@dataclass(frozen=True)
class Where:
    """Where a run takes place, and who is in charge."""

    station: str
    operator: str
    port: str
    tool: str
    slot: str = ""


class Record:
    """A run's document, kept so that writing it again after each step costs little."""

    def __init__(self, plan: Plan, inputs: Mapping[str, Scalar], dut: str, where: Where) -> None:
        self.run = str(uuid.uuid4())
        self._head: Document = {
            "record": VERSION, "run": self.run, "state": "running", "verdict": None,
            "exit_status": None, "reason": "", "advice": "", "dut": dut,
            "station": where.station, "operator": where.operator, "slot": where.slot,
            "port": where.port, "channel": plan.channel.value,
            "tool": {"name": "amt-station", "version": where.tool},
            "plan": {"title": plan.title, "version": plan.version, "path": plan.path,
                     "sha256": plan.sha256, "steps": len(plan.every_step)},
            "inputs": dict(inputs), "began": utc_now(), "ended": None, "seconds": None,
            "begin": [], "remarks": []}
        self.steps: list[Document] = []
        self._texts: list[str] = []

    @property
    def head(self) -> Document:
        """All but the steps."""
        return self._head

    def add_step(self, step: Document) -> None:
        """A step has ended."""
        self.steps.append(step)
        self._texts.append(json.dumps(step))

    def replace_step(self, before: Document, step: Document) -> None:
        """A step that had ended was carried out once more."""
        place = self.steps.index(before)
        self.steps[place] = step
        self._texts[place] = json.dumps(step)

    def end(self, **values: Any) -> None:
        """Set what is known at the end only."""
        self._head.update(values)

    def document(self) -> Document:
        """The whole document."""
        return {**self._head, "steps": self.steps}

    def text(self) -> str:
        """The document as it is written: a line a step."""
        head = ",\n".join(f"{json.dumps(name)}: {json.dumps(value)}"
                          for name, value in self._head.items())
        steps = ",\n".join(self._texts)
        return "{\n" + head + ",\n\"steps\": [\n" + steps + "\n]\n}\n"
