"""The histogram of a value with its limits."""

from __future__ import annotations

from markupsafe import Markup

from amt_line.drawing.axis import Scale, mean_text, number_text, round_step, tick_text, ticks
from amt_line.drawing.svg import (AMBER, BLUE, INK, LINE, RED, SOFT_INK, Drawing, Label, place,
                                  text_width)
from amt_line.drawing.words import ENGLISH, Words
from amt_line.statistics.values import ValueFigures

_WIDTH, _PLOT_HEIGHT = 640.0, 150.0
_LEFT, _RIGHT, _BOTTOM = 56.0, 16.0, 40.0
# A limit that is further away than so many widths of the values would leave them a line.
_FAR = 8.0
# The bin of a number that all are is made for its limits.
_FAR_OF_ONE = 50.0


def value_histogram(figures: ValueFigures, words: Words = ENGLISH) -> Markup:
    """How often which number was measured, and where the limits are."""
    bins, spread, limits = figures.histogram, figures.spread, figures.limits
    name = f"{figures.value.step.label}, {figures.value.name}"
    drawn = _Histogram(figures, words)
    labels = place(drawn.labels(), 2, _WIDTH - 2)
    top = (max((one.row for one in labels), default=-1) + 1) * LINE + 8
    picture = Drawing(
        "histogram", _WIDTH, top + _PLOT_HEIGHT + _BOTTOM,
        words.histogram.format(name=name, count=spread.count),
        words.histogram_more.format(low=number_text(spread.minimum),
                                    high=number_text(spread.maximum),
                                    mean=mean_text(spread.mean, spread.deviation)))
    base = top + _PLOT_HEIGHT
    height = Scale(0, max(bins.counts) * 1.05, base, top)
    for count in ticks(0, height.high, 4, whole=True):
        picture.line(_LEFT, height(count), _WIDTH - _RIGHT, height(count))
        picture.text(_LEFT - 6, height(count) + 4, f"{count:.0f}", "end")
    for index, count in enumerate(bins.counts):
        if count:
            drawn.bar(picture, index, height, base)
    picture.line(_LEFT, base, _WIDTH - _RIGHT, base, SOFT_INK)
    drawn.x_axis(picture, base)
    for bound, colour, dashes in ((limits.near_low, AMBER, "2 3"), (limits.near_high, AMBER, "2 3"),
                                  (limits.low, RED, "7 3"), (limits.high, RED, "7 3"),
                                  (spread.mean, INK, "")):
        if bound is not None and drawn.low <= bound <= drawn.high:
            more = {"stroke_dasharray": dashes} if dashes else {}
            picture.line(drawn.x(bound), top - 3, drawn.x(bound), base, colour,
                         stroke_width=1.5, **more)
    for one in labels:
        picture.text(one.left, LINE * (one.row + 1) - 3, one.label.text, fill=one.label.fill,
                     class_=one.label.class_)
    return picture.markup()


class _Histogram:
    """The horizontal side of the drawing."""

    def __init__(self, figures: ValueFigures, words: Words) -> None:
        self._figures, self._words = figures, words
        edges = figures.histogram.edges
        self.low, self.high = edges[0], edges[-1]
        span = self.high - self.low
        far = span * (_FAR_OF_ONE if len(edges) == 2 else _FAR)
        near = [bound for bound in figures.limits
                if bound is not None and edges[0] - far <= bound <= edges[-1] + far]
        self.low, self.high = min([self.low, *near]), max([self.high, *near])
        alone = len(edges) == 2 and self.high - self.low == span
        room = (self.high - self.low) * (3.0 if alone else 0.03)
        self.low, self.high = self.low - room, self.high + room
        self.x = Scale(self.low, self.high, _LEFT, _WIDTH - _RIGHT)

    def labels(self) -> list[Label]:
        """What stands above the plot, the most important first."""
        limits, words, bins = self._figures.limits, self._words, self._figures.histogram
        spread = self._figures.spread
        found = [self._bound(limits.low, words.minimum, RED, "limit"),
                 self._bound(limits.high, words.maximum, RED, "limit"),
                 Label(self.x(spread.mean), words.mean.format(
                     number=mean_text(spread.mean, spread.deviation)), INK, "mean"),
                 self._bound(limits.near_low, words.near, AMBER, "near"),
                 self._bound(limits.near_high, words.near, AMBER, "near")]
        if bins.below:
            found.append(Label(_LEFT, f"\u25c0 {words.below.format(count=bins.below)}", SOFT_INK))
        if bins.above:
            found.append(Label(_WIDTH - _RIGHT, f"{words.above.format(count=bins.above)} \u25b6",
                               SOFT_INK))
        return [label for label in found if label is not None]

    def _bound(self, bound: float | None, words: str, fill: str, class_: str) -> Label | None:
        if bound is None:
            return None
        text = words.format(number=number_text(bound))
        if bound < self.low:
            return Label(_LEFT, f"\u25c0 {text}", fill, class_)
        if bound > self.high:
            return Label(_WIDTH - _RIGHT, f"{text} \u25b6", fill, class_)
        return Label(self.x(bound), text, fill, class_)

    def bar(self, picture: Drawing, index: int, height: Scale, base: float) -> None:
        """One bin; out of limits it is hollow."""
        bins, limits = self._figures.histogram, self._figures.limits
        low, high = bins.edges[index], bins.edges[index + 1]
        middle = (low + high) / 2
        out = (limits.low is not None and middle < limits.low) or (
            limits.high is not None and middle > limits.high)
        left, right = self.x(low), self.x(high)
        gap = min(1.0, (right - left) * 0.1)
        tip = self._words.bin.format(low=number_text(low), high=number_text(high),
                                     count=bins.counts[index])
        group = picture.group(tip, "bin out" if out else "bin")
        colours = {"fill": "#fff", "stroke": RED, "stroke_width": 1.5} if out else {"fill": BLUE}
        top = min(height(bins.counts[index]), base - 1)
        picture.add("rect", group, x=left + gap / 2, y=top, height=base - top,
                    width=max(right - left - gap, 0.8), **colours)

    def x_axis(self, picture: Drawing, base: float) -> None:
        """Round numbers below, and the unit."""
        most = 8
        step = round_step(self.high - self.low, most)
        widest = max(text_width(tick_text(number, step)) for number in (self.low, self.high))
        while most > 1 and (widest + 12) * most > _WIDTH - _LEFT - _RIGHT:
            most -= 1
        step = round_step(self.high - self.low, most)
        for number in ticks(self.low, self.high, most):
            picture.line(self.x(number), base, self.x(number), base + 4, SOFT_INK)
            text = tick_text(number, step)
            across = min(self.x(number), _WIDTH - text_width(text) / 2)
            picture.text(across, base + 16, text, "middle")
        value = self._figures.value
        unit = f" ({value.unit})" if value.unit else ""
        picture.text((_LEFT + _WIDTH - _RIGHT) / 2, base + 33, f"{value.name}{unit}", "middle",
                     INK)
