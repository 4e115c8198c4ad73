"""Thousands of runs over eight slots, watched for what grows or gets lost: `./dev soak line`.

The handsets are scripted ones on pseudo-terminals: what is watched is the station.
"""

import argparse
import gc
import json
import os
import select
import sys
import tempfile
import threading
import time
import tty
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Mapping

from amt_line.cli.line_records import LineRecords
from amt_line.plan.reader import load_plan
from amt_line.run.desk import Desk
from amt_line.run.events import Stream
from amt_line.run.inputs import Supply
from amt_line.run.line import Line
from amt_line.run.plug import Listing, plug_of
from amt_line.run.presence import Patience
from amt_line.run.record import Where
from amt_line.run.slot import Shop, Slot
from amt_line.run.stop import INTERRUPTED
from amt_line.store import Delivery, Search, Store
from amt_line.view.board import Board
from amt_station.requests.model import Channel
from amt_station.wire import ACKNOWLEDGEMENT, Atom, EnvelopeDecoder, Frame, Packet
from amt_station.wire.decoder import Text
from amt_station.wire.envelope import encode_envelope
from tools.progress import Progress

RUNS, SLOTS = 10_000, 8
PLAN = """title = "soak"
[[step]]
at = "AT"
[[step]]
command = "battery adc"
limits.adc = { min = 100, max = 4000 }
needs = ["shield-box"]
[[step]]
at = "AT+CGMM"
"""
# Every so many runs of a slot the handset is out of its limits, or pulled out in the middle.
FAILS_EVERY, PULLED_EVERY = 10, 25
SILENT_ADC = 0
ADC = {"PASS": 3700, "FAIL": 50, "ABORTED": SILENT_ADC}
BATTERY = 224
# How much more the station may hold in the last quarter of the runs than in the second.
RESIDENT_BOUND_KIB = 4096
DESCRIPTORS_BOUND = THREADS_BOUND = 2 * SLOTS
DELIVERY_SECONDS = 600.0
QUICK = Patience(look=0.02, answer=5.0)


class Handset:
    """A scripted handset that is plugged in under a link."""

    def __init__(self, link: Path, adc: int) -> None:
        self.master, self.slave = os.openpty()
        tty.setraw(self.slave)
        self._decoder = EnvelopeDecoder()
        self._adc = adc
        fresh = link.with_name(f".{link.name}-{self.master}")
        fresh.symlink_to(os.ttyname(self.slave))
        fresh.rename(link)

    def serve(self) -> bool:
        """Answer what has arrived; False for a handset that is pulled out now."""
        for item in self._decoder.feed(os.read(self.master, 4096)):
            if isinstance(item, Text):
                os.write(self.master, b"\r\nOK\r\n")
            elif isinstance(item, Frame) and item.packet.command == BATTERY:
                if self._adc == SILENT_ADC:
                    return False
                os.write(self.master, ACKNOWLEDGEMENT + encode_envelope(Packet(
                    BATTERY + 1, (Atom.integer(151, self._adc), Atom.integer(1, 0)))))
        return True

    def close(self) -> None:
        """Pull it out."""
        os.close(self.master)
        os.close(self.slave)


