"""Simulated handsets on a line, with the page, until Ctrl-C: `./dev line`."""

import argparse

from amt_station.errors import StationError
from tools.build import build
from tools.demo import line
from tools.project import PROJECT, die, note

FOLDER = PROJECT / "build" / "line"
# Rows of inputs for each slot: enough for more than an hour.
RUNS = 1000


def main() -> int:
    """Serve the line until it is interrupted, which is its usual end."""
    parser = argparse.ArgumentParser(prog="./dev line", description=__doc__)
    parser.add_argument("handsets", nargs="?", type=int, default=line.HANDSETS,
                        help="how many (default: %(default)s)")
    parser.add_argument("--http", default="8080", metavar="[HOST:]PORT",
                        help="where the page is served (default: %(default)s)")
    parser.add_argument("--replug", type=float, default=4.0, metavar="SECONDS",
                        help="the next handset comes so long after a verdict "
                        "(default: %(default)s)")
    options = parser.parse_args()
    if not 1 <= options.handsets <= 64:
        parser.error("1 to 64 handsets")
    if not options.replug > 0:
        parser.error("the seconds are a number above 0")
    build("release", ("--target", "handset"))
    note(f"records and their database are in {FOLDER}; Ctrl-C ends the line")
    try:
        return line.serve(options.handsets, FOLDER, options.http, (line.WEAK,), RUNS,
                          options.replug)
    except StationError as error:
        die(str(error))
