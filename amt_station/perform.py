"""Carries out what ``amt_station.requests.operations`` has prepared, and reads what came of it.

    prepared = prepare("battery voltage", {}, link.channel)     # raises UsageProblem, sends nothing
    with link.recorded() as transcripts:                        # every byte, with its time
        outcome = perform(link, prepared)                       # raises StationError
    outcome["voltage"].shown, outcome["voltage"].unit           # 4.012345, "V"

``prepare_packet`` and ``prepare_text`` make the same of any packet and any AT text. A run begins
with ``link.find_place()``. ``Transcript`` (in ``amt_station.exchange``) is the record of one
exchange, ``render.transcript_json`` its JSON form.
"""

from __future__ import annotations

from dataclasses import dataclass
from typing import Mapping

from amt_station.errors import IncompleteAnswer, Refused, StationError, UsageProblem
from amt_station.exchange import AtReply, Exchange
from amt_station.link import Link
from amt_station.requests.at_commands import known_read
from amt_station.requests.model import Channel
from amt_station.requests.operations import (NamedValue, Prepared, Value, prepare, problems,
                                             read_answer)
from amt_station.requests.table import operations
from amt_station.text import printable


@dataclass(frozen=True)
class Outcome:
    """A command that passed: its values, and its exchanges, the last one its own.

    A text has the one value ``reply``, its lines joined.
    """

    prepared: Prepared
    values: tuple[NamedValue, ...]
    exchanges: tuple[Exchange | AtReply, ...]

    def __getitem__(self, name: str) -> NamedValue:
        """The value of this name; raises ``KeyError`` when the answer has none."""
        for value in self.values:
            if value.name == name:
                return value
        raise KeyError(name)

    @property
    def exchange(self) -> Exchange | AtReply:
        """The exchange of the command itself."""
        return self.exchanges[-1]


def perform(link: Link, prepared: Prepared, timeout: float | None = None) -> Outcome:
    """Carry out ``prepared`` and what has to go before it; raises ``StationError`` for a no.

    A yes without the values that it is there for is a no: ``IncompleteAnswer``.
    """
    if prepared.channel is not link.channel:
        raise UsageProblem(f"{prepared.name} was prepared for the {prepared.channel.value} "
                           f"channel, this is the {link.channel.value} channel")
    with link.turn():
        before = perform(link, prepared.before, timeout).exchanges if prepared.before else ()
        if prepared.packet is None:
            values, exchange = _say(link, prepared, timeout)
        else:
            values, exchange = _ask(link, prepared, timeout)
    return Outcome(prepared, values, (*before, exchange))


def _ask(link: Link, prepared: Prepared,
         timeout: float | None) -> tuple[tuple[NamedValue, ...], Exchange | AtReply]:
    assert prepared.packet is not None
    exchange = link.request(prepared.packet, timeout)
    lacks = problems(prepared, exchange.answer)
    if lacks:
        # It may be the late answer to something else, with its own still to come.
        link.doubt()
        raise IncompleteAnswer(f"{prepared.name}: {'; '.join(lacks)}")
    return tuple(read_answer(prepared.packet.command, exchange.answer)), exchange


def _say(link: Link, prepared: Prepared,
         timeout: float | None) -> tuple[tuple[NamedValue, ...], Exchange | AtReply]:
    reply = link.at(prepared.text, timeout)
    problem = reply_problem(reply)
    if problem is not None:
        if reply.ok:
            link.doubt()
        raise problem
    if prepared.at is None:
        return (NamedValue("reply", "\n".join(reply.lines)),), reply
    return (_read_text(prepared, _read_lines(reply)[-1]),), reply


def reply_problem(reply: AtReply) -> StationError | None:
    """Why a reply is no pass: an error, or a read that brought nothing."""
    said = printable(reply.sent)
    if not reply.ok:
        return Refused(f"{said} was answered with {printable(reply.final)}",
                       causes=_causes(reply.sent))
    prefix = known_read(reply.sent)
    found = _read_lines(reply)
    if prefix and not any(line.strip('"') for line in found):
        return IncompleteAnswer(f"{said}: the answer holds no {prefix} line with a value")
    if len(found) > 1:
        return IncompleteAnswer(f"{said}: the answer holds {len(found)} {prefix} lines: it is not "
                                "sure which is its own")
    return None


def _read_lines(reply: AtReply) -> list[str]:
    """What stands behind the prefix of a text that reads something."""
    prefix = known_read(reply.sent)
    return [line[len(prefix):].strip() for line in reply.lines
            if prefix and line.startswith(prefix)]


def _read_text(prepared: Prepared, text: str) -> NamedValue:
    assert prepared.at is not None and prepared.row is not None
    name = prepared.at.field
    field = next(row for row in prepared.row.answer_fields if row.name == name)
    plain = text[1:-1] if text.startswith('"') and text.endswith('"') else text
    value: Value = plain
    if field.numeric:
        try:
            value = int(plain)
        except ValueError:
            raise IncompleteAnswer(f"{prepared.name}: the answer holds no number but "
                                   f"{printable(plain)}") from None
    return NamedValue(name, value, field.word(value), field.unit, field)


def _causes(text: str) -> tuple[str, ...]:
    """The table's reasons for the refusal of a text that a typed command sends too."""
    for row, operation in operations():
        service = row.service(Channel.PC)
        if operation.at is not None and operation.at.text == text and service is not None:
            return service.causes(None, row.use(operation.fixed))
    return ()


def run_operation(link: Link, path: tuple[str, ...], values: Mapping[str, object] | None = None,
                  timeout: float | None = None) -> list[Exchange | AtReply]:
    """Carry out a typed command and what it needs before; the last exchange is its own."""
    return list(perform(link, prepare(path, values, link.channel), timeout).exchanges)
