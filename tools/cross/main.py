"""The daemon for 32-bit Arm under emulation: `./dev cross`."""

import argparse
import sys
import time
from typing import Callable, Mapping

from tools import children
from tools.arguments import refuse_unknown
from tools.build import build
from tools.cross import warnings
from tools.cross.alike import NOT_PLAYED, ONLY_EMULATED, RULES
from tools.cross.emulated import BUILDS, EMULATED, NATIVE
from tools.cross.limits import LEFT_OUT_SANITIZED, PROBE, left_out, tell
from tools.cross.sysroot import make_sysroot
from tools.ctest import run_ctest
from tools.project import CORES, PROJECT, note, say
from tools.results import Count, read_results

SANITIZED = "armhf-asan"
TEST_SECONDS = "900"
DIALOGUE_SECONDS = 900
# The emulated handsets' deadlines are for the machine's own speed.
PATIENCE: Mapping[str, str] = {"HANDSET_TIME_SCALE": "12"}


def check_warnings() -> int:
    """Tell which warnings are errors on either machine; how many files differ in them."""
    own, arm = warnings.flags(BUILDS / NATIVE), warnings.flags(BUILDS / EMULATED)
    found = list(warnings.differences(own, arm))
    for line in found:
        print(line)
    allowed = ", ".join(f"{flag} ({reason})" for flag, reason in warnings.ONLY_ARM.items())
    note(f"warnings are errors in {len(arm)} files, the same ones on both machines; only on Arm "
         f"{allowed}" if not found else "the warnings are not the same on both machines")
    return len(found)


def run_unit() -> Count:
    """The unit tests that can be run under emulation."""
    build(EMULATED)
    build(NATIVE, ["--target", PROBE])
    differing = check_warnings()
    say("what emulation cannot do")
    tell()
    say("unit tests under emulation")
    count = run_ctest(BUILDS / EMULATED, "unit under emulation", "--timeout", TEST_SECONDS,
                      "-E", "|".join(left_out())).count
    count.failed += differing
    return count


def run_dialogues() -> Count:
    """Every dialogue with the daemon of either build."""
    build(EMULATED, ["--target", "handset"])
    build(NATIVE, ["--target", "handset"])
    say("every dialogue on both machines: the same bytes heard, files and log, but for")
    for rule in RULES:
        note(f"{rule.where}: {rule.what}: {rule.reason}")
    note(f"only the emulated handset has {', '.join(ONLY_EMULATED)}: what it starts runs by itself")
    for name, reason in NOT_PLAYED.items():
        note(f"not played: {name}: {reason}")
    report = BUILDS / EMULATED / "dialogues.xml"
    report.unlink(missing_ok=True)
    status = children.run(
        [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider", "tests/cross",
         "-n", str(2 * CORES), f"--timeout={DIALOGUE_SECONDS}", f"--junitxml={report}"],
        children.show, PATIENCE, PROJECT)
    count = read_results(report).count
    if status != 0 and not count.failed:
        print(f"pytest ended with status {status}")
        count.failed = 1
    return count


def run_sanitized() -> Count:
    """The unit tests and the fuzz corpora with AddressSanitizer, under emulation."""
    build(SANITIZED)
    say("unit tests and fuzz corpora with AddressSanitizer and UndefinedBehaviorSanitizer")
    for pattern, reason in LEFT_OUT_SANITIZED.items():
        note(f"left out: {pattern}: {reason}")
    return run_ctest(BUILDS / SANITIZED, "sanitized under emulation", "--timeout", TEST_SECONDS,
                     "-E", "|".join([*left_out(), *LEFT_OUT_SANITIZED])).count


PARTS: Mapping[str, Callable[[], Count]] = {
    "unit": run_unit, "dialogues": run_dialogues, "asan": run_sanitized,
}


def main() -> int:
    """Fetch, build and run the parts that are asked for."""
    parser = argparse.ArgumentParser(prog="./dev cross", description=__doc__)
    parser.add_argument("part", nargs="*", metavar="PART",
                        help=f"only these: {', '.join(PARTS)} (default: all)")
    chosen = parser.parse_args().part
    refuse_unknown(parser, "part", chosen, PARTS)
    make_sysroot()
    told = {}
    for name, run in PARTS.items():
        if not chosen or name in chosen:
            started = time.monotonic()
            count = run()
            # Where nothing ran, nothing has been shown.
            count.failed += not count.passed
            told[name] = count
            note(f"{name}: {count} in {time.monotonic() - started:.0f} s, with its build")
    say("32-bit Arm under emulation")
    for name, count in told.items():
        print(f"{name}: {count}", flush=True)
    return 1 if any(count.failed for count in told.values()) else 0
