"""The stream of events of runs and slots: what every live view is made from.

An event is a document that JSON can carry, with ``event`` and ``time`` (UTC), on a line also
``slot``, and ``run`` where there is one. Those of a run are ``run-began``, ``step-began``,
``step-again``, ``step-ended``, ``notice`` and ``run-ended``. ``question`` (id, kind, name, text and
the file name of a picture) lies open until the ``answer`` with its id (text, by; both empty when
nobody has answered). ``slot-state`` tells what a slot does: its state is one of ``STATES``.
"""

from __future__ import annotations

import logging
import threading
from typing import Any, Callable, Iterable

from amt_line.run.clock import utc_now

Event = dict[str, Any]
Listener = Callable[[Event], None]

WAITING, ASKING, RUNNING, VERDICT, HELD, DEFECT, ENDED = STATES = (
    "waiting", "asking", "running", "verdict", "held", "defect", "ended")

_LOG = logging.getLogger("amt_line")


class _Audience:
    """Whoever listens to a stream and to all parts of it, one event at a time."""

    def __init__(self, listeners: Iterable[Listener]) -> None:
        self.turn = threading.RLock()
        self.listeners = list(listeners)
        self.failure: Exception | None = None

    def tell(self, listener: Listener, document: Event) -> None:
        """Tell one; it is told no more when it fails."""
        try:
            listener(document)
        except Exception as error:  # pylint: disable=broad-except
            # Whatever is wrong with a view, the handset is not to suffer from it.
            _LOG.warning("a view failed and is told no more", exc_info=True)
            self.listeners.remove(listener)
            self.failure = self.failure or error


class Stream:
    """Hands events to its listeners, which see all of them in one order.

    A listener that fails is told no more; the run goes on. None may wait: all slots of a line
    would wait with it.
    """

    def __init__(self, listeners: Iterable[Listener] = (), **common: str) -> None:
        """``common`` stands in every event."""
        self._audience = _Audience(listeners)
        self._common = {name: value for name, value in common.items() if value}

    def part(self, **common: str) -> Stream:
        """A stream to the same listeners whose events have more in common."""
        part = Stream((), **{**self._common, **common})
        part._audience = self._audience
        return part

    def listen(self, listener: Listener) -> None:
        """Hear all events from now on."""
        with self._audience.turn:
            self._audience.listeners.append(listener)

    def leave(self, listener: Listener) -> None:
        """Hear no more."""
        with self._audience.turn:
            if listener in self._audience.listeners:
                self._audience.listeners.remove(listener)

    @property
    def failure(self) -> Exception | None:
        """What went wrong with the first listener that failed."""
        return self._audience.failure

    def send(self, event: str, **values: Any) -> None:
        """Tell everybody."""
        with self._audience.turn:
            document: Event = {"event": event, "time": utc_now(), **self._common, **values}
            for listener in tuple(self._audience.listeners):
                self._audience.tell(listener, document)
