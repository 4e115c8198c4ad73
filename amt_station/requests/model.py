"""What a request is: its atoms, who serves it, what comes back, and how a station asks for it.

The rows themselves are in ``amt_station.requests.table``; the protocol reference and the typed
commands are both made from them.
"""

from __future__ import annotations

from dataclasses import dataclass, field
from enum import Enum
from typing import Mapping

from amt_station.errors import UsageProblem
from amt_station.requests.catalogue import command_name
from amt_station.wire.atoms import RESULT_ATOM, Atom, AtomType
from amt_station.wire.errors import WireError


class Channel(str, Enum):
    """The two ways to the handset."""

    PC = "pc"
    APP = "app"


@dataclass(frozen=True)
class Field:
    """One atom of a request or an answer.

    ``absent`` says what the handset takes when the atom is missing, ``width`` that a bytes atom
    holds a number of so many bytes, ``length_of`` that the value is another atom's byte count.
    On the command line a ``positional`` field is an argument, one with ``flags`` a flag a choice.
    """

    atom: int
    type: AtomType
    name: str
    meaning: str
    unit: str = ""
    low: int | None = None
    high: int | None = None
    longest: int | None = None
    choices: Mapping[str, int] = field(default_factory=dict)
    absent: str = ""
    positional: bool = False
    flags: bool = False
    width: int = 0
    text: bool = False
    length_of: str = ""

    @property
    def numeric(self) -> bool:
        """Whether the value is a number; ``width`` bytes of a bytes atom may hold one."""
        return self.width > 0 or self.type in (AtomType.INT, AtomType.BOOL)

    def encode(self, value: int | str) -> Atom:
        """The atom for ``value``, refused when the handset would not take it."""
        try:
            return self._encode_number(value) if self.numeric else self._encode_text(str(value))
        except WireError as error:
            raise UsageProblem(f"{self.name}: {error}") from error

    def _encode_number(self, value: int | str) -> Atom:
        number = self._number(value)
        if self.low is not None and number < self.low:
            raise UsageProblem(f"{self.name}: {number} is below {self.low}")
        if self.high is not None and number > self.high:
            raise UsageProblem(f"{self.name}: {number} is above {self.high}")
        if self.type is AtomType.BYTES:
            return Atom.raw(self.atom, number.to_bytes(self.width, "little"))
        if self.type is AtomType.BOOL:
            return Atom.boolean(self.atom, number)
        return Atom.integer(self.atom, number)

    def _number(self, value: int | str) -> int:
        if isinstance(value, int):
            return value
        if value in self.choices:
            return self.choices[value]
        try:
            return int(value, 0)
        except ValueError:
            words = f" nor one of {', '.join(self.choices)}" if self.choices else ""
            raise UsageProblem(f"{self.name}: {value!r} is not a number{words}") from None

    def _encode_text(self, text: str) -> Atom:
        atom = (Atom.string(self.atom, text) if self.type is AtomType.STRING
                else Atom.raw(self.atom, text.encode("utf-8", "surrogateescape")))
        if not text:
            raise UsageProblem(f"{self.name}: empty")
        if "\0" in text:
            raise UsageProblem(f"{self.name}: holds a zero byte")
        if self.longest is not None and len(atom.content) > self.longest:
            raise UsageProblem(f"{self.name}: {len(atom.content)} bytes, at most {self.longest}")
        return atom

    def read(self, atom: Atom) -> int | str:
        """The value that an atom of an answer carries, for people and for JSON."""
        if self.width and isinstance(atom.value, bytes):
            return int.from_bytes(atom.value, "little")
        if self.text and isinstance(atom.value, bytes):
            return atom.value.decode("utf-8", "surrogateescape")
        return atom.value.hex() if isinstance(atom.value, bytes) else atom.value

    def word(self, number: int | str) -> str:
        """The word for a number, if it has one."""
        return next((word for word, value in self.choices.items() if value == number), "")


RESULT = Field(RESULT_ATOM, AtomType.INT, "result", "result code, 0 for success")


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


PASSED_ON = Service("modem", False, "passed on to the modem unchanged; the modem answers")


@dataclass(frozen=True)
class Operation:
    """A typed command: one use of a request, with some atoms fixed and some asked for."""

    path: tuple[str, ...]
    summary: str
    fixed: Mapping[str, int] = field(default_factory=dict)
    takes: tuple[str, ...] = ()
    may_take: tuple[str, ...] = ()
    channels: tuple[Channel, ...] = (Channel.PC, Channel.APP)
    before: tuple[str, ...] = ()

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

    def answer_field(self, atom_id: int) -> Field | None:
        """The answer atom with this id."""
        return next((row for row in self.answer_fields if row.atom == atom_id), None)
