"""One atom of a request or an answer: its type, its unit, its limits, and the one rule for values.

Whatever way a value comes in (a typed command, a plan, the library), it passes ``Field.check``.
"""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from typing import Mapping, Union

from amt_station.errors import ValueProblem
from amt_station.requests.formats import problem
from amt_station.wire.atoms import Atom, AtomType
from amt_station.wire.errors import WireError

Value = Union[int, str]
Shown = Union[int, float, str]

_INT_RANGE = (-0x80000000, 0x7FFFFFFF)
_BYTE_RANGE = (0, 0xFF)

_NUMBER = re.compile(r"[+-]?(?:0[xX][0-9A-Fa-f]+|[0-9]+)", re.ASCII)


@dataclass(frozen=True)
class Field:
    """One atom of a request or an answer.

    ``low``, ``high``, ``longest``, ``choices`` and ``format`` bound what a station sends.
    ``scale`` says how many of what travels make one ``unit``: 1000000 for microvolt shown as V.
    ``absent`` says what the handset takes when the atom is missing, ``width`` that a bytes atom
    holds a number of so many bytes, ``length_of`` that the value is another atom's byte count.
    ``echo`` is for answers: the value must be the one that the request asked for.
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
    format: str = ""
    scale: int = 1
    echo: bool = False

    @property
    def numeric(self) -> bool:
        """Whether the value is a number; ``width`` bytes of a bytes atom may hold one."""
        return self.width > 0 or self.type in (AtomType.INT, AtomType.BOOL)

    # values for a request

    def parse(self, text: str) -> Value:
        """The value that ``text`` means on a command line: for a number its digits or its word."""
        if not self.numeric or text in self.choices:
            return text
        try:
            if _NUMBER.fullmatch(text):
                return int(text, 0)
        except ValueError:
            pass  # a leading zero, or more digits than a number can have
        raise self._problem(f"{text[:40]!r} is not a number{self._words()}")

    def check(self, value: object, force: bool = False) -> Value:
        """``value`` as it is sent, or ``ValueProblem``: a number for a word, a text for a text.

        ``force`` goes past the formats, never past the types.
        """
        if self.numeric:
            return self._check_number(value, force)
        return self._check_text(value, force)

    def encode(self, value: Value, force: bool = False) -> Atom:
        """The atom for ``value``, refused when the handset would not take it."""
        if self.numeric and isinstance(value, str):
            value = self.parse(value)
        checked = self.check(value, force)
        try:
            return self._atom(checked)
        except (WireError, OverflowError) as error:
            raise self._problem(str(error)) from error

    def _atom(self, value: Value) -> Atom:
        if isinstance(value, str):
            return (Atom.string(self.atom, value) if self.type is AtomType.STRING
                    else Atom.raw(self.atom, value.encode("utf-8", "surrogateescape")))
        if self.type is AtomType.BYTES:
            return Atom.raw(self.atom, value.to_bytes(self.width, "little"))
        if self.type is AtomType.BOOL:
            return Atom.boolean(self.atom, value)
        return Atom.integer(self.atom, value)

    def _check_number(self, value: object, force: bool) -> int:
        if isinstance(value, str):
            if value in self.choices:
                return self.choices[value]
            raise self._problem(f"{value!r} is a text, not a number{self._words()}")
        if isinstance(value, bool) or not isinstance(value, int):
            raise self._problem(f"{_kind(value)} is not a number{self._words()}")
        self._check_range(value, *self._type_range())
        if not force:
            if self.choices and value not in self.choices.values():
                raise self._problem(f"{value} is neither a known number{self._words()}")
            self._check_range(value, self.low, self.high)
        return value

    def _type_range(self) -> tuple[int, int]:
        if self.width:
            return 0, (1 << 8 * self.width) - 1
        return _INT_RANGE if self.type is AtomType.INT else _BYTE_RANGE

    def _check_range(self, number: int, low: int | None, high: int | None) -> None:
        kind = (" (not a signed 32-bit number)" if high == _INT_RANGE[1]
                else " (not a byte)" if high == 255 else "")
        if low is not None and number < low:
            raise self._problem(f"{number} is below {low}{kind}")
        if high is not None and number > high:
            raise self._problem(f"{number} is above {high}{kind}")

    def _check_text(self, value: object, force: bool) -> str:
        if not isinstance(value, str):
            raise self._problem(f"{_kind(value)} is not a text")
        if not value:
            raise self._problem("empty")
        if "\0" in value:
            raise self._problem("holds a zero byte")
        odd = next((character for character in value if not character.isprintable()), "")
        if odd:
            raise self._problem(f"holds U+{ord(odd):04X}, a control or unprintable character")
        if not force:
            self._check_format(value)
        return value

    def _check_format(self, text: str) -> None:
        length = len(text.encode("utf-8", "surrogateescape"))
        if self.longest is not None and length > self.longest:
            raise self._problem(f"{length} bytes, at most {self.longest}")
        wrong = problem(self.format, text) if self.format else ""
        if wrong:
            raise self._problem(f"{text!r}: {wrong}")

    def _words(self) -> str:
        return f" nor one of {', '.join(self.choices)}" if self.choices else ""

    def _problem(self, reason: str) -> ValueProblem:
        return ValueProblem(self.name, reason)

    # values of an answer

    def read(self, atom: Atom) -> Value:
        """The value that an atom of an answer carries, as it travelled."""
        if self.width and isinstance(atom.value, bytes):
            return int.from_bytes(atom.value, "little")
        if self.text and isinstance(atom.value, bytes):
            return atom.value.decode("utf-8", "surrogateescape")
        return atom.value.hex() if isinstance(atom.value, bytes) else atom.value

    def misfit(self, atom: Atom) -> str:
        """What is wrong with the type of an answer's atom; empty when it can be read."""
        if self.width:
            good = atom.type is AtomType.BYTES and len(atom.content) == self.width
        elif self.numeric:
            good = atom.type in (AtomType.INT, AtomType.BOOL)
        else:
            good = atom.type in (AtomType.STRING, AtomType.BYTES)
        return "" if good else f"{self.name} is of type {atom.type.label}, not {self.type.label}"

    def show(self, value: Value) -> Shown:
        """A value in ``unit``, for people and for reports."""
        return value if self.scale == 1 or isinstance(value, str) else value / self.scale

    def word(self, number: Value) -> str:
        """The word for a number, if it has one."""
        return next((word for word, value in self.choices.items() if value == number), "")


def _kind(value: object) -> str:
    """A value of the wrong type in an error, short enough for one line."""
    shown = repr(value) if not isinstance(value, (dict, list)) else ""
    return f"{shown[:40]} ({type(value).__name__})" if shown else f"a {type(value).__name__}"
