"""What the station adds to a line: its own time a step of a plan, and its start."""

import os
import statistics
import subprocess
import sys
import tempfile
import time
from pathlib import Path

from amt_line.plan.reader import load_plan
from amt_line.run.record import Record, Where
from amt_line.run.record_file import RecordFile, file_name
from amt_line.run.runner import Runner, Setting
from amt_line.view.lines import LineView
from amt_simulator import Handset
from amt_station.port import SerialPort
from amt_station.requests.model import Channel

STEPS = 30
RUNS = 10
STARTS = 15
STEP_TARGET_MS = 5.0
START_TARGET_S = 0.2

STEP = """[[step]]
name = "GPS signal {number}"
command = "gps read"
with = {{ index = {number} }}
limits.result = {{ min = 0, max = 0 }}
limits.satellite = {{ min = 0, max = 255, marginal = {{ min = 1 }} }}
"""


class TimedPort(SerialPort):
    """A port that counts the seconds spent in waiting for the handset."""

    waited = 0.0

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        start = time.perf_counter()
        try:
            return super().read(timeout)
        finally:
            self.waited += time.perf_counter() - start


def one_run(port: str, folder: Path) -> tuple[float, float]:
    """Seconds of a run, read and recorded, without the handset's: by the processor, by the clock.

    By the clock it holds the disk's last writing too, and whatever else the machine does.
    """
    files: list[RecordFile] = []
    ports: list[TimedPort] = []

    def open_port() -> TimedPort:
        ports.append(TimedPort(port))
        return ports[0]

    def keep(record: Record) -> RecordFile:
        name = file_name("bench", record.head["began"], record.run)
        files.append(RecordFile(folder / "records", name, record.text()))
        return files[0]

    start, used = time.perf_counter(), time.process_time()
    plan = load_plan(folder / "bench.toml", Channel.PC)
    with open(os.devnull, "w", encoding="utf-8") as nowhere:
        runner = Runner(plan, {}, "bench", Setting(
            open_port, Where("bench", "", port, ""),
            listeners=[LineView(nowhere)], keep=keep))
        document = runner.run()
    files[0].close()
    total, used = time.perf_counter() - start, time.process_time() - used
    if document["verdict"] != "PASS":
        sys.exit(f"dev: the plan of the bench did not pass: {document['reason']}")
    return used, total - ports[0].waited


def bench_steps() -> None:
    """A plan against the simulated handset; what is not the handset's time is the station's."""
    figures = []
    with tempfile.TemporaryDirectory() as name, Handset("pc", ports=True) as handset:
        handset.wait_ready()
        folder = Path(name)
        (folder / "bench.toml").write_text(
            "".join(STEP.format(number=number) for number in range(STEPS)), encoding="utf-8")
        one_run(str(handset.directory / "pc"), folder)
        for _ in range(RUNS):
            figures.append(one_run(str(handset.directory / "pc"), folder))
    print(f"\nPlan of {STEPS} steps against the simulated handset, read and recorded, {RUNS} runs:"
          f"\nthe station's own time a step (target {STEP_TARGET_MS:.0f} ms)")
    for what, column in zip(("of the processor", "by the clock"), zip(*figures)):
        own = [seconds / STEPS * 1000 for seconds in column]
        print(f"  {what:17} median {statistics.median(own):6.2f} ms, longest {max(own):6.2f} ms")


def bench_start() -> None:
    """From the shell to the first byte that could be sent: `amt-station at AT` without a port."""
    command = [sys.executable, "-m", "amt_station", "-p", "/dev/no-such-port", "at", "AT"]
    seconds = []
    for _ in range(STARTS + 1):
        start = time.perf_counter()
        ended = subprocess.run(command, stderr=subprocess.DEVNULL, check=False)
        seconds.append(time.perf_counter() - start)
        if ended.returncode != 3:
            sys.exit(f"dev: `amt-station at AT` ended with {ended.returncode} instead of 3")
    print(f"\nStart of `amt-station at AT` up to the opening of its port\n  median "
          f"{statistics.median(seconds[1:]):.3f} s, longest {max(seconds[1:]):.3f} s  "
          f"(target {START_TARGET_S:.1f} s)")


def bench_station() -> None:
    """Both."""
    bench_steps()
    bench_start()


if __name__ == "__main__":
    bench_station()
