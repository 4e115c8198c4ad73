"""Plays a scene, with a call that fails or without, and says what became of it."""

import re
from collections import Counter
from dataclasses import dataclass, field

from amt_simulator.control import ProcessInfo
from amt_simulator.errors import HandsetError
from amt_station import wire
from tools.torture.cases import Case, Counted
from tools.torture.outcomes import (LEFT, START_STATUSES, Kind, Outcome, compare, first_difference,
                                    is_allowed, refuses, told)
from tools.torture.page import Call, Order
from tools.torture.play import Heard, Play, hear
from tools.torture.scenes import Scene
from tools.torture.stage import HANG_SECONDS, Hang, Stage, nobody_listens

CRASH = re.compile(r"receive signal: (7|11) - ")
# A request that every daemon serves which serves at all, and its answer.
APP_GOOD = wire.Packet(45, (wire.Atom.integer(19, 1),)).encode()
APP_SERVED = wire.Packet(46, (wire.Atom.integer(19, 1), wire.Atom.raw(
    18, b"\rAndroid4.2,2013-01-21" + b"\n" * 42), wire.Atom.integer(1, 0))).encode()
PC_GOOD, PC_SERVED = b"AT^DBTADDR=?\r", b"\r\nOK\r\n"
# What is held of an unanswered request goes first; nothing takes more.
ATTEMPTS = 4
# What a thread or a child still holds that is about to end is given back in this time.
BACK_SECONDS = 8.0


@dataclass
class Run:
    """How a scene went once."""

    heard: Heard = field(default_factory=Heard)
    fired: bool = False
    # The status with which the daemon ended; None: it is there.
    status: int | None = None
    given_up: bool = False
    lives_on: bool = False
    # It held a refused packet, and was started anew.
    freed: bool = False
    # What it has called, when nothing was to fail.
    calls: list[Call] = field(default_factory=list)
    # What the daemon holds behind it that it did not hold before.
    more: "Counter[str]" = field(default_factory=Counter)
    problems: list[str] = field(default_factory=list)


