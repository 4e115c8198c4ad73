"""Limits of a step's values: read, resolved against the variables, and judged."""

from __future__ import annotations

from dataclasses import dataclass
from decimal import Decimal
from typing import Any, Iterator, Mapping

from amt_line.plan.measure import Measure, digits
from amt_line.plan.pattern import BadPattern, compiled, is_found
from amt_line.plan.references import Scalar, fill, names, only_reference

KEYS = ("min", "max", "equals", "matches", "one_of", "marginal")


@dataclass(frozen=True)
class Limit:
    """The limit of one value as the plan writes it; ``given`` may hold references."""

    measure: Measure
    given: Mapping[str, Any]

    @property
    def name(self) -> str:
        """The value's name in the answer."""
        return self.measure.name

    def references(self) -> list[tuple[str, Any]]:
        """Every key with its value, those of lists and of ``marginal`` singly."""
        found: list[tuple[str, Any]] = []
        for key, value in self.given.items():
            if isinstance(value, Mapping):
                found += [(f"{key}.{inner}", bound) for inner, bound in value.items()]
            elif isinstance(value, list):
                found += [(key, item) for item in value]
            else:
                found.append((key, value))
        return found

    def check_constants(self) -> None:
        """Raise ``ValueError`` for what is wrong whatever the variables come to."""
        Limit(self.measure, dict(self._constants())).resolve({})
        for value in self.given.get("one_of", ()):
            if not names(value):
                self._keyed("one_of", value, {})
        pattern = self.given.get("matches", "")
        if not only_reference(pattern):
            self._pattern({name: "x" for name in names(pattern)})

    def _constants(self) -> Iterator[tuple[str, Any]]:
        """Every key in which no variable has a say."""
        for key, value in self.given.items():
            if isinstance(value, Mapping):
                inner = {name: bound for name, bound in value.items() if not names(bound)}
                if inner:
                    yield key, inner
            elif not any(map(names, value if isinstance(value, list) else [value])):
                yield key, value

    def resolve(self, variables: Mapping[str, Scalar]) -> Bounds:
        """The limit with its references replaced; ``ValueError`` names key and reason."""
        marginal = self.given.get("marginal", {})
        bounds = Bounds(
            self.measure, low=self._number("min", self.given, variables),
            high=self._number("max", self.given, variables),
            near_low=self._number("min", marginal, variables, "marginal."),
            near_high=self._number("max", marginal, variables, "marginal."),
            allowed=self._allowed(variables), pattern=self._pattern(variables))
        bounds.check()
        return bounds

    def _number(self, key: str, table: Mapping[str, Any], variables: Mapping[str, Scalar],
                prefix: str = "") -> Decimal | None:
        if key not in table:
            return None
        if not self.measure.numeric:
            raise ValueError(f"{prefix}{key}: {self.name} is a text")
        number = self._keyed(prefix + key, table[key], variables)
        return number if isinstance(number, Decimal) else None

    def _keyed(self, key: str, value: Any, variables: Mapping[str, Scalar]) -> Decimal | str:
        try:
            return self.measure.read(fill(value, variables))
        except ValueError as error:
            raise ValueError(f"{key}: {error}") from error

    def _allowed(self, variables: Mapping[str, Scalar]) -> tuple[Decimal | str, ...] | None:
        if "equals" in self.given:
            return (self._keyed("equals", self.given["equals"], variables),)
        if "one_of" in self.given:
            return tuple(self._keyed("one_of", value, variables)
                         for value in self.given["one_of"])
        return None

    def _pattern(self, variables: Mapping[str, Scalar]) -> str:
        given = self.given.get("matches", "")
        filled = fill(given, variables) if only_reference(given) else given
        if not isinstance(filled, str):
            raise ValueError("matches: a number is no pattern")
        pattern = filled
        if names(given) and not only_reference(given):
            # What a variable brings into a pattern stands for itself.
            quoted = {name: _quoted(value) for name, value in variables.items()}
            pattern = str(fill(given, quoted))
        try:
            compiled(pattern)
        except BadPattern as error:
            raise ValueError(f"matches: {pattern!r} is no regular expression: {error}") from error
        return pattern


