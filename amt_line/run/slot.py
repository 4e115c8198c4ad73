"""One slot of a line: waits for a handset, asks for its inputs, runs the plan, and so on.

Whatever goes wrong here is this slot's own: it is shown, and the slot goes on with the next
handset.
"""

from __future__ import annotations

import logging
import threading
import time
from dataclasses import dataclass, field
from typing import Callable, ContextManager, Mapping, Protocol

from amt_line.plan.model import Plan
from amt_line.plan.problems import PlanProblem
from amt_line.run.desk import Desk, DeskOperator
from amt_line.run.events import (ASKING, DEFECT, ENDED, HELD, RUNNING, VERDICT, WAITING, Stream)
from amt_line.run.inputs import NoInputs, Supply, Values
from amt_line.run.operator import GivenAnswers, Nobody, Operator
from amt_line.run.plug import Plug, open_again
from amt_line.run.presence import Arrival, Patience, Presence
from amt_line.run.record import Document, Record, Where
from amt_line.run.record_file import Keeper
from amt_line.run.runner import Runner, Setting
from amt_line.run.shared import Shared
from amt_line.run.stop import PULLED, STOPPED, Abort, Aborted, Ended, Stop
from amt_line.run.tally import EXIT_OWN_ERROR
from amt_station.errors import StationError
from amt_station.port import Port
from amt_station.state import write_defect

_AFTER_DEFECT_SECONDS = 1.0
_LOG = logging.getLogger("amt_line")


class RecordKeeper(Keeper, Protocol):
    """Where the record of one run goes, and what is done with it at the end."""

    def close(self) -> None:
        """The run has ended; what was put is kept."""


@dataclass(frozen=True)
class Shop:
    """What the slots of a line have in common."""

    plan: Plan
    stream: Stream
    desk: Desk
    # The place of a run: of a slot, at a port.
    where: Callable[[str, str], Where]
    # Begins the record of a run, to be filed under the handset's name.
    keep: Callable[[str, Record], RecordKeeper]
    # Whether somebody can answer at the desk.
    attended: bool = False
    timeout: float | None = None
    answers: Mapping[str, str] = field(default_factory=dict)
    once: bool = False
    patience: Patience = Patience()
    shared: Shared = field(default_factory=Shared)
    computing: ContextManager[object] = field(default_factory=threading.Lock)
    # Told of every record that can no longer be written, with its text: rather there than nowhere.
    lost_record: Callable[[StationError, str], None] = lambda error, text: None
    # Requests to end the whole line; a signal handler may add to it.
    ends: list[Abort] = field(default_factory=list)


