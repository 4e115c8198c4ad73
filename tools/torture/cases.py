"""The cases: which call fails in which scene, and how."""

import re
from collections import Counter
from dataclasses import dataclass
from random import Random
from typing import Iterable, Sequence

from tools.torture.failures import FAILURES, Failure
from tools.torture.page import Call, Order, Symbols

MAIN = "main"
# Called as often as there is time.
PERIODIC = ("poll", "ppoll", "select")
_TEXT = re.compile(r"(?P<scene>[^:]+):(?P<function>\w+)@(?P<symbol>[^/]+)/(?P<thread>[^#]+)"
                   r"#(?P<nth>\d+)=(?P<failure>.+)")


@dataclass(frozen=True, order=True)
class Place:
    """From where a function is called, and on which thread, in names that a rebuild keeps."""

    function: str
    symbol: str
    thread: str


@dataclass(frozen=True)
class Case:
    """The Nth call from a place fails while a scene is played."""

    scene: str
    place: Place
    nth: int
    failure: Failure

    def __str__(self) -> str:
        place = self.place
        return (f"{self.scene}:{place.function}@{place.symbol}/{place.thread}"
                f"#{self.nth}={self.failure.name}")

    @classmethod
    def parse(cls, text: str) -> "Case | None":
        """The case of this name; None when it is none."""
        match = _TEXT.fullmatch(text)
        if match is None:
            return None
        failures = {failure.name: failure for failure in FAILURES.get(match["function"], ())}
        if match["failure"] not in failures:
            return None
        place = Place(match["function"], match["symbol"], match["thread"])
        return cls(match["scene"], place, int(match["nth"]), failures[match["failure"]])


@dataclass(frozen=True)
class Counted:
    """What a good run of a scene has called, from where and how often."""

    scene: str
    counts: Counter[Place]
    calls: dict[Place, Call]
    symbols: Symbols

    @classmethod
    def of(cls, scene: str, calls: Iterable[Call], symbols: Symbols) -> "Counted":
        """Count the calls that can fail."""
        counts: Counter[Place] = Counter()
        examples: dict[Place, Call] = {}
        for call in calls:
            if call.function in FAILURES:
                thread = symbols.data(call.thread) if call.thread else MAIN
                place = Place(call.function, symbols.name(call.site), thread)
                counts[place] += 1
                examples.setdefault(place, call)
        return cls(scene, counts, examples, symbols)

    def lasting(self) -> Counter[Place]:
        """The counts but for the calls of who looks again and again."""
        return Counter({place: count for place, count in self.counts.items()
                        if place.function not in PERIODIC})

    def cases(self) -> list[Case]:
        """Every call of it, failing in every way."""
        return [Case(self.scene, place, nth, failure) for place in sorted(self.counts)
                for nth in range(1, self.counts[place] + 1) for failure in FAILURES[place.function]]

    def order(self, case: Case) -> Order | None:
        """What the library is told; None when the place is not reached in this scene."""
        call = self.calls.get(case.place)
        if call is None:
            return None
        low, high = self.symbols.limits(call.site)
        return Order(case.place.function, low, high, call.thread, case.nth,
                     case.failure.short, case.failure.result, case.failure.errno)


def draw(cases: Sequence[Case], count: int, random: Random, used: "Counter[str]") -> list[Case]:
    """Some of the cases of a scene, those functions first that were drawn least so far."""
    left = sorted(cases, key=str)
    random.shuffle(left)
    drawn: list[Case] = []
    while left and len(drawn) < count:
        case = min(left, key=lambda one: used[one.place.function])
        left.remove(case)
        used[case.place.function] += 1
        drawn.append(case)
    return drawn
