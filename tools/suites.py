"""The test suites as data: what each runs, on which build, in which order."""

from dataclasses import dataclass, field
from typing import Mapping

from tools.project import CORES

# Most of a system test is waiting for a pause of the daemon: more than one a core run at once.
SYSTEM_WORKERS = 6 * CORES

# A sanitized daemon is several times slower, and so is a machine that runs several of them.
SANITIZED_WORKERS = 4 * CORES

# The deadlines of the tests are for a machine that does nothing else. Here builds run beside them;
# a deadline is only there to end a test that hangs, and one that is far away costs nothing.
PATIENCE: Mapping[str, str] = {"HANDSET_TIME_SCALE": "6"}
SANITIZED_PATIENCE: Mapping[str, str] = {"HANDSET_TIME_SCALE": "12"}

# The parts of a build that the simulated handset needs, and that together with failing calls.
HANDSET, TORTURE, ALL = "handset", "torture", "all"


@dataclass(frozen=True)
class Suite:
    """One run of one test runner on one build."""

    name: str
    preset: str
    # What pytest is given; a suite without is the unit tests, which ctest runs.
    arguments: tuple[str, ...] = ()
    environment: Mapping[str, str] = field(default_factory=dict)
    target: str = ALL
    # Run beside the others: a machine that waits for one has time for another.
    is_beside: bool = False
    # Run only when asked for by name.
    is_extra: bool = False


def system(name: str, preset: str, workers: int, patience: Mapping[str, str],
           is_beside: bool = False) -> Suite:
    """The whole daemon of a build, in the simulated handset."""
    arguments = ["tests/system", f"--handset-build={preset}", "-n", str(workers)]
    if is_beside:
        # The programs on the PC are not sanitized.
        arguments += ["-m", "not pc_side"]
    return Suite(name, preset, tuple(arguments), patience, HANDSET, is_beside)


# In the order in which they begin, and in which their builds are made: what needs no build first,
# then what needs a short one.
SUITES = (
    # The packages take longest: begun last, they would be what all wait for.
    Suite("station", "", ("tests/scripts", "tests/station", "tests/line", "-n", str(2 * CORES),
                          "--dist", "loadgroup")),
    system("system", "release", SYSTEM_WORKERS, PATIENCE),
    # Waits for its daemons nearly all the time.
    Suite("torture", "release", ("tests/torture",), PATIENCE, TORTURE, is_beside=True),
    system("system-asan", "asan", SANITIZED_WORKERS, SANITIZED_PATIENCE, is_beside=True),
    Suite("stateful", "asan", ("tests/stateful", "-n", "2"), SANITIZED_PATIENCE, HANDSET,
          is_beside=True),
    system("system-tsan", "tsan", SANITIZED_WORKERS, SANITIZED_PATIENCE, is_beside=True),
    Suite("unit", "release"),
    Suite("soak", "release", ("tests/soak",), PATIENCE, HANDSET),
    Suite("fuzz", "fuzz", ("tests/fuzz", "-n", str(CORES))),
    Suite("unit-asan", "asan", is_extra=True),
    Suite("unit-tsan", "tsan", is_extra=True),
)