class Slot:
    """``serve`` once, in a thread of its own."""

    def __init__(self, name: str, plug: Plug, supply: Supply, shop: Shop) -> None:
        self.name = name
        self.runs = 0
        # When the first run that was no pass ended, and its status.
        self.first_failure: tuple[float, int] | None = None
        # Whether a handset has had its turn, also one whose run could not even begin.
        self._had_turn = False
        self._plug = plug
        self._supply = supply
        self._shop = shop
        self._stream = shop.stream.part(slot=name)
        self._stop = Stop(of_all=shop.ends)
        self._presence = Presence(plug, shop.plan.channel, shop.patience, self._tell_absence)
        self._told: tuple[str, str] = ("", "")
        self._mark: tuple[object, ...] | None = None
        self._desk_operator = DeskOperator(shop.desk, name)
        self._asking: Stop | None = None
        self._runner: Runner | None = None
        shop.desk.add_slot(name, self.stop)

    def stop(self) -> None:
        """The stop button: the run is ABORTED, or nobody is asked any more; twice is as once."""
        runner, asking = self._runner, self._asking
        if runner is not None:
            if not runner.is_aborted:
                runner.abort(STOPPED)
        elif asking is not None:
            asking.request(STOPPED)

    def announce(self) -> None:
        """Tell the views that there is such a slot."""
        self._state(WAITING, "")

    def serve(self) -> None:
        """Test handset after handset until the line ends."""
        why = ""
        try:
            while not self._shop.ends and not (self._shop.once and self._had_turn):
                try:
                    self._serve_one()
                except NoInputs as error:
                    why = str(error)
                    break
                except Exception as error:  # pylint: disable=broad-except
                    self._get_over(error)
        except Ended as end:
            why = str(end)
        finally:
            self._state(ENDED, why)

    def _serve_one(self) -> None:
        asks = self._supply.needs_asking()
        arrival = self._presence.await_handset(self._stop)
        self._mark = arrival.seen.mark
        try:
            ready = self._gather(arrival, asks)
            if ready is not None:
                self._run(arrival, *ready)
        finally:
            arrival.port.close()
        if not (self._shop.once and self._had_turn):
            self._await_next()

    def _await_next(self) -> None:
        if self._told[0] != DEFECT:
            self._state(VERDICT if self.runs else WAITING, "the next handset is waited for")
        if self._mark is not None:
            self._presence.await_gone(self._mark, self._stop)

    def _get_over(self, error: Exception) -> None:
        """Show what went wrong, and go on with the next handset."""
        if isinstance(error, Ended):
            raise error
        self._note_status(EXIT_OWN_ERROR)
        self._show_defect(error)
        self._had_turn = True
        if self._shop.once:
            return
        self._stop.sleep(_AFTER_DEFECT_SECONDS)
        if self._mark is not None:
            try:
                self._presence.await_gone(self._mark, self._stop)
            except Ended:
                raise
            except Exception:  # pylint: disable=broad-except
                _LOG.error("a slot's port cannot be looked at", exc_info=True)

    def _show_defect(self, error: Exception) -> None:
        if isinstance(error, StationError):
            self._state(DEFECT, str(error))
            return
        where = write_defect(error)
        kept = f"; its traceback is in {where}" if where else ""
        self._state(DEFECT, f"a defect of the station itself ({type(error).__name__}){kept}")

    # inputs

    def _gather(self, arrival: Arrival, asks: bool) -> tuple[Values, str] | None:
        """The inputs; None when the handset went away meanwhile, or the operator stopped."""
        look = getattr(arrival.port, "is_gone", None)
        stop = self._asking = Stop(
            of_all=self._shop.ends, watch=lambda: PULLED if look is not None and look() else None)
        text = ""
        try:
            while True:
                if asks:
                    self._state(ASKING, text)
                try:
                    return self._supply.gather(self._stream, stop.check)
                except PlanProblem as problem:
                    if not asks:
                        raise
                    text = str(problem)
        except Aborted:
            if self._shop.ends:
                raise
            return None
        finally:
            self._asking = None

    # the run

    def _run(self, arrival: Arrival, values: Values, dut: str) -> None:
        shop, unopened = self._shop, [arrival.port]

        def open_port() -> Port:
            if unopened:
                return unopened.pop()
            seen, port = open_again(self._plug)
            self._mark = seen.mark
            return port

        keepers: list[RecordKeeper] = []

        def keep(record: Record) -> RecordKeeper:
            keepers.append(shop.keep(dut, record))
            return keepers[0]

        others: Operator = Nobody()
        if shop.attended:
            others = self._desk_operator
        runner = Runner(shop.plan, values, dut, Setting(
            open_port, shop.where(self.name, arrival.seen.url), shop.timeout,
            GivenAnswers(shop.answers, others), keep=keep, stream=shop.stream,
            shared=shop.shared, ends=shop.ends, computing=shop.computing,
            pulled_is_aborted=True))
        self._desk_operator.run = runner.record.run
        self._state(RUNNING, "", arrival.seen.url)
        self._runner = runner
        try:
            document = runner.run()
        finally:
            self._runner = None
            for keeper in keepers:
                keeper.close()
        self._take(runner, document)

    def _take(self, runner: Runner, document: Document) -> None:
        self.runs += 1
        self._had_turn = True
        if document["exit_status"] != 0:
            self._note_status(document["exit_status"])
        if runner.record_problem is not None:
            self._shop.lost_record(runner.record_problem, runner.record.text())
        if runner.defect is not None:
            self._show_defect(runner.defect)

    def _note_status(self, status: int) -> None:
        if self.first_failure is None:
            self.first_failure = (time.monotonic(), status)

    # what is told

    def _tell_absence(self, held: bool, text: str) -> None:
        self._state(HELD if held else VERDICT if self.runs else WAITING, text)

    def _state(self, state: str, text: str, port: str = "") -> None:
        """Tell a state that is another than the last one."""
        if (state, text) != self._told:
            self._told = (state, text)
            self._stream.send("slot-state", state=state, text=text,
                              port=port or self._plug.name)
