"""What every drawing is made of: elements, texts and how wide they are, labels that keep apart."""

from __future__ import annotations

import zlib
from dataclasses import dataclass
from typing import Any, Iterable, Sequence
from unicodedata import east_asian_width
from xml.etree.ElementTree import Element, SubElement, tostring

from markupsafe import Markup

from amt_station.text import printable

FONT_SIZE = 12.0
LINE = 15.0
FONT = "system-ui, 'Segoe UI', Roboto, 'Liberation Sans', 'Noto Sans CJK SC', sans-serif"

INK, SOFT_INK, GRID = "#1b2127", "#56616b", "#d9dee3"
BLUE, PALE_BLUE, GREEN, RED, AMBER = "#2c5f9e", "#cfdff1", "#16702f", "#b3221c", "#8a5a00"

_NARROW, _BROAD = "fijlrt.,:;'|!()[] 1I-", "mwMW@%"


def text_width(text: str, size: float = FONT_SIZE, bold: bool = False) -> float:
    """About how wide a text is, rather more than less."""
    ems = 0.0
    for character in text:
        if east_asian_width(character) in "WF":
            ems += 1.0
        elif character in _NARROW:
            ems += 0.42
        else:
            ems += 0.98 if character in _BROAD else 0.65
    return ems * size * (1.12 if bold else 1.0)


def cut(text: str, width: float, size: float = FONT_SIZE) -> str:
    """The text, or as much of it as fits with an ellipsis."""
    shown = printable(text)
    if text_width(shown, size) <= width:
        return shown
    while shown and text_width(f"{shown}\u2026", size) > width:
        shown = shown[:-1]
    return f"{shown}\u2026"


def coordinate(number: float) -> str:
    """A place in a drawing."""
    return f"{number:.2f}".rstrip("0").rstrip(".") if number else "0"


class Drawing:
    """One picture with a title and a description for those who do not see it."""

    def __init__(self, kind: str, width: float, height: float, title: str,
                 description: str = "") -> None:
        texts = [printable(title), printable(description)]
        mark = f"d{zlib.crc32(repr((kind, texts)).encode()):08x}"
        self.width, self.height = width, height
        self.root = Element("svg", {
            "xmlns": "http://www.w3.org/2000/svg", "class": f"drawing {kind}", "role": "img",
            "viewBox": f"0 0 {coordinate(width)} {coordinate(height)}",
            "width": coordinate(width), "height": coordinate(height), "font-family": FONT,
            "font-size": coordinate(FONT_SIZE), "fill": "currentColor"})
        ids = []
        for name, text in zip(("title", "desc"), texts):
            if text:
                ids.append(f"{mark}-{name}")
                SubElement(self.root, name, {"id": ids[-1]}).text = text
        self.root.set("aria-labelledby", " ".join(ids))

    def add(self, name: str, parent: Any = None, **attributes: object) -> Element:
        """An element; an underscore in an attribute's name is a hyphen, a last one is nothing."""
        named = {key.rstrip("_").replace("_", "-"):
                 coordinate(value) if isinstance(value, (int, float)) else str(value)
                 for key, value in attributes.items()}
        return SubElement(self.root if parent is None else parent, name, named)

    def group(self, tip: str, class_: str) -> Element:
        """A group that says what it is under the pointer."""
        group = self.add("g", class_=class_)
        SubElement(group, "title").text = printable(tip)
        return group

    def line(self, x1: float, y1: float, x2: float, y2: float, stroke: str = GRID,
             **attributes: object) -> None:
        """A straight line."""
        self.add("line", x1=x1, y1=y1, x2=x2, y2=y2, stroke=stroke, **attributes)

    def text(self, x: float, y: float, text: str, anchor: str = "start", fill: str = SOFT_INK,
             **attributes: object) -> None:
        """A text whose baseline is at ``y``."""
        self.add("text", x=x, y=y, text_anchor=anchor, fill=fill, **attributes
                 ).text = printable(text)

    def markup(self) -> Markup:
        """The finished picture."""
        return Markup(tostring(self.root, encoding="unicode"))


@dataclass(frozen=True)
class Label:
    """A text that belongs to a place on the x axis."""

    x: float
    text: str
    fill: str
    class_: str = "label"


@dataclass(frozen=True)
class Placed:
    """A label with the left end and the row that it got."""

    label: Label
    left: float
    row: int


def place(labels: Iterable[Label], left: float, right: float, gap: float = 10.0
          ) -> Sequence[Placed]:
    """Put labels above their places, into as many rows as they need not to touch each other."""
    placed: list[Placed] = []
    rows: list[list[tuple[float, float]]] = []
    for label in labels:
        width = text_width(label.text)
        start = min(max(label.x - width / 2, left), max(right - width, left))
        taken = (start - gap, start + width + gap)
        row = next((index for index, others in enumerate(rows)
                    if all(end <= taken[0] + gap or begin >= taken[1] - gap
                           for begin, end in others)), len(rows))
        if row == len(rows):
            rows.append([])
        rows[row].append(taken)
        placed.append(Placed(label, start, row))
    return placed
