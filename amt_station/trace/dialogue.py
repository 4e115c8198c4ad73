"""Dialogues: sessions written down as text files. `test_dialogues` draws the format."""

import re
from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable

from amt_station import wire
from amt_station.requests.atom_text import TYPES
from amt_station.requests.catalogue import command_ids
from amt_station.wire.escapes import unescape

TOKEN = re.compile(r'(?:[^\s"#]|"(?:[^"\\]|\\.)*")+')
QUOTED = re.compile(r'"((?:[^"\\]|\\.)*)"')
TIMES = re.compile(r'("(?:[^"\\]|\\.)*")\*(\d+)')
CHANNELS = {"app": "packet", "pc": "pc"}


class DialogueError(Exception):
    """Something in a file that is no dialogue; the message names the file and the line."""


class _Problem(Exception):
    """What is wrong with a line."""


@dataclass(frozen=True)
class Step:
    """One line that does or expects something."""

    line: int
    action: str
    argument: object = None
    subject: str = ""


@dataclass
class Dialogue:
    """A session: on which channel, on a handset of its own or not, and its steps."""

    path: Path
    channel: str = ""
    is_fresh: bool = False
    steps: list[Step] = field(default_factory=list)


def _tokens(text: str) -> list[str]:
    """The words of a line; what is quoted is one word, and a # begins a comment."""
    words: list[str] = []
    place = 0
    while True:
        while place < len(text) and text[place].isspace():
            place += 1
        if place == len(text) or text[place] == "#":
            return words
        match = TOKEN.match(text, place)
        if match is None or (match.end() < len(text) and text[match.end()] == '"'):
            raise _Problem("a quote that is not closed")
        words.append(match[0])
        place = match.end()


def _literal(word: str) -> bytes:
    """The bytes of one word: "text", "text"*COUNT or hexadecimal digits."""
    times = TIMES.fullmatch(word)
    text, count = (times[1], int(times[2])) if times else (word, 1)
    quoted = QUOTED.fullmatch(text)
    if quoted:
        try:
            return unescape(quoted[1], "latin-1") * count
        except UnicodeEncodeError:
            raise _Problem(f"{text}: write bytes above 0x7F as \\xNN") from None
        except ValueError as error:
            raise _Problem(str(error)) from None
    try:
        return bytes.fromhex(word)
    except ValueError:
        raise _Problem(f"{word} is neither quoted text nor hexadecimal bytes") from None


def _bytes(words: list[str]) -> bytes:
    if not words:
        raise _Problem("no bytes")
    return b"".join(_literal(word) for word in words)


def _text(words: list[str]) -> str:
    return _bytes(words).decode("latin-1")


def _number(word: str) -> int:
    try:
        return int(word, 0)
    except ValueError:
        raise _Problem(f"{word} is no number") from None


def _command(word: str) -> int:
    if word in command_ids():
        return command_ids()[word]
    number = _number(word) if word[:1].isdigit() else -1
    if not 0 <= number <= 255:
        raise _Problem(f"no command {word}")
    return number


def _atom(word: str) -> wire.Atom:
    key, equals, rest = word.partition("=")
    label, colon, content = rest.partition(":")
    if not equals or not colon or label not in TYPES:
        raise _Problem(f"{word} is not ATOM={'|'.join(TYPES)}:VALUE")
    kind = TYPES[label]
    try:
        if kind is wire.AtomType.INT:
            return wire.Atom.integer(_number(key), _number(content))
        if kind is wire.AtomType.BOOL:
            return wire.Atom.boolean(_number(key), _number(content))
        return wire.Atom(_number(key), kind, _literal(content) if content else b"")
    except wire.WireError as error:
        raise _Problem(f"{word}: {error}") from None


def _packet(words: list[str]) -> wire.Packet:
    if not words:
        raise _Problem("a packet without a command")
    return wire.Packet(_command(words[0]), tuple(_atom(word) for word in words[1:]))


def _message(words: list[str]) -> "wire.Packet | bytes":
    """What is said or heard."""
    if words[:1] == ["packet"]:
        return _packet(words[1:])
    if words == ["acknowledgement"]:
        return wire.ACKNOWLEDGEMENT
    return _bytes(words)


def _log(words: list[str]) -> "str | tuple[str, int]":
    if words[:1] == ["error"]:
        if len(words) != 3:
            raise _Problem("log error FUNCTION CODE")
        return words[1], _number(words[2])
    return _text(words)


def _nothing(words: list[str]) -> None:
    if words:
        raise _Problem(f"nothing may follow, but there is {words[0]}")


def _one(convert: Callable[[str], object]) -> Callable[[list[str]], object]:
    def parse(words: list[str]) -> object:
        if len(words) != 1:
            raise _Problem("one word must follow")
        return convert(words[0])

    return parse


# Two words, or a word, a name and a word; and how the rest of the line is read.
Parser = Callable[[list[str]], object]
PLAIN: dict[tuple[str, str], Parser] = {
    ("station", "says"): _message, ("station", "hears"): _message,
    ("modem", "hears"): _message, ("modem", "says"): _message, ("modem", "adds"): _message,
    ("modem", "dies"): _nothing, ("modem", "returns"): _nothing,
    ("daemon", "ends"): _one(_number), ("handset", "off"): _nothing,
}
NAMED: dict[tuple[str, str], Parser] = {
    ("file", "is"): _bytes, ("file", "absent"): _nothing,
    ("file", "becomes"): _bytes, ("file", "vanishes"): _nothing,
    ("property", "is"): _text, ("property", "absent"): _nothing,
    ("property", "becomes"): _text, ("call", "answers"): _text,
}


def _step(line: int, words: list[str]) -> Step:
    if words[0] == "log":
        return Step(line, "log", _log(words[1:]))
    plain = PLAIN.get((words[0], words[1] if len(words) > 1 else ""))
    if plain is not None:
        return Step(line, f"{words[0]} {words[1]}", plain(words[2:]))
    named = NAMED.get((words[0], words[2] if len(words) > 2 else ""))
    if named is not None:
        return Step(line, f"{words[0]} {words[2]}", named(words[3:]), words[1])
    known = sorted({first for first, _ in (*PLAIN, *NAMED)} | {"channel", "log"})
    raise _Problem(f"no such statement; lines begin with {', '.join(known)}")


def _take_line(dialogue: Dialogue, number: int, words: list[str]) -> None:
    if words[0] == "channel":
        if dialogue.channel:
            raise _Problem("a second channel")
        if len(words) != 2 or words[1] not in CHANNELS:
            raise _Problem(f"channel {' or '.join(CHANNELS)}")
        dialogue.channel = words[1]
    elif words == ["handset", "fresh"]:
        dialogue.is_fresh = True
    elif not dialogue.channel:
        raise _Problem("the channel comes first")
    else:
        dialogue.steps.append(_step(number, words))


def parse(path: Path, text: str) -> Dialogue:
    """Read a dialogue; PATH is for messages."""
    dialogue = Dialogue(path)
    number = 0
    for number, line in enumerate(text.splitlines(), start=1):
        try:
            words = _tokens(line)
            if words:
                _take_line(dialogue, number, words)
        except _Problem as problem:
            raise DialogueError(f"{path.name}:{number}: {problem}") from None
    if not any(step.action == "station says" for step in dialogue.steps):
        raise DialogueError(f"{path.name}:{number}: the station says nothing at all")
    return dialogue
