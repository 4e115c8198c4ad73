"""The one thing that is said to a handset: the search for the place, which changes nothing there.

It is what every run begins with. A refused text that the handset holds goes with it.
"""

from __future__ import annotations

from dataclasses import dataclass

from amt_station.diagnosis import wrong_line
from amt_station.errors import BadFrame, NoAnswer, Refused, StationError
from amt_station.link import Link, Place
from amt_station.requests.model import Channel
from amt_station.wire.decoder import Item


@dataclass(frozen=True)
class Probe:
    """What came of it.

    ``problem`` is why the handset was not found on the line that was named, ``serves`` the line
    that it was found on, None when on neither; ``items`` is all that came, ``place`` the outcome.
    """

    problem: StationError | None
    serves: Channel | None
    items: tuple[Item, ...] = ()
    place: Place | None = None


def probe(link: Link, timeout: float) -> Probe:
    """Ask for the place, and where that says or may mean that it is the other line, there too."""
    first = _ask(link, timeout)
    if first.serves is not None or not _may_be_other_line(first, link.channel):
        return first
    other = Link(link.port, Channel.PC if link.channel is Channel.APP else Channel.APP)
    return Probe(first.problem, _ask(other, timeout).serves, first.items)


def _ask(link: Link, timeout: float) -> Probe:
    place: Place | None = None
    problem: StationError | None = None
    with link.recorded() as transcripts:
        try:
            place = link.find_place(timeout)
        except StationError as error:
            problem = error
    items = tuple(item for transcript in transcripts
                  for item in (*transcript.late, *(timed.item for timed in transcript.items)))
    if not items and isinstance(problem, NoAnswer):
        # Of a line that never falls silent nothing gets into a transcript.
        items = problem.arrived
    # Only the handset's own service refuses in a packet.
    found = place is not None or isinstance(problem, Refused) and problem.code is not None
    return Probe(problem, link.channel if found else None, items, place)


def _may_be_other_line(found: Probe, channel: Channel) -> bool:
    """On the PC line a packet would go to the modem, so one is sent there for a reason only.

    The text that the PC line knows is harmless on the app channel.
    """
    if channel is Channel.APP:
        return isinstance(found.problem, (BadFrame, NoAnswer))
    return bool(wrong_line(found.items, channel))
