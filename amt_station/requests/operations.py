"""What can be asked, made ready: a packet or a text from named values, all checked before.

``prepare`` is the one way from a typed command's name and values to what is sent, for the command
line, for plans and for the library; it touches no port. ``amt_station.perform`` carries it out.
"""

from __future__ import annotations

from dataclasses import dataclass
from typing import Mapping, Sequence

from amt_station.errors import UsageProblem, ValueProblem
from amt_station.requests.at_commands import known_refusal
from amt_station.requests.field import Shown, Value
from amt_station.requests.model import AtRead, Channel, Field, Operation, Request
from amt_station.requests.table import find_operation, requests_by_id
from amt_station.wire.atoms import RESULT_ATOM, Atom
from amt_station.wire.envelope import encode_request
from amt_station.wire.errors import WireError
from amt_station.wire.packet import Packet

__all__ = ["NamedValue", "Prepared", "Shown", "Value", "build_packet", "check_channel",
           "check_text", "check_value", "misfits", "operation_packet", "prepare", "prepare_packet",
           "prepare_text", "problems", "read_answer"]


@dataclass(frozen=True)
class NamedValue:
    """One value of an answer with its name.

    ``value`` is as it travelled, ``shown`` the same in ``unit``; ``word`` is what a number stands
    for, ``field`` its row in the table where it has one.
    """

    name: str
    value: Value
    word: str = ""
    unit: str = ""
    field: Field | None = None

    @property
    def shown(self) -> Shown:
        """The value in its unit."""
        return self.field.show(self.value) if self.field else self.value


@dataclass(frozen=True)
class Prepared:
    """Something that can be sent at once: a packet, or a text where ``packet`` is None.

    ``asked`` holds the values as they were checked, ``forced`` what ``force`` went past (for the
    record), ``before`` what has to go before it. ``at`` says how a text is read as ``operation``.
    """

    name: str
    channel: Channel
    packet: Packet | None = None
    text: str = ""
    row: Request | None = None
    operation: Operation | None = None
    asked: Mapping[str, Value] | None = None
    forced: tuple[str, ...] = ()
    before: Prepared | None = None
    at: AtRead | None = None


def prepare(command: str | tuple[str, ...], values: Mapping[str, object] | None = None,
            channel: Channel = Channel.PC, force: bool = False) -> Prepared:
    """A typed command with its values, by the table's names; ``UsageProblem`` says what is wrong.

    A wrong value is a ``ValueProblem`` with its key. A value may be None for one not given.
    """
    row, operation = find_operation(tuple(command.split()) if isinstance(command, str)
                                    else command)
    check_channel(row, operation, channel)
    given = {name: value for name, value in (values or {}).items() if value is not None}
    forced: list[str] = []
    checked = {name: check_value(row, operation, name, value, force, forced)
               for name, value in given.items()}
    missing = [name for name in operation.takes if name not in given]
    if missing:
        raise UsageProblem(f"{operation.name} needs {', '.join(missing)}")
    asked: dict[str, Value] = {**operation.fixed, **checked}
    before = prepare(operation.before, None, channel) if operation.before else None
    if operation.at is not None and channel is Channel.PC:
        return Prepared(operation.name, channel, text=operation.at.text, row=row,
                        operation=operation, asked=asked, before=before, at=operation.at)
    packet = build_packet(row, asked, force=True)
    _check_size(packet, channel)
    return Prepared(operation.name, channel, packet, row=row, operation=operation, asked=asked,
                    forced=tuple(forced), before=before)


def check_value(row: Request, operation: Operation, name: str, value: object,
                force: bool = False, forced: list[str] | None = None) -> Value:
    """One value of a typed command as it is sent; what ``force`` goes past is put into ``forced``.
    """
    if name not in (*operation.takes, *operation.may_take):
        known = ", ".join((*operation.takes, *operation.may_take)) or "nothing"
        raise ValueProblem(name, f"{operation.name} has no atom {name}, it takes {known}")
    field = row.field(name)
    try:
        return field.check(value)
    except ValueProblem as problem:
        if not force:
            raise
        checked = field.check(value, force=True)
        if forced is not None:
            forced.append(str(problem))
        return checked


def prepare_packet(packet: Packet, channel: Channel = Channel.PC) -> Prepared:
    """Any packet."""
    _check_size(packet, channel)
    row = requests_by_id().get(packet.command)
    asked = {field.name: field.read(atom) for field in (row.fields if row else ())
             if (atom := packet.find(field.atom)) is not None}
    return Prepared(f"request {packet.command}", channel, packet, row=row, asked=asked)


def prepare_text(text: str, channel: Channel = Channel.PC, force: bool = False) -> Prepared:
    """Any AT text; one that the handset is known to refuse and keep only with ``force``."""
    forced = check_text(text, channel, force)
    return Prepared(text, channel, text=text, forced=(forced,) if forced else ())


