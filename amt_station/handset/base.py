"""What the typed commands of a handset are made of; the methods themselves are generated."""

from __future__ import annotations

from dataclasses import MISSING, dataclass, field, fields
from enum import IntEnum
from typing import Any, Mapping, TypeVar

from amt_station.errors import IncompleteAnswer
from amt_station.link import Link
from amt_station.perform import Outcome, perform
from amt_station.requests.operations import prepare

_Record = TypeVar("_Record", bound="Result")


@dataclass(frozen=True)
class Result:
    """What a command brought; ``performed`` holds its exchanges, with every byte and its time."""

    performed: Outcome = field(repr=False, compare=False)


@dataclass(frozen=True)
class Done(Result):
    """A command that brings nothing but a yes."""


@dataclass(frozen=True)
class Reply(Result):
    """The reply to an AT text that ended with OK."""

    lines: tuple[str, ...]


class Group:
    """Typed commands that share their first words."""

    def __init__(self, link: Link) -> None:
        self._link = link

    def _carry_out(self, record: type[_Record], command: str, values: Mapping[str, object],
                   force: bool, timeout: float | None) -> _Record:
        prepared = prepare(command, values, self._link.channel, force)
        outcome = perform(self._link, prepared, timeout)
        return record(outcome, **_values(record, outcome, self._enums))

    @property
    def _enums(self) -> Mapping[str, type[IntEnum]]:
        from amt_station.handset.enums import ENUMS

        return ENUMS


def _values(record: type[Result], outcome: Outcome,
            enums: Mapping[str, type[IntEnum]]) -> dict[str, Any]:
    brought = {value.name.replace("-", "_"): value for value in outcome.values}
    values: dict[str, Any] = {}
    for one in fields(record)[1:]:
        if one.name in brought:
            shown = brought[one.name].shown
            values[one.name] = _enum(enums.get(one.name), shown)
        elif one.default is MISSING:
            raise IncompleteAnswer(f"{outcome.prepared.name}: the answer holds no {one.name}")
    return values


def _enum(enum: type[IntEnum] | None, value: object) -> object:
    """The member for a number that has one; any other number stays what it is."""
    if enum is None or not isinstance(value, int):
        return value
    return next((member for member in enum if member == value), value)
