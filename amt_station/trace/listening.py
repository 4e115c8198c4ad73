"""Sits between a station and its handset, and notes what goes by in either direction."""

from __future__ import annotations

import threading
from pathlib import Path
from types import TracebackType
from typing import Callable

from amt_station.errors import NoAnswer, NoPort
from amt_station.port import Port
from amt_station.trace.message import decoder
from amt_station.trace.recording import Recording
from amt_station.trace.terminal import Terminal

_LOOK_SECONDS = 0.1
_WRITE_SECONDS = 10.0
# A request goes on as it came, in one write: its pieces come so closely after each other.
_PIECE_SECONDS = 0.3


class Listener:
    """A pseudo-terminal that leads to a port; a context manager."""

    def __init__(self, port: Port, recording: Recording, link: Path | None = None) -> None:
        """``link`` is a further name for the pseudo-terminal."""
        self._recording = recording
        try:
            self._terminal = Terminal(link)
        except BaseException:
            port.close()
            raise
        self._port = recording.traced(port)
        self._lost: NoPort | None = None
        self._over = threading.Event()
        self._threads = [threading.Thread(target=self._carry, args=(work,), daemon=True)
                         for work in (self._to_handset, self._to_station)]

    @property
    def port(self) -> str:
        """What a station gives as its port."""
        return self._terminal.name

    def __enter__(self) -> Listener:
        for thread in self._threads:
            thread.start()
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.close()

    def wait(self, timeout: float | None = None) -> None:
        """Until the handset's port goes away, which raises ``NoPort``."""
        self._over.wait(timeout)
        if self._lost is not None:
            raise self._lost

    def close(self) -> None:
        """End; what has gone by is in the recording, which stays open."""
        self._terminal.stop()
        for thread in self._threads:
            if thread.is_alive():
                thread.join()
        self._terminal.close()
        self._port.close()

    # the threads

    def _carry(self, work: Callable[[], None]) -> None:
        try:
            while not self._over.is_set() and not self._terminal.is_stopped():
                work()
        except NoPort as error:
            self._lost = self._lost or error
            # Who has the other end open sees the hang-up.
            self._terminal.stop()
        finally:
            self._over.set()

    def _to_handset(self) -> None:
        data = self._terminal.read(None)
        if not data:
            return
        whole = decoder(self._recording.channel)
        whole.feed(data)
        while whole.pending and (more := self._terminal.read(_PIECE_SECONDS)):
            whole.feed(more)
            data += more
        try:
            self._port.write(data, _WRITE_SECONDS)
        except NoAnswer:
            pass  # the recording tells of it

    def _to_station(self) -> None:
        data = self._port.read(_LOOK_SECONDS)
        if data and (left := self._terminal.write(data, _LOOK_SECONDS)):
            self._recording.comment(f"nobody reads: {len(left)} bytes went no further")