def check_text(text: object, channel: Channel = Channel.PC, force: bool = False) -> str:
    """Refuse an AT text that is none; what ``force`` went past, empty when nothing."""
    if channel is not Channel.PC:
        raise UsageProblem("AT text is understood on the PC line only")
    if not isinstance(text, str):
        raise UsageProblem(f"an AT text of type {type(text).__name__}")
    if not text.strip():
        raise UsageProblem("an empty AT text")
    odd = next((character for character in text if not character.isprintable()), "")
    if odd:
        raise UsageProblem(f"an AT text with U+{ord(odd):04X}, a control or unprintable "
                           "character")
    why = known_refusal(text)
    if not why:
        return ""
    if force:
        return f"the handset is known to refuse {text}: {why}"
    raise UsageProblem(f"the handset is known to refuse {text}: {why}; it would keep the text and "
                       "read it again with what follows (--force sends it)")


def _check_size(packet: Packet, channel: Channel) -> None:
    try:
        encode_request(packet, enveloped=channel is Channel.PC)
    except WireError as error:
        raise UsageProblem(str(error)) from error


def build_packet(row: Request, values: Mapping[str, Value], force: bool = False) -> Packet:
    """The request packet for these values, its atoms in the row's order."""
    for name in values:
        row.field(name)
    return Packet(row.id, tuple(atom for field in row.fields
                                if (atom := _field_atom(row, field, values, force)) is not None))


def _field_atom(row: Request, field: Field, values: Mapping[str, Value],
                force: bool) -> Atom | None:
    if field.name in values:
        return field.encode(values[field.name], force)
    if field.length_of in values:
        measured = row.field(field.length_of).encode(values[field.length_of], force)
        return field.encode(len(measured.content), force)
    return None


def operation_packet(row: Request, operation: Operation,
                     values: Mapping[str, Value] | None = None) -> Packet:
    """The packet of a typed command; numbers may be given as text."""
    given = {name: value for name, value in (values or {}).items() if value is not None}
    missing = [name for name in operation.takes if name not in given]
    if missing:
        raise UsageProblem(f"{operation.name} needs {', '.join(missing)}")
    return build_packet(row, {**operation.fixed, **given})


def check_channel(row: Request, operation: Operation, channel: Channel) -> None:
    """Refuse what the handset is known to refuse, or to do otherwise, on this channel."""
    if channel not in operation.channels or row.service(channel) is None:
        served = " and ".join(name.value for name in operation.channels
                              if row.service(name) is not None)
        raise UsageProblem(f"{operation.name} is served on the {served} channel only")


def read_answer(command: int, answer: Packet) -> list[NamedValue]:
    """The values of an answer to request ``command``, with their names."""
    row = requests_by_id().get(command)
    return [_named_value(row, atom) for atom in answer.atoms]


def _named_value(row: Request | None, atom: Atom) -> NamedValue:
    field = row.answer_field(atom.id) if row else None
    if field is None:
        plain = atom.value.hex() if isinstance(atom.value, bytes) else atom.value
        return NamedValue("result" if atom.id == RESULT_ATOM else f"atom {atom.id}", plain)
    value = field.read(atom)
    return NamedValue(field.name, value, field.word(value), field.unit, field)


def problems(prepared: Prepared, answer: Packet) -> Sequence[str]:
    """What an answer that says yes lacks of what was asked for; empty when it is whole.

    It has to hold its result code and the values that the command is there for, each of its type,
    and it has to be about the module or the index that was asked for.
    """
    row = prepared.row
    if row is None:
        return ()
    return [*(f"the answer holds no {name}" for name in _wanted(row, prepared.operation)
              if answer.find(_answer_field(row, name).atom) is None),
            *misfits(prepared, answer)]


def misfits(prepared: Prepared, answer: Packet) -> Sequence[str]:
    """What an answer that says yes holds, but of another type or for something else."""
    found: list[str] = []
    for atom in answer.atoms:
        field = prepared.row.answer_field(atom.id) if prepared.row else None
        if field is not None and field.misfit(atom):
            found.append(f"the answer's {field.misfit(atom)}")
        elif field is not None and field.echo:
            found += _other_than_asked(field, field.read(atom), prepared.asked or {})
    return found


def _wanted(row: Request, operation: Operation | None) -> tuple[str, ...]:
    result = ("result",) if row.reports_result else ()
    return (*result, *operation.brings) if operation is not None else result


def _answer_field(row: Request, name: str) -> Field:
    return next(field for field in row.answer_fields if field.name == name)


def _other_than_asked(field: Field, value: Value, asked: Mapping[str, Value]) -> list[str]:
    wanted = asked.get(field.name)
    if wanted is None or value == wanted:
        return []
    return [f"the answer is for {field.name} {value} instead of {wanted}: the answer holds no "
            f"{field.name} {wanted}"]
