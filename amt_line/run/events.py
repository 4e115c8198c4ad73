"""The stream of events of a run: what every live view is made from.

An event is a document that JSON can carry, with ``event`` and ``time``. Those of a run are
``run-began``, ``step-began``, ``step-again``, ``step-ended``, ``question``, ``answer``,
``notice`` and ``run-ended``.
"""

from __future__ import annotations

import logging
from typing import Any, Callable, Iterable

from amt_line.run.clock import utc_now

Event = dict[str, Any]
Listener = Callable[[Event], None]

_LOG = logging.getLogger("amt_line")


class Stream:
    """Hands events to its listeners. One that fails is told no more; the run goes on."""

    def __init__(self, listeners: Iterable[Listener] = (), **common: str) -> None:
        """``common`` stands in every event."""
        self._listeners = list(listeners)
        self._common = {name: value for name, value in common.items() if value}
        self.failure: Exception | None = None

    def send(self, event: str, **values: Any) -> None:
        """Tell everybody."""
        document: Event = {"event": event, "time": utc_now(), **self._common, **values}
        for listener in tuple(self._listeners):
            try:
                listener(document)
            except Exception as error:  # pylint: disable=broad-except
                # Whatever is wrong with a view, the handset is not to suffer from it.
                _LOG.warning("a view failed and is told no more", exc_info=True)
                self._listeners.remove(listener)
                self.failure = self.failure or error
