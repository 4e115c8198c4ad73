"""Measure the daemon against its floor, and tell which goals are missed: `./dev bench`."""

import argparse
import os
import sys

from tools.bench import calls, codec, line, link, size, slots, stats
from tools.bench.figures import Figure, conclude
from tools.build import build

RUNS = 5

# In the order in which they are measured: the stable figures come first.
GROUPS = {**link.GROUPS, **codec.GROUPS, **size.GROUPS, **calls.GROUPS}
STATION = "station"


def arguments() -> argparse.Namespace:
    """The command line."""
    parser = argparse.ArgumentParser(
        prog="./dev bench", description=__doc__,
        epilog="./dev bench line [HANDSETS] measures many handsets on one line instead, "
        "./dev bench stats [VALUES] the statistics of a large store. The exit status is 1 when a "
        "goal is missed; the last lines name it.")
    parser.add_argument("--runs", type=int, default=RUNS, metavar="N",
                        help=f"measure everything N times (default: {RUNS})")
    parser.add_argument("--only", action="append", choices=[*GROUPS, STATION], metavar="GROUP",
                        help=f"only these figures, of {', '.join([*GROUPS, STATION])}; may be "
                        "given several times")
    parser.add_argument("--all-cores", action="store_true",
                        help="let the system place the processes, and measure that too")
    options = parser.parse_args()
    if options.runs < 1:
        parser.error("--runs takes a number from 1")
    return options


def main() -> int:
    """Measure everything. The log goes to its file, as in service."""
    if sys.argv[1:2] == ["line"]:
        return slots.main()
    if sys.argv[1:2] == ["stats"]:
        return stats.main()
    options = arguments()
    chosen = options.only or [*GROUPS, STATION]
    build("release", ("--target", "handset", "link-bench", "micro-bench", "codec-bench"))
    print(f"Load of this machine when the measurements began: {os.getloadavg()[0]:.1f}. "
          "Both sides take turns;\na wake-up costs 5 or 50 microseconds, as the system places "
          "processes, so processor time\n(the scheduler's own account) stands first, and round "
          "trips are compared turn by turn.")
    if not options.all_cores:
        # Waking a process on another core costs more than all that is measured here, and which
        # side is placed there is chance.
        os.sched_setaffinity(0, {min(os.sched_getaffinity(0))})
        print("Everything runs on one core, so that both sides are placed alike (--all-cores).")
    figures: list[Figure] = []
    for name, measure in GROUPS.items():
        if name in chosen:
            figures += measure(options.runs)
    if STATION in chosen:
        line.bench_station()
    print("\nLeft out, because a pause is part of them: every write of a factory file"
          "\n(two pauses of 50 ms), power-off (2 s), the battery ADC (20 ms)."
          f"\nLoad when they ended: {os.getloadavg()[0]:.1f}.")
    return conclude(figures)