class Trial:
    """A scene on a stage."""

    def __init__(self, stage: Stage, scene: Scene) -> None:
        self.stage = stage
        self.scene = scene
        self._good = Run()
        self._needs_new = False
        self.counted = Counted(scene.name, Counter(), {}, stage.symbols)

    def count(self) -> None:
        """Play it with nothing failing, and take down what is called.

        A daemon that has played it once may play it otherwise: then each case needs a new one.
        """
        self.counted, self._good = self._count()
        if self.scene.dialogue is not None and self.stage.is_new and self.stage.runs:
            again, _ = self._count()
            self._needs_new = again.lasting() != self.counted.lasting()

    def _count(self) -> tuple[Counted, Run]:
        run = self.play(None)
        if run.problems or run.heard.wrong:
            raise HandsetError(f"{self.scene.name} fails by itself: {run.problems} "
                               f"{[str(wrong) for wrong in run.heard.wrong]}\n"
                               f"{self.stage.handset.story()}")
        if not self.stage.page.is_there:
            raise HandsetError("the daemon does not know the library")
        return Counted.of(self.scene.name, run.calls, self.stage.symbols), run

    def try_case(self, case: Case) -> Outcome:
        """Play it with the case's call failing."""
        order, good = self.counted.order(case), self._good
        if order is None:
            return Outcome(case, Kind.NOT_REACHED)
        run = self.play(order)
        kind = self._kind(run, good) if run.fired else Kind.NOT_REACHED
        problems = run.problems
        left = LEFT.get((case.place.function, case.place.symbol), ())
        too_much = {name: count for name, count in (+run.more).items() if name not in left}
        if too_much:
            problems.append(f"holds more: {too_much}")
        if not is_allowed(kind, case):
            problems.append(f"{kind.value}: {first_difference(good.heard, run.heard)}, "
                            f"status {run.status}")
        if run.status not in (None, 0, good.status) and not self._may_end_with(run.status):
            problems.append(f"ended with {run.status}")
        if kind is Kind.AS_USUAL:
            problems += told(run.heard)
        return Outcome(case, kind, problems)

    def _may_end_with(self, status: int | None) -> bool:
        is_start = self.scene.dialogue is None and self.scene.action is None
        return is_start and status in START_STATUSES

    def _kind(self, run: Run, good: Run) -> Kind:
        if run.given_up:
            return Kind.GIVEN_UP
        if run.lives_on:
            kind = compare(good.heard, run.heard, self.stage.is_app)
            return Kind.LIVES_ON if kind is Kind.AS_USUAL else kind
        if run.status == good.status:
            return compare(good.heard, run.heard, self.stage.is_app)
        return Kind.START_FAILED if run.status else Kind.ENDED

    def renew(self) -> None:
        """Begin again with another handset."""
        self.stage.is_new = False
        self.stage.renew()

    # one run

    def play(self, order: Order | None) -> Run:
        """Play the scene once."""
        stage = self.stage
        stage.be_up()
        stage.listen = nobody_listens
        mark = stage.handset.log.mark()
        run = Run()
        try:
            self._play(order, run)
        except Hang as hang:
            run.problems.append(str(hang))
        run.fired = stage.page.fired
        if not stage.runs and not (run.given_up or run.lives_on or run.freed):
            run.status = stage.status()
        crash = stage.handset.log.find(CRASH, mark)
        if crash is not None and not self.scene.fault:
            run.problems.append(crash.text)
        for name, report in stage.handset.sanitizer_reports().items():
            run.problems.append(report)
            stage.handset.place(f"/handset/{name}", None)
        if run.problems:
            self.stage.is_new = False
        return run

    def _play(self, order: Order | None, run: Run) -> None:
        stage = self.stage
        is_start = self.scene.dialogue is None and self.scene.action is None
        if not self._prepare(order if is_start else None, is_start):
            run.calls = stage.page.calls()
            return
        before = None
        if not is_start:
            before = stage.look()
            stage.arm(order)
            self._act(run)
        stage.page.disarm()
        run.heard.answers.append(b"")
        if order is None:
            run.calls = stage.page.calls()
        if stage.runs:
            self._check(run, before)

    def _prepare(self, order: Order | None, is_start: bool) -> bool:
        """A daemon that serves; False when it has ended instead, as only a start's may."""
        stage = self.stage
        if self._can_go_on():
            stage.put_back(stage.served)
        else:
            stage.stop()
            stage.lay_lines()
            stage.put_back(stage.first)
            stage.arm(order)
            stage.start()
            self.stage.is_new = True
            if not stage.wait_serving():
                if not is_start:
                    raise HandsetError(f"no start: {stage.handset.story()}")
                return False
            stage.served = stage.files()
        stage.settle()
        if self.scene.dialogue is not None:
            stage.take(stage.station.open())
            stage.take(stage.modem.open())
        return True

    def _can_go_on(self) -> bool:
        """Whether the daemon that runs may play the scene."""
        return (self.scene.dialogue is not None and self.stage.is_new and not self._needs_new
                and self.stage.runs)

    def _act(self, run: Run) -> None:
        if self.scene.dialogue is not None:
            run.heard = Play(self.stage, self.scene.dialogue).hold()
        elif self.scene.action is not None:
            self.stage.is_new = False
            self.scene.action(self.stage)

    # after it

    def _check(self, run: Run, before: ProcessInfo | None) -> None:
        """The daemon lives: it must serve, and hold no more than it did."""
        stage = self.stage
        if self._good.status is not None:
            # It was to end, and has not: a signal still ends it.
            stage.look_for_reader()
            run.given_up = stage.given_up
            run.lives_on = not run.given_up
            if stage.terminate() != 0:
                run.problems.append("does not end")
            return
        if not self._serves(run.heard):
            self.stage.is_new = False
            run.given_up = stage.given_up
            if run.given_up and stage.terminate() != 0:
                run.problems.append("does not end")
            run.freed = stage.runs and self._is_freed(run)
            if stage.runs:
                run.problems.append("does not serve the next request")
            return
        if before is None:
            return
        is_good = not run.fired and self._good.status is None and not self.counted.counts
        run.more = stage.wait_back(before, self._good.more, 1.0 if is_good else BACK_SECONDS)
        if run.more or stage.is_stale or len(stage.look().descriptors) < len(before.descriptors):
            self.stage.is_new = False

    def _serves(self, heard: Heard) -> bool:
        """Ask what is always served, until it is: what was held goes first."""
        stage = self.stage
        good, served = (APP_GOOD, APP_SERVED) if stage.is_app else (PC_GOOD, PC_SERVED)
        for attempt in range(ATTEMPTS):
            stage.release()
            stage.say(stage.station, good)
            answer = hear(stage, served)
            if attempt == ATTEMPTS - 1 and not refuses(answer, stage.is_app) and stage.runs:
                # A machine that stands still makes nobody silent.
                answer += hear(stage, served, HANG_SECONDS)
            heard.answers[-1] += answer
            if answer.endswith(served):
                return True
            if not stage.runs or stage.given_up:
                return False
        return False

    def _is_freed(self, run: Run) -> bool:
        """A packet that the PC's line holds and refuses is gone when the cable is drawn."""
        stage = self.stage
        if stage.is_app or not refuses(run.heard.answers[-1], False):
            return False
        stage.handset.pc.hang_up()
        stage.wait_end()
        return not stage.runs and stage.status() == 0
