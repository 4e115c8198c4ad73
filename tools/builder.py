"""Builds that go on while suites run: one after another, in the order in which they are wanted."""

import threading
import time
from typing import Sequence

from tools.build import Build, BuildFailed
from tools.children import Stopped
from tools.progress import Progress

# What runs beside a build is a test, which comes first.
POLITE = ("nice", "-n", "10")
LOOK_SECONDS = 0.2

Step = tuple[str, str]


class Builder:
    """A thread that builds the (preset, target) pairs it was given."""

    def __init__(self, steps: Sequence[Step]) -> None:
        self._steps = list(dict.fromkeys(steps))
        self._ended = {step: threading.Event() for step in self._steps}
        self._failures: dict[Step, str] = {}
        self._seconds: dict[Step, float] = {}
        self._progress = (0, 0)
        self._thread = threading.Thread(target=self._work, daemon=True)

    def start(self) -> None:
        """Begin with the first."""
        self._thread.start()

    def _work(self) -> None:
        try:
            for step in self._steps:
                self._build(step)
        except Stopped:
            return

    def _build(self, step: Step) -> None:
        preset, target = step
        started = time.monotonic()
        try:
            Build(preset, ("--target", target)).run(self._show, POLITE)
        except BuildFailed as failed:
            self._failures[step] = str(failed)
        except OSError as error:
            self._failures[step] = f"{preset}: {error}"
        finally:
            self._seconds[step] = time.monotonic() - started
            self._ended[step].set()

    def _show(self, done: int, total: int) -> None:
        self._progress = (done, total)

    def seconds(self, step: Step) -> float:
        """How long the build of a step has taken."""
        return self._seconds[step]

    def wait(self, step: Step, is_watched: bool) -> str:
        """Wait until a step has been built, watching how it goes on; what went wrong, or ''."""
        if not is_watched:
            self._ended[step].wait()
            return self._failures.get(step, "")
        progress = Progress(f"building {step[0]}")
        while not self._ended[step].wait(LOOK_SECONDS):
            progress.show(*self._progress)
        progress.close()
        return self._failures.get(step, "")