class Hands:
    """Plugs a handset into every slot, and the next one when its verdict is there."""

    def __init__(self, folder: Path, runs: int) -> None:
        self._links = {str(number): folder / str(number) for number in range(1, SLOTS + 1)}
        self._left = runs
        self._counts = dict.fromkeys(self._links, 0)
        self._handsets: dict[str, Handset] = {}
        self._wake_read, self._wake_write = os.pipe()
        self._done: list[str] = []
        # The runs with another verdict than their handset deserves.
        self.wrong: list[str] = []
        self._thread = threading.Thread(target=self._serve, daemon=True)

    @property
    def links(self) -> Mapping[str, Path]:
        """Where each slot's handset is."""
        return self._links

    def start(self) -> None:
        """Plug the first ones in."""
        for slot in self._links:
            self._plug(slot)
        self._thread.start()

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        if event["event"] == "run-ended":
            slot = str(event["slot"])
            if event["verdict"] != _expected(self._counts[slot]):
                self.wrong.append(f"slot {slot}, run {self._counts[slot]}: {event['verdict']}, "
                                  f"{event['reason']}")
            self._done.append(slot)
            os.write(self._wake_write, b"x")

    def _plug(self, slot: str) -> None:
        if self._left <= 0:
            return
        self._left -= 1
        self._counts[slot] += 1
        self._handsets[slot] = Handset(self._links[slot],
                                       ADC[_expected(self._counts[slot])])

    def _pull(self, slot: str) -> None:
        handset = self._handsets.pop(slot, None)
        if handset is not None:
            self._links[slot].unlink()
            handset.close()

    def _serve(self) -> None:
        while True:
            masters = {handset.master: slot for slot, handset in self._handsets.items()}
            ready = select.select([self._wake_read, *masters], [], [])[0]
            for fd in ready:
                if fd == self._wake_read:
                    if b"e" in os.read(fd, 4096):
                        return
                    while self._done:
                        slot = self._done.pop()
                        self._pull(slot)
                        self._plug(slot)
                elif masters[fd] in self._handsets and not self._handsets[masters[fd]].serve():
                    self._pull(masters[fd])

    def close(self) -> None:
        """Pull all out."""
        os.write(self._wake_write, b"e")
        self._thread.join()
        for slot in list(self._handsets):
            self._pull(slot)
        os.close(self._wake_read)
        os.close(self._wake_write)


def _expected(count: int) -> str:
    """The verdict of a slot's run of this number."""
    if count % PULLED_EVERY == 0:
        return "ABORTED"
    return "FAIL" if count % FAILS_EVERY == 0 else "PASS"


@dataclass(frozen=True)
class Look:
    """What the station holds."""

    descriptors: int
    threads: int
    resident_kib: int

    @classmethod
    def now(cls) -> "Look":
        """Look at this process."""
        status = Path("/proc/self/status").read_text(encoding="ascii")
        values = dict(line.split(":", 1) for line in status.splitlines())
        return cls(len(os.listdir("/proc/self/fd")), int(values["Threads"]),
                   int(values["VmRSS"].split()[0]))


