"""A run of steps on two fresh handsets, and the shortest run that fails as a long one did."""

from __future__ import annotations

import sys
import time
from collections import Counter
from dataclasses import dataclass, field
from typing import Callable, Iterable, Iterator, Sequence

from tools.progress import Progress
from tools.stateful.draw import Draw
from tools.stateful.steps import Step
from tools.stateful.side import Mismatch
from tools.stateful.world import World

CHECK_EVERY = 100
# However slow a machine is, a run that is shorter than this says nothing.
FEWEST_STEPS = 100
# In a shortened run an answer that does not come has been seen not to come before.
SHORTENED_PATIENCE = 5.0


@dataclass
class Outcome:
    """How a run has gone."""

    steps: list[Step] = field(default_factory=list)
    error: str = ""
    story: str = ""
    seconds: float = 0.0

    @property
    def kinds(self) -> "Counter[str]":
        """How often each kind of step was done."""
        return Counter(step.do for step in self.steps)

    def __str__(self) -> str:
        counted = ", ".join(f"{count} {kind}" for kind, count in sorted(self.kinds.items()))
        return f"{len(self.steps)} steps in {self.seconds:.0f} s: {counted}"


def drawn(seed: int, world: World) -> Iterator[Step]:
    """Steps without an end, each fit for the moment."""
    draw = Draw(seed)
    while True:
        step = draw.step(world.pc_model, world.app_model, world.held is not None)
        if world.can(step):
            yield step


def run(build: str, source: Callable[[World], Iterable[Step]], count: int, seconds: float,
        patience: float | None = None, is_shown: bool = False) -> Outcome:
    """Do at most COUNT steps, for about SECONDS, until one goes wrong."""
    outcome = Outcome()
    progress = Progress("steps", is_shown and sys.stderr.isatty())
    world = World(build, patience)
    began = time.monotonic()
    try:
        with world:
            # The handsets have taken their time to come up.
            began = time.monotonic()
            for step in source(world):
                outcome.steps.append(step)
                world.apply(step)
                if len(outcome.steps) % CHECK_EVERY == 0:
                    world.check_size()
                if is_shown:
                    progress.show(len(outcome.steps), count)
                is_late = time.monotonic() - began > seconds
                if len(outcome.steps) >= (min(count, FEWEST_STEPS) if is_late else count):
                    break
    except Mismatch as error:
        outcome.error, outcome.story = str(error), world.last_story
    finally:
        progress.close()
    outcome.seconds = time.monotonic() - began
    return outcome


def repeat(build: str, steps: Sequence[Step], patience: float | None = None) -> Outcome:
    """Do these steps, without those that make no sense where they stand now."""
    return run(build, lambda world: (step for step in steps if world.can(step)),
               len(steps) + 1, float("inf"), patience)


def _last_steps(steps: Sequence[Step], is_failing: Callable[[Sequence[Step]], bool],
                end: float) -> list[Step]:
    """A few last steps if they fail by themselves: what went before seldom matters."""
    count = 1
    while count < len(steps) // 2 and time.monotonic() < end:
        if is_failing(steps[-count:]):
            return list(steps[-count:])
        count *= 4
    return list(steps)


def shorten(steps: Sequence[Step], is_failing: Callable[[Sequence[Step]], bool],
            seconds: float) -> list[Step]:
    """The shortest list of steps that still fails, as far as SECONDS allow to look for it."""
    end = time.monotonic() + seconds
    kept = _last_steps(steps, is_failing, end)
    size = max(1, len(kept) // 2)
    while size >= 1 and time.monotonic() < end:
        start = len(kept)
        is_shorter = False
        while start > 0 and time.monotonic() < end:
            start = max(0, start - size)
            tried = kept[:start] + kept[start + size:]
            if tried and is_failing(tried):
                kept, is_shorter = tried, True
        if size == 1 and not is_shorter:
            break
        size = max(1, size // 2)
    return kept


def shorten_run(build: str, outcome: Outcome, seconds: float) -> list[Step]:
    """The shortest steps that go wrong; all of them when they do not go wrong again."""
    def is_failing(steps: Sequence[Step]) -> bool:
        return bool(repeat(build, steps, SHORTENED_PATIENCE).error)

    return shorten(outcome.steps, is_failing, seconds)
