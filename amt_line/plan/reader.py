"""Reads a plan file, and checks it whole: what is returned can be carried out."""

from __future__ import annotations

import hashlib
import math
import tomllib
from pathlib import Path
from typing import Any, Iterator, Mapping

from amt_line.plan.flow import VERDICT, flow_problems, input_kinds
from amt_line.plan.inputs import Input
from amt_line.plan.model import Plan, Section, Step
from amt_line.plan.pattern import BadPattern, compiled
from amt_line.plan.problems import PlanProblem, Problem, shown
from amt_line.plan.references import names
from amt_line.plan.step_reader import read_step
from amt_line.plan.validate import schema_problems, where
from amt_station.errors import StationError
from amt_station.requests.model import Channel

_LARGEST_FILE = 1024 * 1024


def load_plan(path: Path, channel: Channel) -> Plan:
    """Read a plan file; ``channel`` is for a plan that names none.

    Whatever is wrong raises ``PlanProblem``, which holds every problem found.
    """
    try:
        return _load(path, channel)
    except (RecursionError, MemoryError) as error:
        raise PlanProblem(str(path), [Problem("", "", "nested too deep")]) from error


def _load(path: Path, channel: Channel) -> Plan:
    data = _read(path)
    try:
        content = tomllib.loads(data.decode("utf-8-sig"))
    except ValueError as error:
        raise PlanProblem(str(path), [Problem("", "", str(error))]) from error
    odd = {(problem.place, problem.key): problem for problem in _odd_numbers(content, (), content)}
    problems = [*odd.values(), *(problem for problem in schema_problems(content)
                                 if (problem.place, problem.key) not in odd)]
    if problems:
        raise PlanProblem(str(path), problems)
    plan, problems = _build(content, path, hashlib.sha256(data).hexdigest(), channel)
    if problems:
        raise PlanProblem(str(path), problems)
    return plan


def _read(path: Path) -> bytes:
    try:
        if not path.is_file():
            reason = "no file" if path.exists() else "no such file"
            raise PlanProblem(str(path), [Problem("", "", reason)])
        with path.open("rb") as file:
            data = file.read(_LARGEST_FILE + 1)
    except (OSError, ValueError) as error:
        reason = getattr(error, "strerror", None) or str(error)
        raise PlanProblem(str(path), [Problem("", "", reason)]) from error
    if len(data) > _LARGEST_FILE:
        raise PlanProblem(str(path), [Problem("", "", f"larger than {_LARGEST_FILE} bytes")])
    return data


def _odd_numbers(value: Any, path: tuple[Any, ...], content: Mapping[str, Any]
                 ) -> Iterator[Problem]:
    """Numbers that are none; a schema does not see them."""
    if isinstance(value, float) and not math.isfinite(value):
        yield Problem(*where(path, content), f"{value} is no number")
    elif isinstance(value, dict):
        for name, part in value.items():
            yield from _odd_numbers(part, (*path, name), content)
    elif isinstance(value, list):
        for number, part in enumerate(value):
            yield from _odd_numbers(part, (*path, number), content)


def _build(content: Mapping[str, Any], path: Path, sha256: str, channel: Channel
           ) -> tuple[Plan, list[Problem]]:
    channel = Channel(content["channel"]) if "channel" in content else channel
    problems: list[Problem] = []
    inputs = tuple(_inputs(content.get("input", {}), problems))
    lists: dict[Section, tuple[Step, ...]] = {
        section: tuple(read_step(step, section, number, channel, path.parent, problems)
                       for number, step in enumerate(content.get(section.value, ()), start=1))
        for section in Section}
    plan = Plan(content.get("title", path.stem), content.get("version", ""), str(path), sha256,
                channel, content.get("deadline"), content.get("dut", ""), inputs,
                lists[Section.SETUP], lists[Section.STEP], lists[Section.ALWAYS])
    problems += _text_problems(content)
    problems += _dut_problems(plan)
    problems += _name_problems(plan)
    if not problems:
        problems += flow_problems(plan.every_step, inputs)
    return plan, problems


def _inputs(tables: Mapping[str, Mapping[str, Any]], problems: list[Problem]) -> Iterator[Input]:
    for name, table in tables.items():
        key = f"input.{name}"
        if name == VERDICT:
            problems.append(Problem("", key, "the run itself gives 'verdict'"))
        item = Input(name, table.get("prompt", name), table.get("format", "text"),
                     table.get("pattern", ""), table.get("default"))
        try:
            compiled(item.pattern)
            if item.default is not None:
                item.read(item.default)
        except BadPattern as error:
            problems.append(Problem("", f"{key}.pattern",
                                    f"{shown(item.pattern)} is no regular expression: {error}"))
        except StationError as error:
            reason = str(error).removeprefix(f"input {name}: ")
            problems.append(Problem("", f"{key}.default", reason))
        yield item


def _text_problems(content: Mapping[str, Any]) -> Iterator[Problem]:
    for key in ("title", "version", "dut"):
        text = content.get(key, "")
        if not text.isprintable():
            yield Problem("", key, f"{shown(text)} holds a character that cannot be shown")


def _dut_problems(plan: Plan) -> Iterator[Problem]:
    try:
        for name in names(plan.dut):
            if name not in input_kinds(plan.inputs):
                yield Problem("", "dut", f"no input has the name {name!r}")
    except ValueError as error:
        yield Problem("", "dut", str(error))


def _name_problems(plan: Plan) -> Iterator[Problem]:
    """An answer is given by the step's name, so there is one such step only."""
    asked: set[str] = set()
    for step in plan.every_step:
        if step.kind.value in ("ask", "enter"):
            if step.name in asked:
                yield Problem(step.place, "name", "another operator step has it too")
            asked.add(step.name)
