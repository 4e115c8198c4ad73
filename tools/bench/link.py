"""What a request costs over what it has to cost: processor time first, round trips beside it."""

import json
import os
import subprocess
import sys
from typing import Any, Callable

from amt_simulator import Handset
from tools.bench.bare_modem import bare_modem
from tools.bench.daemon import BUILD, daemon_pid, log_tail
from tools.bench.figures import Figure, show

ROUNDS = "4000"
TUNNEL_ROUNDS = "2000"
THROUGHPUT_BYTES = "20000000"
PROGRESS_TAIL = 150

Measured = dict[str, Any]

THREADS_COST = ("the daemon serves several lines, so it has several threads, and each of their "
                "system calls takes locks that a single thread's does not; the rest clears "
                "whole buffers")


def run_link_bench(handset: Handset, arguments: list[str], lines: tuple[int, ...]) -> Measured:
    """One measurement of link-bench, which inherits the lines; the floor logs beside the daemon."""
    state = handset.log.path.parent
    environment = {**os.environ, "VX_HOST_LOG": str(state / "floor-log.txt"),
                   "FLOOR_OUTPUT": str(state / "floor-stdout.txt")}
    ended = subprocess.run([str(BUILD / "bin" / "link-bench"), *arguments], pass_fds=lines,
                           env=environment, capture_output=True, text=True, check=False)
    if ended.returncode != 0:
        sys.exit(f"dev: {ended.stderr.strip()}")
    return json.loads(ended.stdout)  # type: ignore[no-any-return]


def check_floor(handset: Handset, count: int, prints: bool = False) -> None:
    """The floor must have logged, and printed, for its last request what the daemon has."""
    state = handset.log.path.parent
    ours, floors = (log_tail(path, count) for path in (handset.log.path, state / "floor-log.txt"))
    if ours != floors:
        sys.exit(f"dev: the floor logs something else than the daemon:\n{floors}\n{ours}")
    printed = (state / "floor-stdout.txt").read_bytes()[-PROGRESS_TAIL:]
    if prints and not handset.stdout().endswith(printed):
        sys.exit("dev: the floor prints something else than the daemon")


class Comparison:
    """The figures of one request against its floor."""

    def __init__(self, what: str, floor: str, goal: float, tail_goal: float | None = None,
                 why: str = "") -> None:
        self.processor = Figure(f"{what}: processor time over the {floor}'s", "", "at most", goal,
                                why)
        self.paired = Figure(f"{what}: round trip over the {floor}'s, paired median", "",
                             "at most", goal, why)
        self.tail = Figure(f"{what}: 99th percentile over the {floor}'s")
        if tail_goal is not None:
            self.tail.sense, self.tail.goal = "at most", tail_goal
            self.tail.floor = "on a busy machine, of when each side was out of a processor"
        self.times = [Figure(f"    processor time a request, {side} (us)", digits=1)
                      for side in ("daemon", floor)]
        self.trips = [Figure(f"    round trip, {side} (us)", digits=1)
                      for side in ("daemon", floor)]

    def add(self, measured: Measured) -> None:
        """Take one run in."""
        sides = (measured["daemon"], measured["other"])
        self.processor.add(measured["processor_ratio"])
        self.paired.add(measured["paired_ratio"])
        self.tail.add(sides[0]["p99_us"] / sides[1]["p99_us"])
        for side, time, trip in zip(sides, self.times, self.trips):
            time.add(side["processor_us"])
            trip.add(side["median_us"])

    @property
    def figures(self) -> list[Figure]:
        """All of them, processor time first."""
        return [self.processor, *self.times, self.paired, *self.trips, self.tail]


