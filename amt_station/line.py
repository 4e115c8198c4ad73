"""A port with its decoder: what arrives, who listens, whose turn it is. ``Link`` adds what to ask.
"""

from __future__ import annotations

import threading
import time
from contextlib import contextmanager
from dataclasses import dataclass
from types import TracebackType
from typing import Callable, Iterator, TypeVar

from amt_station import diagnosis, log
from amt_station.errors import OutOfStep, StationError, UsageProblem
from amt_station.exchange import TimedItem, Transcript
from amt_station.port import LastingPort, Port
from amt_station.replug import reopened
from amt_station.requests.model import Channel
from amt_station.wire.decoder import BareDecoder, Decoder, EnvelopeDecoder, Item

# A frame's bytes follow each other closely; after so long a silence its rest will not come.
_SILENCE = 0.3
_DRAIN_SECONDS = 1.0
_MOST_DRAINED = 4096
# So many may well have waited while this process stood still.
_FEW_PIECES = 16

# Beyond any wait that is meant: no number of seconds below it is too large for the system.
_LONGEST_WAIT = 1e9

Observer = Callable[[Transcript], None]


_Self = TypeVar("_Self", bound="Line")


@dataclass
class Deadline:
    """Seconds from the sending, which may be shortened while waiting."""

    seconds: float


class Line:
    """A port to one handset; a context manager that closes it."""

    def __init__(self, port: Port, channel: Channel = Channel.PC, timeout: float | None = None,
                 reopen: Callable[[], Port] | None = None) -> None:
        """``timeout`` in seconds overrides the time that each request is given by itself.

        ``reopen`` opens the port again after it went away.
        """
        self.port = port
        self.channel = channel
        self.timeout = None if timeout is None else checked_seconds(timeout)
        self.observers: list[Observer] = [log.exchange]
        self._reopen = reopen
        self._turn = threading.RLock()
        self._step = not self._left_out_of_step()
        self._forget()

    def _left_out_of_step(self) -> bool:
        return isinstance(self.port, LastingPort) and self.port.left_out_of_step()

    @property
    def _in_step(self) -> bool:
        return self._step

    @_in_step.setter
    def _in_step(self, in_step: bool) -> None:
        """The port learns it too: this process may be the next that ends without its answer."""
        if in_step is not self._step:
            self._step = in_step
            if isinstance(self.port, LastingPort):
                self.port.remember(not in_step)

    def _forget(self) -> None:
        pc = self.channel is Channel.PC
        self._decoder: Decoder = EnvelopeDecoder() if pc else BareDecoder()
        self._watch = None if pc else diagnosis.WrongLineWatch()

    def __enter__(self: _Self) -> _Self:
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.close()

    def close(self) -> None:
        """Give the port back."""
        self.port.close()

    @contextmanager
    def turn(self) -> Iterator[None]:
        """Hold the turn over several exchanges: other threads wait until the end of the block."""
        with self._turn:
            yield

    @contextmanager
    def recorded(self) -> Iterator[list[Transcript]]:
        """Collect the transcripts of all exchanges in the block, failed ones and searches too."""
        transcripts: list[Transcript] = []
        self.observers.append(transcripts.append)
        try:
            yield transcripts
        finally:
            self.observers.remove(transcripts.append)

    # what arrives

    def drain(self) -> list[Item]:
        """Take what has arrived unasked; ``OutOfStep`` when that does not end within a second.

        On such a line anything may be taken for an answer.
        """
        items: list[Item] = []
        pieces = 0
        end = time.monotonic() + _DRAIN_SECONDS
        while data := self.port.read(0.0):
            items = (items + self._decode(data))[:_MOST_DRAINED]
            pieces += 1
            if time.monotonic() >= end and pieces > _FEW_PIECES:
                raise OutOfStep(f"the line does not fall silent within {_DRAIN_SECONDS:g} s; "
                                f"nothing was sent{diagnosis.instead(items)}", items)
        return items + self._decode(b"")

    def _decode(self, data: bytes) -> list[Item]:
        """What the next bytes complete; none mean a silence, in which a frame ends."""
        items = self._decoder.feed(data) if data else self._decoder.give_up()
        if self._watch is not None:
            for item in items:
                self._watch.look(item)
        return items

    def _arrivals(self, transcript: Transcript, deadline: Deadline) -> Iterator[TimedItem]:
        """Send; everything that arrives until the deadline, which counts from then.

        What arrived before is taken away first: it cannot be an answer.
        """
        transcript.late = self.drain()
        start = time.monotonic()
        self._in_step = False
        self.port.write(transcript.sent, deadline.seconds)
        seconds = 0.0
        while seconds < deadline.seconds:
            left = deadline.seconds - seconds
            piece = self.port.read(min(left, _SILENCE) if self._decoder.pending else left)
            seconds = transcript.seconds = time.monotonic() - start
            items = self._decode(piece)
            for item in items:
                transcript.add(seconds, item)
            for item in items:
                yield TimedItem(seconds, item)

    @contextmanager
    def _conversation(self, transcript: Transcript) -> Iterator[None]:
        """Tell the observers of an exchange, however it ends."""
        try:
            yield
        except StationError as error:
            transcript.error = str(error)
            raise
        except BaseException as error:
            transcript.error = type(error).__name__
            raise
        finally:
            for observer in list(self.observers):
                observer(transcript)

    def reconnect(self, timeout: float) -> None:
        """Take the port again that went away or is about to, within ``timeout`` seconds.

        The link is out of step afterwards and finds its place before the next exchange.
        """
        with self._turn:
            if self._reopen is None:
                raise UsageProblem(f"{self.port.name} cannot be opened again")
            self._in_step = False
            self.port.close()
            self.port = reopened(self._reopen, checked_seconds(timeout))
            self._forget()


def checked_seconds(timeout: float) -> float:
    """A time to wait: a finite number of seconds above 0."""
    if (isinstance(timeout, bool) or not isinstance(timeout, (int, float))
            or not 0 < timeout <= _LONGEST_WAIT):
        raise UsageProblem(f"a time of {timeout} s: it has to be a finite number above 0")
    return timeout
