"""What Python reads of strangers, with ever new examples: the frames of a line, and plan files."""

from __future__ import annotations

import random
import re
import sys
import time
from dataclasses import dataclass, field

from tools import children
from tools.project import PROJECT

# Among the tests of these files those that draw their examples.
FILES = ("tests/station/test_station_decoder.py", "tests/station/test_station_wire.py",
         "tests/line/test_line_plan.py", "tests/line/test_line_plan_whole.py")
EXAMPLES = re.compile(rb"- (\d+) passing examples")
PASSED = 0


@dataclass
class Properties:
    """How often they held."""

    examples: int = 0
    rounds: int = 0
    seconds: float = 0.0
    status: int = PASSED
    said: bytes = field(default=b"", repr=False)


def run(seconds: float, processes: int) -> Properties:
    """Draw examples for SECONDS, at least once; the first that does not hold ends it."""
    result = Properties()
    began = time.monotonic()
    while result.status == PASSED and (result.rounds == 0 or result.seconds < seconds):
        said: list[bytes] = []
        seed = random.SystemRandom().getrandbits(32)
        # Where a machine judges a change the examples are always the same; here they never are.
        result.status = children.run(
            [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider", "-m", "hypothesis",
             "-n", str(processes), f"--hypothesis-seed={seed}", "--hypothesis-show-statistics",
             *FILES], said.append, {"CI": ""}, PROJECT)
        result.said = b"".join(said)
        result.examples += sum(map(int, EXAMPLES.findall(result.said)))
        result.rounds += 1
        result.seconds = time.monotonic() - began
    return result
