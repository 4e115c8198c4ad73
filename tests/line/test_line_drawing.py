"""Drawings: whole, harmless, and nothing lies over anything else, however much there is."""

from __future__ import annotations

import random
from collections import Counter
from dataclasses import replace
from datetime import date, timedelta
from typing import Callable, Sequence
from xml.etree import ElementTree

import pytest
from markupsafe import Markup

from amt_line.drawing.axis import day_ticks, mean_text, tick_text, ticks
from amt_line.drawing.days import share_text, yield_over_days
from amt_line.drawing.histogram import value_histogram
from amt_line.drawing.pareto import failure_pareto
from amt_line.drawing.svg import cut, text_width
from amt_line.drawing.value_bar import value_bar
from amt_line.drawing.words import ENGLISH
from amt_line.statistics.figures import statistics_of
from amt_line.statistics.filter import Filter
from amt_line.statistics.rows import Limits, Place, Rows, ValueCounts, ValueKey
from amt_line.statistics.steps import Failures, StepName
from amt_line.statistics.values import ValueFigures
from amt_line.statistics.yields import DayKey, Yields

SVG = "{http://www.w3.org/2000/svg}"
HOSTILE = "\x1b[2J\u202e<script>alert(1)</script>&\"'\x00"
FIRST_DAY = date(2026, 1, 30)


def figures(numbers: Sequence[float], limits: Limits = Limits(), name: str = "adc",
            unit: str = "V") -> ValueFigures:
    key = ValueKey(Place("End", "f", 1, name), name, unit, limits)
    rows = Rows(values={key: ValueCounts(Counter(numbers))})
    return statistics_of(rows, Filter()).values[0]


def day(handsets: int, first: int, final: int) -> Yields:
    return Yields(handsets + 3, first, handsets - first, 0, 0, 0, 0, handsets, first, final, 0, 0,
                  None, None, None)


def days(number: int) -> dict[DayKey, Yields]:
    chance = random.Random(number)
    return {DayKey(FIRST_DAY + timedelta(days=index)):
            day(50, 50 - chance.randrange(9), 50 - chance.randrange(3))
            for index in range(number)}


def failures(*runs: int, name: str = "step") -> list[Failures]:
    return [Failures(StepName("End", f"{name} {index}"), count, count, 0)
            for index, count in enumerate(runs)]


def bell(mean: float, deviation: float, count: int) -> list[float]:
    chance = random.Random(count)
    return [chance.gauss(mean, deviation) for _ in range(count)]


PICTURES: dict[str, Callable[[], Markup]] = {
    "histogram": lambda: value_histogram(figures(
        [round(one) for one in bell(2000, 60, 3000)], Limits(1800, 2200, 1850, 2150))),
    "near limits": lambda: value_histogram(figures(bell(5, 1, 500), Limits(4.9, 5.1, 4.95, 5.05))),
    "far limits": lambda: value_histogram(figures(bell(5, 1e-6, 500), Limits(0, 10))),
    "one limit": lambda: value_histogram(figures(bell(-80, 4, 100), Limits(-95))),
    "outliers": lambda: value_histogram(figures([*bell(0, 1, 1000), 1e6, -1e6], Limits(-3, 3))),
    "large numbers": lambda: value_histogram(figures(
        bell(1e9, 1e5, 500), Limits(999_600_000, 1_000_400_000))),
    "one value": lambda: value_histogram(figures([5.0])),
    "all the same": lambda: value_histogram(figures([0.0] * 9, Limits(-1, 1))),
    "two values": lambda: value_histogram(figures([1.0, 1e12])),
    "hostile value": lambda: value_histogram(figures([1, 2], name=HOSTILE, unit=HOSTILE)),
    "no day": lambda: yield_over_days({}),
    "one day": lambda: yield_over_days(days(1)),
    "two weeks": lambda: yield_over_days(days(14)),
    "400 days": lambda: yield_over_days(days(400)),
    "15 years": lambda: yield_over_days(days(5500)),
    "a day without handsets": lambda: yield_over_days({DayKey(FIRST_DAY): day(0, 0, 0)}),
    "no failure": lambda: failure_pareto(failures(0)),
    "pareto": lambda: failure_pareto(failures(37, 22, 8, 8, 3, 1, 1)),
    "many steps": lambda: failure_pareto(failures(*range(60, 0, -1))),
    "hostile step": lambda: failure_pareto(failures(3, 1, name=HOSTILE * 3)),
    "bar": lambda: value_bar({"value": 3, "verdict": "fail", "limits": {"min": 4}}, HOSTILE)}


@pytest.mark.parametrize("name", PICTURES)
def test_a_picture_is_whole_and_harmless(name: str) -> None:
    drawn = PICTURES[name]()
    assert isinstance(drawn, Markup), "a template takes it as it is"
    root = ElementTree.fromstring(drawn)
    tags = {element.tag.removeprefix(SVG) for element in root.iter()}
    assert tags <= {"svg", "title", "desc", "g", "rect", "line", "text", "polyline", "circle"}
    assert not {"script", "style", "foreignObject"} & tags
    for element in root.iter():
        assert not any(key == "style" or key.startswith("on") for key in element.attrib)
        assert "nan" not in "".join(element.attrib.values())
        assert (element.text or "").isprintable()
    assert root.attrib["role"] == "img"
    if name != "bar":
        ids = {element.attrib["id"] for element in root.iter() if "id" in element.attrib}
        assert set(root.attrib["aria-labelledby"].split()) == ids and len(ids) == 2


