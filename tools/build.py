"""Configure and build a preset: `./dev build`."""

import argparse
import os
import re
import time
from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable, Sequence

from tools import children
from tools.progress import Progress
from tools.project import PROJECT, die, note, say

PRESETS = ("release", "asan", "tsan", "coverage", "fuzz", "fuzz-plain", "armhf", "armhf-asan",
           "android")
# What ninja puts before each step.
STEP = re.compile(rb"\[(\d+)/(\d+)\] ")
FIRST_FAILURE = re.compile(r"^FAILED: |^CMake Error", re.MULTILINE)
SHOWN_LINES = 60

Shower = Callable[[int, int], None]


class BuildFailed(Exception):
    """What went wrong, for people."""


@dataclass
class Build:
    """One build of some targets of a preset; everything it says goes to its log."""

    preset: str
    arguments: Sequence[str] = ()
    folder: Path = PROJECT
    log: Path = field(init=False)

    def __post_init__(self) -> None:
        self.log = PROJECT / "build" / f"{self.preset}.log"

    def run(self, shower: Shower, prefix: Sequence[str] = ()) -> None:
        """Configure and build, SHOWER being told about each step; raises BuildFailed."""
        self.log.parent.mkdir(exist_ok=True)
        with open(self.log, "wb") as log:
            def take(piece: bytes) -> None:
                log.write(piece)
                log.flush()
                steps = STEP.findall(piece)
                if steps:
                    shower(int(steps[-1][0]), int(steps[-1][1]))

            status = children.run(["cmake", "--preset", self.preset], take)
            if status == 0:
                command = ["cmake", "--build", "--preset", self.preset, *self.arguments]
                status = children.run([*prefix, *command], take, {"NINJA_STATUS": "[%f/%t] "})
        if status != 0:
            raise BuildFailed(f"{self.failure()}\nthe {self.preset} build failed; "
                              f"all of it: {self.log}")

    def failure(self) -> str:
        """The part of the log that says why."""
        text = self.log.read_text(errors="backslashreplace")
        failed = FIRST_FAILURE.search(text)
        if failed:
            return "\n".join(text[failed.start():].splitlines()[:SHOWN_LINES])
        return "\n".join(text.splitlines()[-SHOWN_LINES:])


def build(preset: str, arguments: Sequence[str] = ()) -> None:
    """Build a preset now, and show how it goes on; ends the program when that fails."""
    say(f"building {preset}")
    started = time.monotonic()
    progress = Progress(preset)
    try:
        Build(preset, arguments).run(progress.show)
    except BuildFailed as failed:
        progress.close()
        die(str(failed))
    progress.close()
    note(f"{preset}: built in {time.monotonic() - started:.0f} s")


def main() -> int:
    """Build one preset."""
    parser = argparse.ArgumentParser(prog="./dev build", description=__doc__)
    parser.add_argument("preset", nargs="?", default="release", metavar="PRESET",
                        help=f"one of {', '.join(PRESETS)} (default: release)")
    parser.add_argument("argument", nargs=argparse.REMAINDER,
                        help="passed to `cmake --build`: --target NAME, -j N, --verbose ...")
    options = parser.parse_args()
    if options.preset not in PRESETS:
        die(f"no such preset: {options.preset} (there are: {', '.join(PRESETS)})")
    if options.preset == "android" and not os.environ.get("ANDROID_NDK"):
        die("ANDROID_NDK has to name an Android NDK")
    build(options.preset, options.argument)
    return 0
