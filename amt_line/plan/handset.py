"""All that plans know of the request table: one place, so that the table can change."""

from __future__ import annotations

import re
from dataclasses import dataclass, replace
from decimal import Decimal
from functools import lru_cache
from typing import Any, Mapping

from amt_line.plan.measure import Measure
from amt_station.errors import UsageProblem
from amt_station.requests import formats
from amt_station.requests.atom_text import TYPES, parse_atom
from amt_station.requests.model import RESULT, Channel, Field, Operation, Request
from amt_station.requests.operations import (Prepared, check_channel, check_value, prepare,
                                             prepare_packet, prepare_text)
from amt_station.requests.table import (find_command, find_operation, operations,
                                        requests_by_id)
from amt_station.wire.atoms import Atom
from amt_station.wire.envelope import LARGEST_REQUEST
from amt_station.wire.packet import Packet

REPLY = Measure("reply", numeric=False)
ENTERED = Measure("text", numeric=False)
_OTHER_ATOM = re.compile(r"atom (25[0-5]|2[0-4][0-9]|1?[0-9]?[0-9])")


@dataclass(frozen=True)
class Command:
    """A typed command: what it takes and what its answer brings."""

    row: Request
    operation: Operation

    @property
    def needed(self) -> tuple[str, ...]:
        """The values that it cannot do without."""
        return self.operation.takes

    def fields(self) -> dict[str, Field]:
        """Every value that it takes, by name."""
        names = (*self.operation.takes, *self.operation.may_take)
        return {name: self.row.field(name) for name in names}

    def measures(self, channel: Channel | None = None) -> dict[str, Measure]:
        """Every value that its answer may bring, by name; where it goes as a text, only that."""
        at = self.operation.at if channel is Channel.PC else None
        return {field.name: measure_of(field) for field in self.row.answer_fields
                if at is None or field.name == at.field}

    def check_channel(self, channel: Channel) -> None:
        """Refuse a channel on which the handset does not serve it."""
        check_channel(self.row, self.operation, channel)

    def check(self, name: str, value: Any, force: bool) -> None:
        """Refuse a value that is not what the table says; ``force`` goes past formats."""
        check_value(self.row, self.operation, name, value, force)


def measure_of(field: Field) -> Measure:
    """How a value of an answer is shown and limited."""
    return Measure(field.name, field.numeric, field.unit if " " not in field.unit else "",
                   Decimal(1) / Decimal(field.scale), field.choices)


@lru_cache(maxsize=1)
def command_names() -> tuple[str, ...]:
    """Every typed command, as it is typed."""
    return tuple(sorted(operation.name for _, operation in operations()))


@lru_cache(maxsize=None)
def command(name: str) -> Command:
    """A typed command by its name."""
    return Command(*find_operation(tuple(name.split())))


def request_id(name: str) -> int:
    """The id of any request: a number, a catalogue name or the table's name."""
    return find_command(name)


def _request_measure(command_id: int, name: str) -> Measure | None:
    row = requests_by_id().get(command_id)
    fields = row.answer_fields if row else (RESULT,)
    found = next((field for field in fields if field.name == name), None)
    if found is not None:
        return measure_of(found)
    return unknown(name) if _OTHER_ATOM.fullmatch(name) else None


def measure(kind: str, subject: str, name: str, channel: Channel | None = None
            ) -> Measure | None:
    """A value that a step of this kind can bring; None when it cannot."""
    if kind == "command":
        return command(subject).measures(channel).get(name)
    if kind == "request":
        return _request_measure(request_id(subject), name)
    if kind == "at":
        return REPLY if name == REPLY.name else None
    return ENTERED if kind == "enter" and name == ENTERED.name else None


def unknown(name: str) -> Measure:
    """A value of which nothing is known."""
    return Measure(name, numeric=True)


def prepared(kind: str, subject: str, values: Mapping[str, Any], atoms: tuple[str, ...],
             channel: Channel, force: bool) -> Prepared:
    """What a step sends, checked by the one rule of the table; ``UsageProblem`` when it is not."""
    if kind == "command":
        return prepare(subject, values, channel, force)
    if kind == "at":
        return _prepared_text(subject, channel, force)
    number, forced = request_id(subject), list[str]()
    row = requests_by_id().get(number)
    packet = Packet(number, tuple(_atom(row, text, force, forced) for text in atoms))
    return replace(prepare_packet(packet, channel), forced=tuple(forced))


def _prepared_text(text: str, channel: Channel, force: bool) -> Prepared:
    size = len(text.encode("utf-8")) + 1
    if size > LARGEST_REQUEST:
        raise UsageProblem(f"an AT text of {size} bytes; the handset takes {LARGEST_REQUEST}")
    return prepare_text(text, channel, force)


def _atom(row: Request | None, text: str, force: bool, forced: list[str]) -> Atom:
    try:
        return parse_atom(row, text)
    except UsageProblem as problem:
        label, colon, _ = text.partition("=")[2].partition(":")
        if not force or colon and label in TYPES:
            raise
        # A value without its type is of the row's type, however it is forced.
        atom = parse_atom(row, text, raw=True)
        forced.append(str(problem))
        return atom


def check_atom(request: str, text: str, force: bool) -> None:
    """Refuse an atom of a request that cannot be sent."""
    _atom(requests_by_id().get(request_id(request)), text, force, [])


def in_words_of_a_plan(message: str) -> str:
    """What the table says of a wrong value, without the command line's way around it."""
    return message.replace("--force sends it", "force = true sends it").replace(
        " (--raw sends it all the same)", "")


def check_format(name: str, text: str) -> None:
    """Refuse a text that is not of a named format."""
    wrong = formats.problem(name, text) if name in formats.FORMATS else ""
    if wrong:
        raise ValueError(f"{text!r}: {wrong}")


def problem_of(error: UsageProblem, name: str) -> str:
    """What is wrong with a value, without its name in front."""
    return str(error).removeprefix(f"{name}: ")
