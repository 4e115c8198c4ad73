"""A step with its references replaced: what is really sent, and by what it is judged."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Any, Iterator, Mapping

from amt_line.plan import handset
from amt_line.plan.limits import Bounds
from amt_line.plan.model import Kind, Plan, Step
from amt_line.plan.problems import PlanProblem, Problem
from amt_line.plan.references import Scalar, fill, names
from amt_station.errors import StationError, UsageProblem
from amt_station.requests.operations import Prepared


@dataclass(frozen=True)
class Filled:
    """A step without references."""

    step: Step
    text: str
    bounds: tuple[Bounds, ...] = ()
    prepared: Prepared | None = None


class Unfit(ValueError):
    """A value that does not fit its place, once the variables are known."""

    def __init__(self, key: str, reason: str) -> None:
        super().__init__(f"{key}: {reason}" if key else reason)
        self.key = key
        self.reason = reason


def holes(step: Step) -> Iterator[tuple[str, Any]]:
    """Every key of a step that may hold references, with its value."""
    yield step.kind.value, step.subject
    for name, value in step.values.items():
        yield f"with.{name}", value
    for text in step.atoms:
        yield "atoms", text
    for limit in step.limits:
        for key, value in limit.references():
            yield f"limits.{limit.name}.{key}", value


def references(step: Step) -> set[str]:
    """The variables that a step depends on."""
    return {name for _, value in holes(step) for name in names(value)}


def filled(step: Step, variables: Mapping[str, Scalar]) -> Filled:
    """The step for these variables; ``Unfit`` when a value is not what its place takes."""
    text = str(fill(step.subject, variables))
    values = {name: fill(value, variables) for name, value in step.values.items()}
    atoms = tuple(str(fill(text, variables)) for text in step.atoms)
    return Filled(step, text, tuple(_bounds(step, variables)),
                  _prepared(step, text, values, atoms) if step.kind.needs_handset else None)


def _bounds(step: Step, variables: Mapping[str, Scalar]) -> Iterator[Bounds]:
    for limit in step.limits:
        try:
            yield limit.resolve(variables)
        except ValueError as error:
            raise unfit_limit(limit.name, error) from error


def unfit_limit(name: str, error: ValueError) -> Unfit:
    """What is wrong with a limit; the error's text begins with the key where it is about one."""
    key, _, reason = str(error).partition(": ")
    if not reason or " " in key:
        return Unfit(f"limits.{name}", str(error))
    return Unfit(f"limits.{name}.{key}", reason)


def _prepared(step: Step, text: str, values: Mapping[str, Any], atoms: tuple[str, ...]
              ) -> Prepared:
    if step.kind is Kind.COMMAND:
        for name, value in values.items():
            try:
                handset.command(step.subject).check(name, value, step.force)
            except UsageProblem as error:
                raise Unfit(f"with.{name}", handset.problem_of(error, name)) from error
    try:
        return handset.prepared(step.kind.value, text, values, atoms, step.channel, step.force)
    except StationError as error:
        key = {Kind.COMMAND: "with", Kind.REQUEST: "atoms"}.get(step.kind, "at")
        raise Unfit(key, handset.in_words_of_a_plan(str(error))) from error


def check_with_inputs(plan: Plan, inputs: Mapping[str, Scalar]) -> str:
    """Check, before anything is sent, all that depends on the inputs alone; the run's DUT.

    Whatever does not fit raises ``PlanProblem``.
    """
    problems = []
    for step in plan.every_step:
        if references(step) <= set(inputs):
            try:
                filled(step, inputs)
            except Unfit as error:
                problems.append(Problem(step.place, error.key, error.reason))
    if problems:
        raise PlanProblem(plan.path, problems)
    return str(fill(plan.dut, inputs))
