"""What the tests of a line need: places where scripted handsets are plugged in, and the line."""

from __future__ import annotations

import json
import threading
import time
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Callable, Iterator, Mapping, Sequence

from line_bench import Script, adc, load
from station_peer import Peer

from amt_line.run.desk import Desk
from amt_line.run.events import Event, Stream
from amt_line.run.inputs import Supply
from amt_line.run.line import Line
from amt_line.run.plug import Listing, plug_of
from amt_line.run.presence import Patience
from amt_line.run.record import Record, Where
from amt_line.run.record_file import RecordFile, file_name
from amt_line.run.slot import RecordKeeper, Shop, Slot
from amt_line.run.stop import INTERRUPTED, Abort
from amt_station.wire import ACKNOWLEDGEMENT
from amt_station.wire.decoder import EnvelopeDecoder

# Only what never happens takes so long.
PATIENCE = 120.0
QUICK = Patience(look=0.01, answer=0.3, silent=0.5, ask=0.05)


def battery(value: int, **texts: Sequence[bytes]) -> Script:
    """A handset with this battery."""
    return Script(texts=dict(texts), requests={224: [[ACKNOWLEDGEMENT, adc(value)]]})


class Socket:
    """A place on the bench: its link leads to the handset that is plugged in."""

    def __init__(self, path: Path) -> None:
        self.path = path
        self.peer: Peer | None = None
        self._turn = 0

    def plug(self, script: Any) -> Peer:
        """Plug a handset in."""
        self.peer = Peer(EnvelopeDecoder())
        self.peer.script = script
        self._turn += 1
        fresh = self.path.with_name(f".{self.path.name}-{self._turn}")
        fresh.symlink_to(self.peer.path)
        fresh.rename(self.path)
        return self.peer

    def pull(self) -> None:
        """Pull the handset out."""
        self.path.unlink(missing_ok=True)
        if self.peer is not None:
            peer, self.peer = self.peer, None
            peer.stop()
            peer.close()


@dataclass
class Bench:
    """A line with scripted handsets, served in threads of this process."""

    folder: Path
    plan: str
    names: Sequence[str] = ("A",)
    once: bool = False
    attended: bool = False
    answers: Mapping[str, str] = field(default_factory=dict)
    rows: Mapping[str, Sequence[Mapping[str, str]]] = field(default_factory=dict)
    ports: Mapping[str, str] = field(default_factory=dict)
    patience: Patience = QUICK
    on_event: Callable[[Event], None] = lambda event: None

    def __post_init__(self) -> None:
        self.records = self.folder / "records"
        self.sockets = {name: Socket(self.folder / name) for name in self.names}
        self.events: list[Event] = []
        self.desk = Desk()
        self.status: int | None = None
        self._heard = threading.Condition()
        plan = load(self.folder, self.plan)
        self.shop = Shop(plan, Stream([self._hear, lambda event: self.on_event(event)]), self.desk,
                         lambda slot, url: Where("bench", "me", url, "1.0", slot), self.keep,
                         self.attended, 5.0, self.answers, self.once, self.patience)
        listing = Listing(lambda: [])
        desk = self.desk if self.attended else None
        self.slots = {name: Slot(name, plug_of(
            self.ports.get(name, str(self.sockets[name].path)), listing),
            Supply(name, plan, {}, self.rows.get(name, ()), desk), self.shop)
            for name in self.names}
        self.line = Line(list(self.slots.values()), self.shop.ends, self.once)
        self._thread = threading.Thread(target=self._run, daemon=True)

    def keep(self, dut: str, record: Record) -> RecordKeeper:
        """Begin a record."""
        return RecordFile(self.records, file_name(dut, record.head["began"], record.run),
                          record.text())

    def _run(self) -> None:
        self.status = self.line.run()

    def _hear(self, event: Event) -> None:
        with self._heard:
            self.events.append(event)
            self._heard.notify_all()

    def __enter__(self) -> Bench:
        self._thread.start()
        return self

    def __exit__(self, *_error: object) -> None:
        self.line.end(INTERRUPTED)
        self.line.end(INTERRUPTED)
        self._thread.join(PATIENCE)
        for socket in self.sockets.values():
            socket.pull()
        assert not self._thread.is_alive(), "the line has ended"

    def end(self, how: Abort = INTERRUPTED) -> int | None:
        """End the line and wait for it; its status."""
        self.line.end(how)
        return self.join()

    def join(self) -> int | None:
        """Wait until the line has ended; its status."""
        self._thread.join(PATIENCE)
        assert not self._thread.is_alive(), [event["event"] for event in self.events[-20:]]
        return self.status

    # what happened

    def wait(self, event: str, count: int = 1, **values: Any) -> Event:
        """The COUNT-th event with these values, as soon as it is there."""
        end = time.monotonic() + PATIENCE
        with self._heard:
            while len(found := list(self.found(event, **values))) < count:
                assert self._heard.wait(end - time.monotonic()), (
                    f"no {event} {values} in {self.events[-20:]}")
        return found[count - 1]

    def found(self, event: str, **values: Any) -> Iterator[Event]:
        """The events with these values so far."""
        return (item for item in list(self.events) if item["event"] == event
                and all(item.get(name) == value for name, value in values.items()))

    def verdicts(self, slot: str) -> list[str]:
        """The verdicts of a slot's runs so far."""
        return [event["verdict"] for event in self.found("run-ended", slot=slot)]

    def record(self, run: str) -> dict[str, Any]:
        """The record of a run, from its file."""
        for path in self.records.glob("*.json"):
            document: dict[str, Any] = json.loads(path.read_text(encoding="utf-8"))
            if document["run"] == run:
                return document
        raise AssertionError(f"no record of {run}")
