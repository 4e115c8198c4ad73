"""Where a value stands within its limits, as places on a bar from 0 to 100."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Any, Mapping
from xml.etree.ElementTree import Element, SubElement, tostring

from markupsafe import Markup

from amt_line.drawing.svg import INK, coordinate
from amt_station.text import printable

_LEFT, _RIGHT = 20.0, 80.0


@dataclass(frozen=True)
class Bar:
    """The allowed band, the band that is not marginal, and the value's mark."""

    low: float
    high: float
    near_low: float
    near_high: float
    mark: float
    beyond: bool


def bar_for(value: Mapping[str, Any]) -> Bar | None:
    """The bar of a value that has a number and a limit of numbers; None for all others."""
    limits, number = value.get("limits", {}), value["value"]
    low, high = limits.get("min"), limits.get("max")
    if isinstance(number, str) or (low is None and high is None):
        return None
    start, width = _scale(float(number), low, high)

    def place(at: float) -> float:
        return _LEFT + (_RIGHT - _LEFT) * (at - start) / width

    low_place = place(low) if low is not None else 0.0
    high_place = place(high) if high is not None else 100.0
    mark = place(number)
    return Bar(low_place, high_place,
               place(limits["marginal_min"]) if "marginal_min" in limits else low_place,
               place(limits["marginal_max"]) if "marginal_max" in limits else high_place,
               min(max(mark, 1.5), 98.5), not 1.5 <= mark <= 98.5)


def _scale(number: float, low: float | None, high: float | None) -> tuple[float, float]:
    """The number at the left and the distance to the right end of the middle part."""
    if low is not None and high is not None:
        width = float(high) - float(low)
        return (float(low), width) if width else (float(low) - 0.5, 1.0)
    edge = float(low if low is not None else high or 0.0)
    width = max(abs(number - edge) * 1.25, abs(edge) * 0.25) or 1.0
    return (edge, width) if low is not None else (edge - width, width)


def value_bar(value: Mapping[str, Any], label: str) -> Markup:
    """A record's value as a mark on the bar of its limits; empty without limits of numbers.

    ``label`` says the same in words.
    """
    bar = bar_for(value)
    if bar is None:
        return Markup()
    root = Element("svg", {"viewBox": "0 0 100 12", "preserveAspectRatio": "none", "role": "img",
                           "class": "value-bar", "aria-label": printable(label)})
    for start, end, band, colour in ((0.0, 100.0, "outside", "#e6eaee"),
                                     (bar.low, bar.high, "marginal", "#ffd58a"),
                                     (bar.near_low, bar.near_high, "inside", "#9bd3a8")):
        SubElement(root, "rect", {"x": coordinate(start), "y": "4", "height": "4",
                                  "width": coordinate(end - start), "class": band,
                                  "fill": colour})
    verdict = "fail" if value.get("verdict") == "fail" else "pass"
    SubElement(root, "rect", {"x": coordinate(bar.mark - 0.8), "y": "0", "width": "1.6",
                              "height": "12", "class": f"mark {verdict}", "fill": INK})
    return Markup(tostring(root, encoding="unicode"))
