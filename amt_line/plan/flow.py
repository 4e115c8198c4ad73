"""Which variables a step can rely on: what is saved on every way that leads to it."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Iterator, Mapping, Sequence

from amt_line.plan import handset
from amt_line.plan.filled import holes
from amt_line.plan.inputs import Input
from amt_line.plan.model import Kind, Section, Step, When
from amt_line.plan.problems import Problem
from amt_line.plan.references import names, only_reference
from amt_station.requests.model import Field

VERDICT = "verdict"
INT, NUMBER, TEXT = "int", "number", "text"


@dataclass(frozen=True)
class _Saved:
    step: Step
    kind: str


def input_kinds(inputs: Sequence[Input]) -> dict[str, str]:
    """The kind of every input's value."""
    return {item.name: INT if item.format == "int" else TEXT for item in inputs}


def flow_problems(steps: Sequence[Step], inputs: Sequence[Input]) -> Iterator[Problem]:
    """References to what is not there, or not on every way, or of the wrong kind."""
    given = input_kinds(inputs)
    saved: dict[str, list[_Saved]] = {}
    for step in steps:
        yield from _check_step(step, given, saved)
        yield from _remember(step, given, saved)


def _remember(step: Step, given: Mapping[str, str], saved: dict[str, list[_Saved]]
              ) -> Iterator[Problem]:
    measures = {limit.name: limit.measure for limit in step.limits}
    for value, name in step.save.items():
        measure = measures.get(value) or handset.measure(step.kind.value, step.subject, value)
        kind = TEXT
        if measure is not None and measure.numeric:
            kind = INT if measure.scale == 1 else NUMBER
        if name in given or name == VERDICT:
            yield Problem(step.place, f"save.{value}", f"{name!r} is no free name")
        elif any(other.kind != kind for other in saved.get(name, ())):
            yield Problem(step.place, f"save.{value}", f"{name!r} is of another kind elsewhere")
        else:
            saved.setdefault(name, []).append(_Saved(step, kind))


def _check_step(step: Step, given: Mapping[str, str], saved: Mapping[str, list[_Saved]]
                ) -> Iterator[Problem]:
    for key, value in holes(step):
        for name in names(value):
            reason = _missing(name, step, given, saved)
            if reason:
                yield Problem(step.place, key, reason)
                break
        else:
            reason = _unfit(step, key, value, given, saved)
            if reason:
                yield Problem(step.place, key, reason)


def _missing(name: str, step: Step, given: Mapping[str, str],
             saved: Mapping[str, list[_Saved]]) -> str:
    if name in given:
        return ""
    if name == VERDICT:
        return "" if step.section is Section.ALWAYS else "'verdict' is known in [[always]] only"
    if name not in saved:
        return f"no input has the name {name!r}, and no step before saves it"
    if any(_is_certain(item.step, step) for item in saved[name]):
        return ""
    return (f"{name!r} is not saved on every way there: {saved[name][-1].step.place} may be "
            'skipped or not pass (stop = true there, or when = "passed" here, makes it certain)')


def _is_certain(saver: Step, user: Step) -> bool:
    """Whether the saver has passed whenever the user is carried out."""
    if user.when is When.PASSED and saver.when is not When.FAILED:
        return True
    if saver.when is not None or (user.section is Section.ALWAYS) != (
            saver.section is Section.ALWAYS):
        return False
    return saver.stop or saver.section is Section.SETUP


def _unfit(step: Step, key: str, value: object, given: Mapping[str, str],
           saved: Mapping[str, list[_Saved]]) -> str:
    alone = only_reference(value)
    mixed = bool(names(value)) and not alone
    if not alone and not mixed:
        return ""
    kind = TEXT if mixed or alone == VERDICT else given.get(alone) or saved[alone][0].kind
    if step.kind is Kind.COMMAND and key.startswith("with."):
        field = handset.command(step.subject).fields()[key.removeprefix("with.")]
        return _unfit_field(field, kind, alone)
    if key.startswith("limits."):
        limit = next(limit for limit in step.limits if key.startswith(f"limits.{limit.name}."))
        if key.endswith(".matches"):
            return "" if kind == TEXT else "a number is no pattern"
        if kind == TEXT and limit.measure.numeric and not mixed and not limit.measure.choices:
            return f"{alone!r} is a text, {limit.name} a number"
        if kind != TEXT and not limit.measure.numeric:
            return f"{alone!r} is a number, {limit.name} a text"
    return ""


def _unfit_field(field: Field, kind: str, alone: str) -> str:
    if alone == VERDICT and field.numeric:
        lacking = {"pass", "fail"} - set(field.choices)
        return f"{field.name} knows no {' and no '.join(sorted(lacking))}" if lacking else ""
    if kind == TEXT and field.numeric and not field.choices:
        return f"a text, and {field.name} is a whole number"
    if kind == NUMBER and field.numeric:
        return f"{alone!r} may not be whole, and {field.name} is"
    if kind != TEXT and not field.numeric:
        return f"{alone!r} is a number, and {field.name} is a text"
    return ""
