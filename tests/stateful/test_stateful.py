"""All lines of two handsets at once, against the model; and a daemon that errs would be seen."""

import os
import random
from pathlib import Path
from typing import Sequence

import pytest

from tools.stateful import main, steps
from tools.stateful.phone import Phone
from tools.stateful.run import FEWEST_STEPS, Outcome, drawn, repeat, run, shorten
from tools.stateful.steps import Step
from tools.stateful.world import World

SHORTENING_SECONDS = 60.0
MEMORY_TEXT = Step(steps.PC_TEXT, "AT^DEMMCINFO?\r")


@pytest.fixture
def build(request: pytest.FixtureRequest) -> str:
    """The preset whose daemon is tested."""
    return str(request.config.getoption("--handset-build"))


def test_the_daemon_does_what_the_model_says(request: pytest.FixtureRequest, build: str,
                                             tmp_path: Path) -> None:
    """Steps of a seed for a while; the seed and the shortest steps are told of a failure."""
    seed = request.config.getoption("--stateful-seed")
    if seed is None:
        seed = 1 if os.environ.get("CI") else random.SystemRandom().getrandbits(32)
    seconds = request.config.getoption("--stateful-seconds")
    outcome = run(build, lambda world: drawn(seed, world), main.STEPS, seconds)
    print(f"seed {seed}: {outcome}")
    assert not outcome.error, main.describe(outcome, seed, build, SHORTENING_SECONDS, tmp_path)
    assert len(outcome.steps) >= FEWEST_STEPS


def test_the_number_in_front_of_the_smallest_is_the_largest(build: str) -> None:
    """A long run found the model to be wrong here."""
    wrapping = Step(steps.APP_PACKET, command=230,
                    atoms=(("int", 39, -2147483648), ("int", 36, 2)))
    outcome = repeat(build, [wrapping])
    assert not outcome.error, outcome.error
    assert outcome.steps == [wrapping]


def test_a_difference_is_found_told_and_shortened(build: str, tmp_path: Path,
                                                  monkeypatch: pytest.MonkeyPatch) -> None:
    """A model that is wrong in one place stands for a daemon that is."""
    monkeypatch.setattr(Phone, "emmc", lambda phone: "another")
    another = Step(steps.APP_PACKET, command=176)
    outcome = repeat(build, [another, MEMORY_TEXT, another])
    assert outcome.error == (
        "the line pc:\n  found  b'\\r\\n^DEMMCINFO: \"HW8G-0031 7456 M'\n"
        "  wanted b'\\r\\n^DEMMCINFO: \"another\"\\r\\n\\r\\nOK\\r\\n'")
    assert outcome.steps == [another, MEMORY_TEXT] and "the log ends with" in outcome.story
    told = main.describe(outcome, 42, build, float("inf"), tmp_path)
    assert told.startswith(f"FAIL: step 2 of seed 42: {outcome.error}\n\nthe shortest steps found "
                           f"that go wrong (1 of 2):\n  {MEMORY_TEXT.as_line()}\n\n"
                           f"again: ./dev stateful --build {build} --replay {tmp_path}/seed-42-")
    with (tmp_path / "seed-42-short.steps").open(encoding="utf-8") as stream:
        assert steps.read_steps(stream) == [MEMORY_TEXT]


def test_steps_are_drawn_alike_from_a_seed_and_survive_a_file(tmp_path: Path) -> None:
    """The model alone, without a handset behind it."""
    def draw(seed: int) -> list[Step]:
        world = World("none")
        source = drawn(seed, world)
        return [next(source) for _ in range(300)]

    one = draw(7)
    assert one == draw(7) != draw(8)
    assert {step.do for step in one} > {steps.PC_PACKET, steps.PC_TEXT, steps.APP_PACKET}
    steps.write_steps(tmp_path / "one", 7, one)
    with (tmp_path / "one").open(encoding="utf-8") as stream:
        assert steps.read_steps(stream) == one


@pytest.mark.parametrize("guilty", [{3}, {0, 99}, {10, 11, 50}])
def test_shortening_keeps_what_is_needed(guilty: set[int]) -> None:
    """Of a hundred steps those stay without which nothing goes wrong, in their order."""
    many = [Step(steps.PC_TEXT, str(number)) for number in range(100)]

    def is_failing(some: Sequence[Step]) -> bool:
        return guilty <= {int(step.text) for step in some}

    assert [int(step.text) for step in shorten(many, is_failing, 30.0)] == sorted(guilty)


def test_kinds_are_counted() -> None:
    """The line that tells how a run has gone."""
    outcome = Outcome([Step(steps.MODEM), Step(steps.MODEM), Step(steps.EVENT)], seconds=2.4)
    assert str(outcome) == "3 steps in 2 s: 1 event, 2 modem"
