"""Words of the `amt-handset` command line, as the values that they stand for."""

import re
import shlex
from pathlib import Path
from typing import Any

import click

from amt_station.wire.escapes import unescape

SIZE = re.compile(r"^(\d+)([kKmMgG]?)$")
FACTORS = {"": 1, "k": 1 << 10, "m": 1 << 20, "g": 1 << 30}


class Pair(click.ParamType):
    """`KEY=VALUE`; `KEY` alone, where that has a meaning, is KEY without a value."""

    name = "KEY=VALUE"

    def __init__(self, needs_value: bool) -> None:
        self._needs_value = needs_value

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> tuple[str, str | None]:
        """Split at the first "="."""
        key, equals, text = str(value).partition("=")
        if not key or (self._needs_value and not equals):
            self.fail(f"{value!r} is not {self.name}", param, ctx)
        return key, text if equals else None


class Screen(click.ParamType):
    """`WIDTHxHEIGHT` in pixels."""

    name = "WIDTHxHEIGHT"

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> tuple[int, int]:
        """Two numbers, neither of them 0."""
        match = re.match(r"^([1-9]\d{0,3})x([1-9]\d{0,3})$", str(value))
        if not match:
            self.fail(f"{value!r} is not {self.name}", param, ctx)
        return int(match[1]), int(match[2])


class CardSize(click.ParamType):
    """A size in bytes, with K, M or G, or `none`."""

    name = "SIZE|none"

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> int:
        """Bytes; 0 stands for no card."""
        if isinstance(value, int):
            return value
        if str(value).lower() == "none":
            return 0
        match = SIZE.match(str(value))
        if not match or int(match[1]) == 0:
            self.fail(f"{value!r} is not {self.name}", param, ctx)
        return int(match[1]) * FACTORS[match[2].lower()]


class Words(click.ParamType):
    """Words of a command line, quoted as for a shell."""

    name = "WORDS"

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> list[str]:
        """The words, none of an empty text."""
        try:
            return shlex.split(str(value))
        except ValueError as error:
            self.fail(f"{value!r}: {error}".rstrip("."), param, ctx)


def pairs(given: tuple[tuple[str, str | None], ...]) -> dict[str, str | None]:
    """The pairs of a repeated option; a later one wins."""
    return dict(given)


def file_contents(given: tuple[tuple[str, str | None], ...]) -> dict[str, Path | None]:
    """Files to place: path in the handset to a file of the PC."""
    return {inside: None if outside is None else Path(outside) for inside, outside in given}


class Escaped(click.ParamType):
    r"""A text for the wire, in which \r, \n and \xHH stand for bytes."""

    name = "TEXT"

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> str:
        """The text as init takes it: bytes that are no text are surrogates."""
        try:
            return unescape(str(value)).decode("utf-8", "surrogateescape")
        except ValueError as error:
            self.fail(str(error), param, ctx)
