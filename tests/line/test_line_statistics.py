"""Statistics of runs: worked examples, counted by hand beside each."""

from __future__ import annotations

from datetime import date, datetime, timedelta, timezone
from zoneinfo import ZoneInfo

import pytest

from amt_line.statistics.figures import statistics_of
from amt_line.statistics.filter import Filter, since_from, until_from, zone_named
from amt_line.statistics.rows import Rows, Run
from amt_line.statistics.yields import DayKey, PlanKey, SlotKey, StationKey, Yields

MONDAY = datetime(2026, 3, 2, 8, 0, tzinfo=timezone.utc)


def run(number: int, dut: str, verdict: str, minutes: float, station: str = "A", slot: str = "1",
        plan: str = "End", version: str = "7", seconds: float = 60.0) -> Run:
    """A run that began so many minutes after Monday's eight o'clock."""
    began = MONDAY + timedelta(minutes=minutes)
    ended = began + timedelta(seconds=seconds) if verdict else None
    return Run(f"run-{number:03}", dut, verdict, plan, version, station, slot, began, ended,
               seconds if verdict else None)


DAY = 24 * 60

# Two days of two stations. By hand, a line a handset:
#   K1 passes at once                                   first PASS, at the end PASS
#   K2 fails, passes an hour later                      first FAIL, at the end PASS; 1 retest
#   K3 fails twice, the second time on Tuesday at B     first FAIL, at the end FAIL; 1 retest
#   K4 is an error, then passes                         first PASS, at the end PASS
#   K5 passes, and is aborted on Tuesday                first PASS, at the end in doubt
#   K6 is an error only                                 never judged: no handset of the yields
#   K7 passes on Tuesday at B, and its run beside has not ended   in doubt
#   a run without a handset's name passes               a run, but nobody's first
HISTORY = [
    run(1, "K1", "PASS", 0), run(2, "K2", "FAIL", 2), run(3, "K3", "FAIL", 4),
    run(4, "K4", "ERROR", 6), run(5, "K4", "PASS", 8), run(6, "K5", "PASS", 10),
    run(7, "K6", "ERROR", 12), run(8, "K2", "PASS", 62), run(9, "K3", "FAIL", DAY, "B"),
    run(10, "K5", "ABORTED", DAY + 2, "B"), run(11, "K7", "PASS", DAY + 4, "B"),
    run(12, "K7", "", DAY + 6, "B"), run(13, "", "PASS", DAY + 8, "B")]


def counted(runs: list[Run], history: list[Run] | None = None, chosen: Filter = Filter()
            ) -> Yields:
    rows = Rows(runs=runs, history=runs if history is None else history, beside=runs)
    return statistics_of(rows, chosen).all


def shares(one: Yields) -> tuple[int, int, int, int, int]:
    return (one.handsets, one.first_passed, one.final_passed, one.in_doubt, one.retests)


def test_runs_and_handsets_are_counted() -> None:
    figures = counted(HISTORY)
    assert (figures.runs, figures.passed, figures.failed, figures.errors, figures.aborted,
            figures.unfinished, figures.unnamed) == (13, 6, 3, 2, 1, 1, 1)
    assert shares(figures) == (6, 4, 3, 2, 2)
    assert figures.first_pass_yield == pytest.approx(4 / 6)
    assert figures.final_yield == pytest.approx(3 / 6)
    assert figures.passed + figures.failed == figures.handsets + figures.retests + figures.unnamed


def test_a_handset_is_counted_where_it_was_first() -> None:
    whole = statistics_of(Rows(runs=HISTORY, history=HISTORY, beside=HISTORY), Filter())
    # Monday: K1 to K5; K3 and K5 take Tuesday's end along. Tuesday: K7.
    assert [(key.day, shares(one)) for key, one in whole.days.items()] == [
        (date(2026, 3, 2), (5, 3, 3, 1, 1)), (date(2026, 3, 3), (1, 1, 0, 1, 1))]
    assert [(key, shares(one)) for key, one in whole.stations.items()] == [
        (StationKey("A"), (5, 3, 3, 1, 1)), (StationKey("B"), (1, 1, 0, 1, 1))]
    assert list(whole.slots) == [SlotKey("A", "1"), SlotKey("B", "1")]
    assert list(whole.plans) == [PlanKey("End")]
    for groups in (whole.days, whole.stations, whole.slots, whole.plans):
        columns = zip(*map(shares, groups.values()))  # type: ignore[attr-defined]
        assert tuple(map(sum, columns)) == shares(whole.all), "groups add up to the whole"


def test_yesterdays_failure_is_no_first_pass_today() -> None:
    today = [one for one in HISTORY if one.began >= MONDAY + timedelta(days=1)]
    again = [run(20, "K2", "PASS", DAY + 20)]
    figures = counted(today + again, HISTORY + again)
    # Only K7 begins today; K2 and K3 were judged yesterday.
    assert shares(figures) == (1, 1, 0, 1, 2)


