"""Which steps end most runs."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Sequence

from markupsafe import Markup

from amt_line.drawing.axis import Scale
from amt_line.drawing.days import nothing, share_text
from amt_line.drawing.svg import BLUE, INK, PALE_BLUE, SOFT_INK, Drawing, cut, text_width
from amt_line.drawing.words import ENGLISH, Words
from amt_line.statistics.steps import Failures

_WIDTH, _ROW, _TOP, _BOTTOM = 720.0, 24.0, 30.0, 26.0
_WIDEST_NAME, _RIGHT = 240.0, 64.0
_MOST_ROWS = 12


@dataclass(frozen=True)
class _Bar:
    name: str
    runs: int
    cumulated: int


def failure_pareto(failures: Sequence[Failures], words: Words = ENGLISH) -> Markup:
    """Failed runs by the step that failed first: its own share dark, with those above pale."""
    bars = _bars([one for one in failures if one.runs], words)
    if not bars:
        return nothing("pareto", words.pareto, words.no_failure)
    total = bars[-1].cumulated
    left = min(_WIDEST_NAME, max(text_width(bar.name) for bar in bars)) + 14
    base = _TOP + _ROW * len(bars)
    picture = Drawing("pareto", _WIDTH, base + _BOTTOM, words.pareto, words.pareto_more.format(
        count=total, step=f"{bars[0].name} ({bars[0].runs})"))
    x = Scale(0, 1, left, _WIDTH - _RIGHT)
    _legend(picture, left, words)
    for percent in (0, 25, 50, 75, 100):
        across = x(percent / 100)
        picture.line(across, _TOP - 4, across, base)
        picture.text(across, base + 16, f"{percent} %", "middle")
    for index, bar in enumerate(bars):
        _row(picture, bar, total, x, _TOP + _ROW * index, words)
    return picture.markup()


def _bars(failures: Sequence[Failures], words: Words) -> list[_Bar]:
    titles = {one.step.plan for one in failures}
    bars: list[_Bar] = []
    cumulated = 0
    shown = failures if len(failures) <= _MOST_ROWS else failures[:_MOST_ROWS - 1]
    for one in shown:
        cumulated += one.runs
        plan = f" \u2013 {one.step.plan}" if len(titles) > 1 else ""
        bars.append(_Bar(f"{one.step.label}{plan}", one.runs, cumulated))
    rest = failures[len(shown):]
    if rest:
        runs = sum(one.runs for one in rest)
        bars.append(_Bar(words.others.format(count=len(rest)), runs, cumulated + runs))
    return bars


def _legend(picture: Drawing, left: float, words: Words) -> None:
    picture.add("rect", x=left, y=5, width=12, height=10, fill=BLUE, class_="own")
    picture.text(left + 18, 14, words.own_share)
    there = left + 18 + text_width(words.own_share) + 18
    picture.add("rect", x=there, y=5, width=12, height=10, fill=PALE_BLUE, class_="cumulated")
    picture.line(there + 12, 3, there + 12, 17, INK, stroke_width=2)
    picture.text(there + 20, 14, words.cumulated)


def _row(picture: Drawing, bar: _Bar, total: int, x: Scale, top: float, words: Words) -> None:
    share, cumulated = bar.runs / total, bar.cumulated / total
    group = picture.group(words.pareto_row.format(
        step=bar.name, count=bar.runs, share=share_text(share), cumulated=share_text(cumulated)),
        "step")
    height = _ROW - 8
    picture.add("rect", group, x=x(0), y=top + 2, width=x(cumulated) - x(0), height=height,
                fill=PALE_BLUE, class_="cumulated")
    picture.add("rect", group, x=x(0), y=top + 2, width=max(x(share) - x(0), 1.5), height=height,
                fill=BLUE, class_="own")
    picture.add("line", group, x1=x(cumulated), y1=top - 1, x2=x(cumulated), y2=top + height + 5,
                stroke=INK, stroke_width=2)
    middle = top + 2 + height / 2 + 4
    picture.text(x(0) - 8, middle, cut(bar.name, _WIDEST_NAME), "end", INK)
    inside = x(share) - x(0) > text_width(str(bar.runs)) + 12
    picture.text(x(share) - 6 if inside else x(share) + 6, middle, str(bar.runs),
                 "end" if inside else "start", "#fff" if inside else INK, font_weight="600")
    picture.text(_WIDTH - 8, middle, share_text(cumulated), "end", SOFT_INK)
