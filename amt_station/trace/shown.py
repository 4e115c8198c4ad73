"""A trace decoded for a person and for ``--json``, and what is different between two."""

from __future__ import annotations

import re
from dataclasses import dataclass
from difflib import SequenceMatcher
from typing import Any, Iterator

from amt_station.render import item_json, item_line, packet_json, packet_lines
from amt_station.requests.model import Channel
from amt_station.text import printable
from amt_station.trace.conversation import Event, Spoken, contents, events, key
from amt_station.trace.dialogue import HEARS, SAYS, Dialogue
from amt_station.wire.decoder import Frame, Skipped

_ARROWS = {True: "->", False: "<-"}
_TIME = "{:11.6f} {:>11}  "
_COLUMN = re.compile(r"^\s*(?:@\S+)?\s*")


def shown_lines(trace: Dialogue) -> Iterator[str]:
    """Everything in order: the time, the time since the line before, the direction, and what."""
    begun = f", begun {trace.begun:%Y-%m-%d %H:%M:%S} UTC" if trace.begun else ""
    yield f"{trace.channel} channel{begun}"
    last: float | None = None
    for event in events(trace):
        first, *others = _event_lines(trace, event)
        yield _times(event.seconds, last) + first
        for line in others:
            yield (" " * len(_times(event.seconds, last))) + "   " + line
        last = event.seconds


def _times(seconds: float | None, last: float | None) -> str:
    if seconds is None:
        return ""
    since = "" if last is None else f"{(seconds - last) * 1000:+.1f} ms"
    return _TIME.format(seconds, since)


def _statement(trace: Dialogue, event: Event) -> str:
    return printable(_COLUMN.sub("", trace.lines[event.line - 1]))


def _event_lines(trace: Dialogue, event: Event) -> list[str]:
    if not isinstance(event, Spoken):
        return [f"   {_statement(trace, event)}"]
    arrow = _ARROWS[event.said]
    if isinstance(event.item, Frame):
        title, *atoms = packet_lines(event.item.packet, event.request)
        return [f"{arrow} {title}", *atoms]
    return [f"{arrow} {item_line(event.item)}"]


def shown_json(trace: Dialogue) -> dict[str, Any]:
    """The same as a document."""
    return {"ok": True, "channel": trace.channel,
            "begun": trace.begun.isoformat() if trace.begun else None,
            "events": [_event_json(trace, event) for event in events(trace)]}


def _event_json(trace: Dialogue, event: Event) -> dict[str, Any]:
    head: dict[str, Any] = {"line": event.line, "seconds": event.seconds}
    if not isinstance(event, Spoken):
        return {**head, "kind": "statement", "text": _statement(trace, event)}
    document: dict[str, Any] = {
        **head, "action": SAYS if event.said else HEARS, "bytes": event.item.raw.hex(),
        **item_json(event.item)}
    if isinstance(event.item, Frame):
        document["packet"] = packet_json(event.item.packet, event.request)
    return document


@dataclass(frozen=True)
class Difference:
    """One piece that only one of two traces has, and the line where it stands there."""

    is_first: bool
    line: int
    text: str

    def json(self) -> dict[str, object]:
        """For ``--json``."""
        return {"in": "first" if self.is_first else "second", "line": self.line,
                "text": self.text}


def differences(first: Dialogue, second: Dialogue) -> list[Difference]:
    """What one has and the other has not, by content; none when both say the same."""
    if first.channel != second.channel:
        return [Difference(trace is first, 1, f"channel {trace.channel}")
                for trace in (first, second)]
    channel = first.line_channel
    left, right = contents(first), contents(second)
    matcher = SequenceMatcher(None, _keys(left, channel), _keys(right, channel), autojunk=False)
    found: list[Difference] = []
    for kind, left_begin, left_end, right_begin, right_end in matcher.get_opcodes():
        if kind != "equal":
            found += [_difference(True, piece) for piece in left[left_begin:left_end]]
            found += [_difference(False, piece) for piece in right[right_begin:right_end]]
    return found


def _keys(pieces: list[Spoken], channel: Channel) -> list[tuple[bool, bytes]]:
    return [key(piece, channel) for piece in pieces]


def _difference(is_first: bool, spoken: Spoken) -> Difference:
    raw = f" [{spoken.item.raw.hex()}]" if isinstance(spoken.item, Skipped) else ""
    return Difference(is_first, spoken.line,
                      f"{_ARROWS[spoken.said]} {item_line(spoken.item)}{raw}")
