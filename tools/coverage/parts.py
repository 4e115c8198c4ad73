"""What is counted: the daemon, and the packages on the PC; each with its floors."""

from dataclasses import dataclass
from typing import Callable, Sequence

from tools.coverage import daemon, floors, pc
from tools.coverage.floors import FileCount, Floor, judge
from tools.project import say
from tools.suites import Suite


@dataclass(frozen=True)
class Part:
    """A part of the code: the suites that count it, its counts and what they must reach."""

    name: str
    # Of the suites that are to be run, those that are run in their place.
    counting: Callable[[Sequence[Suite]], list[Suite]]
    # The files' counts, and the page for people.
    report: Callable[[], tuple[list[FileCount], str]]
    floors: Sequence[Floor]
    # The suites without which nothing is counted.
    needs: tuple[str, ...] = ()


PARTS = (
    Part("daemon", daemon.counting, daemon.report, floors.DAEMON, (daemon.REPLACED,)),
    Part("pc", pc.counting, pc.report, floors.PC, pc.NAMES),
)


def count(parts: Sequence[Part], suites: Sequence[Suite]) -> list[Suite]:
    """The suites that run and count."""
    for part in parts:
        suites = part.counting(suites)
    return list(suites)


def hold(parts: Sequence[Part]) -> bool:
    """Tell what was counted, and whether nothing is below its floor."""
    say("coverage")
    is_held = True
    for part in parts:
        files, page = part.report()
        for result in judge(part.floors, files):
            print(result)
            is_held = is_held and result.holds
        print(f"file by file: {page}" if page else f"{part.name}: nothing was counted", flush=True)
    return is_held
