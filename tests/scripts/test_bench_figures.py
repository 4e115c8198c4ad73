"""The figures of `./dev bench`: when a goal is met, and what the last lines and the status say."""

import pytest

from tools.bench.figures import Figure, conclude, show


def figure(*values: float, sense: str = "at most", goal: float = 1.15, why: str = "") -> Figure:
    made = Figure("round trip", " us", sense, goal, why)  # type: ignore[arg-type]
    for value in values:
        made.add(value)
    return made


def test_median_decides() -> None:
    assert not figure(1.0, 1.1, 9.0).is_missed
    assert figure(1.0, 1.2, 1.3).is_missed
    assert not figure(1.15).is_missed, "the goal itself is met"
    assert not figure(4.0, 4.1, 2.0, sense="at least", goal=4).is_missed
    assert figure(3.9, 4.1, 2.0, sense="at least", goal=4).is_missed


def test_figure_without_a_goal_is_never_missed() -> None:
    assert not figure(99.0, sense="").is_missed
    assert not figure(sense="").is_missed


def test_what_could_not_be_measured_is_missed(capsys: pytest.CaptureFixture[str]) -> None:
    unknown = figure(why="nobody may trace here")
    assert unknown.is_missed
    assert conclude([unknown]) == 1
    assert capsys.readouterr().out.splitlines()[1:] == [
        "0 of 1 goals are met.",
        "missed: round trip: not measured, goal at most 1.15 us (nobody may trace here)"]


def test_row_shows_the_spread_the_goal_and_the_verdict(
        capsys: pytest.CaptureFixture[str]) -> None:
    show("Title", [figure(1.2, 1.0, 1.1), figure(2.0), figure(3.0, sense="")])
    rows = [line.split() for line in capsys.readouterr().out.splitlines()[3:]]
    assert rows == [["round", "trip", "1.00", "1.10", "1.20", "at", "most", "1.15", "us", "met"],
                    ["round", "trip", "2.00", "2.00", "2.00", "at", "most", "1.15", "us", "missed"],
                    ["round", "trip", "3.00", "3.00", "3.00"]]


def test_end_counts_the_goals_and_names_the_missed(capsys: pytest.CaptureFixture[str]) -> None:
    assert conclude([figure(1.0), figure(5.0, sense="")]) == 0
    assert capsys.readouterr().out.splitlines()[1:] == ["1 of 1 goals are met."]
    assert conclude([figure(1.0), figure(2.0)]) == 1
    assert capsys.readouterr().out.splitlines()[1:] == [
        "1 of 2 goals are met.", "missed: round trip: 2.00 us, goal at most 1.15 us"]