def test_another_version_or_station_is_no_first_try_and_another_plan_is() -> None:
    runs = [run(1, "K1", "FAIL", 0), run(2, "K1", "PASS", 5, "B", version="8"),
            run(3, "K1", "PASS", 9, plan="Audio")]
    assert shares(counted(runs)) == (2, 1, 2, 0, 1)


def test_a_pass_that_is_followed_by_a_failure_is_none_at_the_end() -> None:
    assert shares(counted([run(1, "K1", "PASS", 0), run(2, "K1", "FAIL", 5)])) == (1, 1, 0, 0, 1)


def test_nothing_has_no_yield() -> None:
    figures = counted([])
    assert figures.first_pass_yield is None and figures.final_yield is None
    assert figures.takt is None and figures.run_median is None
    assert counted([run(1, "K", "ERROR", 0)]).first_pass_yield is None


def test_runs_of_one_moment_keep_an_order() -> None:
    runs = [run(2, "K1", "FAIL", 0), run(1, "K1", "PASS", 0)]
    assert shares(counted(runs)) == shares(counted(runs[::-1])) == (1, 1, 0, 0, 1)


def test_takt_is_the_time_between_ends_in_a_slot() -> None:
    # Slot 1 ends at minutes 1, 3, 6 (gaps 120, 180), breaks off for 20 minutes, ends at 27 and 29
    # (gap 120). Slot 2 ends at 1 and 11 (gap 600). All gaps: 120, 120, 180, 600.
    first = [run(index, f"K{index}", "PASS", minute) for index, minute in enumerate(
        (0, 2, 5, 26, 28))]
    second = [run(10, "L1", "ABORTED", 0, slot="2"), run(11, "L2", "ERROR", 10, slot="2")]
    rows = Rows(runs=first + second, history=first + second, beside=first + second)
    figures = statistics_of(rows, Filter())
    assert figures.all.takt == pytest.approx(150)
    assert figures.slots[SlotKey("A", "1")].takt == pytest.approx(120)
    assert figures.slots[SlotKey("A", "2")].takt == pytest.approx(600)


def test_takt_of_a_plan_knows_the_runs_between() -> None:
    runs = [run(1, "K1", "PASS", 0), run(2, "K2", "PASS", 6)]
    between = run(3, "K3", "PASS", 3, plan="Audio")
    rows = Rows(runs=runs, history=runs, beside=[*runs, between])
    assert statistics_of(rows, Filter(plan="End")).all.takt == pytest.approx(180)


def test_times_of_runs_are_those_of_judged_ones() -> None:
    runs = [run(1, "K1", "PASS", 0, seconds=10), run(2, "K2", "FAIL", 2, seconds=20),
            run(3, "K3", "ABORTED", 4, seconds=500)]
    figures = counted(runs)
    assert figures.run_median == pytest.approx(15) and figures.run_p95 == pytest.approx(19.5)


def test_a_day_is_one_of_the_zone() -> None:
    late = [run(1, "K1", "PASS", 15 * 60 + 30), run(2, "K2", "PASS", 0)]
    rows = Rows(runs=late, history=late, beside=late)
    assert list(statistics_of(rows, Filter()).days) == [DayKey(date(2026, 3, 2))]
    days = statistics_of(rows, Filter(zone=ZoneInfo("Asia/Shanghai"))).days
    assert list(days) == [DayKey(date(2026, 3, 2)), DayKey(date(2026, 3, 3))]


@pytest.mark.parametrize("text, since, until", [
    ("2026-03-02", "2026-03-01T23:00", "2026-03-02T23:00"),
    ("2026-03-02T06:00", "2026-03-02T05:00", "2026-03-02T05:00"),
    ("2026-03-02T06:00Z", "2026-03-02T06:00", "2026-03-02T06:00"),
    ("2026-03-29", "2026-03-28T23:00", "2026-03-29T22:00"),  # the clock is put forward
    ("today", "2026-03-02T23:00", "2026-03-03T23:00"),
    ("yesterday", "2026-03-01T23:00", "2026-03-02T23:00")])
def test_periods(text: str, since: str, until: str) -> None:
    zone, now = zone_named("Europe/Berlin"), datetime(2026, 3, 2, 23, 30, tzinfo=timezone.utc)
    wanted = [datetime.fromisoformat(moment).replace(tzinfo=timezone.utc)
              for moment in (since, until)]
    assert [since_from(text, zone, now), until_from(text, zone, now)] == wanted


@pytest.mark.parametrize("text", ["", "soon", "2026-13-01", "2026-02-30T10:00", "9999-12-31",
                                  "2026-03-02T25:00"])
def test_what_is_no_period(text: str) -> None:
    with pytest.raises(ValueError, match="is no time"):
        until_from(text, timezone.utc, MONDAY)


@pytest.mark.parametrize("name", ["Mars/Olympus", "", "../../etc/passwd", "/etc/localtime"])
def test_what_is_no_zone(name: str) -> None:
    with pytest.raises(ValueError, match="is no time zone"):
        zone_named(name)