@pytest.mark.parametrize("name", [name for name in PICTURES if name != "bar"])
def test_texts_lie_in_the_picture_and_apart(name: str) -> None:
    root = ElementTree.fromstring(PICTURES[name]())
    boxes: list[tuple[float, float, float, str]] = []
    for element in root.iter(f"{SVG}text"):
        text, x, y = element.text or "", float(element.attrib["x"]), float(element.attrib["y"])
        # The guess is a generous one; a browser's letters are rather narrower.
        width = 0.9 * text_width(text)
        left = x - {"start": 0.0, "middle": 0.5, "end": 1.0}[element.attrib["text-anchor"]] * width
        assert -1 <= left and left + width <= float(root.attrib["width"]) + 1, text
        assert 9 <= y <= float(root.attrib["height"]), text
        for other_left, other_right, other_y, other in boxes:
            apart = left >= other_right or left + width <= other_left or abs(y - other_y) >= 11
            assert apart, f"{text!r} lies over {other!r}"
        boxes.append((left, left + width, y, text))


def _rectangles(drawn: Markup, class_: str) -> list[ElementTree.Element]:
    return [element for element in ElementTree.fromstring(drawn).iter(f"{SVG}rect")
            if element.attrib.get("class", "") == class_]


def test_bars_are_as_high_as_their_counts() -> None:
    numbers = [1.0] * 30 + [2.0] * 10 + [4.0] * 20
    drawn = ElementTree.fromstring(value_histogram(figures(numbers)))
    heights = [float(group[1].attrib["height"]) for group in drawn.iter(f"{SVG}g")]
    assert [height / heights[0] for height in heights] == pytest.approx([1, 1 / 3, 2 / 3], abs=0.01)
    tips = [group[0].text for group in drawn.iter(f"{SVG}g")]
    assert tips == ["0.5 to 1.5: 30", "1.5 to 2.5: 10", "3.5 to 4.5: 20"]


def test_what_is_out_of_limits_is_hollow() -> None:
    drawn = ElementTree.fromstring(value_histogram(figures(
        [1, 2, 2, 3, 3, 3, 4, 4, 5, 9], Limits(2, 6))))
    kinds = [(group.attrib["class"], (group[0].text or "").rsplit(" ", 1)[1])
             for group in drawn.iter(f"{SVG}g")]
    assert sum(int(count) for kind, count in kinds if kind == "bin out") == 2
    assert sum(int(count) for kind, count in kinds if kind == "bin") == 8
    hollow = [group[1].attrib["fill"] for group in drawn.iter(f"{SVG}g")
              if group.attrib["class"] == "bin out"]
    assert set(hollow) == {"#fff"}


def test_the_pareto_adds_up() -> None:
    drawn = failure_pareto(failures(*range(60, 0, -1)))
    own = [float(one.attrib["width"]) for one in _rectangles(drawn, "own")[1:]]
    cumulated = [float(one.attrib["width"]) for one in _rectangles(drawn, "cumulated")[1:]]
    assert len(own) == 12
    assert cumulated[0] == pytest.approx(own[0], abs=0.02)
    assert cumulated[5] == pytest.approx(sum(own[:6]), abs=0.1)
    assert cumulated[-1] == max(cumulated) == pytest.approx(sum(own), abs=0.2)
    assert "49 other steps" in drawn


def test_weeks_are_drawn_instead_of_too_many_days() -> None:
    assert ENGLISH.yields in yield_over_days(days(120))
    drawn = yield_over_days(days(121))
    # The first of January's days is a Friday: 18 weeks have one of the 121 days.
    assert ENGLISH.yields_by_week in drawn and len(_rectangles(drawn, "runs")) == 18
    assert "week from 2026-01-26" in drawn


def test_words_can_be_others() -> None:
    words = replace(ENGLISH, first_pass="erster Versuch", no_failure="\u65e0\u5931\u8d25")
    assert "erster Versuch" in yield_over_days(days(2), words)
    assert "\u65e0\u5931\u8d25" in failure_pareto([], words)


@pytest.mark.parametrize("share, text", [
    (None, "\u2013"), (1.0, "100 %"), (0.9999, "99.9 %"), (0.5, "50 %"), (0.0, "0 %"),
    (1 / 3, "33.3 %")])
def test_a_share_is_never_rounded_to_all(share: float | None, text: str) -> None:
    assert share_text(share) == text


def test_axes() -> None:
    assert ticks(0, 10, 5) == [0, 2, 4, 6, 8, 10]
    assert ticks(0, 3, 5, whole=True) == [0, 1, 2, 3]
    assert ticks(0.87, 1.0, 5) == pytest.approx([0.9, 0.95, 1.0])
    assert tick_text(0.25, 0.25) == "0.25" and tick_text(-0.0, 0.1) == "0.0"
    assert tick_text(1e9, 1e6) == "1000000000"
    assert mean_text(2000.1534, 60) == "2000.2" and mean_text(4.0104321, 0.02) == "4.0104"
    assert [tick.text for tick in day_ticks(date(2026, 1, 30), date(2026, 2, 2), 8)] == [
        "2026-01-30", "2026-01-31", "2026-02-01", "2026-02-02"]
    assert [tick.text for tick in day_ticks(date(2026, 1, 30), date(2026, 12, 31), 8)] == [
        "2026-03", "2026-05", "2026-07", "2026-09", "2026-11"]
    assert cut("\u7535\u6c60" * 9, 60).endswith("\u2026") and cut("ab\x07", 99) == "ab\\x07"