def _quoted(value: Scalar) -> str:
    return "".join(character if character.isalnum() else f"\\{character}"
                   for character in str(value))


@dataclass(frozen=True)
class Judgement:
    """What a limit says of a value."""

    reason: str = ""
    marginal: bool = False


@dataclass(frozen=True)
class Bounds:
    """A limit without references; numbers are in the value's unit."""

    measure: Measure
    low: Decimal | None = None
    high: Decimal | None = None
    near_low: Decimal | None = None
    near_high: Decimal | None = None
    allowed: tuple[Decimal | str, ...] | None = None
    pattern: str = ""

    def check(self) -> None:
        """Raise ``ValueError`` for bounds that nothing can be within."""
        _ordered(self.low, self.high, "min", "max")
        _ordered(self.near_low, self.near_high, "marginal.min", "marginal.max")
        _ordered(self.low, self.near_low, "min", "marginal.min")
        _ordered(self.near_high, self.high, "marginal.max", "max")
        _ordered(self.near_low, self.high, "marginal.min", "max")
        _ordered(self.low, self.near_high, "min", "marginal.max")
        if self.allowed is not None and all(map(self._outside, self.allowed)):
            key = "equals" if len(self.allowed) == 1 else "one_of"
            raise ValueError(f"{key}: {self._outside(self.allowed[0])}: nothing can be within both")

    def judge(self, value: Scalar) -> Judgement:
        """Judge a value as the handset gave it."""
        exact = self.measure.exact(value)
        reason = self._not_allowed(exact) or self._outside(exact) or self._unmatched(exact)
        if reason:
            return Judgement(f"{self.measure.name} {reason}")
        near = (_below(exact, self.near_low) or _above(exact, self.near_high))
        return Judgement(marginal=near)

    def _shown(self, exact: Decimal | str) -> str:
        return self.measure.shown(exact)

    def _not_allowed(self, exact: Decimal | str) -> str:
        if self.allowed is None or exact in self.allowed:
            return ""
        wanted = " or ".join(self._shown(value) for value in self.allowed)
        return f"is {self._shown(exact)} instead of {wanted}"

    def _outside(self, exact: Decimal | str) -> str:
        if self.low is None and self.high is None:
            return ""
        if isinstance(exact, str):
            return f"{exact!r} is no number"
        if self.low is not None and exact < self.low:
            return f"{self._shown(exact)} is below {self._shown(self.low)}"
        if self.high is not None and exact > self.high:
            return f"{self._shown(exact)} is above {self._shown(self.high)}"
        return ""

    def _unmatched(self, exact: Decimal | str) -> str:
        text = exact if isinstance(exact, str) else digits(exact)
        if not self.pattern or is_found(self.pattern, text):
            return ""
        return f"{self._shown(exact)} does not match {self.pattern!r}"

    def document(self) -> dict[str, Any]:
        """The limit for the record."""
        entries = {"min": self.low, "max": self.high, "marginal_min": self.near_low,
                   "marginal_max": self.near_high}
        document: dict[str, Any] = {key: plain_number(bound) for key, bound in entries.items()
                                    if bound is not None}
        if self.allowed is not None:
            document["one_of"] = [plain_number(value) if isinstance(value, Decimal) else value
                                  for value in self.allowed]
        if self.pattern:
            document["matches"] = self.pattern
        return document


def plain_number(value: Decimal) -> int | float:
    """An exact number as JSON has it."""
    return int(value) if value == value.to_integral_value() else float(value)


def _below(value: Decimal | str, bound: Decimal | None) -> bool:
    return bound is not None and isinstance(value, Decimal) and value < bound


def _above(value: Decimal | str, bound: Decimal | None) -> bool:
    return bound is not None and isinstance(value, Decimal) and value > bound


def _ordered(low: Decimal | None, high: Decimal | None, low_key: str, high_key: str) -> None:
    if low is not None and high is not None and low > high:
        raise ValueError(f"{low_key} {plain_number(low)} is above {high_key} "
                         f"{plain_number(high)}")
