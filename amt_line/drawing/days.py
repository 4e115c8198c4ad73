"""The yields over the days, and how many runs they are made of."""

from __future__ import annotations

from dataclasses import dataclass
from datetime import date, timedelta
from math import ceil
from typing import Mapping, Sequence

from markupsafe import Markup

from amt_line.drawing.axis import Scale, day_ticks, round_step, tick_text, ticks
from amt_line.drawing.svg import BLUE, GREEN, INK, SOFT_INK, Drawing, text_width
from amt_line.drawing.words import ENGLISH, Words
from amt_line.statistics.yields import DayKey, Yields

_WIDTH = 720.0
_LEFT, _TOP = 56.0, 14.0
_YIELD_HEIGHT, _RUNS_HEIGHT, _BETWEEN, _BOTTOM = 150.0, 48.0, 24.0, 26.0
_BASE = _TOP + _YIELD_HEIGHT + _BETWEEN + _RUNS_HEIGHT
_MOST_MARKED, _MOST_DAYS = 62, 120
_SPAN = 0.05
_GREY = "#8b97a3"


def share_text(share: float | None) -> str:
    """A share for people; one that is not quite all is never rounded to all."""
    if share is None:
        return "\u2013"
    percent = round(share * 100, 1)
    if percent == 100 and share < 1:
        percent = 99.9
    return f"{percent:.1f} %" if percent % 1 else f"{percent:.0f} %"


@dataclass(frozen=True)
class _Point:
    """A day, or a week from its Monday on."""

    day: date
    runs: int
    handsets: int
    first_passed: int
    final_passed: int

    @property
    def first(self) -> float | None:
        return self.first_passed / self.handsets if self.handsets else None

    @property
    def final(self) -> float | None:
        return self.final_passed / self.handsets if self.handsets else None


_Points = Sequence[_Point]


def _points(days: Mapping[DayKey, Yields], by_week: bool) -> list[_Point]:
    found: dict[date, list[Yields]] = {}
    for key, one in sorted(days.items()):
        day = key.day - timedelta(days=key.day.weekday()) if by_week else key.day
        found.setdefault(day, []).append(one)
    return [_Point(day, sum(one.runs for one in several), sum(one.handsets for one in several),
                   sum(one.first_passed for one in several),
                   sum(one.final_passed for one in several)) for day, several in found.items()]


def yield_over_days(days: Mapping[DayKey, Yields], words: Words = ENGLISH) -> Markup:
    """First-pass yield (round marks) and final yield (square ones, dashed) of each day.

    So many days that they could not be told apart are drawn by the week.
    """
    if not days:
        return nothing("yields", words.yields, words.nothing)
    by_week = (max(days).day - min(days).day).days >= _MOST_DAYS
    found = _points(days, by_week)
    right = 30 + max(text_width(f"\u25cf {word} 99.9 %", bold=True)
                     for word in (words.first_pass, words.final))
    latest = found[-1]
    picture = Drawing(
        "yields", _WIDTH, _BASE + _BOTTOM, words.yields_by_week if by_week else words.yields,
        words.yields_more.format(
            count=len(found), first=min(days).day, last=max(days).day,
            latest=f"{words.first_pass} {share_text(latest.first)}, "
            f"{words.final} {share_text(latest.final)}"))
    x = _DayScale(found[0].day, found[-1].day, 7 if by_week else 1, _LEFT, _WIDTH - right)
    _yield_axis(picture, found, _WIDTH - right)
    _run_bars(picture, found, x, words)
    _day_axis(picture, found, x)
    y = _yield_scale(found)
    ends = []
    for word, colour, dashes, shares in (
            (words.final, GREEN, "6 3", [(one.day, one.final) for one in found]),
            (words.first_pass, BLUE, "", [(one.day, one.first) for one in found])):
        known = [(x(day), y(share), share) for day, share in shares if share is not None]
        if known:
            points = [(across, down) for across, down, _ in known]
            _curve(picture, points, colour, dashes, len(found) <= _MOST_MARKED)
            ends.append((points[-1], f"{word} {share_text(known[-1][2])}", colour, dashes))
    _end_labels(picture, ends, _WIDTH - right)
    _tips(picture, found, x, words, by_week)
    return picture.markup()


