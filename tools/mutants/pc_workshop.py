"""Tries mutants of the packages on the PC: nothing to build, and their own tests."""

import ast
from pathlib import Path
from typing import Callable

from tools.mutants.copy import COPY, bring_up_to_date, failing_test
from tools.mutants.fate import Fate, Trial
from tools.mutants.operators import Mutant
from tools.project import CORES, die

FOLDERS = ("tests/station", "tests/line")
# They start browsers, databases and installers; what only computes is not what they are there for.
WITHOUT = ("tests/station/test_station_wheel.py", "tests/line/test_line_web_browser.py",
           "tests/line/test_line_store_postgresql.py", "tests/line/test_line_manual.py")


class PcWorkshop:
    """The copy as it is."""

    def __init__(self, note: Callable[[str], None]) -> None:
        self._note = note
        bring_up_to_date()

    def check(self) -> None:
        """Everything passes as it is; else a found mutant says nothing."""
        self._note("testing what the mutants are made of")
        failed = self._tests(FOLDERS)
        if failed:
            die(f"without any mutant {failed} fails already")

    def try_mutant(self, mutant: Mutant) -> Trial:
        """Test it until a test fails."""
        path = COPY / mutant.path
        original = path.read_text()
        changed = mutant.applied(original)
        try:
            tree = ast.parse(changed)
        except SyntaxError:
            return Trial(mutant, Fate.NO_PROGRAM)
        if ast.dump(tree) == ast.dump(ast.parse(original)):
            return Trial(mutant, Fate.SAME)
        try:
            path.write_text(changed)
            return self._tested(mutant)
        finally:
            path.write_text(original)

    def _tested(self, mutant: Mutant) -> Trial:
        for fate, tests in ((Fate.AREA, self.area(mutant.path)), (Fate.SYSTEM, FOLDERS)):
            failed = self._tests(tests) if tests else ""
            if failed:
                return Trial(mutant, fate, failed)
        return Trial(mutant, Fate.SURVIVED)

    def area(self, path: str) -> tuple[str, ...]:
        """The tests that have the name of a source, or of the folder that it is in."""
        source = Path(path)
        found = [test.relative_to(COPY) for word in (source.stem, source.parent.name)
                 for folder in FOLDERS for test in sorted((COPY / folder).glob("test_*.py"))
                 if word.rstrip("s") in test.stem.split("_", 2)[2]]
        return tuple(dict.fromkeys(str(test) for test in found if str(test) not in WITHOUT))

    def _tests(self, tests: tuple[str, ...]) -> str:
        without = [f"--ignore={name}" for name in WITHOUT]
        return failing_test("-n", str(2 * CORES), "--dist", "loadgroup", *without, *tests)
