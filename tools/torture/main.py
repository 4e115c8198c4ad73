"""One call after another fails, and the daemon must stand it: `./dev torture [NAME ...]`."""

import argparse
import os
from random import Random
from typing import Sequence

from tools.build import build
from tools.project import CORES, note, say
from tools.torture.cases import Case, Counted
from tools.torture.outcomes import Outcome
from tools.torture.report import report
from tools.torture.run import Choice, Torture, sample, whole
from tools.torture.scenes import Scene, all_scenes

FIXED_SEED = 20171116
SHOWN = 300


def new_seed() -> int:
    """A change is judged by the same draw each time; who looks for something draws anew."""
    return FIXED_SEED if os.environ.get("CI") else Random().randrange(1 << 31)


def named(names: Sequence[str]) -> tuple[list[Scene], Choice]:
    """The scenes of these names and beginnings of names, and single cases; ValueError: none."""
    scenes = all_scenes()
    wanted: set[str] = set()
    single: dict[str, list[Case]] = {}
    for name in names:
        case = Case.parse(name)
        begin = case.scene if case else name
        found = ([scene.name for scene in scenes if scene.name == begin]
                 or [scene.name for scene in scenes if not case and scene.name.startswith(begin)])
        if not found:
            raise ValueError(f"no such scene or case: {name}")
        if case is None:
            wanted.update(found)
        else:
            single.setdefault(case.scene, []).append(case)

    def choose(counted: Counted) -> Sequence[Case]:
        return counted.cases() if counted.scene in wanted else single[counted.scene]

    return [scene for scene in scenes if scene.name in wanted | set(single)], choose


def _tell(outcome: Outcome) -> None:
    if outcome.problems:
        note(f"{outcome.case}: {'; '.join(outcome.problems)[:SHOWN]}")


def _parser() -> argparse.ArgumentParser:
    parser = argparse.ArgumentParser(
        prog="./dev torture", description=__doc__,
        epilog="A NAME is a scene, the beginning of some scenes' names, or a case as this prints "
               "it. Without one, cases are drawn evenly over scenes and functions.")
    parser.add_argument("name", nargs="*", metavar="NAME")
    parser.add_argument("--seed", type=int, help="draw the cases of this number again")
    parser.add_argument("--minutes", type=float, default=2.0,
                        help="how long cases are drawn and played (default: %(default)s)")
    parser.add_argument("--all", action="store_true", help="every call of every scene")
    parser.add_argument("--build", default="release", choices=("release", "asan"),
                        help="whose daemon it is (default: %(default)s)")
    parser.add_argument("--jobs", type=int, default=CORES, metavar="N",
                        help="handsets at once (default: %(default)s)")
    return parser


def main() -> int:
    """Build what is needed, let calls fail, and tell what became of it."""
    parser = _parser()
    options = parser.parse_args()
    if not options.minutes > 0 or options.jobs < 1:
        parser.error("the minutes and the jobs are numbers above 0")
    seconds = float("inf")
    try:
        if options.name:
            parts = whole(*named(options.name), options.jobs)
        elif options.all:
            parts = whole(all_scenes(), lambda counted: counted.cases(), options.jobs)
        else:
            seed = new_seed() if options.seed is None else options.seed
            say(f"--seed {seed} --jobs {options.jobs}")
            parts = sample(all_scenes(), seed, float("inf"), options.jobs)
            seconds = options.minutes * 60
    except ValueError as error:
        parser.error(str(error))
    build(options.build, ("--target", "torture"))
    torture = Torture(options.build, parts, _tell, seconds)
    torture.run()
    print(report(torture.outcomes, list(torture.counted.values())))
    return 1 if any(outcome.problems for outcome in torture.outcomes) else 0
