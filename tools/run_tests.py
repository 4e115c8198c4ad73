"""Run the test suites and count what they say: `./dev test`."""

import argparse
import os
import shutil
import subprocess
import sys
import time
import xml.etree.ElementTree as ElementTree
from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable

PROJECT = Path(__file__).resolve().parents[1]
RESULTS = PROJECT / "build" / "test-results"

# Most of a system test is waiting for a described pause, so more of them than cores run at once.
SYSTEM_WORKERS = 6 * (os.cpu_count() or 1)

# A sanitized daemon is several times slower, and so is a machine that runs several of them.
SANITIZED_PATIENCE = "4"
SANITIZED_WORKERS = 4 * (os.cpu_count() or 1)


# More failures than this are no bad luck.
SECOND_CHANCES = 5


@dataclass
class Count:
    """What a suite's report counts."""

    passed: int = 0
    failed: int = 0
    skipped: int = 0

    def add(self, other: "Count") -> None:
        """Add another suite's count."""
        self.passed += other.passed
        self.failed += other.failed
        self.skipped += other.skipped

    def __str__(self) -> str:
        return f"{self.passed} passed, {self.failed} failed, {self.skipped} skipped"


@dataclass
class Suite:
    """One run of one test runner on one build."""

    name: str
    preset: str
    command: Callable[[Path], list[str]]
    environment: dict[str, str] = field(default_factory=dict)
    target: str = "all"
    # Run only when asked for by name.
    is_extra: bool = False


def read_count(report: Path) -> Count:
    """Count the test cases of a JUnit report."""
    count = Count()
    for case in ElementTree.parse(report).getroot().iter("testcase"):
        if case.find("failure") is not None or case.find("error") is not None:
            count.failed += 1
        elif case.find("skipped") is not None or case.get("status") in ("notrun", "disabled"):
            count.skipped += 1
        else:
            count.passed += 1
    return count


def failed_tests(report: Path) -> list[str]:
    """The failed tests of a pytest report, as pytest takes them."""
    return [f"{case.get('classname', '').replace('.', '/')}.py::{case.get('name')}"
            for case in ElementTree.parse(report).getroot().iter("testcase")
            if case.find("failure") is not None or case.find("error") is not None]


def ctest(preset: str) -> Callable[[Path], list[str]]:
    """The unit tests of a build."""
    return lambda report: [
        "ctest", "--test-dir", str(PROJECT / "build" / preset), "--output-on-failure",
        "--no-tests=error", "-j", str(os.cpu_count() or 1), "--output-junit", str(report), "-Q"]


def pytest(*arguments: str) -> Callable[[Path], list[str]]:
    """Tests in Python."""
    return lambda report: [
        sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider", "--timeout=180",
        f"--junitxml={report}", *arguments]


def system(preset: str, workers: int) -> Callable[[Path], list[str]]:
    """The whole daemon of a build, in the simulated handset."""
    return pytest("tests/system", f"--handset-build={preset}", "-n", str(workers))


def all_suites() -> list[Suite]:
    """Every suite, in the order in which they run."""
    suites = [
        Suite("unit", "release", ctest("release")),
        Suite("station", "", pytest("tests/station", "tests/scripts", "-n", "4")),
        Suite("system", "release", system("release", SYSTEM_WORKERS), target="handset"),
        Suite("soak", "release", pytest("tests/soak"), target="handset"),
    ]
    for preset in ("asan", "tsan"):
        suites.append(Suite(f"system-{preset}", preset, system(preset, SANITIZED_WORKERS),
                            {"HANDSET_TIME_SCALE": SANITIZED_PATIENCE}, target="handset"))
    suites.append(Suite("fuzz", "fuzz", pytest("tests/fuzz", "-n", "2")))
    for preset in ("asan", "tsan"):
        suites.append(Suite(f"unit-{preset}", preset, ctest(preset), is_extra=True))
    return suites


def say(text: str) -> None:
    """Say what is going on; standard output stays for the runners."""
    print(f"\n== {text}", file=sys.stderr, flush=True)


def build(preset: str, target: str) -> bool:
    """Build a target of a preset the way everybody does."""
    command = [str(PROJECT / "dev"), "build", preset, "--target", target]
    return subprocess.run(command, check=False).returncode == 0


def run_again(suite: Suite, report: Path, count: Count) -> None:
    """Run a few failed tests once more, alone: on a machine under load a deadline may be missed.

    Those that pass then are counted as passed, and named.
    """
    tests = failed_tests(report)
    say(f"suite {suite.name}: once more, one by one: {' '.join(tests)}")
    options = [word for word in suite.command(report) if word.startswith(("--handset", "--fuzz"))]
    again = report.with_name(f"{suite.name}-again.xml")
    subprocess.run(pytest(*tests, *options)(again), cwd=PROJECT, check=False,
                   stdin=subprocess.DEVNULL, env={**os.environ, **suite.environment})
    second = read_count(again) if again.exists() else Count()
    if second.passed + second.failed + second.skipped >= len(tests):
        count.passed += count.failed - second.failed
        count.failed = second.failed
        say(f"suite {suite.name}: {second.passed} of {len(tests)} passed at the second try")


def run(suite: Suite) -> Count:
    """Run one suite. A runner that ends badly without a failed test counts as one."""
    if suite.preset and not build(suite.preset, suite.target):
        return Count(failed=1)
    report = RESULTS / f"{suite.name}.xml"
    report.unlink(missing_ok=True)
    say(f"suite {suite.name}")
    started = time.monotonic()
    status = subprocess.run(suite.command(report), cwd=PROJECT, check=False,
                            stdin=subprocess.DEVNULL,
                            env={**os.environ, **suite.environment}).returncode
    count = read_count(report) if report.exists() else Count()
    if status != 0 and count.failed == 0:
        count.failed = 1
    elif 0 < count.failed <= SECOND_CHANCES and "pytest" in suite.command(report):
        run_again(suite, report, count)
    say(f"suite {suite.name}: {count} in {time.monotonic() - started:.0f} s")
    return count


def choose(names: list[str]) -> list[Suite]:
    """The suites that were asked for."""
    suites = all_suites()
    known = [suite.name for suite in suites]
    for name in names:
        if name not in known:
            sys.exit(f"dev: no such suite: {name} (there are: {', '.join(known)})")
    return [suite for suite in suites
            if (suite.name in names if names else not suite.is_extra)]


def main() -> int:
    """Run the chosen suites and print one line that counts them all."""
    parser = argparse.ArgumentParser(prog="./dev test", description="Run the tests.")
    parser.add_argument("suite", nargs="*", help="only these: " + ", ".join(
        suite.name + (" (not run unless named)" if suite.is_extra else "")
        for suite in all_suites()))
    suites = choose(parser.parse_args().suite)
    shutil.rmtree(RESULTS, ignore_errors=True)
    RESULTS.mkdir(parents=True)
    total = Count()
    for suite in suites:
        total.add(run(suite))
    say("all suites" if len(suites) > 1 else f"suite {suites[0].name}")
    print(total, flush=True)
    return 1 if total.failed or not total.passed else 0


if __name__ == "__main__":
    sys.exit(main())
