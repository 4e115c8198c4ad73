"""The codec by itself: checksum and packets, beside a single table and beside other codecs."""

import json
import math
import subprocess
from typing import Any

from tools.bench.daemon import BUILD
from tools.bench.figures import Figure, show

OTHERS = {"nanopb": "nanopb", "libcbor": "libcbor", "msgpack_c": "msgpack-c"}
FRAME = "4096"
SECONDS = "0.05"

Times = dict[str, list[float]]


def _run(program: str, runs: int, pattern: str = ".") -> Times:
    """Nanoseconds of each benchmark of a program, a value a run; the runs are mixed."""
    ended = subprocess.run(
        [str(BUILD / "bin" / program), f"--benchmark_filter={pattern}",
         f"--benchmark_repetitions={runs}", f"--benchmark_min_time={SECONDS}",
         "--benchmark_enable_random_interleaving=true", "--benchmark_format=json"],
        check=True, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
    times: Times = {}
    found: list[dict[str, Any]] = json.loads(ended.stdout)["benchmarks"]
    for one in found:
        if one.get("error_occurred"):
            raise SystemExit(f"dev: {program}: {one['name']}: {one['error_message']}")
        if one["run_type"] == "iteration":
            times.setdefault(one["run_name"], []).append(one["cpu_time"])
    return times


def _ratio(figure: Figure, theirs: list[float], ours: list[float]) -> Figure:
    for their, our in zip(theirs, ours):
        figure.add(their / our)
    return figure


def _pays_from(times: Times) -> Figure:
    """The length from which on it is never slower than a table and a byte at a time."""
    figure = Figure("checksum: length from which on it pays (bytes)", digits=0)
    lengths = sorted(int(name.partition("/")[2]) for name in times if name.startswith("checksum/"))
    for run in range(len(times[f"checksum/{FRAME}"])):
        slower = [length for length in lengths if times[f"checksum/{length}"][run]
                  > times[f"checksum_byte_by_byte/{length}"][run]]
        longest = max(slower, default=0)
        figure.add(min((length for length in lengths if length > longest), default=math.inf))
    return figure


def bench_checksum(runs: int) -> list[Figure]:
    """The checksum against one table, byte by byte."""
    times = _run("micro-bench", runs, "^checksum")
    figure = _ratio(Figure(f"checksum of {FRAME} bytes: faster than byte by byte", " times",
                           "at least", 4),
                    times[f"checksum_byte_by_byte/{FRAME}"], times[f"checksum/{FRAME}"])
    figures = [figure, _pays_from(times)]
    show("Checksum", figures)
    return figures


CLEARING = ("both clear the whole area first, which is most of the time: without that, a packet "
            "could hold what an earlier answer has left")


def bench_codecs(runs: int) -> list[Figure]:
    """A packet against the same content by other codecs."""
    times = _run("codec-bench", runs)
    figures, notes = [], []
    for act in ("build", "read"):
        for key, name in OTHERS.items():
            figure = Figure(f"{act} the same content: faster than {name}", " times", "at least", 2,
                            CLEARING if act == "build" else "")
            figures.append(_ratio(figure, times[f"{act}_content/{key}"],
                                  times[f"{act}_content/packet"]))
    for name, values in times.items():
        notes.append(f"    {name:42}{min(values):8.0f} ns")
    show("Packets: a command id, two numbers and a text; each into a cleared area of 4 KiB, "
         "and nothing behind it", figures)
    print("\n".join(notes))
    return figures


GROUPS = {"checksum": bench_checksum, "codec": bench_codecs}
