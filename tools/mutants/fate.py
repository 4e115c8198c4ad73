"""What may become of a mutant."""

from dataclasses import dataclass
from enum import Enum

from tools.mutants.operators import Mutant


class Fate(Enum):
    """What became of a mutant."""

    NO_PROGRAM = "does not compile"
    SAME = "is the same program"
    UNIT = "found by the unit tests"
    AREA = "found by the tests of its area"
    SYSTEM = "found by the other tests"
    SANITIZED = "found by the sanitized unit tests"
    SURVIVED = "survived"

    @property
    def is_found(self) -> bool:
        """Whether a test has found it."""
        return self in (Fate.UNIT, Fate.AREA, Fate.SYSTEM, Fate.SANITIZED)


@dataclass(frozen=True)
class Trial:
    """A mutant, what became of it, and the first test that failed."""

    mutant: Mutant
    fate: Fate
    found_by: str = ""