class _DayScale:
    """Where the middle of a day, or of a week, is, and how wide it is."""

    def __init__(self, first: date, last: date, days: int, left: float, right: float) -> None:
        self._first, self._days = first, days
        self.left, self.right = left, right
        self.width = (right - left) / ((last - first).days // days + 1)

    def __call__(self, day: date) -> float:
        return self.left + ((day - self._first).days / self._days + 0.5) * self.width


def _yield_scale(points: _Points) -> Scale:
    lowest = min((share for one in points for share in (one.first, one.final)
                  if share is not None), default=0.0)
    span = max(1 - lowest, _SPAN)
    step = round_step(span, 5)
    low = max(0.0, 1 - step * ceil(span / step - 1e-9))
    return Scale(low, 1.0, _TOP + _YIELD_HEIGHT, _TOP)


def _yield_axis(picture: Drawing, points: _Points, right: float) -> None:
    y = _yield_scale(points)
    step = round_step(y.high - y.low, 5) * 100
    for share in ticks(y.low, y.high, 5):
        picture.line(_LEFT, y(share), right, y(share))
        picture.text(_LEFT - 6, y(share) + 4, f"{tick_text(share * 100, step)} %", "end")


def _run_bars(picture: Drawing, points: _Points, x: _DayScale, words: Words) -> None:
    most = max(one.runs for one in points)
    y = Scale(0, most, _BASE, _BASE - _RUNS_HEIGHT)
    width = min(max(x.width * 0.7, 0.6), 40.0)
    for one in points:
        picture.add("rect", x=x(one.day) - width / 2, y=y(one.runs), width=width,
                    height=_BASE - y(one.runs), fill=_GREY, class_="runs")
    picture.text(_LEFT - 6, _BASE - _RUNS_HEIGHT + 9, f"{most}", "end")
    picture.text(_LEFT - 6, _BASE, "0", "end")
    picture.text(x.right + 8, _BASE - _RUNS_HEIGHT / 2 + 4, words.runs)


def _day_axis(picture: Drawing, points: _Points, x: _DayScale) -> None:
    picture.line(x.left, _BASE, x.right, _BASE, SOFT_INK)
    most = int((x.right - x.left) / (text_width("2026-00-00") + 14))
    for tick in day_ticks(points[0].day, points[-1].day, most):
        picture.line(x(tick.day), _BASE, x(tick.day), _BASE + 4, SOFT_INK)
        picture.text(x(tick.day), _BASE + 18, tick.text, "middle")


def _curve(picture: Drawing, points: Sequence[tuple[float, float]], colour: str, dashes: str,
           marked: bool) -> None:
    more = {"stroke_dasharray": dashes} if dashes else {}
    if len(points) > 1:
        path = " ".join(f"{across:.2f},{down:.2f}" for across, down in points)
        picture.add("polyline", points=path, fill="none", stroke=colour, stroke_width=2,
                    class_="final" if dashes else "first-pass", stroke_linejoin="round", **more)
    if not marked and len(points) > 1:
        return
    for across, down in points:
        if dashes:
            picture.add("rect", x=across - 3.5, y=down - 3.5, width=7, height=7, fill="#fff",
                        stroke=colour, stroke_width=1.8, class_="final")
        else:
            picture.add("circle", cx=across, cy=down, r=3, fill=colour, class_="first-pass")


def _end_labels(picture: Drawing, ends: Sequence[tuple[tuple[float, float], str, str, str]],
                right: float) -> None:
    """What each curve is, beside its end; one is moved when both end alike."""
    placed: list[float] = []
    for (_, down), text, colour, dashes in sorted(ends, key=lambda end: end[0][1]):
        y = max(down, placed[-1] + 16) if placed else down
        placed.append(y)
        mark = "\u25a1" if dashes else "\u25cf"
        picture.text(right + 6, y + 4, f"{mark} {text}", fill=colour,
                     class_="final" if dashes else "first-pass", font_weight="600")


def _tips(picture: Drawing, points: _Points, x: _DayScale, words: Words, by_week: bool) -> None:
    """Under the pointer each day tells its figures."""
    for one in points:
        day = words.week.format(day=one.day) if by_week else one.day
        group = picture.group(words.day.format(
            day=day, first=share_text(one.first), final=share_text(one.final),
            handsets=one.handsets, runs=one.runs), "day")
        picture.add("rect", group, x=x(one.day) - x.width / 2, y=_TOP, width=x.width,
                    height=_BASE - _TOP, fill="transparent")


def nothing(kind: str, title: str, text: str) -> Markup:
    """A picture of nothing, which says so."""
    picture = Drawing(kind, _WIDTH, 60, title, text)
    picture.text(_WIDTH / 2, 34, text, "middle", INK)
    return picture.markup()
