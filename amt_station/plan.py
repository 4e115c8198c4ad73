"""Test plans: a TOML file of steps with limits, read and checked whole before anything is sent.

A step is a typed command (``command`` and ``with``), any request (``request`` and ``atoms``) or an
AT text (``at``, and ``expect`` for a final result other than OK). ``limits`` bound the values of
the answer by name; an AT reply has the one value ``reply``, its lines joined.
"""

from __future__ import annotations

import re
import tomllib
from dataclasses import dataclass
from pathlib import Path
from typing import Any, Mapping

from amt_station.errors import StationError, UsageProblem
from amt_station.requests.at_commands import known_refusal
from amt_station.requests.atom_text import parse_atom
from amt_station.requests.model import Channel
from amt_station.requests.operations import check_channel, operation_packet
from amt_station.requests.table import find_command, find_operation, requests_by_id
from amt_station.wire.packet import Packet

Value = int | str

_PLAN_KEYS = {"title", "step"}
_COMMON_KEYS = {"name", "limits", "timeout", "stop"}
_KIND_KEYS = {"command": {"command", "with"}, "request": {"request", "atoms"},
              "at": {"at", "expect"}}
_LIMIT_KEYS = {"min", "max", "equals", "matches"}


@dataclass(frozen=True)
class Limit:
    """Bounds of one value; None where there is no bound."""

    name: str
    low: int | float | None = None
    high: int | float | None = None
    equals: Value | None = None
    matches: str | None = None

    def violation(self, values: Mapping[str, Value]) -> str:
        """What is wrong with the value; empty when it is within its bounds."""
        if self.name not in values:
            return f"the answer has no {self.name}"
        value = values[self.name]
        if self.equals is not None and value != self.equals:
            return f"{self.name} is {value!r} instead of {self.equals!r}"
        if self.matches is not None and not re.search(self.matches, str(value)):
            return f"{self.name} {value!r} does not match {self.matches!r}"
        return self._out_of_range(value)

    def _out_of_range(self, value: Value) -> str:
        if self.low is None and self.high is None:
            return ""
        if not isinstance(value, int):
            return f"{self.name} {value!r} is no number"
        if self.low is not None and value < self.low:
            return f"{self.name} {value} is below {self.low}"
        if self.high is not None and value > self.high:
            return f"{self.name} {value} is above {self.high}"
        return ""


@dataclass(frozen=True)
class Step:
    """One thing to do: exactly one of ``path`` (a typed command), ``packet`` and ``text``."""

    name: str
    path: tuple[str, ...] = ()
    values: Mapping[str, Value] | None = None
    packet: Packet | None = None
    text: str = ""
    expect: str = "OK"
    limits: tuple[Limit, ...] = ()
    timeout: float | None = None
    stop: bool = False


@dataclass(frozen=True)
class Plan:
    """A title and its steps."""

    title: str
    steps: tuple[Step, ...]


def load_plan(path: Path, channel: Channel) -> Plan:
    """Read a plan file for one channel; whatever is wrong in it raises ``UsageProblem``."""
    try:
        content = tomllib.loads(path.read_text(encoding="utf-8"))
    except (OSError, UnicodeDecodeError, tomllib.TOMLDecodeError) as error:
        raise UsageProblem(f"{path}: {error}") from error
    try:
        return _read_plan(content, path.stem, channel)
    except StationError as error:
        raise UsageProblem(f"{path}: {error}") from error


def _read_plan(content: Mapping[str, Any], title: str, channel: Channel) -> Plan:
    _check_keys(content, _PLAN_KEYS)
    steps = content.get("step", [])
    if not isinstance(steps, list) or not steps:
        raise UsageProblem("the plan has no [[step]]")
    read = []
    for number, step in enumerate(steps, start=1):
        try:
            read.append(_read_step(step, channel))
        except StationError as error:
            raise UsageProblem(f"step {number}: {error}") from error
    return Plan(_typed(content, "title", str, title), tuple(read))


def _check_keys(table: Mapping[str, Any], known: set[str]) -> None:
    for key in table:
        if key not in known:
            raise UsageProblem(f"unknown key {key!r}")


def _typed(table: Mapping[str, Any], key: str, kind: Any, default: Any = None) -> Any:
    value = table.get(key, default)
    if key in table and (not isinstance(value, kind) or isinstance(value, bool)
                         and kind is not bool):
        raise UsageProblem(f"{key} has the wrong type")
    return value


def _read_step(step: Mapping[str, Any], channel: Channel) -> Step:
    kinds = [kind for kind in _KIND_KEYS if kind in step]
    if len(kinds) != 1:
        raise UsageProblem("a step has exactly one of command, request and at")
    _check_keys(step, _COMMON_KEYS | _KIND_KEYS[kinds[0]])
    timeout = _typed(step, "timeout", (int, float))
    if timeout is not None and timeout <= 0:
        raise UsageProblem("timeout is not a time")
    common = {"name": _typed(step, "name", str, _typed(step, kinds[0], str)),
              "limits": tuple(_read_limit(name, limit) for name, limit
                              in _typed(step, "limits", dict, {}).items()),
              "timeout": timeout, "stop": _typed(step, "stop", bool, False)}
    reader = {"command": _read_command, "request": _read_request, "at": _read_at}[kinds[0]]
    return Step(**common, **reader(step, channel))


def _read_limit(name: str, limit: Any) -> Limit:
    if not isinstance(limit, dict):
        limit = {"equals": limit}
    _check_keys(limit, _LIMIT_KEYS)
    matches = _typed(limit, "matches", str)
    try:
        re.compile(matches or "")
    except re.error as error:
        raise UsageProblem(f"limit of {name}: {matches!r}: {error}") from error
    return Limit(name, _typed(limit, "min", (int, float)), _typed(limit, "max", (int, float)),
                 _typed(limit, "equals", (int, str)), matches)


def _read_command(step: Mapping[str, Any], channel: Channel) -> dict[str, Any]:
    path = tuple(_typed(step, "command", str).split())
    values = _typed(step, "with", dict, {})
    row, operation = find_operation(path)
    check_channel(row, operation, channel)
    operation_packet(row, operation, values)
    return {"path": path, "values": values}


def _read_request(step: Mapping[str, Any], channel: Channel) -> dict[str, Any]:
    command = find_command(_typed(step, "request", str))
    row = requests_by_id().get(command)
    atoms = tuple(parse_atom(row, text) for text in _typed(step, "atoms", list, []))
    return {"packet": Packet(command, atoms)}


def _read_at(step: Mapping[str, Any], channel: Channel) -> dict[str, Any]:
    text = _typed(step, "at", str)
    if channel is not Channel.PC:
        raise UsageProblem("AT text is understood on the PC line only")
    why = known_refusal(text)
    if why:
        raise UsageProblem(f"the handset is known to refuse {text}: {why}")
    return {"text": text, "expect": _typed(step, "expect", str, "OK")}
