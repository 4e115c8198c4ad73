"""Ready handsets by name: each a file that says in a line what it shows, and what is different."""

from __future__ import annotations

import os
import tomllib
from dataclasses import dataclass
from pathlib import Path
from typing import Any, Callable, Mapping

import click

from amt_simulator.errors import HandsetError
from amt_simulator.inside.modem_table import MODES
from amt_simulator.kinds import KINDS
from amt_simulator.parse import CardSize, Escaped, Screen

FOLDER = Path(__file__).with_name("scenarios")
SUFFIX = ".toml"


class _Wrong(Exception):
    """What is wrong with a value."""


@dataclass(frozen=True)
class Scenario:
    """A handset with something about it; ``options`` are those of a handset that differ."""

    name: str
    shows: str
    options: Mapping[str, Any]

    def with_options(self, given: Mapping[str, Any]) -> dict[str, Any]:
        """The options of a handset where some are ``given``: these go before, entry by entry."""
        merged = {**self.options, **given}
        for name, value in self.options.items():
            if isinstance(value, dict) and name in given:
                merged[name] = {**value, **given[name]}
        return merged


def names() -> list[str]:
    """Every scenario that is ready."""
    return sorted(path.stem for path in FOLDER.glob(f"*{SUFFIX}"))


def find(name: str) -> Scenario:
    """The scenario of this name, or in the file of this path."""
    if os.sep in name:
        return read(Path(name))
    if name not in names():
        raise HandsetError(f"no scenario {name}; there are {', '.join(names())}")
    return read(FOLDER / f"{name}{SUFFIX}")


def read(path: Path) -> Scenario:
    """The scenario in a file; what is wrong with it names file and key."""
    try:
        content = tomllib.loads(path.read_text("utf-8"))
    except OSError as error:
        raise HandsetError(f"{path}: {error.strerror}") from None
    except (UnicodeDecodeError, tomllib.TOMLDecodeError) as error:
        raise HandsetError(f"{path}: {error}") from None
    shows = content.pop("shows", "")
    if not isinstance(shows, str) or not shows.strip() or "\n" in shows:
        raise HandsetError(f"{path}: shows: one line that says what it shows is needed")
    options: dict[str, Any] = {}
    for key, value in content.items():
        if key not in _READERS:
            raise HandsetError(f"{path}: {key}: no such key; there are shows, "
                               f"{', '.join(sorted(_READERS))}")
        try:
            options[key.replace("-", "_")] = _READERS[key](value)
        except (_Wrong, click.BadParameter) as wrong:
            text = wrong.message if isinstance(wrong, click.BadParameter) else str(wrong)
            raise HandsetError(f"{path}: {key}: {text}") from None
    return Scenario(path.stem, shows, options)


def _text(value: Any) -> str:
    if not isinstance(value, str):
        raise _Wrong(f"{value!r} is no text")
    return value


def _flag(value: Any) -> bool:
    if not isinstance(value, bool):
        raise _Wrong(f"{value!r} is neither true nor false")
    return value


def _one_of(words: Any) -> Callable[[Any], str]:
    def convert(value: Any) -> str:
        if value not in words:
            raise _Wrong(f"{value!r} is none of {', '.join(words)}")
        return str(value)

    return convert


def _table(convert: Callable[[Any], Any]) -> Callable[[Any], dict[str, Any]]:
    def read_table(value: Any) -> dict[str, Any]:
        if not isinstance(value, dict):
            raise _Wrong(f"{value!r} is no table")
        found = {}
        for key, entry in value.items():
            try:
                found[key] = convert(entry)
            except _Wrong as wrong:
                raise _Wrong(f"{key}: {wrong}") from None
        return found

    return read_table


def _text_or_none(value: Any) -> str | None:
    """A text; false takes the entry away."""
    return None if value is False else _text(value)


def _lines(value: Any) -> list[str]:
    return [_text(line) for line in value] if isinstance(value, list) else [_text(value)]


_READERS: dict[str, Callable[[Any], Any]] = {
    "path": _one_of(KINDS), "modem": _one_of(MODES), "usb-state": _text,
    "restart": _flag, "start": _flag, "card-full": _flag,
    "card": lambda value: CardSize().convert(_text(value), None, None) or None,
    "screen": lambda value: Screen().convert(_text(value), None, None),
    "config": _table(_text_or_none), "properties": _table(_text_or_none),
    "files": _table(_text_or_none), "answers": _table(_lines),
    "modem-answers": _table(lambda value: Escaped().convert(_text(value), None, None)),
}
