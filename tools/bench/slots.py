"""Many simulated handsets on one line against one alone: `./dev bench line [HANDSETS]`."""

import argparse
import json
import os
import statistics
import sys
import tempfile
import time
from dataclasses import dataclass
from pathlib import Path

from amt_line.cli.line_records import LineRecords
from amt_line.cli.simulated import simulated_handsets
from amt_line.plan.reader import load_plan
from amt_line.run.desk import Desk
from amt_line.run.events import Stream
from amt_line.run.inputs import Supply
from amt_line.run.line import Line
from amt_line.run.plug import Listing, plug_of
from amt_line.run.record import Where
from amt_line.run.slot import Shop, Slot
from amt_line.view.board import Board
from amt_station.requests.model import Channel
from tools.build import build

HANDSETS, STEPS, ROUNDS_ALONE = 32, 30, 3
TARGET = 2.0
STEP = """[[step]]
name = "GPS signal {number}"
command = "gps read"
with = {{ index = {number} }}
limits.result = {{ min = 0, max = 0 }}
"""
# Between two steps, where the handsets are to find the processor free.
PAUSE = """[[step]]
wait = 0.3
"""


@dataclass(frozen=True)
class Figures:
    """What one round on the line came to."""

    handsets: int
    passed: int
    told: int
    records: int
    exchanges: list[float]
    seconds: float
    own_seconds: float

    @property
    def median_ms(self) -> float:
        """The median of an exchange."""
        return statistics.median(self.exchanges) * 1000

    def __str__(self) -> str:
        slowest = sorted(self.exchanges)[int(len(self.exchanges) * 0.95)] * 1000
        return (f"{self.handsets:3} handsets: {self.passed} of {self.told} runs passed, "
                f"{self.records} records, {len(self.exchanges)} exchanges, median "
                f"{self.median_ms:6.2f} ms, 95th percentile {slowest:6.2f} ms\n"
                f"{'':14}{self.seconds:.1f} s by the clock; the station used "
                f"{self.own_seconds:.1f} s of a processor")


def one_round(handsets: dict[str, Path], folder: Path, pause: str = "") -> Figures:
    """One run a slot, all at once, recorded."""
    (folder / "bench.toml").write_text(
        "".join(STEP.format(number=number) + pause for number in range(STEPS)), encoding="utf-8")
    plan = load_plan(folder / "bench.toml", Channel.PC)
    directory = Path(tempfile.mkdtemp(dir=folder))
    records, board = LineRecords(directory, f"sqlite:///{directory / 'line.sqlite'}"), Board()
    shop = Shop(plan, Stream([board.take]), Desk(),
                lambda slot, port: Where("bench", "", port, "", slot), records.keep, once=True)
    listing = Listing()
    line = Line([Slot(name, plug_of(str(port), listing), Supply(name, plan, {}, (), None), shop)
                 for name, port in handsets.items()], shop.ends, once=True)
    start, used = time.monotonic(), time.process_time()
    with records.open():
        line.run()
        seconds, used = time.monotonic() - start, time.process_time() - used
    documents = [json.loads(path.read_text(encoding="utf-8"))
                 for path in directory.glob("*.json")]
    exchanges = [exchange["seconds"] for document in documents for step in document["steps"]
                 for exchange in step["exchanges"]]
    return Figures(len(handsets), sum(document["verdict"] == "PASS" for document in documents),
                   sum(board.counts.values()), len(documents), exchanges, seconds, used)


def problems_of(figures: Figures, steps: int = STEPS) -> list[str]:
    """Wrong verdicts and lost records."""
    problems = []
    if figures.passed != figures.handsets:
        problems.append(f"{figures.handsets - figures.passed} runs did not pass")
    if not figures.records == figures.told == figures.handsets:
        problems.append(f"{figures.told} runs were told of, {figures.records} records are kept")
    if len(figures.exchanges) != figures.handsets * steps:
        problems.append(f"{len(figures.exchanges)} exchanges are recorded")
    return problems


def show(what: str, alone: Figures, together: Figures, target: float | None = None) -> None:
    """Two rounds, and how they compare."""
    aim = f"  (target {target:.1f})" if target else ""
    print(f"\n{what}\n{alone}\n{together}\n  median together over alone: "
          f"{together.median_ms / alone.median_ms:.2f}{aim}")


def main() -> int:
    """Measure, and give the verdict; the ratio is judged only where processors are free."""
    parser = argparse.ArgumentParser(prog="./dev bench line", description=__doc__)
    parser.add_argument("handsets", nargs="?", type=int, default=HANDSETS,
                        help="how many (default: %(default)s)")
    count = parser.parse_args(sys.argv[2:]).handsets
    if not 2 <= count <= 64:
        parser.error("2 to 64 handsets")
    build("release", ("--target", "handset"))
    with tempfile.TemporaryDirectory(prefix="bench-line-") as name, \
            simulated_handsets(count, Channel.PC) as handsets:
        folder = Path(name)
        ports = {slot: handset.directory / "pc" for slot, handset in handsets.items()}
        first = {"1": ports["1"]}
        alone = min((one_round(first, folder) for _ in range(ROUNDS_ALONE)),
                    key=lambda figures: figures.median_ms)
        hurried = one_round(ports, folder)
        alone_paced = one_round(first, folder, PAUSE)
        paced = one_round(ports, folder, PAUSE)
    print(f"\nA plan of {STEPS} steps, recorded, on {os.cpu_count()} processors; load of the "
          f"machine {os.getloadavg()[0]:.1f}")
    show("One exchange at the heels of the other: nobody finds a processor free", alone, hurried)
    print("  what limits it: Python lets one thread of the station compute at a time, and the\n"
          "  daemons share the processors with it")
    show("With pauses between the exchanges: the daemons find a processor free", alone_paced,
         paced, TARGET)
    problems = [problem for figures in (alone, hurried, alone_paced, paced)
                for problem in problems_of(figures)]
    print("\n".join(f"FAIL: {problem}" for problem in problems) if problems
          else "PASS: no wrong verdict, no lost record")
    return 1 if problems else 0
