"""What the demo shows: every exchange decoded, timed, and whether it came out as it should."""

import sys
import textwrap
from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable, Mapping

from amt_simulator import Handset, screen
from amt_station.errors import Refused, StationError
from amt_station.link import Link
from amt_station.requests.operations import Value, operation_packet, read_answer
from amt_station.requests.table import display_name, find_operation, requests_by_id
from amt_station.text import printable
from amt_station.wire.decoder import Acknowledgement, Frame, Item, Text
from amt_station.wire.packet import Packet

WIDTH = 100
NAME_WIDTH = 26
INDENT = " " * (8 + 2 + 6 + 2 + NAME_WIDTH + 2)
# A short exchange stands in one line, its answer in a column of its own.
SENT_WIDTH = 30


@dataclass
class Stage:
    """The table on standard output and the count behind the verdict."""

    passed: int = 0
    failures: list[str] = field(default_factory=list)

    def act(self, title: str) -> None:
        """Begin a part of the demo."""
        print(f"\n{title}\n{'-' * len(title)}", flush=True)

    def say(self, text: str) -> None:
        """A line between two exchanges."""
        print(f"{'':18}{text}", flush=True)

    def row(self, milliseconds: float | None, what: str, sent: str, received: list[str],
            good: bool) -> None:
        """One exchange."""
        time = f"{milliseconds:5.1f} ms" if milliseconds is not None else ""
        head = f"{time:>8}  {'ok' if good else 'FAILED':6}  {what:{NAME_WIDTH}}"
        for line in _fitted(sent, received or ["(nothing)"]):
            print(f"{head:{len(INDENT)}}{line}".rstrip())
            head = ""
        sys.stdout.flush()
        if good:
            self.passed += 1
        else:
            self.failures.append(what)

    # exchanges

    def at(self, link: Link, what: str, text: str, expected: str = "OK") -> None:
        """An AT text and its reply; EXPECTED must be in it."""
        try:
            reply = link.at(text)
        except StationError as error:
            self.row(None, what, f"-> {text}", [f"<- {error}"], False)
            return
        lines = [f"<- {printable(line)}" for line in (*reply.lines, reply.final)]
        self.row(reply.seconds * 1000, what, f"-> {text}", lines, expected in reply.raw)

    def operation(self, link: Link, what: str, path: tuple[str, ...],
                  values: "Mapping[str, Value] | None" = None,
                  expected: "Mapping[str, Value] | None" = None) -> None:
        """A request of the station's table; EXPECTED values must come back."""
        row, operation = find_operation(path)
        self.request(link, what, operation_packet(row, operation, values), expected)

    def request(self, link: Link, what: str, packet: Packet,
                expected: "Mapping[str, Value] | None" = None) -> None:
        """A packet and its answer."""
        sent = f"-> {_named_request(packet)}"
        try:
            exchange = link.request(packet)
        except StationError as error:
            self.row(None, what, sent, [f"<- {error}"], False)
            return
        lines = [f"<- {_shown(timed.item, packet.command)}" for timed in exchange.items]
        values = {value.name: value.value for value in read_answer(packet.command, exchange.answer)}
        good = exchange.answer.result in (0, None)
        good = good and all(_plain(values.get(name)) == wanted
                            for name, wanted in (expected or {}).items())
        self.row(exchange.seconds * 1000, what, sent, lines, good)

    def refused(self, what: str, sent: str, attempt: Callable[[], object]) -> None:
        """Something that the handset must refuse."""
        try:
            attempt()
        except Refused as error:
            self.row(None, what, sent, [f"<- refused: {str(error).splitlines()[0]}"], True)
        except StationError as error:
            self.row(None, what, sent, [f"<- {error}"], False)
        else:
            self.row(None, what, sent, ["<- accepted"], False)

    # what the exchanges leave behind

    def file(self, handset: Handset, path: str, wanted: str) -> None:
        """A file of the handset, which must hold WANTED."""
        try:
            content = handset.wait_file(path, wanted).decode("utf-8", "backslashreplace")
        except (OSError, RuntimeError, TimeoutError) as error:
            content = str(error)
        self.row(None, "file in the handset", f"   {path}", [repr(content)], content == wanted)

    def check(self, what: str, shown: str, good: bool) -> None:
        """Anything else that must be true."""
        self.row(None, what, "", [shown], good)

    def picture(self, handset: Handset, path: Path) -> None:
        """The handset's screen, saved."""
        screen.save(handset.path(screen.FRAMEBUFFER), handset.path(screen.STATE), path)
        self.check("screen saved", str(path), path.stat().st_size > 0)

    def verdict(self) -> int:
        """The last line, and the exit status."""
        total = self.passed + len(self.failures)
        print()
        if self.failures:
            print(f"FAIL: {len(self.failures)} of {total} steps: {', '.join(self.failures)}")
            return 1
        print(f"PASS: {total} steps")
        return 0


def _fitted(sent: str, received: list[str]) -> list[str]:
    """An exchange in lines that fit behind the name."""
    room = WIDTH - len(INDENT)
    first, *rest = received
    if len(joined := f"{sent:{SENT_WIDTH}}  {first}".strip()) <= room:
        lines = [joined, *rest]
    else:
        lines = [sent, *received]
    return [piece for line in lines if line
            for piece in textwrap.wrap(line, room, subsequent_indent="   ",
                                       break_on_hyphens=False)]


def _plain(value: object) -> object:
    return value.strip("\r\n") if isinstance(value, str) else value


def _with_values(packet: Packet, values: list[str]) -> str:
    return " ".join([str(packet.command), display_name(packet.command), ", ".join(values)]).strip()


def _named_request(packet: Packet) -> str:
    row = requests_by_id().get(packet.command)
    names = {field.atom: field.name for field in row.fields} if row else {}
    return _with_values(packet, [f"{names.get(atom.id, atom.id)}={_readable(atom.value)}"
                                 for atom in packet.atoms])


def _named_answer(packet: Packet, command: int) -> str:
    return _with_values(packet, [f"{value.name}={value.word or _readable(value.value)}"
                                 for value in read_answer(command, packet)])


def _readable(value: object) -> str:
    return value.hex() if isinstance(value, bytes) else printable(str(value).strip())


def _shown(item: Item, command: int) -> str:
    if isinstance(item, Acknowledgement):
        return "acknowledged"
    if isinstance(item, Frame):
        return _named_answer(item.packet, command)
    if isinstance(item, Text):
        return printable(item.text.strip())
    return "unreadable bytes"
