"""The engine: threads that play scenes on stages of their own, and take down what becomes of it."""

import itertools
import threading
import time
from collections import Counter
from pathlib import Path
from random import Random
from typing import Callable, Iterable, Iterator, Sequence

from amt_simulator.errors import HandsetError
from tools.project import PROJECT
from tools.torture.cases import Case, Counted, draw
from tools.torture.outcomes import Kind, Outcome
from tools.torture.page import Symbols
from tools.torture.scenes import Scene
from tools.torture.stage import Stage
from tools.torture.trial import Trial

PROGRAM = "bin/vx-kel-amt"
# Of a scene so many cases are drawn at a time.
DRAWN = 4

# The cases of a scene that are to be played now.
Choice = Callable[[Counted], Sequence[Case]]
Teller = Callable[[Outcome], None]


class Workshop:
    """The stages and trials of one thread, which must be the one that brings them up."""

    def __init__(self, build: Path) -> None:
        self._build = build
        self._symbols = Symbols(build / PROGRAM)
        self._stages: dict[str, Stage] = {}
        self._trials: dict[str, Trial] = {}

    def trial(self, scene: Scene) -> Trial:
        """The trial of a scene, on the stage of its kind; its calls have been counted."""
        if scene.name not in self._trials:
            if scene.key not in self._stages:
                self._stages[scene.key] = Stage(scene.path, self._build, self._symbols,
                                                **scene.options)
            trial = Trial(self._stages[scene.key], scene)
            trial.count()
            self._trials[scene.name] = trial
        return self._trials[scene.name]

    @property
    def counted(self) -> list[Counted]:
        """What has been counted."""
        return [trial.counted for trial in self._trials.values()]

    def close(self) -> None:
        """Take everything down."""
        for stage in self._stages.values():
            stage.close()


class Part:
    """A thread's part of the work: scenes one after another, and which of their cases."""

    def __init__(self, scenes: Iterable[Scene], choose: Choice) -> None:
        self.scenes = scenes
        self.choose = choose


def _try(trial: Trial, case: Case) -> Outcome:
    """A case; what the handset itself cannot stand is no reason to stop."""
    try:
        return trial.try_case(case)
    except HandsetError as error:
        trial.renew()
        return Outcome(case, Kind.WRONG, [f"{type(error).__name__}: {error}"])


class Torture:
    """All parts at once, until they are done or the time is over."""

    def __init__(self, build: str, parts: Sequence[Part], tell: Teller,
                 seconds: float = float("inf")) -> None:
        self.outcomes: list[Outcome] = []
        self.counted: dict[str, Counted] = {}
        self._build = PROJECT / "build" / build
        self._parts = parts
        self._tell = tell
        self._end = time.monotonic() + seconds
        self._lock = threading.Lock()
        self._error: BaseException | None = None

    def run(self) -> None:
        """Play; the first error of a thread is everybody's."""
        threads = [threading.Thread(target=self._work, args=(part,)) for part in self._parts]
        for thread in threads:
            thread.start()
        try:
            for thread in threads:
                thread.join()
        except BaseException as error:
            self._error = error
            raise
        if self._error is not None:
            raise self._error

    def _is_over(self) -> bool:
        return time.monotonic() > self._end or self._error is not None

    def _work(self, part: Part) -> None:
        workshop = Workshop(self._build)
        try:
            for scene in part.scenes:
                if self._is_over():
                    break
                trial = workshop.trial(scene)
                for case in part.choose(trial.counted):
                    if self._is_over():
                        break
                    self._take(_try(trial, case))
        except BaseException as error:
            self._error = self._error or error
        finally:
            with self._lock:
                self.counted.update({one.scene: one for one in workshop.counted})
            workshop.close()

    def _take(self, outcome: Outcome) -> None:
        with self._lock:
            self.outcomes.append(outcome)
            self._tell(outcome)


class Shared:
    """Scenes that several threads take from, each one once."""

    def __init__(self, scenes: Iterable[Scene]) -> None:
        self._scenes = iter(scenes)
        self._lock = threading.Lock()

    def __iter__(self) -> Iterator[Scene]:
        while True:
            with self._lock:
                scene = next(self._scenes, None)
            if scene is None:
                return
            yield scene


def whole(scenes: Sequence[Scene], choose: Choice, jobs: int) -> list[Part]:
    """Every one of the scenes, the longest first."""
    shared = Shared(sorted(scenes, key=lambda scene: not scene.slow))
    return [Part(shared, choose) for _ in range(jobs)]


class Draw:
    """COUNT cases of some scenes, evenly drawn over them and over the functions."""

    def __init__(self, scenes: Sequence[Scene], seed: str, count: float) -> None:
        self._random = Random(seed)
        self._scenes = list(scenes)
        self._random.shuffle(self._scenes)
        self._count = count
        self._left: dict[str, list[Case]] = {}
        self._used: Counter[str] = Counter()

    def scenes(self) -> Iterator[Scene]:
        """The scenes again and again, until all has been drawn."""
        for scene in itertools.cycle(self._scenes):
            if self._count <= 0 or (self._left and not any(self._left.values())
                                    and len(self._left) == len(self._scenes)):
                return
            yield scene

    def choose(self, counted: Counted) -> Sequence[Case]:
        """The next cases of a scene."""
        left = self._left.setdefault(counted.scene, counted.cases())
        drawn = draw(left, int(min(DRAWN, self._count)), self._random, self._used)
        self._left[counted.scene] = [case for case in left if case not in drawn]
        self._count -= len(drawn)
        return drawn


def sample(scenes: Sequence[Scene], seed: int, count: float, jobs: int) -> list[Part]:
    """A share of the scenes for each thread: what it draws does not depend on the others."""
    draws = [Draw([scene for scene in scenes[job::jobs] if not scene.slow], f"{seed} {job}",
                  count / jobs) for job in range(jobs)]
    return [Part(one.scenes(), one.choose) for one in draws]
