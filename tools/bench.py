"""Measure the daemon beside what its lines cost by themselves: `./dev bench`."""

import argparse
import json
import os
import shutil
import subprocess
import sys
import tempfile
from pathlib import Path
from typing import Any

from amt_simulator import Handset
from amt_simulator.inside.modem import Modem
from amt_simulator.inside.modem_table import IDENTITIES
from amt_station import wire
from tools import bench_slots, bench_stats
from tools.bare_modem import bare_modem
from tools.bench_line import bench_station
from tools.build import build
from tools.project import PROJECT

BUILD = PROJECT / "build" / "release"
ROUNDS = "4000"
EXCHANGE_ROUNDS = "2000"
THROUGHPUT_BYTES = "40000000"

# What is aimed at: the daemon's figure over the bare one's.
ROUND_TRIP_TARGET = 2.0
PASS_THROUGH_TARGET = 1.5

Figures = dict[str, Any]


def run_link_bench(arguments: list[str], descriptors: tuple[int, ...]) -> Figures:
    """One measurement of link-bench, which inherits the lines."""
    ended = subprocess.run([str(BUILD / "bin" / "link-bench"), *arguments], pass_fds=descriptors,
                           capture_output=True, text=True, check=False)
    if ended.returncode != 0:
        sys.exit(f"dev: {ended.stderr.strip()}")
    return json.loads(ended.stdout)  # type: ignore[no-any-return]


def show(what: str, figures: Figures, own: str, bare: str, target: float | None) -> None:
    """A row: both sides and their ratios."""
    ours, theirs = figures[own], figures[bare]
    columns = ("median_us", "p99_us")
    cells = [f"{side[column]:8.1f}" for side in (ours, theirs) for column in columns]
    ratios = [f"{ours[column] / theirs[column]:7.2f}" for column in columns]
    aim = f"  (target {target:.1f})" if target else ""
    print(f"  {what:33}{''.join(cells[:2])}  {''.join(cells[2:])}  {''.join(ratios)}"
          f"{figures['paired_ratio']:8.2f}{aim}")


def head(title: str, bare: str) -> None:
    """The head of a table of rows."""
    names = f"{'median':>8}{'p99':>8}"
    print(f"\n{title} (microseconds)\n  {'':33}{'daemon':>8}{'':8}  {bare:>8}{'':8}  "
          f"{'ratio of':>8}\n  {'':33}{names}  {names}  {'median':>7}{'p99':>7}{'paired':>8}")


def bench_round_trips(handset: Handset) -> None:
    """Request to whole response over the PC line."""
    head("Round trip on the PC line, against a bare process that writes the same frames", "bare")
    line = handset.pc.fileno()
    ok = wire.encode_envelope(wire.Packet(175, (wire.Atom.integer(1, 0),)))
    for what, request, response in (
            ("packet (acknowledged, answered)", wire.encode_envelope(wire.Packet(176, ())),
             [wire.ACKNOWLEDGEMENT, ok]),
            ("AT text (AT^DBTADDR=?)", b"AT^DBTADDR=?\r", [b"\r\nOK\r\n"])):
        frames = ",".join(frame.hex() for frame in response)
        figures = run_link_bench(["round-trip", str(line), request.hex(), frames, ROUNDS], (line,))
        show(what, figures, "daemon", "bare", ROUND_TRIP_TARGET)


def bench_pass_through(handset: Handset) -> None:
    """What the daemon copies between the modem and the PC."""
    lines = (handset.pc.fileno(), handset.modem.fileno())
    figures = run_link_bench(["pass-through", *map(str, lines), THROUGHPUT_BYTES, ROUNDS], lines)
    head("Pass-through of a line of text, against socat between two pseudo-terminals", "socat")
    show("modem to PC", figures, "daemon", "socat", PASS_THROUGH_TARGET)
    show("PC to modem", figures["to_modem"], "daemon", "socat", PASS_THROUGH_TARGET)
    rates = figures["from_modem"]
    print(f"\n  throughput modem to PC: daemon {rates['daemon_mb_s']:.0f} MB/s, socat "
          f"{rates['socat_mb_s']:.0f} MB/s, socat over daemon "
          f"{rates['socat_mb_s'] / rates['daemon_mb_s']:.2f}  (target {PASS_THROUGH_TARGET:.1f})")


