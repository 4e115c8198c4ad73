"""Every fuzz target for a while: `./dev fuzz [SECONDS]`."""

import argparse
import sys

from tools import children
from tools.build import build
from tools.project import CORES


def main() -> int:
    """Build the targets and run them; a finding fails its test."""
    parser = argparse.ArgumentParser(prog="./dev fuzz", description=__doc__)
    parser.add_argument("seconds", nargs="?", type=int, default=60, metavar="SECONDS",
                        help="for each target (default: 60)")
    seconds = parser.parse_args().seconds
    if seconds < 1:
        parser.error("the seconds are a whole number above 0")
    build("fuzz")
    return children.run(
        [sys.executable, "-m", "pytest", "-q", "-s", "-p", "no:cacheprovider", "-n", str(CORES),
         "tests/fuzz", f"--fuzz-seconds={seconds}"], children.show)
