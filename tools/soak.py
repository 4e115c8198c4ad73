"""Handsets under constant load, watched for what grows: `./dev soak [MINUTES]`."""

import argparse
import os
import sys
import threading
import time
from dataclasses import dataclass, field
from typing import Callable, Mapping

from amt_simulator import Handset
from amt_station.link import Link
from amt_station.requests.model import Channel
from amt_station.requests.operations import Value, operation_packet
from amt_station.requests.table import find_operation
from tools import soak_line
from tools.build import build

# How much more than at first the daemon may hold, however long it has worked.
RESIDENT_BOUND_KIB = 512

# The first rounds of work touch what a daemon touches once: libraries, stacks, files.
WARM_UP_ROUNDS = 2
LOOK_SECONDS = 1.0
TELL_SECONDS = 30.0

# Records of a long run would fill the disk.
RECORDS = ("log.txt", "calls.txt", "stdout.txt")
RECORD_BYTES = 16 << 20

Job = Callable[[Link], None]


class Grown(Exception):
    """The daemon has grown, or is not the one it was."""


def ask(*path: str, **values: Value) -> Job:
    """A request of the station's table, which must succeed."""
    row, operation = find_operation(path)
    packet = operation_packet(row, operation, values)

    def job(link: Link) -> None:
        answer = link.request(packet).answer
        if answer.result not in (0, None):
            raise Grown(f"{' '.join(path)}: result {answer.result}")

    return job


def say(text: str, expected: str = "OK") -> Job:
    """An AT text, whose answer must hold EXPECTED."""
    def job(link: Link) -> None:
        reply = link.at(text)
        if expected not in reply.raw:
            raise Grown(f"{text}: {reply.raw!r}")

    return job


@dataclass(frozen=True)
class Load:
    """What a station does over and over, and where."""

    path: str
    channel: Channel
    jobs: tuple[Job, ...]
    options: Mapping[str, object] = field(default_factory=dict)


LOADS = {
    "pc": Load("pc", Channel.PC, (
        say("AT"),
        say("AT^DBTADDR=?"),
        say("AT^DBTADDR?", "00:11:22:33:44:55"),
        # Completed when the modem has answered.
        say("AT^DCGSNW=490154203237518"),
        say("AT^DMSN=KEL0000000042"),
        # Passed to the modem and back.
        say("AT+CGMM"),
        say("AT+CGSN"),
        ask("imei", "write", imei="490154203237518"),
        # Answered by the daemon.
        ask("version", module=16),
        ask("pcba", "read"),
        ask("adb-serial", "read"),
        ask("bt-address", "read"),
        ask("wifi-address", "read"),
        ask("battery", "adc"),
        ask("emmc-info"),
        # The test library.
        ask("bluetooth", "check"),
        ask("wifi", "check"),
        ask("gps", "check"),
        ask("gps", "read", index=3),
    ), {"files": {"/amt/BT/BT_Address.txt": "00:11:22:33:44:55\n",
                  "/amt/WIFI/WIFI_nvram.txt": "00:11:22:33:44:66\n",
                  "/amt/sn-2.txt": "PCBA-0042", "/amt/usb_serial": "ADB0042"}}),
    "packet": Load("packet", Channel.APP, (
        # Asked of the modem.
        ask("version", module=17),
        ask("board", "read"),
        ask("serial-number", "read"),
        ask("out-date", "read"),
        ask("sim", "check"),
        ask("imei", "read"),
        ask("test-result", "write", station=3, verdict=1, description="RF calibration"),
        ask("test-result", "read", station=3),
        # Files of the factory and of the kernel.
        ask("version", module=1),
        ask("item-result", "read", station=4),
        ask("battery", "voltage"),
        ask("battery", "temperature"),
        ask("tf-card"),
        ask("lcd-brightness", "set", level=120),
        ask("button-backlight", "on"),
        ask("vibrator", "off"),
        # Device nodes and libraries.
        ask("camera", "preview", "main"),
        ask("camera", "test", camera=1),
        ask("audio", "loop", "on"),
        ask("audio", "loop", "off"),
        ask("dev-info"),
        ask("bluetooth", "check"),
        ask("wifi", "check"),
        ask("gps", "check"),
    )),
}


