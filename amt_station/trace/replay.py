"""Plays the handset's side of a trace on a pseudo-terminal: the same answers, without a handset."""

from __future__ import annotations

import threading
from dataclasses import dataclass
from pathlib import Path
from types import TracebackType

from amt_station import wire
from amt_station.errors import StationError
from amt_station.place import is_searched
from amt_station.requests.model import Channel
from amt_station.trace.dialogue import HEARS, LOSES, OPENS, SAYS, Dialogue, Step
from amt_station.trace.message import Message, encode, write_messages
from amt_station.trace.terminal import Terminal

# A message that has begun goes on at once; only a machine that stands still takes so long.
_REST_SECONDS = 20.0
_RESULT_REFUSED = 1


class Differs(StationError):
    """The station said something else than in the trace, or not all of it."""

    kind = "differs"


@dataclass(frozen=True)
class Standing:
    """How far a replay is: the line of the trace, whether all is done, and what was different."""

    line: int
    done: bool
    difference: str = ""


class _End(Exception):
    """The replay goes no further."""


class Replay:
    """A handset that says what one has said once; a context manager.

    It answers only a station that says the same, byte for byte, and hangs up on any other. What it
    says comes at once, or with ``timed`` after the pauses of the trace.
    """

    def __init__(self, trace: Dialogue, link: Path | None = None, timed: bool = False) -> None:
        """``link`` is a name for the port, which otherwise has that of its pseudo-terminal."""
        self._trace = trace
        self._channel = trace.line_channel
        self._timed = timed
        self._terminal = Terminal(link)
        self._said = b""
        self._searches: dict[int, int] = {}
        self._standing = Standing(0, False)
        self._over = threading.Event()
        self._thread = threading.Thread(target=self._play, name="replay", daemon=True)

    @property
    def port(self) -> str:
        """What a station gives as its port."""
        return self._terminal.name

    @property
    def standing(self) -> Standing:
        """How far it is."""
        return self._standing

    def __enter__(self) -> Replay:
        self._thread.start()
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.close()

    def wait(self, timeout: float | None = None) -> Standing:
        """Until the trace has been played and the station has closed its port, or said no more."""
        self._over.wait(timeout)
        return self._standing

    def nobody_else(self) -> None:
        """Whoever was to open the port has done so: it is over when nobody has it open."""
        self._terminal.let_go()

    def check(self) -> None:
        """Raise ``Differs`` unless the whole trace was played."""
        standing = self._standing
        where = f"{self._trace.path}:{standing.line}"
        if standing.difference:
            raise Differs(f"{where}: {standing.difference}")
        if not standing.done:
            raise Differs(f"{where}: the station did not come so far")

    def close(self) -> None:
        """Hang up and end."""
        self._terminal.stop()
        if self._thread.is_alive():
            self._thread.join()
        self._terminal.close()

    # the thread

    def _play(self) -> None:
        try:
            moment: float | None = None
            for step in self._trace.steps:
                self._standing = Standing(step.line, False)
                self._pause(step, moment)
                self._carry_out(step)
                moment = step.seconds
            more = self._said
            if self._terminal.is_plugged:
                more = more or self._terminal.wait_closed()
            if more:
                self._differ(f"behind the last line the station says {self._shown(more)}")
            self._standing = Standing(self._standing.line, True)
        except _End:
            self._terminal.unplug()
        except StationError as error:
            self._standing = Standing(self._standing.line, False, str(error))
        finally:
            self._over.set()

    def _differ(self, difference: str) -> None:
        self._standing = Standing(self._standing.line, False, difference)
        raise _End()

    def _pause(self, step: Step, moment: float | None) -> None:
        if self._timed and step.action == HEARS and None not in (step.seconds, moment):
            assert step.seconds is not None and moment is not None
            if self._terminal.is_stopped(max(0.0, step.seconds - moment)):
                raise _End()

    def _carry_out(self, step: Step) -> None:
        if step.action == SAYS:
            self._listen(_message(step))
        elif step.action == HEARS:
            data = encode(self._answer(_message(step)), self._channel)
            if self._terminal.write(data, None):
                raise _End()
        elif step.action == LOSES and self._terminal.is_plugged:
            self._terminal.wait_read()
            self._terminal.unplug()
        elif step.action == OPENS and not self._terminal.is_plugged:
            self._terminal.plug()

    def _listen(self, message: Message) -> None:
        """Wait until the station has said this."""
        wanted = encode(message, self._channel)
        while True:
            found = self._searched(message) or wanted
            common = min(len(found), len(self._said))
            if self._said[:common] != found[:common]:
                self._differ(f"the station says {self._shown(self._said)} instead of "
                             f"{self._shown(wanted)}")
            if common == len(found):
                self._said = self._said[common:]
                return
            data = self._terminal.read(_REST_SECONDS if self._said else None)
            if data is None:
                raise _End()
            if not data:
                self._differ(f"the station says only {self._shown(self._said)} instead of "
                             f"{self._shown(wanted)}")
            self._said += data

    def _searched(self, message: Message) -> bytes:
        """What the station asks now where the trace asks for its place with another id."""
        if self._channel is Channel.PC or not isinstance(message, wire.Packet):
            return b""
        try:
            said = wire.Packet.decode(self._said)
        except wire.WireError:
            return b""
        if said.atoms or message.atoms or not (is_searched(said.command)
                                               and is_searched(message.command)):
            return b""
        self._searches[message.command + 1] = said.command + 1
        return said.encode()

    def _answer(self, message: Message) -> Message:
        if isinstance(message, wire.Packet) and message.result == _RESULT_REFUSED:
            return wire.Packet(self._searches.get(message.command, message.command), message.atoms)
        return message

    def _shown(self, data: bytes) -> str:
        return ", ".join(write_messages(data, self._channel))


def _message(step: Step) -> Message:
    assert isinstance(step.argument, (bytes, wire.Packet))
    return step.argument
