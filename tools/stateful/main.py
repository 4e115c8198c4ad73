"""Speak on all lines of two handsets at once, against a model: `./dev stateful [STEPS]`."""

from __future__ import annotations

import argparse
import random
from pathlib import Path

from tools.arguments import positive
from tools.build import build
from tools.project import PROJECT, note
from tools.stateful.run import Outcome, drawn, repeat, run, shorten_run
from tools.stateful.steps import read_steps, write_steps

STEPS, PRESET = 10_000, "asan"
SHORTENING_SECONDS = 300.0
TRAILS = PROJECT / "build" / "stateful"


def describe(outcome: Outcome, seed: int, preset: str, shortening: float, folder: Path) -> str:
    """What has gone wrong, by which steps, and how to see it again."""
    whole, short = folder / f"seed-{seed}.steps", folder / f"seed-{seed}-short.steps"
    write_steps(whole, seed, outcome.steps)
    kept = shorten_run(preset, outcome, shortening)
    write_steps(short, seed, kept)
    return "\n".join([
        f"FAIL: step {len(outcome.steps)} of seed {seed}: {outcome.error}", "",
        f"the shortest steps found that go wrong ({len(kept)} of {len(outcome.steps)}):",
        *(f"  {step.as_line()}" for step in kept), "",
        f"again: ./dev stateful --build {preset} --replay {short}",
        f"all:   ./dev stateful --build {preset} --replay {whole}", "", outcome.story])


def parse() -> argparse.Namespace:
    """The options."""
    parser = argparse.ArgumentParser(prog="./dev stateful", description=__doc__)
    parser.add_argument("steps", nargs="?", type=positive, default=STEPS, metavar="STEPS",
                        help=f"how many (default: {STEPS})")
    parser.add_argument("--seed", type=int, help="what they are drawn from (default: any)")
    parser.add_argument("--seconds", type=float, default=float("inf"),
                        help="no longer than this (default: however long they take)")
    parser.add_argument("--build", default=PRESET, metavar="PRESET",
                        help="the daemon that is spoken to (default: %(default)s)")
    parser.add_argument("--replay", type=argparse.FileType(encoding="utf-8"), metavar="FILE",
                        help="do the steps of a file instead")
    return parser.parse_args()


def main() -> int:
    """Do the steps and tell how it went."""
    options = parse()
    build(options.build, ("--target", "handset"))
    if options.replay:
        steps = read_steps(options.replay)
        outcome = repeat(options.build, steps)
        print(f"FAIL: step {len(outcome.steps)}: {outcome.error}\n\n{outcome.story}"
              if outcome.error else f"PASS: {outcome}")
        return 1 if outcome.error else 0
    seed = random.SystemRandom().getrandbits(32) if options.seed is None else options.seed
    note(f"seed {seed}")
    outcome = run(options.build, lambda world: drawn(seed, world), options.steps,
                  options.seconds, is_shown=True)
    if outcome.error:
        print(describe(outcome, seed, options.build, SHORTENING_SECONDS, TRAILS))
        return 1
    print(f"PASS: seed {seed}: {outcome}")
    return 0