@dataclass
class Result:
    """How it went."""

    runs: int
    verdicts: dict[str, int] = field(default_factory=dict)
    seconds: float = 0.0
    looks: list[Look] = field(default_factory=list)
    problems: list[str] = field(default_factory=list)

    def quarter(self, number: int) -> Look:
        """The most that was held at once in a quarter of the runs."""
        size = max(1, len(self.looks) // 4)
        part = self.looks[(number - 1) * size:number * size] or self.looks
        return Look(max(look.descriptors for look in part), max(look.threads for look in part),
                    max(look.resident_kib for look in part))

    def judge(self) -> None:
        """Note what has grown."""
        early, late = self.quarter(2), self.quarter(4)
        for name, bound in (("descriptors", DESCRIPTORS_BOUND), ("threads", THREADS_BOUND),
                            ("resident_kib", RESIDENT_BOUND_KIB)):
            if getattr(late, name) > getattr(early, name) + bound:
                self.problems.append(f"{name} grew: {early}, then {late}")

    def __str__(self) -> str:
        tally = ", ".join(f"{count} {word}" for word, count in sorted(self.verdicts.items()))
        return (f"{self.runs} runs in {self.seconds:.0f} s: {tally}\n"
                f"  second quarter at most {self.quarter(2)}\n"
                f"  last quarter at most   {self.quarter(4)}")


def soak(runs: int, folder: Path, progress: Progress | None = None) -> Result:
    """Carry out so many runs; ``problems`` of the result tells what is wrong."""
    (folder / "soak.toml").write_text(PLAN, encoding="utf-8")
    plan = load_plan(folder / "soak.toml", Channel.PC)
    result, hands, board, changed = Result(runs), Hands(folder, runs), Board(), threading.Event()
    told: dict[str, str] = {}

    def count(event: Mapping[str, Any]) -> None:
        if event["event"] == "run-ended":
            told[event["run"]] = event["verdict"]
            if len(told) % max(1, runs // 200) == 0:
                result.looks.append(Look.now())
            if len(told) >= runs:
                changed.set()

    url = f"sqlite:///{folder / 'line.sqlite'}"
    records = LineRecords(folder / "records", url)
    shop = Shop(plan, Stream([board.take, count, hands]), Desk(),
                lambda slot, port: Where("soak", "", port, "", slot), records.keep,
                patience=QUICK, lost_record=records.lost)
    listing = Listing(lambda: [])
    line = Line([Slot(name, plug_of(str(link), listing), Supply(name, plan, {}, (), None), shop)
                 for name, link in hands.links.items()], shop.ends)
    before, start = Look.now(), time.monotonic()
    with records.open():
        server = threading.Thread(target=line.run)
        server.start()
        hands.start()
        try:
            while not changed.wait(0.5):
                if progress is not None:
                    progress.show(len(told), runs)
        finally:
            line.end(INTERRUPTED)
            server.join()
            hands.close()
    result.seconds = time.monotonic() - start
    gc.collect()
    _check_end(result, before)
    # What the database has not had the time for.
    Delivery(url, folder / "records").close(DELIVERY_SECONDS)
    _check_records(result, folder / "records", url, told)
    result.problems += hands.wrong[:SLOTS]
    if sum(board.counts.values()) != runs:
        result.problems.append(f"the board counts {board.counts}")
    result.judge()
    return result


def _check_end(result: Result, before: Look) -> None:
    end = time.monotonic() + DELIVERY_SECONDS
    while (after := Look.now()).threads > before.threads and time.monotonic() < end:
        # A delivery that was under way at the end finishes what it has begun.
        time.sleep(0.05)
    if after.threads > before.threads:
        result.problems.append(f"threads are left: {threading.enumerate()}")
    # The database's library keeps a few open.
    if after.descriptors > before.descriptors + SLOTS:
        result.problems.append(f"descriptors are left: {before} before, {after} after")


def _check_records(result: Result, folder: Path, url: str, told: Mapping[str, str]) -> None:
    """Every run that was told of is in the directory and in the database, once, as it ended."""
    kept: dict[str, str] = {}
    for path in folder.glob("*.json"):
        document = json.loads(path.read_text(encoding="utf-8"))
        kept[document["run"]] = document["verdict"]
    for verdict in told.values():
        result.verdicts[verdict] = result.verdicts.get(verdict, 0) + 1
    if kept != told:
        result.problems.append(f"{len(told)} runs were told of, {len(kept)} records are kept, "
                               f"{len(set(told.items()) ^ set(kept.items()))} differ")
    stored = Store.open(url).runs(Search(size=1)).total
    if stored != len(told):
        result.problems.append(f"{stored} of {len(told)} runs are in the database")


def main() -> int:
    """Soak, and give the verdict."""
    parser = argparse.ArgumentParser(prog="./dev soak line", description=__doc__)
    parser.add_argument("runs", nargs="?", type=int, default=RUNS,
                        help="how many (default: %(default)s)")
    runs = parser.parse_args(sys.argv[2:]).runs
    if runs < SLOTS:
        parser.error(f"at least {SLOTS} runs")
    progress = Progress("runs")
    with tempfile.TemporaryDirectory(prefix="soak-line-") as folder:
        result = soak(runs, Path(folder), progress)
    progress.close()
    print(result)
    print("\n".join(f"FAIL: {problem}" for problem in result.problems) if result.problems
          else "PASS: nothing grew, no verdict is wrong, no record is lost")
    return 1 if result.problems else 0
