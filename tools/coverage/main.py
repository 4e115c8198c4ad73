"""What the tests run of the code, and whether it is enough: `./dev coverage [PART ...]`."""

import argparse

from tools.arguments import refuse_unknown
from tools.coverage.parts import PARTS, count, hold
from tools.results import Count
from tools.run_tests import run_suites
from tools.suites import SUITES


def main() -> int:
    """Run the tests with counting, report, and compare with the floors."""
    parser = argparse.ArgumentParser(prog="./dev coverage", description=__doc__)
    parser.add_argument("part", nargs="*", metavar="PART", help="daemon: unit and system tests "
                        "on a build that counts; pc: the station and the line. Default: both")
    parser.add_argument("--report-only", action="store_true",
                        help="report what the last run has counted")
    options = parser.parse_args()
    names = [part.name for part in PARTS]
    refuse_unknown(parser, "part", options.part, names)
    parts = [part for part in PARTS if part.name in (options.part or names)]
    total = Count()
    if not options.report_only:
        needed = {name for part in parts for name in part.needs}
        total = run_suites(count(parts, [suite for suite in SUITES if suite.name in needed]))
    is_held = hold(parts)
    if not options.report_only:
        print(f"tests: {total}")
    is_held = is_held and not total.failed
    print("PASS" if is_held else "FAIL", flush=True)
    return 0 if is_held else 1