def bench_exchange() -> None:
    """A request of the app that the modem answers, against the bare exchange with that modem."""
    request, command = wire.Packet(7), b"AT^DTTEST=07\r"
    answer = Modem().answer_line(command.decode())
    imei = wire.Atom.raw(21, IDENTITIES["0"]["imei"].encode())
    response = wire.Packet(8, (wire.Atom.integer(wire.RESULT_ATOM, 0), imei)).encode()
    with Handset("packet") as handset, bare_modem() as bare:
        handset.wait_ready()
        app = handset.app.fileno()
        # Once by hand: what is timed below must be the whole answer, and the right one.
        handset.app.write(request.encode())
        if handset.app.read_exactly(len(response)) != response:
            sys.exit("dev: the app did not get the modem's IMEI")
        os.write(bare, command)
        said = b""
        while len(said) < len(answer):
            said += os.read(bare, len(answer) - len(said))
        if said != answer:
            sys.exit("dev: the bare modem says something else than the handset's")
        figures = run_link_bench(["exchange", str(app), request.encode().hex(),
                                  str(len(response)), str(bare), command.hex(),
                                  str(len(answer)), EXCHANGE_ROUNDS], (app, bare))
    head("Tunnel round trip on the app line, against the bare exchange with the modem", "bare")
    show("READIMEI through the tunnel", figures, "daemon", "bare", None)


def show_size(handset: Handset) -> None:
    """How small the daemon is."""
    with tempfile.TemporaryDirectory() as folder:
        stripped = Path(folder) / "vx-kel-amt"
        shutil.copy(BUILD / "bin" / "vx-kel-amt", stripped)
        subprocess.run(["strip", str(stripped)], check=True)
        size = stripped.stat().st_size
    print(f"\nSize\n  program, stripped: {size / 1024:.0f} KiB; resident set while serving the PC: "
          f"{handset.inspect().resident_kib} KiB")


def bench_codec() -> None:
    """The codec by itself."""
    print("\nCodec", flush=True)
    subprocess.run([str(BUILD / "bin" / "micro-bench"), "--benchmark_min_time=0.1"], check=True,
                   stderr=subprocess.DEVNULL)


def main() -> int:
    """Measure everything. The log goes to its file, as in service."""
    if sys.argv[1:2] == ["line"]:
        return bench_slots.main()
    if sys.argv[1:2] == ["stats"]:
        return bench_stats.main()
    parser = argparse.ArgumentParser(
        prog="./dev bench", description=__doc__,
        epilog="./dev bench line [HANDSETS] measures many handsets on one line instead, "
        "./dev bench stats [VALUES] the statistics of a large store")
    parser.add_argument("--no-codec", action="store_true", help="only what needs a handset")
    parser.add_argument("--all-cores", action="store_true",
                        help="let the system place the processes, and measure that too")
    options = parser.parse_args()
    build("release", ("--target", "handset", "link-bench", "micro-bench"))
    print("Both sides take turns. A wake-up costs 5 or 50 microseconds, as the system places\n"
          'processes; "paired" compares turn by turn and takes the median of that.')
    if not options.all_cores:
        # Waking a process on another core costs more than all that is measured here, and which
        # side is placed there is chance.
        os.sched_setaffinity(0, {min(os.sched_getaffinity(0))})
        print("Everything runs on one core, so that both sides are placed alike (--all-cores).")
    if not options.no_codec:
        bench_codec()
    with Handset("pc", modem="held") as handset:
        handset.wait_ready()
        bench_round_trips(handset)
        bench_pass_through(handset)
        show_size(handset)
    bench_exchange()
    bench_station()
    print("\nLeft out, because a pause is part of them: every write of a factory file"
          "\n(two pauses of 50 ms), power-off (2 s), the battery ADC (20 ms).")
    return 0
