"""The guide to statistics: its examples come out as it says, and every figure is named."""

from __future__ import annotations

import re
from datetime import date, datetime, timezone

import pytest
from station_peer import ROOT

from amt_line.report.statistics_data import YIELD_FIGURES, statistics_document
from amt_line.statistics.figures import statistics_of
from amt_line.statistics.filter import Filter
from amt_line.statistics.rows import Limits, Place, Rows, Run, ValueCounts, ValueKey
from amt_line.statistics.spread import Numbers, capability
from amt_line.statistics.values import FEW, MOST_LIMITS
from amt_line.statistics.yields import DayKey

GUIDE = (ROOT / "docs" / "line.md").read_text(encoding="utf-8")
CHAPTER = GUIDE.partition("## How to read the statistics\n")[2].split("\n## ")[0]


def the_runs() -> list[Run]:
    found = re.findall(r"^\| (\w*) ?\| (\w+) \| ([\dT:-]+) \| ([A-Z]+) \|$", CHAPTER, re.MULTILINE)
    return [Run(f"{number:02}", dut, verdict, plan, "1", "bench", "1",
                datetime.fromisoformat(began).replace(tzinfo=timezone.utc), None, 1.0)
            for number, (dut, plan, began, verdict) in enumerate(found)]


def test_the_example_of_runs() -> None:
    runs = the_runs()
    assert len(runs) == 10
    found = statistics_of(Rows(runs=runs, history=runs, beside=runs), Filter())
    whole, tuesday = found.all, found.days[DayKey(date(2026, 3, 3))]
    assert (whole.handsets, whole.first_passed, whole.final_passed, whole.in_doubt,
            whole.retests, whole.unnamed) == (5, 3, 3, 1, 2, 1)
    assert "first-pass yield 3 of 5, 60 %" in CHAPTER.replace("\n", " ")
    assert "final yield 3 of 5, 60 %" in CHAPTER and whole.final_yield == pytest.approx(0.6)
    assert (tuesday.runs, tuesday.handsets, tuesday.final_yield) == (3, 0, None)


def test_the_example_of_a_value() -> None:
    text = re.search(r"By hand: ([\d, ]+) with limits", CHAPTER)
    assert text
    found = Numbers.of(float(one) for one in text.group(1).split(",")).spread()
    assert found is not None and found.deviation is not None
    both = capability(found, -1, 14)
    assert both.cp is not None and both.cpk is not None
    for number in (found.deviation, both.cp, both.cpk):
        assert f"{number:.3f}" in CHAPTER
    assert f"{found.mean:g}" == "5"


def test_the_chapter_names_every_figure() -> None:
    key = ValueKey(Place("End", "f", 1, "step"), "adc", "", Limits())
    document = statistics_document(statistics_of(
        Rows(values={key: ValueCounts({1.0: 1})}), Filter()))
    keys = {"min", "max", "plan", "step", "value", "unit"}
    names = {*YIELD_FIGURES, "runs", "failed", "errors", "count", "median", "p95", "total",
             *(document["values"][0].keys() - keys), *document["values"][0]["histogram"]}
    for name in names:
        assert f"`{name}`" in CHAPTER, f"{name} is not explained"
    assert f"fewer than {FEW} values" in CHAPTER and MOST_LIMITS == 5
    assert "than five different pairs" in CHAPTER.replace("\n", " ").replace("  ", " ")


def test_the_chapter_names_every_option() -> None:
    from amt_line.cli.stats import stats

    for option in stats.params:
        name = option.opts[-1]
        if option.expose_value:
            assert name in CHAPTER, f"{name} is not explained"
