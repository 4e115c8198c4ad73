"""Waits for the handset of a slot to come and to go."""

from __future__ import annotations

import os
import time
from dataclasses import dataclass
from typing import Callable

from amt_line.run.plug import Plug, Seen
from amt_line.run.port import StoppablePort
from amt_line.run.stop import Stop
from amt_station.errors import PortBusy, Refused, StationError
from amt_station.found_ports import holders, is_pseudo_terminal
from amt_station.link import Link
from amt_station.port import Port
from amt_station.requests.model import Channel

# What is told of a slot's state meanwhile: whether somebody else holds the port, and a text.
Tell = Callable[[bool, str], None]

HELD_AGAIN_SECONDS = 0.5


@dataclass(frozen=True)
class Patience:
    """How long things are waited for, in seconds."""

    look: float = 0.1
    # For the answer to one question whether a handset is there.
    answer: float = 1.0
    # A handset that has been plugged in, and does not answer for so long, is tested all the same.
    silent: float = 15.0
    # Between two questions to a handset whose port stays when it goes.
    ask: float = 1.0
    # So often such a handset may leave a question unanswered before it is taken for gone.
    unanswered: int = 2


@dataclass
class Arrival:
    """A handset that has come, its port open."""

    seen: Seen
    port: Port


class Presence:
    """Looks at one plug, for one slot."""

    def __init__(self, plug: Plug, channel: Channel, patience: Patience, tell: Tell) -> None:
        self._plug = plug
        self._channel = channel
        self._patience = patience
        self._tell = tell
        # What was seen last, and since when it is there; None for what was there at the first look.
        self._before: tuple[object, ...] | None = None
        self._since: float | None = None
        self._has_looked = False

    def await_handset(self, stop: Stop) -> Arrival:
        """Return when a handset has been plugged in, or answers."""
        while True:
            stop.check()
            seen = self._look()
            if seen is not None:
                arrival = self._try(seen, stop)
                if arrival is not None:
                    return arrival
            else:
                self._tell(False, f"no handset at {self._plug.name}")
                stop.sleep(self._patience.look)

    def _look(self) -> Seen | None:
        seen = self._plug.look()
        mark = seen.mark if seen is not None else None
        if mark != self._before:
            self._before = mark
            self._since = time.monotonic() if self._has_looked else None
        self._has_looked = True
        return seen

    def _try(self, seen: Seen, stop: Stop) -> Arrival | None:
        try:
            port = self._plug.open(seen)
        except PortBusy as error:
            self._tell(True, str(error))
            stop.sleep(HELD_AGAIN_SECONDS)
            return None
        except StationError as error:
            self._tell(False, str(error))
            stop.sleep(self._patience.look)
            return None
        try:
            if self.answers(port, stop) or self._is_overdue():
                return Arrival(seen, port)
        except BaseException:
            port.close()
            raise
        port.close()
        others = _holders(seen.url)
        self._tell(bool(others), f"port {seen.url} is busy: {others} has it open" if others
                   else f"no handset answers at {seen.url}")
        stop.sleep(self._patience.look)
        return None

    def _is_overdue(self) -> bool:
        return (self._since is not None
                and time.monotonic() - self._since >= self._patience.silent)

    def answers(self, port: Port, stop: Stop) -> bool:
        """Whether a handset answers at an open port; one that refuses is there too."""
        link = Link(StoppablePort(port, stop), self._channel)
        try:
            link.find_place(self._patience.answer)
        except Refused:
            return True
        except StationError:
            return False
        return True

    def await_gone(self, mark: tuple[object, ...], stop: Stop) -> None:
        """Return when the handset with this mark is gone, or another one is there."""
        unanswered = 0
        next_question = time.monotonic() + self._patience.ask
        self._before = mark
        while True:
            stop.sleep(self._patience.look)
            seen = self._look()
            if seen is None or seen.mark != mark:
                return
            if self._plug.stays and time.monotonic() >= next_question:
                unanswered = 0 if self._is_answering(seen, stop) else unanswered + 1
                if unanswered >= self._patience.unanswered:
                    self._since = None
                    return
                next_question = time.monotonic() + self._patience.ask

    def _is_answering(self, seen: Seen, stop: Stop) -> bool:
        try:
            port = self._plug.open(seen)
        except PortBusy:
            # Whoever holds it talks with it.
            return True
        except StationError:
            return False
        try:
            return self.answers(port, stop)
        finally:
            port.close()


def _holders(url: str) -> str:
    """Who else reads what arrives at a port, although the port is not kept for them."""
    path = os.path.realpath(url)
    if not os.path.exists(path) or is_pseudo_terminal(path):
        return ""
    return ", ".join(map(str, holders(path)))
