"""Simulated handsets in the slots of a line, so that all of it can be tried on any PC."""

from __future__ import annotations

import random
import threading
from concurrent.futures import ThreadPoolExecutor, wait
from contextlib import ExitStack, contextmanager
from typing import Any, Collection, Iterator, Mapping

from amt_line.cli.slots import SlotSpec
from amt_simulator import Handset, HandsetError
from amt_simulator.waiting import wait_until
from amt_station.errors import StationError
from amt_station.requests.model import Channel

MOST_HANDSETS = 64
_AT_ONCE = 8
# How long a cable is out when a simulated operator changes the handset.
_AWAY_SECONDS = 1.0
# What the battery's driver reads in a handset, and in one of which it would be told.
_BATTERY = "/handset/devices/battery-adc"
_USUAL_ADC, _SPREAD_ADC, _WEAK_ADC = 3700, 60, 3100
_WEAK_SHARE = 0.1


class SimulationProblem(StationError):
    """The simulated handsets did not come up."""

    exit_status = 7
    kind = "simulation"


@contextmanager
def simulated_handsets(count: int, channel: Channel, weak: Collection[str] = ()
                       ) -> Iterator[dict[str, Handset]]:
    """Handsets by the names of their slots, brought up beside each other; gone afterwards.

    Those of the ``weak`` slots have a weak battery.
    """
    path = "pc" if channel is Channel.PC else "packet"
    handsets: dict[str, Handset] = {}
    with ExitStack() as stack:
        try:
            for number in range(1, count + 1):
                files = {_BATTERY: str(_WEAK_ADC)} if str(number) in weak else {}
                handsets[str(number)] = Handset(path, ports=True, files=files)
            stack.callback(_each, handsets, Handset.down)
            _each(handsets, _bring_up)
        except HandsetError as error:
            raise SimulationProblem(f"simulated handsets: {error}") from error
        yield handsets


def _bring_up(handset: Handset) -> None:
    handset.up()
    handset.wait_ready()


def _each(handsets: Mapping[str, Handset], do: Any) -> None:
    """Do something with all, beside each other; the first error once all are done."""
    pool = ThreadPoolExecutor(_AT_ONCE)
    try:
        done = [pool.submit(do, handset) for handset in handsets.values()]
        wait(done)
    finally:
        # Ended early: those that have not begun need not.
        pool.shutdown(cancel_futures=True)
    for future in done:
        future.result()


def slots_of(handsets: Mapping[str, Handset], channel: Channel) -> list[SlotSpec]:
    """Their slots."""
    return [SlotSpec(name, str(handset.directory / channel.value))
            for name, handset in handsets.items()]


class Hand:
    """Changes simulated handsets as an operator does: a while after the verdict the cable goes.

    What is plugged in then has another battery, a weak one now and then. A listener to the events
    of the line.
    """

    def __init__(self, handsets: Mapping[str, Handset], seconds: float) -> None:
        """A handset is pulled out so many ``seconds`` after its verdict."""
        self._handsets = handsets
        self._seconds = seconds
        self._stop = threading.Event()
        self._threads: set[threading.Thread] = set()

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        handset = self._handsets.get(str(event.get("slot", "")))
        if event["event"] == "run-ended" and handset is not None and not self._stop.is_set():
            thread = threading.Thread(target=self._change, args=(handset,), daemon=True)
            self._threads = {other for other in self._threads if other.is_alive()} | {thread}
            thread.start()

    def _change(self, handset: Handset) -> None:
        try:
            if not self._stop.wait(self._seconds):
                first = handset.pid
                handset.usb.unplug()
                self._stop.wait(_AWAY_SECONDS)
                # However long the service takes to end: the one that ends must not answer any more.
                wait_until(lambda: self._stop.is_set() or handset.pid != first or None,
                           "the end of the service")
                handset.place(_BATTERY, str(_some_battery()))
                handset.usb.plug()
        except HandsetError:
            pass  # it is being taken down, or has powered itself off

    def close(self) -> None:
        """Let go of all."""
        self._stop.set()
        for thread in list(self._threads):
            thread.join()


def _some_battery() -> int:
    if random.random() < _WEAK_SHARE:
        return _WEAK_ADC
    return round(random.gauss(_USUAL_ADC, _SPREAD_ADC))
