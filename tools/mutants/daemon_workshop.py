"""Tries mutants of the daemon: each is built, then tested until a test fails."""

import re
from pathlib import Path
from typing import Callable, Sequence

from tools.lint.tested import DOCUMENT, read_rows
from tools.mutants.areas import further
from tools.mutants.copy import COPY, TEST_SECONDS, bring_up_to_date, failing_test, quietly
from tools.mutants.fate import Fate, Trial
from tools.mutants.operators import Mutant
from tools.project import CORES, PROJECT, die
from tools.suites import PATIENCE, SYSTEM_WORKERS

PRESET = "release"
# What reads or writes one byte too far may do it without a trace elsewhere.
SANITIZED_PRESET = "asan"
BUILDS = COPY / "build"
PROGRAM = BUILDS / PRESET / "bin" / "vx-kel-amt"
UNIT_PROGRAMS = ("amt-unit-tests", "pub-unit-tests")
TARGETS = {PRESET: ("handset", *UNIT_PROGRAMS), SANITIZED_PRESET: UNIT_PROGRAMS}
# Most of a unit test is waiting, too.
UNIT_JOBS = 4 * CORES


class DaemonWorkshop:
    """The copy, with a build of the daemon and of its tests."""

    def __init__(self, note: Callable[[str], None]) -> None:
        self._note = note
        self._rows = read_rows((PROJECT / DOCUMENT).read_text())
        bring_up_to_date()
        self._note("building what the mutants are made of")
        for preset in (PRESET, SANITIZED_PRESET):
            self._make(preset)
        self._whole = PROGRAM.read_bytes()

    def _make(self, preset: str) -> None:
        status, said = quietly(["cmake", "--preset", preset])
        if status == 0:
            status, said = self._build(preset)
        if status != 0:
            die(f"the copy cannot be built:\n{said[-2000:]}")

    def _build(self, preset: str = PRESET) -> tuple[int, str]:
        return quietly(["cmake", "--build", "--preset", preset, "--target", *TARGETS[preset]])

    def check(self) -> None:
        """Everything passes as it is; else a found mutant says nothing."""
        self._note("testing what the mutants are made of")
        failed = self._unit() or self._system(["tests/system"]) or self._sanitized()
        if failed:
            die(f"without any mutant {failed} fails already")

    def try_mutant(self, mutant: Mutant) -> Trial:
        """Build it, and test it until a test fails."""
        path = COPY / mutant.path
        original = path.read_text()
        try:
            path.write_text(mutant.applied(original))
            if self._build()[0] != 0:
                return Trial(mutant, Fate.NO_PROGRAM)
            if PROGRAM.read_bytes() == self._whole:
                return Trial(mutant, Fate.SAME)
            return self._tested(mutant)
        finally:
            path.write_text(original)

    def _tested(self, mutant: Mutant) -> Trial:
        area = self.area(mutant.path)
        stages: list[tuple[Fate, Callable[[], str]]] = [(Fate.UNIT, self._unit)]
        if area:
            stages.append((Fate.AREA, lambda: self._system(area)))
        others = ["tests/system", *(f"--ignore={test}" for test in area)]
        stages += [(Fate.SYSTEM, lambda: self._system(others)),
                   (Fate.SANITIZED, self._sanitized)]
        for fate, run in stages:
            failed = run()
            if failed:
                return Trial(mutant, fate, failed)
        return Trial(mutant, Fate.SURVIVED)

    def area(self, path: str) -> list[str]:
        """The system tests of a source: by the architecture document, its name, and a table."""
        tests = [test for sources, tests in self._rows for test in tests
                 if test.startswith("tests/system/test_")
                 and any(path == source or path.startswith(f"{source}/") for source in sources)]
        stem = Path(path).stem.replace("-", "_").removeprefix("amt_")
        tests += [str(found.relative_to(COPY)) for found in
                  sorted((COPY / "tests" / "system").glob(f"test_*{stem}*.py"))]
        return list(dict.fromkeys([*tests, *further(path)]))

    def _sanitized(self) -> str:
        """The same with the sanitizer's build, which is made only here: it takes its time."""
        if self._build(SANITIZED_PRESET)[0] != 0:
            return ""
        return self._unit(SANITIZED_PRESET)

    def _unit(self, preset: str = PRESET) -> str:
        """The name of a unit test that fails; empty when all pass."""
        status, said = quietly(
            ["ctest", "--test-dir", str(BUILDS / preset), "--no-tests=error", "-j", str(UNIT_JOBS),
             "--stop-on-failure", "--timeout", str(TEST_SECONDS), "-R", r"^(amt|pub)\."])
        if status == 0:
            return ""
        found = re.search(r"Test +#\d+: (\S+) .*\*\*\*", said)
        return found.group(1) if found else f"ctest, with status {status}"

    def _system(self, tests: Sequence[str]) -> str:
        """The same with system tests; those of the programs on the PC say nothing."""
        return failing_test("-n", str(SYSTEM_WORKERS), "-m", "not pc_side",
                            f"--handset-build={BUILDS / PRESET}", *tests, environment=PATIENCE)
