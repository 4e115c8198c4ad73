"""Reads one step of a plan, whose shape the schema has already checked."""

from __future__ import annotations

import re
from pathlib import Path, PurePosixPath
from typing import Any, Iterator, Mapping

from amt_line.plan import handset
from amt_line.plan.filled import Unfit, filled, holes, references, unfit_limit
from amt_line.plan.limits import Limit
from amt_line.plan.model import Kind, Section, Step, When
from amt_line.plan.problems import Problem, shown
from amt_line.plan.references import names
from amt_station.errors import StationError, UsageProblem
from amt_station.requests.model import Channel

_PICTURES = (".png", ".jpg", ".jpeg", ".gif", ".webp")
_FINAL_RESULT = re.compile(r"OK|ERROR|\+CM[ES](?: ERROR(?::.*\S)?)?")
_LONGEST_NAME = 200


def read_step(table: Mapping[str, Any], section: Section, number: int, channel: Channel,
              folder: Path, problems: list[Problem]) -> Step:
    """The step; what is wrong with it is added to ``problems``."""
    step = _read(table, section, number, channel, folder)
    problems += (Problem(step.place, key, reason)
                 for key, reason in _step_problems(step, table))
    return step


def _read(table: Mapping[str, Any], section: Section, number: int, channel: Channel,
          folder: Path) -> Step:
    kind = next(kind for kind in Kind if kind.value in table)
    subject, retry, expect = table[kind.value], table.get("retry", {}), table.get("expect")
    save = table.get("save", {})
    seconds = float(subject) if kind is Kind.WAIT else 0.0
    return Step(
        section, number, table.get("name", _short(kind, subject)), kind,
        " ".join(subject.split()) if kind is Kind.COMMAND else str(subject),
        channel,
        values=table.get("with", {}), atoms=tuple(table.get("atoms", ())),
        expect=expect if isinstance(expect, str) else "OK",
        wanted=expect if isinstance(expect, bool) else True,
        picture=folder / table["picture"] if "picture" in table else None, seconds=seconds,
        limits=tuple(_limits(kind, str(subject), table.get("limits", {}))),
        save={handset.ENTERED.name: save} if isinstance(save, str) else save,
        timeout=table.get("timeout"), stop=table.get("stop", False),
        when=When(table["when"]) if "when" in table else None,
        retries=int(retry.get("times", 0)), retry_delay=float(retry.get("delay", 0.0)),
        force=table.get("force", False), reconnect=table.get("reconnect"))


def _short(kind: Kind, subject: Any) -> str:
    text = f"wait {subject:g} s" if kind is Kind.WAIT else str(subject)
    return text[:_LONGEST_NAME]


def _limits(kind: Kind, subject: str, tables: Mapping[str, Any]) -> Iterator[Limit]:
    for name, given in tables.items():
        try:
            measure = handset.measure(kind.value, subject, name)
        except UsageProblem:
            measure = None
        # One that the answer cannot have is a problem of the step; see _limit_problems.
        yield Limit(measure or handset.unknown(name),
                    given if isinstance(given, Mapping) else {"equals": given})


_Problems = Iterator[tuple[str, str]]


def _step_problems(step: Step, table: Mapping[str, Any]) -> _Problems:
    yield from _form_problems(step, table)
    try:
        _check_subject(step)
    except StationError as error:
        yield step.kind.value, str(error)
        return
    yield from _limit_problems(step, table)
    try:
        for key, value in holes(step):
            last = key
            names(value)
    except ValueError as error:
        yield last, str(error)
        return
    yield from _value_problems(step)


def _form_problems(step: Step, table: Mapping[str, Any]) -> _Problems:
    if not step.name.isprintable():
        yield "name", f"{shown(step.name)} holds a character that cannot be shown"
    if isinstance(table.get("save"), str) and step.kind is not Kind.ENTER:
        yield "save", "needs a table: { VALUE = \"variable\" }"
    if isinstance(table.get("retry", {}).get("times"), float):
        yield "retry.times", f"{table['retry']['times']} is no whole number"
    if "expect" in table:
        yield from _expect_problems(step.kind, table["expect"])
    if step.picture is not None:
        yield from _picture_problems(step.picture, table["picture"])


def _expect_problems(kind: Kind, expect: Any) -> _Problems:
    if kind is Kind.ASK:
        if not isinstance(expect, bool):
            yield "expect", f"{shown(expect)} is neither true nor false"
    elif not isinstance(expect, str):
        yield "expect", f"{shown(expect)} is no text"
    elif not _FINAL_RESULT.fullmatch(expect):
        yield "expect", (f"{shown(expect)} is no final result: OK, ERROR, +CME ERROR or "
                         "+CMS ERROR, those with ': ' and the error where only one will do")


def _picture_problems(path: Path, given: str) -> _Problems:
    if PurePosixPath(given).is_absolute() or ".." in PurePosixPath(given).parts:
        yield "picture", "the file must stand beside the plan"
    elif path.suffix.lower() not in _PICTURES:
        yield "picture", f"{shown(given)} is none of {', '.join(_PICTURES)}"
    else:
        try:
            there = path.is_file()
        except (OSError, ValueError):
            there = False
        if not there:
            yield "picture", f"no file {shown(given)} beside the plan"


def _check_subject(step: Step) -> None:
    if step.kind is Kind.COMMAND:
        handset.command(step.subject).check_channel(step.channel)
    elif step.kind is Kind.REQUEST:
        handset.request_id(step.subject)
    elif step.kind is Kind.AT and step.channel is not Channel.PC:
        raise UsageProblem("AT text is understood on the PC line only")


def _limit_problems(step: Step, table: Mapping[str, Any]) -> _Problems:
    for key in ("limits", "save"):
        given = table.get(key, {})
        for name in given if isinstance(given, Mapping) else ():
            if handset.measure(step.kind.value, step.subject, name, step.channel) is None:
                yield f"{key}.{name}", "the answer has no such value"
    for limit in step.limits:
        if "equals" in limit.given and "one_of" in limit.given:
            yield f"limits.{limit.name}", "equals and one_of contradict each other"
        if set(limit.given) == {"marginal"}:
            yield f"limits.{limit.name}", "marginal alone limits nothing"


def _value_problems(step: Step) -> _Problems:
    """Check all that no variable has a say in."""
    if not references(step):
        try:
            filled(step, {})
        except Unfit as error:
            yield error.key, error.reason
        return
    for limit in step.limits:
        try:
            limit.check_constants()
        except ValueError as error:
            unfit = unfit_limit(limit.name, error)
            yield unfit.key, unfit.reason
    yield from _constant_problems(step)


def _constant_problems(step: Step) -> _Problems:
    """Check the constants beside the references."""
    for name, value in step.values.items():
        if not names(value):
            try:
                handset.command(step.subject).check(name, value, step.force)
            except UsageProblem as error:
                yield f"with.{name}", handset.problem_of(error, name)
    for text in step.atoms:
        if not names(text):
            try:
                handset.check_atom(step.subject, text, step.force)
            except UsageProblem as error:
                yield "atoms", handset.in_words_of_a_plan(str(error))
