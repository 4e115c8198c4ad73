"""What a request is: its atoms, who serves it, what comes back, and how a station asks for it.

The rows themselves are in ``amt_station.requests.table``; the protocol reference and the typed
commands are both made from them.
"""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from enum import Enum
from typing import Mapping

from amt_station.errors import UsageProblem
from amt_station.requests.catalogue import command_name
from amt_station.requests.field import Field
from amt_station.wire.atoms import RESULT_ATOM, AtomType

__all__ = ["PASSED_ON", "RESULT", "AtRead", "Channel", "Field", "Operation", "Refusal", "Request",
           "Service"]


class Channel(str, Enum):
    """The two ways to the handset."""

    PC = "pc"
    APP = "app"


RESULT = Field(RESULT_ATOM, AtomType.INT, "result", "result code, 0 for success")


# A refusal of one use only begins with the word of that use.
_USE = re.compile(r"[a-z]+: ")


@dataclass(frozen=True)
class Refusal:
    """A case that the handset refuses, and the result code of its error packet."""

    when: str
    code: int = 1
    held: bool = True


@dataclass(frozen=True)
class Service:
    """Who answers a request on one channel, and how.

    ``passes_on`` names the values of an int atom for which the modem answers after all.
    """

    by: str
    acknowledged: bool
    how: str
    refusals: tuple[Refusal, ...] = ()
    passes_on: Mapping[int, tuple[int, ...]] = field(default_factory=dict)

    def causes(self, code: int | None = None, use: str = "") -> tuple[str, ...]:
        """Why it refuses with ``code``; of those for one use, only those for ``use``."""
        found = [refusal.when for refusal in self.refusals if code in (None, refusal.code)]
        return tuple(when for when in found
                     if not use or not _USE.match(when) or when.startswith(f"{use}:"))


PASSED_ON = Service("modem", False, "passed on to the modem unchanged; the modem answers")


@dataclass(frozen=True)
class AtRead:
    """The AT text that reads the same on the PC line, and whose refusal the handset forgets.

    The value ``field`` stands behind ``prefix`` in a line of the reply, with or without quotes.
    """

    text: str
    prefix: str
    field: str


@dataclass(frozen=True)
class Operation:
    """A typed command: one use of a request, with some atoms fixed and some asked for.

    ``brings`` names the values that the answer must hold besides its result code, ``before`` the
    typed command that has to go before, ``at`` what is sent instead on the PC line.
    """

    path: tuple[str, ...]
    summary: str
    fixed: Mapping[str, int] = field(default_factory=dict)
    takes: tuple[str, ...] = ()
    may_take: tuple[str, ...] = ()
    channels: tuple[Channel, ...] = (Channel.PC, Channel.APP)
    before: tuple[str, ...] = ()
    brings: tuple[str, ...] = ()
    at: AtRead | None = None

    @property
    def name(self) -> str:
        """The command as it is typed."""
        return " ".join(self.path)


@dataclass(frozen=True)
class Request:
    """One row of the request table."""

    id: int
    name: str
    summary: str
    fields: tuple[Field, ...] = ()
    answer_fields: tuple[Field, ...] = (RESULT,)
    pc: Service | None = PASSED_ON
    app: Service | None = None
    answer: int | None = None
    answers: int = 1
    timeout: float | None = None
    notes: tuple[str, ...] = ()
    at_twin: str = ""
    operations: tuple[Operation, ...] = ()

    @property
    def catalogue_name(self) -> str:
        """The name in the catalogue, ``(undefined)`` for an id that has none there."""
        return command_name(self.id)

    @property
    def answer_id(self) -> int:
        """The id of a positive answer."""
        return (self.id + 1) & 0xFF if self.answer is None else self.answer

    def service(self, channel: Channel) -> Service | None:
        """Who serves the request on ``channel``; None when it is refused there."""
        return self.pc if channel is Channel.PC else self.app

    def field(self, name: str) -> Field:
        """The request atom of this name."""
        for candidate in self.fields:
            if candidate.name == name:
                return candidate
        raise UsageProblem(f"request {self.name} has no atom {name}")

    @property
    def reports_result(self) -> bool:
        """Whether an answer carries a result code."""
        return RESULT in self.answer_fields

    def use(self, values: Mapping[str, int | str]) -> str:
        """The word for the use that the values make of the request; empty when it has one only."""
        return next((field.word(values[field.name]) for field in self.fields
                     if field.choices and field.name in values), "")

    def answer_field(self, atom_id: int) -> Field | None:
        """The answer atom with this id."""
        return next((row for row in self.answer_fields if row.atom == atom_id), None)
