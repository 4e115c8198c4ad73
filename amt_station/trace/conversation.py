"""What was said and heard in a trace, decoded: for showing, comparing and exporting."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Iterator, Union

from amt_station import wire
from amt_station.place import is_searched
from amt_station.requests.model import Channel
from amt_station.trace.dialogue import HEARS, SAYS, Dialogue, Step
from amt_station.trace.message import decoder, encode

# A frame's bytes follow each other closely; after so long a silence its rest will not come.
SILENCE = 0.3


@dataclass(frozen=True)
class Spoken:
    """A frame or a text that was said or heard, where, and when it was complete.

    ``request`` is the id of the request that it answers, or None.
    """

    line: int
    seconds: float | None
    said: bool
    item: wire.Item
    request: int | None = None


Event = Union[Spoken, Step]


class _Side:
    """One direction: its decoder, and where its last piece stood."""

    def __init__(self, channel: Channel, said: bool) -> None:
        self.said = said
        self.decoder = decoder(channel)
        self.step = Step(0, "")

    def take(self, step: Step, data: bytes) -> Iterator[Spoken]:
        """What the next piece completes."""
        if self._is_late(step):
            yield from self.end()
        self.step = step
        yield from self._spoken(self.decoder.feed(data))

    def end(self) -> Iterator[Spoken]:
        """What is left when nothing more will complete it."""
        yield from self._spoken(self.decoder.give_up())

    def _spoken(self, items: list[wire.Item]) -> Iterator[Spoken]:
        for item in items:
            yield Spoken(self.step.line, self.step.seconds, self.said, item)

    def _is_late(self, step: Step) -> bool:
        return (step.seconds is not None and self.step.seconds is not None
                and step.seconds - self.step.seconds > SILENCE)


def events(trace: Dialogue) -> list[Event]:
    """Everything in a trace, in order: what went over the line decoded, the rest as it stands."""
    return _answered(_decoded(trace, True))


def _decoded(trace: Dialogue, by_time: bool) -> Iterator[Event]:
    channel = trace.line_channel
    station, handset = _Side(channel, True), _Side(channel, False)
    for step in trace.steps:
        if step.action not in (SAYS, HEARS):
            yield from station.end()
            yield from handset.end()
            yield step
            continue
        side, other = (station, handset) if step.action == SAYS else (handset, station)
        yield from other.end()
        message = step.argument
        assert isinstance(message, (bytes, wire.Packet))
        timed = step if by_time else Step(step.line, step.action)
        yield from side.take(timed, encode(message, channel))
    yield from station.end()
    yield from handset.end()


def _answered(decoded: Iterator[Event]) -> list[Event]:
    """Tell each packet that is heard which request it answers."""
    found: list[Event] = []
    request: int | None = None
    for event in decoded:
        if isinstance(event, Spoken) and isinstance(event.item, wire.Frame):
            if event.said:
                request = event.item.packet.command
            else:
                event = Spoken(event.line, event.seconds, False, event.item, request)
        found.append(event)
    return found


def contents(trace: Dialogue) -> list[Spoken]:
    """What went over the line, whenever and in whatever pieces it came: texts are whole runs."""
    merged: list[Spoken] = []
    for event in _decoded(trace, False):
        if not isinstance(event, Spoken):
            continue
        last = merged[-1] if merged else None
        if (last is not None and last.said is event.said and isinstance(last.item, wire.Text)
                and isinstance(event.item, wire.Text)):
            merged[-1] = Spoken(last.line, None, last.said,
                                wire.Text(last.item.raw + event.item.raw))
        else:
            merged.append(event)
    return merged


def key(spoken: Spoken, channel: Channel) -> tuple[bool, bytes]:
    """What makes two pieces the same.

    On the app channel a station finds its place by an id that nobody serves, any of them.
    """
    item = spoken.item
    if channel is Channel.APP and isinstance(item, wire.Frame):
        asked = item.packet.command - (not spoken.said)
        if is_searched(asked) and len(item.packet.atoms) == (not spoken.said):
            return spoken.said, b"".join(atom.encode() for atom in item.packet.atoms)
    return spoken.said, item.raw
