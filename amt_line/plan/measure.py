"""What a value of an answer is: a number with a unit and words, or a text."""

from __future__ import annotations

import math
import re
from dataclasses import dataclass, field
from decimal import Decimal
from typing import Any, Mapping

from amt_line.plan.references import Scalar

_PREFIXES: Mapping[str, Decimal] = {
    "n": Decimal("1e-9"), "u": Decimal("1e-6"), "µ": Decimal("1e-6"), "μ": Decimal("1e-6"),
    "m": Decimal("1e-3"), "": Decimal(1), "k": Decimal("1e3"), "M": Decimal("1e6"),
    "G": Decimal("1e9")}
_QUANTITY = re.compile(r"(?P<number>[+-]?[0-9]{1,18}(?:\.[0-9]{1,18})?) *(?P<unit>[^0-9 .].*)",
                       re.ASCII)
_LARGEST = Decimal("1e18")


@dataclass(frozen=True)
class Measure:
    """A value by name; the handset's number times ``scale`` is the number in ``unit``."""

    name: str
    numeric: bool
    unit: str = ""
    scale: Decimal = Decimal(1)
    choices: Mapping[str, int] = field(default_factory=dict)

    def read(self, given: Any) -> Decimal | str:
        """A limit as a plan writes it: a number, a number with its unit, a word, or a text."""
        if isinstance(given, bool) or not isinstance(given, (int, float, str)):
            raise ValueError(f"{given!r} is neither a number nor a text")
        if not self.numeric:
            if not isinstance(given, str):
                raise ValueError(f"{given!r} is no text, and {self.name} is one")
            return given
        if isinstance(given, str):
            return self._read_words(given)
        if isinstance(given, float) and not math.isfinite(given):
            raise ValueError(f"{given} is no number")
        return self._bounded(Decimal(str(given)) if abs(given) < _LARGEST else _LARGEST * 10)

    def _bounded(self, number: Decimal) -> Decimal:
        if abs(number) > _LARGEST:
            raise ValueError("the number is too large")
        return number

    def _read_words(self, text: str) -> Decimal:
        if text in self.choices:
            return Decimal(self.choices[text])
        match = _QUANTITY.fullmatch(text)
        if match is None:
            words = f" nor one of {', '.join(self.choices)}" if self.choices else ""
            unit = f" in {self.unit}" if self.unit else ""
            raise ValueError(f"{text!r} is no number{unit}{words}")
        factor = self._factor(match.group("unit"))
        if factor is None:
            has = f"is in {self.unit}" if self.unit else "has no unit"
            raise ValueError(f"{text!r}: {self.name} {has}")
        return self._bounded(Decimal(match.group("number")) * factor)

    def _factor(self, unit: str) -> Decimal | None:
        if not self.unit:
            return None
        return next((factor for prefix, factor in _PREFIXES.items()
                     if unit == prefix + self.unit), None)

    def exact(self, value: Scalar) -> Decimal | str:
        """A value of the handset, in the unit; texts lose line ends and padding at their end."""
        if isinstance(value, str):
            return value.rstrip("\r\n\0")
        return Decimal(int(value)) * self.scale if self.numeric else str(value)

    def word(self, exact: Decimal | str) -> str:
        """The word for a number, if it has one."""
        return next((word for word, number in self.choices.items() if number == exact), "")

    def shown(self, exact: Decimal | str) -> str:
        """A value for people."""
        if isinstance(exact, str):
            return repr(exact)
        word, number = self.word(exact), digits(exact)
        return word or (f"{number} {self.unit}" if self.unit else number)


def digits(number: Decimal) -> str:
    """An exact number without an exponent and without zeros that say nothing."""
    return format(number.normalize(), "f") if number else "0"
