"""The dissector for captures of traces: its names are made from the catalogue and the table."""

from __future__ import annotations

from pathlib import Path
from typing import Iterable, Mapping

from amt_station.requests.field import Field
from amt_station.requests.table import REQUESTS, display_name
from amt_station.trace.pcapng import HEAD_VERSION
from amt_station.wire.envelope import ACKNOWLEDGEMENT

_SOURCE = Path(__file__).with_name("dissector.lua")
_MARK = "-- TABLES\n"


def dissector() -> str:
    """The whole script, for Wireshark's and tshark's own Lua."""
    before, _, after = _SOURCE.read_text(encoding="ascii").partition(_MARK)
    return before + "".join(f"{line}\n" for line in _tables()) + after


def _tables() -> Iterable[str]:
    """The names as Lua tables."""
    yield f"local HEAD_VERSION = {HEAD_VERSION}"
    yield f'local ACKNOWLEDGEMENT = "{ACKNOWLEDGEMENT.hex()}"'
    yield "local NAMES = {"
    yield from (f"  [{command}] = {_quoted(display_name(command))}," for command in range(256))
    yield "}"
    yield "-- Where the answer to a request has not the next id."
    yield "local ANSWERS = {"
    yield from (f"  [{row.id}] = {row.answer_id}," for row in REQUESTS
                if row.answer_id != row.id + 1 & 0xFF)
    yield "}"
    for name, fields in (("REQUEST_ATOMS", {row.id: row.fields for row in REQUESTS}),
                         ("ANSWER_ATOMS", {row.id: row.answer_fields for row in REQUESTS})):
        yield from _atoms(name, fields)


def _atoms(name: str, fields: Mapping[int, Iterable[Field]]) -> Iterable[str]:
    yield f"local {name} = {{"
    for command, row in fields.items():
        entries = [f"[{field.atom}] = {{ {_quoted(field.name)}{_words(field)} }}" for field in row]
        yield f"  [{command}] = {{ {', '.join(entries)} }},"
    yield "}"


def _words(field: Field) -> str:
    words = ", ".join(f"[{value}] = {_quoted(word)}" for word, value in field.choices.items())
    return f", {{ {words} }}" if words else ""


def _quoted(text: str) -> str:
    return '"' + text.replace("\\", "\\\\").replace('"', '\\"') + '"'
