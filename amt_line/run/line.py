"""A line: slots that test handsets beside each other, each in a thread of its own."""

from __future__ import annotations

import sys
import threading
from typing import Sequence

from amt_line.run.slot import Slot
from amt_line.run.stop import Abort
from amt_line.run.tally import EXIT_OWN_ERROR, EXIT_PASS

_LOOK_SECONDS = 0.2
_SWITCH_SECONDS = 0.0005


class Line:
    """Starts the slots, and waits until all of them have ended."""

    def __init__(self, slots: Sequence[Slot], ends: list[Abort], once: bool = False) -> None:
        """``ends`` is the list that the slots look into; ``once``: they test one handset each."""
        self._once = once
        self.slots = tuple(slots)
        self._ends = ends
        self._threads = [threading.Thread(target=slot.serve, name=f"slot {slot.name}", daemon=True)
                         for slot in slots]

    def end(self, how: Abort) -> None:
        """End all slots: in order at the first call, at once at the second.

        Takes no lock: a signal handler calls this.
        """
        self._ends.append(how)

    def run(self) -> int:
        """Serve until every slot has ended; the exit status."""
        # With the usual 5 ms an answer waits longer for its thread's turn than for the handset.
        sys.setswitchinterval(min(_SWITCH_SECONDS, sys.getswitchinterval()))
        for slot in self.slots:
            slot.announce()
        for thread in self._threads:
            thread.start()
        for thread in self._threads:
            while thread.is_alive():
                # In slices: only then does a signal's handler get its turn.
                thread.join(_LOOK_SECONDS)
        return self.exit_status()

    def exit_status(self) -> int:
        """How it was ended; else 0 when all has passed in every slot, or what came first.

        Of a line that tests one handset a slot, a run that was no pass comes before all else.
        """
        failures = [slot.first_failure for slot in self.slots if slot.first_failure is not None]
        if self._ends and not (self._once and failures):
            return self._ends[0].exit_status
        if failures:
            return min(failures)[1]
        return EXIT_PASS if all(slot.runs for slot in self.slots) else EXIT_OWN_ERROR
