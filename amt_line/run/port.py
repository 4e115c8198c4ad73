"""A port on which a run can be ended while it waits."""

from __future__ import annotations

import time

from amt_line.run.stop import SLICE, Stop
from amt_station.port import LastingPort, Port


class StoppablePort:
    """The port of a link, which raises ``Ended`` as soon as the run ends."""

    def __init__(self, port: Port, stop: Stop) -> None:
        self.name = port.name
        self._port = port
        self._stop = stop
        if hasattr(port, "check"):
            # A write may wait as long as a read.
            port.check = stop.check

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        end = time.monotonic() + timeout
        while True:
            self._stop.check()
            left = max(0.0, end - time.monotonic())
            data = self._port.read(min(left, SLICE))
            if data or left <= SLICE:
                return data

    def write(self, data: bytes, timeout: float) -> None:
        """As in ``Port``."""
        self._stop.check()
        self._port.write(data, timeout)

    def left_out_of_step(self) -> bool:
        """As in ``LastingPort``."""
        return isinstance(self._port, LastingPort) and self._port.left_out_of_step()

    def remember(self, out_of_step: bool) -> None:
        """As in ``LastingPort``."""
        if isinstance(self._port, LastingPort):
            self._port.remember(out_of_step)

    def close(self) -> None:
        """As in ``Port``."""
        self._port.close()
