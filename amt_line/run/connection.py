"""The run's way to the handset: opened, in step, lost, and found again."""

from __future__ import annotations

import time
from typing import Callable

from amt_line.run.port import StoppablePort
from amt_line.run.stop import Stop
from amt_station.errors import BadFrame, NoAnswer, NoPort, PortBusy, Refused, StationError
from amt_station.exchange import Transcript
from amt_station.link import RECOVER_TIMEOUT, Link
from amt_station.port import Port
from amt_station.requests.model import Channel

_PAUSE = 0.1
# A port that stays longer than this after a mode change does not go away at all.
_STAYS = 5.0

OpenPort = Callable[[], Port]


class Connection:
    """A link that may come and go during a run."""

    def __init__(self, open_port: OpenPort, channel: Channel, timeout: float | None,
                 stop: Stop) -> None:
        """``timeout`` in seconds overrides what each request is given by itself."""
        self._open_port = open_port
        self._channel = channel
        self._timeout = timeout
        self._stop = stop
        self._port: StoppablePort | None = None
        self._link: Link | None = None
        self._transcripts: list[Transcript] = []
        self._why = "the port was never open"

    def open(self, seconds: float = RECOVER_TIMEOUT) -> None:
        """Open the port and find the link's place, each answer within ``seconds``.

        When the handset holds a request that it refuses, ``Refused`` says so and the port stays
        open: somebody may pull the cable.
        """
        self._port = StoppablePort(self._open_port(), self._stop)
        link = Link(self._port, self._channel, self._timeout)
        link.observers.append(self._transcripts.append)
        self._link = link
        try:
            link.find_place(min(seconds, RECOVER_TIMEOUT))
        except Refused:
            raise
        except BaseException as error:
            self.lose(str(error))
            raise

    def link(self) -> Link:
        """The link; ``NoPort`` when it is lost."""
        if self._link is None:
            raise NoPort(f"the handset is not connected: {self._why}")
        return self._link

    def lose(self, why: str) -> None:
        """Give the port up."""
        if self._port is not None:
            self._port.close()
        self._port = self._link = None
        self._why = why

    def connected(self) -> bool:
        """Whether the handset answers."""
        if self._link is None:
            return False
        try:
            if not self._link.in_step:
                self._link.find_place()
        except StationError:
            return False
        return True

    def take_transcripts(self) -> list[Transcript]:
        """What went over the port since the last call."""
        taken = list(self._transcripts)
        self._transcripts.clear()
        return taken

    def reconnect(self, seconds: float, must_go: bool = False) -> None:
        """Wait for the port to go and come back, and find the link's place again.

        One that stays is opened again all the same, unless it ``must_go``.
        """
        end = time.monotonic() + seconds
        gone = self._wait_until_gone(end if must_go
                                     else min(end, time.monotonic() + min(_STAYS, seconds / 2)))
        if must_go and not gone:
            raise NoPort(f"the handset was not unplugged within {seconds:g} s")
        self.lose("it has not come back yet")
        while True:
            try:
                self.open(max(_PAUSE, end - time.monotonic()))
                return
            except (NoPort, PortBusy, NoAnswer, BadFrame) as error:
                if time.monotonic() + _PAUSE >= end:
                    raise NoPort(f"the handset was not back within {seconds:g} s: "
                                 f"{error}") from error
            self._stop.sleep(_PAUSE)

    def _wait_until_gone(self, end: float) -> bool:
        while self._port is not None and time.monotonic() < end:
            try:
                self._port.read(_PAUSE)
            except NoPort:
                return True
        return self._port is None
