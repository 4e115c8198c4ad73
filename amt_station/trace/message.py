"""What is said or heard at once: ``packet COMMAND ATOM...``, ``acknowledgement``, or bytes."""

from __future__ import annotations

from typing import Union

from amt_station import wire
from amt_station.requests.atom_text import TYPES
from amt_station.requests.catalogue import command_ids, command_names
from amt_station.requests.model import Channel
from amt_station.trace.words import Problem, joined, literal, word_of, words_of

# More than any line carries at once.
MOST_BYTES = 1 << 20

Message = Union[wire.Packet, bytes]


def number(word: str) -> int:
    """A number, in any of Python's notations."""
    try:
        return int(word, 0)
    except ValueError:
        raise Problem(f"{word} is no number") from None


def _command(word: str) -> int:
    if word in command_ids():
        return command_ids()[word]
    code = number(word) if word[:1].isdigit() else -1
    if not 0 <= code <= 255:
        raise Problem(f"no command {word}")
    return code


def _atom(word: str) -> wire.Atom:
    key, equals, rest = word.partition("=")
    label, colon, content = rest.partition(":")
    if not equals or not colon or label not in TYPES:
        raise Problem(f"{word} is not ATOM={'|'.join(TYPES)}:VALUE")
    kind = TYPES[label]
    try:
        if kind is wire.AtomType.INT:
            return wire.Atom.integer(number(key), number(content))
        if kind is wire.AtomType.BOOL:
            return wire.Atom.boolean(number(key), number(content))
        return wire.Atom(number(key), kind, literal(content) if content else b"")
    except wire.WireError as error:
        raise Problem(f"{word}: {error}") from None


def _packet(words: list[str]) -> wire.Packet:
    if not words:
        raise Problem("a packet without a command")
    packet = wire.Packet(_command(words[0]), tuple(_atom(word) for word in words[1:]))
    try:
        packet.encode()
    except wire.WireError as error:
        raise Problem(str(error)) from None
    return packet


def parse_message(words: list[str]) -> Message:
    """What is said or heard."""
    if words[:1] == ["packet"]:
        return _packet(words[1:])
    if words == ["acknowledgement"]:
        return wire.ACKNOWLEDGEMENT
    data = joined(words)
    if len(data) > MOST_BYTES:
        raise Problem(f"{len(data)} bytes at once; {MOST_BYTES} are the most")
    return data


def encode(message: Message, channel: Channel) -> bytes:
    """The bytes of a message on its line."""
    if isinstance(message, bytes):
        return message
    return wire.encode_envelope(message) if channel is Channel.PC else message.encode()


def decoder(channel: Channel) -> wire.Decoder:
    """What reads the bytes of a line."""
    return wire.EnvelopeDecoder() if channel is Channel.PC else wire.BareDecoder()


def write_messages(data: bytes, channel: Channel) -> list[str]:
    """The messages that stand for ``data``, in order; read again, they are exactly these bytes."""
    reader = decoder(channel)
    messages: list[str] = []
    rest = b""
    for item in [*reader.feed(data), *reader.give_up()]:
        message = _whole(item, channel)
        if not message:
            rest += item.raw
            continue
        messages += [words_of(rest)] * bool(rest) + [message]
        rest = b""
    return messages + [words_of(rest)] * bool(rest)


def _whole(item: wire.Item, channel: Channel) -> str:
    """A frame in words; empty for whatever has to be written as bytes."""
    if isinstance(item, wire.Acknowledgement):
        return "acknowledgement"
    if isinstance(item, wire.Frame) and encode(item.packet, channel) == item.raw:
        return write_packet(item.packet)
    return ""


def write_packet(packet: wire.Packet) -> str:
    """A packet in words."""
    name = command_names().get(packet.command, str(packet.command))
    return " ".join(["packet", name, *(_write_atom(atom) for atom in packet.atoms)])


def _write_atom(atom: wire.Atom) -> str:
    value = str(atom.value) if isinstance(atom.value, int) else word_of(atom.content)
    return f"{atom.id}={atom.type.label}:{value}"
