"""How small the daemon is, and how soon it serves."""

import re
import shutil
import signal
import subprocess
import sys
import tempfile
import threading
import time
from datetime import datetime
from pathlib import Path

from amt_simulator import Completed, Handset
from tools.bench.daemon import BUILD, DAEMON, daemon_pid, resident
from tools.bench.figures import Figure, show
from tools.project import PROJECT

KIB = 1024
ARM = PROJECT / "build" / "armhf" / "bin" / DAEMON
ARM_STRIP = "arm-linux-gnueabihf-strip"
RESIDENT_GOAL_MIB = 3.5

# What a start waits for because it has to: the PC's tty gets a second to settle, and before each
# of the disk's synchronizations behind a factory file there is a pause.
TTY_PAUSES_MS = {"pc": 1000.0, "packet": 0.0}
SYNC_PAUSE_MS, SYNC_CALL = 50.0, "sync() = 0"
# The kernel's number for the clock of a whole process, beside the process in a clock's id.
PROCESS_CLOCK = 2
STAMP = "%Y-%m-%d %H:%M:%S.%f"


def _stripped_kib(program: Path, strip: str) -> float:
    with tempfile.TemporaryDirectory() as folder:
        copy = Path(folder) / program.name
        shutil.copy(program, copy)
        subprocess.run([strip, str(copy)], check=True)
        return copy.stat().st_size / KIB


def bench_size(_runs: int) -> list[Figure]:
    """The program, and what it keeps in memory while it serves: both the same every time."""
    program = Figure("program, stripped, x86-64 (KiB)", " KiB", "at most", 190, digits=1)
    program.add(_stripped_kib(BUILD / "bin" / DAEMON, "strip"))
    figures = [program]
    if ARM.is_file() and shutil.which(ARM_STRIP):
        arm = Figure("program, stripped, armhf (KiB)", " KiB", "at most", 160, digits=1)
        arm.add(_stripped_kib(ARM, ARM_STRIP))
        figures.append(arm)
    with Handset("pc", modem="held") as handset:
        handset.wait_ready()
        parts = resident(daemon_pid(handset))
    whole = Figure("resident set while serving the PC (MiB)", " MiB", "at most", RESIDENT_GOAL_MIB)
    whole.add(sum(parts.values()) / KIB)
    figures.append(whole)
    show("Size (measured once)", figures)
    print("    made of (KiB): " + ", ".join(f"{name} {kib}" for name, kib in parts.items()))
    if len(figures) == 2:
        print("    armhf: not measured, ./dev cross makes that build")
    return figures


def _logged_at(stamp: str, began: datetime) -> datetime:
    """The time of a record, which does not name its year."""
    return datetime.strptime(f"{began.year}-{stamp}", STAMP)


def _processor_ms(pid: int) -> float:
    """What a process has had of a processor so far, its ended threads too, in milliseconds."""
    return time.clock_gettime(~pid << 3 | PROCESS_CLOCK) * 1000


def _start_ms(kind: str) -> tuple[float, float]:
    """From the start of the program to the record with which it serves, in milliseconds.

    By the clock, and what it had of a processor for that.
    """
    with Handset(kind, start=False, modem="table", shared={"/bench": BUILD}) as handset:
        ended: list[Completed] = []
        words = ["/bench/bin/link-bench", "start", handset.kind.program]
        runner = threading.Thread(target=lambda: ended.append(handset.run(words, timeout=60)))
        runner.start()
        record = [handset.log.wait(text) for text in handset.kind.ready][-1]
        pauses = TTY_PAUSES_MS[kind] + SYNC_PAUSE_MS * handset.calls().count(SYNC_CALL)
        used = _processor_ms(daemon_pid(handset, record.pid))
        handset.signal(signal.SIGTERM, pid=record.pid)
        runner.join()
    said = re.match(rb"(\d+\.\d+)\n", ended[0].stdout)
    if said is None:
        sys.exit("dev: the start of the daemon could not be timed")
    began = datetime.utcfromtimestamp(float(said[1]))
    spent = (_logged_at(record.time, began) - began).total_seconds() * 1000
    return spent - pauses, used


def bench_start(runs: int) -> list[Figure]:
    """Both paths."""
    figures = []
    for kind, title in (("pc", "PC path"), ("packet", "app path")):
        figure = Figure(f"start to serving, {title}, without pauses (ms)", " ms", "at most", 20,
                        digits=0,
                        floor="on a busy machine, of other processes' turns: compare the "
                        "processor time")
        used = Figure("    processor time of it (ms)", digits=1)
        for _ in range(runs):
            for one, value in zip((figure, used), _start_ms(kind)):
                one.add(value)
        figures += [figure, used]
    show("Start, from execve to the record with which the line is read (its stamp counts "
         "milliseconds), without\nthe second that the PC's tty gets and the 50 ms before each "
         "synchronization of the disk", figures)
    return figures


GROUPS = {"size": bench_size, "start": bench_start}
