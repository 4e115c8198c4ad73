"""One self-contained HTML page of one or many records; it opens without a network."""

from __future__ import annotations

from functools import lru_cache
from typing import Any, Mapping, Sequence

from jinja2 import Environment, PackageLoader, StrictUndefined

from amt_line.report.bars import bar_for
from amt_line.report.records import (counts, duration, limits_text, number_text, value_text,
                                     verdict_word)
from amt_station.text import printable


def printable_lines(text: object) -> str:
    """A text with everything that cannot be shown written out."""
    return printable(str(text))


def spaced_hex(text: str) -> str:
    """Bytes in hexadecimal, told apart."""
    return " ".join(text[index:index + 2] for index in range(0, len(text), 2))


def decoded_text(item: Mapping[str, Any]) -> str:
    """What went over the line, in words."""
    kind = item["kind"]
    if kind == "text":
        return printable(item["text"])
    if kind == "skipped":
        return f"{len(item['bytes']) // 2} bytes skipped: {printable(item['why'])}"
    if kind == "acknowledgement":
        return "acknowledgement"
    packet = item["packet"]
    atoms = ", ".join(map(_atom_text, packet["atoms"]))
    return f"{packet['id']} {printable(packet['name'])}" + (f": {atoms}" if atoms else "")


def _atom_text(atom: Mapping[str, Any]) -> str:
    name = printable(str(atom["name"] or atom["id"]))
    return f"{name}={printable(str(atom.get('text', atom['value'])))}"


@lru_cache(maxsize=1)
def _environment() -> Environment:
    environment = Environment(loader=PackageLoader("amt_line.report", "templates"),
                              autoescape=True, undefined=StrictUndefined, trim_blocks=True,
                              lstrip_blocks=True)
    environment.filters.update(safe_text=printable_lines, hex=spaced_hex, decoded=decoded_text,
                               duration=duration, number=number_text)
    environment.globals.update(bar=bar_for, value_text=value_text, limits_text=limits_text,
                               verdict=verdict_word, counts=counts)
    return environment


def html_page(records: Sequence[Mapping[str, Any]]) -> str:
    """The page; several records have a list in front that leads to each."""
    return _environment().get_template("report.html").render(records=records)
