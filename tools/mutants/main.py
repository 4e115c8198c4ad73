"""How many small defects the tests find: `./dev mutate [N]`."""

import argparse
import itertools
import time
from typing import Callable, Iterator, Mapping, Protocol, Sequence

from tools.arguments import positive
from tools.mutants.daemon_workshop import DaemonWorkshop
from tools.mutants.draw import EQUAL, drawn, known_equal, pc_sources, sources
from tools.mutants.fate import Fate, Trial
from tools.mutants.operators import Mutant
from tools.mutants.pc_workshop import PcWorkshop
from tools.project import die, note, say


class Workshop(Protocol):
    """Where mutants are tried."""

    def check(self) -> None:
        """Everything passes as it is; else a found mutant says nothing."""

    def try_mutant(self, mutant: Mutant) -> Trial:
        """Test it until a test fails."""


# What may be broken: its sources, and who tries its mutants.
SUBJECTS: Mapping[str, tuple[Callable[[], Mapping[str, str]],
                             Callable[[Callable[[str], None]], Workshop]]] = {
    "daemon": (sources, DaemonWorkshop),
    "pc": (pc_sources, PcWorkshop),
}


def chosen(files: Mapping[str, str], seed: int, names: Sequence[str]) -> Iterator[Mutant]:
    """The mutants to try, in order; when they are drawn, with spares for those that are none."""
    if not names:
        return drawn(files, seed)
    known = {mutant.name: mutant for mutant in drawn(files, seed)}
    unknown = [name for name in names if name not in known]
    if unknown:
        die(f"no such mutant: {unknown[0]} (they are named FILE:PLACE:KIND)")
    return iter([known[name] for name in names])


def subject(mutant: Mutant) -> str:
    """Of what it is a mutant."""
    return "pc" if mutant.path.endswith(".py") else "daemon"


def score(trials: Sequence[Trial], equal: Sequence[Mutant]) -> str:
    """The result in a line."""
    judged = [trial for trial in trials if trial.mutant not in equal]
    found = sum(trial.fate.is_found for trial in judged)
    share = 100 * found / len(judged) if judged else 0.0
    return (f"{found} of {len(judged)} mutants found, {share:.1f} %; "
            f"{len(trials) - len(judged)} more are known to be equal")


def report(trials: Sequence[Trial], others: Sequence[Trial]) -> int:
    """Say what became of all; 1 when one has survived that is not known to be equal."""
    known = known_equal(EQUAL.read_text())
    equal = [trial.mutant for trial in trials
             if trial.fate is Fate.SURVIVED and trial.mutant.listed in known]
    say("mutants")
    for fate in Fate:
        count = sum(trial.fate is fate for trial in [*trials, *others])
        if count:
            note(f"{count:4} {fate.value}")
    lost = [trial.mutant for trial in trials
            if trial.fate is Fate.SURVIVED and trial.mutant not in equal]
    for mutant in equal:
        print(f"equal: {mutant} ({known[mutant.listed]})")
    for mutant in lost:
        print(f"survived: {mutant}\n    ./dev mutate --of {subject(mutant)} --only {mutant.name}")
    print(score(trials, equal), flush=True)
    return 1 if lost else 0


def main() -> int:
    """Draw mutants, try each, and print the score and the survivors."""
    parser = argparse.ArgumentParser(
        prog="./dev mutate", description="Put small defects into a copy of the project, one at a "
        "time, and see whether the tests find them: the unit tests, then those of the area, then "
        "all, then the unit tests with a sanitizer.")
    parser.add_argument("number", nargs="?", type=positive, default=30, metavar="N",
                        help="how many (default: %(default)s; one takes half a minute, one that "
                        "survives four)")
    parser.add_argument("--seed", type=int, default=1, help="which ones (default: %(default)s)")
    parser.add_argument("--only", nargs="+", metavar="MUTANT", default=[],
                        help="only these, as the survivors are named")
    parser.add_argument("--list", action="store_true", help="only say which would be tried")
    parser.add_argument("--of", choices=list(SUBJECTS), default="daemon", help="what is broken: "
                        "the daemon, or what only computes on the PC (default: %(default)s)")
    options = parser.parse_args()
    files, workshop_of = SUBJECTS[options.of]
    wanted = len(options.only) or options.number
    mutants = chosen(files(), options.seed, options.only)
    if options.list:
        for mutant in itertools.islice(mutants, wanted):
            print(mutant)
        return 0
    workshop = workshop_of(note)
    workshop.check()
    trials: list[Trial] = []
    others: list[Trial] = []
    for mutant in mutants:
        started = time.monotonic()
        trial = workshop.try_mutant(mutant)
        is_judged = trial.fate not in (Fate.NO_PROGRAM, Fate.SAME)
        (trials if is_judged else others).append(trial)
        by = f": {trial.found_by}" if trial.found_by else ""
        note(f"{len(trials):4} {mutant}\n        {trial.fate.value}{by} "
             f"({time.monotonic() - started:.0f} s)")
        if len(trials) == wanted:
            break
    return report(trials, others)
