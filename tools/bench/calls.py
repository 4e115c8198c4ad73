"""The system calls of a request, counted by strace around the running daemon."""

import re
import subprocess
import tempfile
from collections import Counter
from pathlib import Path
from typing import Callable

from amt_simulator import Handset
from amt_station import wire
from tools.bench.daemon import daemon_pid
from tools.bench.figures import Figure, show

REQUESTS = 20
ATTACHED = "attached"
CALL = re.compile(r"^(?P<thread>\d+) +(?P<name>\w+)\((?:\d+<(?P<path>[^>]*)>)?")
TTY = re.compile(r"^/dev/(pts/|ptmx|tty)")
TEXTS = {"/handset/log.txt": "log records", "/handset/stdout.txt": "progress texts"}

Exchange = Callable[[Handset], None]


def _packet(handset: Handset) -> None:
    handset.pc.write(wire.encode_envelope(wire.Packet(176, ())))
    answer = wire.encode_envelope(wire.Packet(175, (wire.Atom.integer(1, 0),)))
    handset.pc.read_exactly(len(wire.ACKNOWLEDGEMENT) + len(answer))


def _text(handset: Handset) -> None:
    handset.pc.write(b"AT^DBTADDR=?\r")
    handset.pc.read_exactly(len(b"\r\nOK\r\n"))


def _tunnel(handset: Handset) -> None:
    handset.app.write(wire.Packet(7).encode())
    imei = wire.Atom.raw(21, b"0" * 15)
    handset.app.read_exactly(len(wire.Packet(8, (wire.Atom.integer(1, 0), imei)).encode()))


def _kind_of(match: "re.Match[str]") -> str:
    """What a call is for; a call for nothing that a request is about keeps its own name."""
    name, path = match["name"], match["path"] or ""
    if name == "read" and TTY.match(path):
        return "reading"
    if name == "write" and TTY.match(path):
        return "answering"
    return TEXTS.get(path, name) if name == "write" else name


def _trace(handset: Handset, exchange: Exchange) -> "Counter[str] | None":
    """The calls of some requests, made by the thread that serves them; None: no tracing here."""
    with tempfile.TemporaryDirectory() as folder:
        path = Path(folder) / "calls"
        with subprocess.Popen(["strace", "-f", "-y", "-o", str(path), "-p",
                               str(daemon_pid(handset))], stderr=subprocess.PIPE,
                              text=True) as tracer:
            assert tracer.stderr is not None
            if ATTACHED not in tracer.stderr.readline():
                return None
            try:
                exchange(handset)  # what the tracer finds half done is this one's
                for _ in range(REQUESTS):
                    exchange(handset)
            finally:
                tracer.terminate()
                tracer.communicate()
        return _count(path.read_text("utf-8", "replace"))


def _count(trace: str) -> "Counter[str]":
    """The calls between the first whole request and the last, by what they are for."""
    calls = [match for line in trace.splitlines() if (match := CALL.match(line))]
    server = next((match["thread"] for match in calls if match["path"] in TEXTS), "")
    own = [_kind_of(match) for match in calls if match["thread"] == server]
    # From the first request's first record on; its read had begun before the trace.
    return Counter(own[next((i for i, kind in enumerate(own) if kind in TEXTS.values()), 0):])


def bench_calls(_runs: int) -> list[Figure]:
    """A packet, an AT text, and a request through the tunnel."""
    figures = []
    notes = []
    for start, modem, exchanges in (("pc", "held", {"PC packet": _packet, "AT text": _text}),
                                    ("packet", "table", {"tunnel": _tunnel})):
        with Handset(start, modem=modem) as handset:
            handset.wait_ready()
            for name, exchange in exchanges.items():
                figure = Figure(f"{name}: system calls beyond reading, answering and logging", "",
                                "at most", 0, digits=0)
                figures.append(figure)
                counted = _trace(handset, exchange)
                if counted is None:
                    figure.floor = "strace may not attach to a process here"
                    continue
                known = {"reading", "answering", *TEXTS.values()}
                others = {what: n for what, n in counted.items() if what not in known}
                figure.add(sum(others.values()))
                shown = ", ".join(f"{what} {n}" for what, n in counted.most_common())
                notes.append(f"    {name}: {REQUESTS + 1} requests made {shown}")
    show("System calls, by strace (measured once)", figures)
    print("\n".join(notes))
    return figures


GROUPS = {"calls": bench_calls}
