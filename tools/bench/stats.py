"""Measure the statistics of a large store: `./dev bench stats`."""

import argparse
import json
import os
import random
import sys
import tempfile
import time
from datetime import datetime, timedelta, timezone
from typing import Any, Callable, Iterator

from amt_line.report.statistics_file import statistics_page
from amt_line.statistics.figures import Statistics
from amt_line.statistics.filter import Filter
from amt_line.store import Store
from amt_line.store.figures import gather

VALUES = 1_000_000
STEPS, VALUES_A_STEP = 20, 2
DAYS = 30
BEGIN = datetime(2026, 1, 1, tzinfo=timezone.utc)
DAY_TARGET_S, ALL_TARGET_S = 1.0, 10.0


def _utc(moment: datetime) -> str:
    return moment.isoformat(timespec="milliseconds").replace("+00:00", "Z")


def records(runs: int) -> Iterator[str]:
    """Records of so many runs in the period, five in a hundred of them failed, as texts."""
    chance = random.Random(runs)
    for number in range(runs):
        began = BEGIN + timedelta(days=DAYS) * (number / runs)
        verdict = "PASS" if chance.random() < 0.95 else "FAIL"
        yield json.dumps({
            "record": 1, "run": f"{number:08x}-0000-4000-8000-{number:012x}", "state": "ended",
            "verdict": verdict, "exit_status": 0, "reason": "", "advice": "",
            "dut": f"KEL{number - (number % 20 == 0):010d}", "station": f"bench-{number % 4}",
            "operator": "bench", "slot": str(number % 8), "port": "/dev/ttyACM0",
            "channel": "pc", "tool": {"name": "amt-station", "version": "0"}, "inputs": {},
            "plan": {"title": "End of line", "version": "7", "path": "end.toml",
                     "sha256": "0" * 64, "steps": STEPS},
            "began": _utc(began), "ended": _utc(began + timedelta(seconds=40)), "seconds": 40.0,
            "begin": [], "remarks": [],
            "steps": [_step(step, verdict, began, chance) for step in range(1, STEPS + 1)]})


def _step(number: int, verdict: str, began: datetime, chance: random.Random) -> dict[str, Any]:
    values = [{"name": f"value {index}", "unit": "mV", "verdict": "pass",
               "limits": {"min": 1800, "max": 2200, "marginal_min": 1850},
               # A converter's number beside one that hardly ever comes twice.
               "value": round(chance.gauss(2000, 40), 0 if index else 6)}
              for index in range(VALUES_A_STEP)]
    return {"number": number, "section": "step", "name": f"battery measurement {number}",
            "kind": "command", "verdict": verdict.lower() if number == STEPS else "pass",
            "attempts": 1, "began": _utc(began), "seconds": round(chance.uniform(0.1, 2), 6),
            "reason": "", "advice": "", "exit_status": 0, "forced": [], "values": values,
            "earlier": [], "exchanges": [], "remarks": []}


def measured(what: str, work: Callable[[], Any], target: float | None = None) -> tuple[Any, bool]:
    """The work's result, and whether it kept its target by the processor's time."""
    clock, processor = time.perf_counter(), time.process_time()
    result = work()
    seconds, own = time.perf_counter() - clock, time.process_time() - processor
    aim = f"  (target {target:g} s)" if target else ""
    print(f"  {what:36}{own:7.2f} s of processor, {seconds:7.2f} s by the clock{aim}", flush=True)
    return result, target is None or own <= target


def main() -> int:
    """Fill a SQLite store through its own bulk insert, and measure."""
    parser = argparse.ArgumentParser(prog="./dev bench stats", description=__doc__)
    parser.add_argument("values", nargs="?", type=int, default=VALUES,
                        help="how many values (default: %(default)s)")
    values = parser.parse_args(sys.argv[2:]).values
    if values < 10_000:
        parser.error("10000 values or more")
    runs = values // (STEPS * VALUES_A_STEP)
    day = Filter(since=BEGIN + timedelta(days=DAYS - 1))
    print(f"\nStatistics of {values} values in {runs} runs of {DAYS} days, in SQLite; load of the "
          f"machine {os.getloadavg()[0]:.1f}")
    with tempfile.TemporaryDirectory(prefix="bench-stats-") as folder, \
            Store.open(f"sqlite:///{folder}/line.sqlite") as store:
        measured("fill the store", lambda: store.put_new(records(runs)))
        found, in_time_day = measured("a day", lambda: gather(store, day), DAY_TARGET_S)
        whole, in_time_all = measured("everything", lambda: gather(store), ALL_TARGET_S)
        measured("the page of everything", lambda: statistics_page(whole))
    is_whole = _is_whole(found, runs // DAYS) and _is_whole(whole, runs)
    if not is_whole:
        print("FAIL: values are missing")
    elif not (in_time_day and in_time_all):
        print("FAIL: slower than aimed at")
    else:
        print("PASS: in time, nothing missing")
    return 0 if is_whole and in_time_day and in_time_all else 1


def _is_whole(found: Statistics, runs: int) -> bool:
    counted = sum(one.spread.count for one in found.values)
    return counted == found.all.runs * STEPS * VALUES_A_STEP and abs(found.all.runs - runs) <= 1
