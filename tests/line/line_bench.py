"""What several tests of a line need: plans from text, a handset's script, and a run."""

from __future__ import annotations

import threading
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Callable, Mapping, Sequence

from station_peer import Peer, ok

from amt_line.plan.filled import check_with_inputs
from amt_line.plan.model import Plan
from amt_line.plan.problems import PlanProblem
from amt_line.plan.reader import load_plan
from amt_line.run.operator import GivenAnswers, Nobody
from amt_line.run.record import Record, Where
from amt_line.run.record_file import Keeper, NoRecord, RecordFile, file_name
from amt_line.run.runner import Runner, Setting
from amt_line.run.stop import Abort
from amt_station.port import FdPort, Port
from amt_station.requests.model import Channel
from amt_station.wire import ACKNOWLEDGEMENT, Atom, Frame
from amt_station.wire.decoder import Item, Text

OK = b"\r\nOK\r\n"
ADC = '[[step]]\nname = "adc"\ncommand = "battery adc"\nlimits.adc = { min = 10, max = 20 }\n'


def write_plan(folder: Path, text: str) -> Path:
    """A plan file of this text."""
    path = folder / "line.toml"
    path.write_text(text, encoding="utf-8")
    return path


def load(folder: Path, text: str, channel: Channel = Channel.PC) -> Plan:
    """The plan of this text."""
    return load_plan(write_plan(folder, text), channel)


def problems(folder: Path, text: str, channel: Channel = Channel.PC) -> list[str]:
    """What is wrong with the plan of this text, without the file's name."""
    try:
        load(folder, text, channel)
    except PlanProblem as problem:
        return [line.removeprefix(f"{problem.path}: ") for line in problem.lines()]
    return []


def adc(value: int) -> bytes:
    """The answer with an ADC value."""
    return ok(225, Atom.integer(151, value))


@dataclass
class Script:
    """A handset: texts and requests that it answers in a way of their own, OK to all others."""

    texts: dict[str, Sequence[bytes]] = field(default_factory=dict)
    requests: dict[int, list[Sequence[bytes]]] = field(default_factory=dict)
    asked: list[int | str] = field(default_factory=list)

    def __call__(self, item: Item) -> Sequence[bytes]:
        if isinstance(item, Text):
            text = item.text.strip()
            self.asked.append(text)
            return self.texts.get(text, [OK])
        if not isinstance(item, Frame):
            return []
        number = item.packet.command
        self.asked.append(number)
        answers = self.requests.get(number)
        if answers:
            return answers.pop(0) if len(answers) > 1 else answers[0]
        return [ACKNOWLEDGEMENT, ok(number + 1)]


@dataclass
class Bench:
    """One run with a scripted handset."""

    plan: Plan
    peer: Peer
    inputs: Mapping[str, Any] = field(default_factory=dict)
    answers: Mapping[str, str] = field(default_factory=dict)
    records: Path | None = None
    on_event: Callable[[dict[str, Any]], None] = lambda event: None
    open_port: Callable[[], Port] | None = None
    operator: Any = None
    events: list[dict[str, Any]] = field(default_factory=list)
    file: RecordFile | None = None
    runner: Runner | None = None

    def run(self) -> dict[str, Any]:
        """Carry the plan out; the record."""
        dut = check_with_inputs(self.plan, self.inputs)
        setting = Setting(self.open_port or (lambda: FdPort(self.peer.slave)),
                          Where("bench 1", "somebody", self.peer.path, "1.0"), timeout=5.0,
                          operator=GivenAnswers(self.answers, self.operator or Nobody()),
                          listeners=[self.events.append, self.on_event], keep=self._keep)
        self.runner = Runner(self.plan, self.inputs, dut, setting)
        try:
            document = self.runner.run()
        finally:
            if self.file is not None:
                self.file.close()
        if self.runner.defect is not None:
            raise self.runner.defect
        return document

    def abort(self, how: Abort) -> None:
        """End the run from outside."""
        assert self.runner is not None
        self.runner.abort(how)

    def _keep(self, record: Record) -> Keeper:
        if self.records is None:
            return NoRecord()
        name = file_name(record.head["dut"], record.head["began"], record.run)
        self.file = RecordFile(self.records, name, record.text())
        return self.file


def verdicts(document: Mapping[str, Any]) -> list[str]:
    """The verdicts of a record's steps."""
    return [step["verdict"] for step in document["steps"]]


def in_thread(work: Callable[[], object]) -> threading.Thread:
    """Do something beside the test."""
    thread = threading.Thread(target=work, daemon=True)
    thread.start()
    return thread


def toml_text(value: object) -> str:
    """A value as TOML has it; characters by their numbers."""
    if isinstance(value, dict):
        return "{" + ", ".join(f"{toml_text(str(key))} = {toml_text(part)}"
                               for key, part in value.items()) + "}"
    if isinstance(value, list):
        return "[" + ", ".join(map(toml_text, value)) + "]"
    if isinstance(value, bool):
        return str(value).lower()
    if isinstance(value, str):
        return '"' + "".join(f"\\U{ord(character):08x}" for character in value) + '"'
    return str(value)