@dataclass(frozen=True)
class Look:
    """What the daemon holds between two requests."""

    pid: int
    descriptors: int
    threads: int
    children: int
    resident_kib: int

    @classmethod
    def at(cls, handset: Handset) -> "Look":
        """Look at the daemon now."""
        info = handset.inspect()
        return cls(info.pid, len(info.descriptors), len(info.threads), len(info.children),
                   info.resident_kib)

    def __str__(self) -> str:
        return (f"{self.descriptors} descriptors, {self.threads} threads, "
                f"{self.children} children, {self.resident_kib} KiB resident")

    def check(self, first: "Look") -> None:
        """Raise when something has grown beyond its bound since FIRST."""
        kept = ("pid", "descriptors", "threads", "children")
        grown = [name for name in kept if getattr(self, name) != getattr(first, name)]
        if self.resident_kib > first.resident_kib + RESIDENT_BOUND_KIB:
            grown.append("resident set")
        if grown:
            raise Grown(f"{', '.join(grown)}: at first {first}; now {self}")


@dataclass
class Result:
    """How a run has gone."""

    name: str
    jobs: int = 0
    first: Look | None = None
    last: Look | None = None
    error: str = ""

    def __str__(self) -> str:
        text = f"{self.name}: {self.jobs} jobs; at first {self.first}; at last {self.last}"
        return f"{text}; {self.error}" if self.error else text


def cut_records(handset: Handset) -> None:
    """Empty the records that have grown large; their writers append."""
    for name in RECORDS:
        path = handset.path(f"/handset/{name}")
        if path.stat().st_size > RECORD_BYTES:
            os.truncate(path, 0)


def work(handset: Handset, link: Link, load: Load, result: Result, seconds: float) -> None:
    """Repeat the jobs for SECONDS, with a look at the daemon about every second."""
    end = time.monotonic() + seconds
    next_look = next_word = 0.0
    rounds = 0
    while time.monotonic() < end or rounds <= WARM_UP_ROUNDS + 1:
        for job in load.jobs:
            job(link)
        rounds += 1
        result.jobs += len(load.jobs)
        now = time.monotonic()
        if rounds < WARM_UP_ROUNDS or now < next_look:
            continue
        next_look = now + LOOK_SECONDS
        result.last = Look.at(handset)
        result.first = result.first or result.last
        result.last.check(result.first)
        cut_records(handset)
        if now > next_word:
            next_word = now + TELL_SECONDS
            print(f"   {result.name}: {result.jobs} jobs, {result.last}", file=sys.stderr,
                  flush=True)


def soak(result: Result, seconds: float, build: str) -> None:
    """Put a handset under a load for SECONDS; raises when something grows or goes wrong."""
    load = LOADS[result.name]
    with Handset(load.path, build, ports=True, restart=False, **load.options) as handset:
        handset.wait_ready()
        port = handset.directory / load.channel.value
        with Link.open(str(port), load.channel) as link:
            work(handset, link, load, result, seconds)


def soak_all(seconds: float, build: str = "release") -> dict[str, Result]:
    """Put a handset under each load, all at once; a Result with `error` has gone wrong."""
    results = {name: Result(name) for name in LOADS}

    def run(result: Result) -> None:
        try:
            soak(result, seconds, build)
        except Exception as error:  # whatever it is, the other load goes on
            result.error = f"{type(error).__name__}: {error}"

    # A handset ends with the thread that brought it up.
    threads = [threading.Thread(target=run, args=(result,)) for result in results.values()]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    return results


def main() -> int:
    """Put both paths under load and give the verdict."""
    if sys.argv[1:2] == ["line"]:
        return soak_line.main()
    parser = argparse.ArgumentParser(
        prog="./dev soak", description=__doc__,
        epilog="./dev soak line [RUNS] watches the station instead: runs on a line of eight slots")
    parser.add_argument("minutes", nargs="?", type=float, default=10.0)
    seconds = parser.parse_args().minutes * 60
    if not 0 < seconds < float("inf"):
        parser.error("the minutes are a number above 0")
    build("release", ("--target", "handset"))
    results = soak_all(seconds)
    print(*results.values(), sep="\n")
    failed = [name for name, result in results.items() if result.error]
    print(f"FAIL: {', '.join(failed)}" if failed else
          f"PASS: nothing grew in {seconds:.0f} s (resident set within {RESIDENT_BOUND_KIB} KiB)")
    return 1 if failed else 0
