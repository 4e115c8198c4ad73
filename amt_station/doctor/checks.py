"""The table of checks, and the engine that carries them out."""

from __future__ import annotations

import importlib
from dataclasses import dataclass
from typing import Callable, Iterator, Sequence

from amt_station.doctor.computer import NotKnown
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, unchecked
from amt_station.errors import Refused, StationError

_Function = Callable[[Examination], Sequence[Finding]]


@dataclass(frozen=True)
class Check:
    """A name, and where the function is that gives the findings; it is imported when wanted.

    ``needs`` says what has to be there before it can be made.
    """

    name: str
    target: str
    needs: str = ""


# From the ground up: a later one may fail because an earlier one has.
CHECKS: tuple[Check, ...] = (
    Check("port", "amt_station.doctor.port:presence"),
    Check("permission", "amt_station.doctor.port:permission", needs="port"),
    Check("holder", "amt_station.doctor.port:holder", needs="permission"),
    Check("line settings", "amt_station.doctor.line_settings:settings", needs="holder"),
    Check("probing services", "amt_station.doctor.services:probing"),
    Check("answer", "amt_station.doctor.handset:answer", needs="holder"),
    Check("mode", "amt_station.doctor.handset:mode", needs="answer"),
    Check("request buffer", "amt_station.doctor.handset:request_buffer", needs="mode"),
    Check("clock", "amt_station.doctor.machine:clock"),
    Check("disk", "amt_station.doctor.machine:disk"),
    # The line's software stands on this package, so it is only named.
    Check("store", "amt_line.store.health:store"),
)


def examine(examination: Examination,
            checks: Sequence[Check] = CHECKS) -> Iterator[tuple[str, Finding]]:
    """Carry out the checks in their order: the name of each with its findings, at least one."""
    for check in checks:
        if check.needs in examination.failed:
            examination.failed.add(check.name)
            yield check.name, unchecked(f"has to wait until this is right: {check.needs}")
            continue
        findings = _made(check, examination)
        if any(finding.blocks for finding in findings):
            examination.failed.add(check.name)
        for finding in findings:
            yield check.name, finding


def _made(check: Check, examination: Examination) -> Sequence[Finding]:
    module, _, name = check.target.partition(":")
    try:
        function: _Function = getattr(importlib.import_module(module), name)
        findings = function(examination)
    except NotKnown as problem:
        return [unchecked(str(problem))]
    except StationError as problem:
        advice = problem.advice if isinstance(problem, Refused) else ""
        return [error(str(problem), advice, problem.exit_status)]
    except OSError as problem:
        where = f"{problem.filename}: " if problem.filename else ""
        return [unchecked(f"{where}{problem.strerror or problem}")]
    except ImportError as problem:
        return [unchecked(f"a part of the software is missing: {problem}")]
    except Exception as problem:
        return [_defect(problem)]
    return findings or [unchecked("the check came to nothing")]


def _defect(problem: Exception) -> Finding:
    from amt_station.state import write_defect

    where = write_defect(problem)
    return unchecked(f"a defect of the station itself ({type(problem).__name__})",
                     f"report it: its traceback is in {where}" if where else "")