def bench_round_trips(runs: int) -> list[Figure]:
    """A packet, acknowledged and answered, and an AT text, over the PC line."""
    comparisons = {name: Comparison(title, "floor", 1.15, 1.5, THREADS_COST) for name, title in
                   (("packet", "PC packet"), ("text", "AT text"))}
    threaded = {name: Figure(f"{title}: processor time over a floor of as many threads")
                for name, title in (("packet", "PC packet"), ("text", "AT text"))}
    with Handset("pc", modem="held") as handset:
        handset.wait_ready()
        line, pid = handset.pc.fileno(), daemon_pid(handset)
        threads = len(handset.inspect().threads)

        def measure(name: str, count: int) -> Measured:
            arguments = ["round-trip", str(pid), str(line), name, str(count), ROUNDS]
            measured = run_link_bench(handset, arguments, (line,))
            check_floor(handset, measured["records"])
            return measured

        for name, comparison in comparisons.items():
            for _ in range(runs):
                comparison.add(measure(name, 1))
                threaded[name].add(measure(name, threads)["processor_ratio"])
    figures = [figure for name, comparison in comparisons.items()
               for figure in (*comparison.figures, threaded[name])]
    show("Request to whole response over the PC line; the floor reads it, formats and writes the "
         "same log records,\nand writes the same frames, in a process of one thread", figures)
    return figures


def bench_tunnel(runs: int) -> list[Figure]:
    """A request of the app that the modem answers: two hops."""
    comparison = Comparison("tunnel", "bare relay", 1.2)
    with Handset("packet") as handset, bare_modem() as modem:
        handset.wait_ready()
        app, pid = handset.app.fileno(), daemon_pid(handset)
        for _ in range(runs):
            measured = run_link_bench(
                handset, ["tunnel", str(pid), str(app), str(modem), TUNNEL_ROUNDS], (app, modem))
            comparison.add(measured)
            check_floor(handset, measured["records"], prints=True)
    show("READIMEI through the tunnel; the bare relay stands in front of the same modem and writes "
         "the same records\nand progress texts", comparison.figures)
    return comparison.figures


SOCAT_COST = ("socat writes no log: the daemon writes {} records a chunk, each a system call, "
              "before and behind the bytes")


def bench_pass_through(runs: int) -> list[Figure]:
    """What the daemon copies between the modem and the PC, as socat copies it."""
    directions = {"to_pc": ("modem to PC", 4), "to_modem": ("PC to modem", 6)}
    paired, trips, rates, copied = {}, {}, {}, {}
    for key, (title, records) in directions.items():
        why = SOCAT_COST.format(records)
        paired[key] = Figure(f"{title}: a line's latency over socat's, paired median", "",
                             "at most", 1.0, why)
        rates[key] = Figure(f"{title}: throughput over socat's", "", "at least", 1.0, why)
        trips[key] = [Figure(f"    a line, {side} (us)", digits=1) for side in ("daemon", "socat")]
        copied[key] = [Figure(f"    throughput, {side} (MB/s)", digits=0)
                       for side in ("daemon", "socat")]
    with Handset("pc", modem="held") as handset:
        handset.wait_ready()
        lines = (handset.pc.fileno(), handset.modem.fileno())
        arguments = ["pass-through", str(daemon_pid(handset)), *map(str, lines),
                     THROUGHPUT_BYTES, ROUNDS]
        for _ in range(runs):
            for key, measured in run_link_bench(handset, arguments, lines).items():
                paired[key].add(measured["paired_ratio"])
                rates[key].add(measured["daemon_mb_s"] / measured["other_mb_s"])
                for index, side in enumerate(("daemon", "other")):
                    trips[key][index].add(measured[side]["median_us"])
                    copied[key][index].add(measured[f"{side}_mb_s"])
    figures = [figure for key in directions
               for figure in (paired[key], *trips[key], rates[key], *copied[key])]
    show("Pass-through, against socat between two pseudo-terminals", figures)
    return figures


GROUPS: dict[str, Callable[[int], list[Figure]]] = {
    "round-trip": bench_round_trips, "tunnel": bench_tunnel, "pass-through": bench_pass_through}
