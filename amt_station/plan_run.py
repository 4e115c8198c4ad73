"""Carries out a test plan, step by step, and keeps the handset usable between the steps."""

from __future__ import annotations

import time
from dataclasses import dataclass, field
from enum import Enum
from typing import Iterator, Mapping

from amt_station.errors import EXIT_PASS, EXIT_REFUSED, Held, NoPort, Refused, StationError
from amt_station.link import Link
from amt_station.perform import perform
from amt_station.plan import Plan, Step, Value
from amt_station.requests.operations import prepare, read_answer


class Verdict(str, Enum):
    """How a step ended."""

    PASS = "pass"
    FAIL = "fail"
    ERROR = "error"
    SKIPPED = "skipped"


@dataclass(frozen=True)
class StepResult:
    """A step's verdict, its values, and why it did not pass."""

    name: str
    verdict: Verdict
    values: Mapping[str, Value] = field(default_factory=dict)
    reason: str = ""
    seconds: float = 0.0
    exit_status: int = EXIT_PASS


def run_plan(link: Link, plan: Plan) -> Iterator[StepResult]:
    """Carry out the steps; a failed one ends the plan only when it says so or nothing else helps.

    A refusal that the handset holds is flushed at once, because it would spoil every later step.
    """
    blocked = ""
    for step in plan.steps:
        if blocked:
            yield StepResult(step.name, Verdict.SKIPPED, reason=blocked)
            continue
        result, error = _run_step(link, step)
        blocked = _obstacle(link, error)
        if result.verdict is not Verdict.PASS and step.stop:
            blocked = blocked or f"step {step.name!r} did not pass"
        yield result


def exit_status(results: list[StepResult]) -> int:
    """0 when everything passed; that of a lost port; else 1."""
    if any(result.exit_status == NoPort.exit_status for result in results):
        return NoPort.exit_status
    return (EXIT_PASS if all(result.verdict is Verdict.PASS for result in results)
            else EXIT_REFUSED)


def _run_step(link: Link, step: Step) -> tuple[StepResult, StationError | None]:
    start = time.monotonic()
    try:
        values = _perform(link, step)
    except StationError as error:
        verdict = Verdict.FAIL if isinstance(error, Refused) else Verdict.ERROR
        return StepResult(step.name, verdict, {}, str(error), time.monotonic() - start,
                          error.exit_status), error
    violations = [text for limit in step.limits if (text := limit.violation(values))]
    return StepResult(step.name, Verdict.FAIL if violations else Verdict.PASS, values,
                      "; ".join(violations), time.monotonic() - start), None


def _perform(link: Link, step: Step) -> Mapping[str, Value]:
    if step.text:
        reply = link.at(step.text, step.timeout)
        if not reply.final.startswith(step.expect):
            raise Refused(f"{step.text} was answered with {reply.final}")
        return {"reply": "\n".join(reply.lines)}
    if step.packet is not None:
        exchange = link.request(step.packet, step.timeout)
    else:
        outcome = perform(link, prepare(step.path, step.values, link.channel), step.timeout)
        return {value.name: value.value for value in outcome.values}
    return {value.name: value.value
            for value in read_answer(exchange.request.command, exchange.answer)}


def _obstacle(link: Link, error: StationError | None) -> str:
    """What makes the rest of the plan pointless; empty when nothing does."""
    if isinstance(error, NoPort):
        return str(error)
    if not isinstance(error, Refused) or error.held is Held.NOTHING:
        return ""
    try:
        link.recover()
    except StationError as failure:
        advice = failure.advice if isinstance(failure, Refused) else ""
        return advice or str(failure)
    return ""
