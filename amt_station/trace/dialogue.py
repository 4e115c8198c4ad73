"""Dialogues and traces: sessions on a line, written as text, a statement a line.

    @2026-11-21T09:30:00.000000Z channel pc
    @+0.000213  station says   packet AMT_VERSION_CMD 19=int:16
    @+0.002040  station hears  acknowledgement

The first column is optional: a moment, or with a + the seconds since the first moment. A statement
of a trace is ``channel``, ``station says``, ``station hears``, ``station opens`` or ``station
loses``: its port was opened, or went away. The others say what is around it; the tests of the whole
daemon, which hold dialogues, explain them. A # begins a comment.
"""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from datetime import datetime, timezone
from pathlib import Path
from typing import Callable

from amt_station.errors import UsageProblem
from amt_station.requests.model import Channel
from amt_station.trace.message import number, parse_message
from amt_station.trace.words import Problem, joined, tokens

SAYS, HEARS = "station says", "station hears"
OPENS, LOSES = "station opens", "station loses"

_SECONDS = re.compile(r"\+[0-9]{1,9}(\.[0-9]{1,9})?")


class DialogueError(Exception):
    """Something in a file that is no dialogue; the message names the file and the line."""

    def __init__(self, path: Path, line: int, problem: str) -> None:
        super().__init__(f"{path.name}:{line}: {problem}")
        self.line = line
        self.problem = problem


class DamagedTrace(UsageProblem):
    """A file that is no trace, or no whole one."""

    kind = "trace"


@dataclass(frozen=True)
class Step:
    """One line that does or expects something; ``seconds`` are since the beginning."""

    line: int
    action: str
    argument: object = None
    subject: str = ""
    seconds: float | None = None


@dataclass
class Dialogue:
    """A session: on which channel, on a handset of its own or not, and its steps."""

    path: Path
    channel: str = ""
    is_fresh: bool = False
    steps: list[Step] = field(default_factory=list)
    begun: datetime | None = None
    lines: list[str] = field(default_factory=list, repr=False)

    @property
    def line_channel(self) -> Channel:
        """The line on which the station speaks."""
        return Channel(self.channel)


def _text(words: list[str]) -> str:
    return joined(words).decode("latin-1")


def _log(words: list[str]) -> "str | tuple[str, int]":
    if words[:1] == ["error"]:
        if len(words) != 3:
            raise Problem("log error FUNCTION CODE")
        return words[1], number(words[2])
    return _text(words)


def _nothing(words: list[str]) -> None:
    if words:
        raise Problem(f"nothing may follow, but there is {words[0]}")


def _one(convert: Callable[[str], object]) -> Callable[[list[str]], object]:
    def parse_one(words: list[str]) -> object:
        if len(words) != 1:
            raise Problem("one word must follow")
        return convert(words[0])

    return parse_one


# Two words, or a word, a name and a word; and how the rest of the line is read.
Parser = Callable[[list[str]], object]
PLAIN: dict[tuple[str, str], Parser] = {
    ("station", "says"): parse_message, ("station", "hears"): parse_message,
    ("station", "opens"): _text, ("station", "loses"): _nothing,
    ("modem", "hears"): parse_message, ("modem", "says"): parse_message,
    ("modem", "adds"): parse_message,
    ("modem", "dies"): _nothing, ("modem", "returns"): _nothing,
    ("daemon", "ends"): _one(number), ("handset", "off"): _nothing,
}
NAMED: dict[tuple[str, str], Parser] = {
    ("file", "is"): joined, ("file", "absent"): _nothing,
    ("file", "becomes"): joined, ("file", "vanishes"): _nothing,
    ("property", "is"): _text, ("property", "absent"): _nothing,
    ("property", "becomes"): _text, ("call", "answers"): _text,
}


def _step(line: int, words: list[str], seconds: float | None) -> Step:
    if words[0] == "log":
        return Step(line, "log", _log(words[1:]), seconds=seconds)
    plain = PLAIN.get((words[0], words[1] if len(words) > 1 else ""))
    if plain is not None:
        return Step(line, f"{words[0]} {words[1]}", plain(words[2:]), seconds=seconds)
    named = NAMED.get((words[0], words[2] if len(words) > 2 else ""))
    if named is not None:
        return Step(line, f"{words[0]} {words[2]}", named(words[3:]), words[1], seconds)
    known = sorted({first for first, _ in (*PLAIN, *NAMED)} | {"channel", "log"})
    raise Problem(f"no such statement; lines begin with {', '.join(known)}")


def _moment(dialogue: Dialogue, word: str) -> float:
    """The first column: seconds since the beginning."""
    if _SECONDS.fullmatch(word):
        return float(word)
    try:
        moment = datetime.fromisoformat(word)
        moment = moment.replace(tzinfo=moment.tzinfo or timezone.utc).astimezone(timezone.utc)
    except (ValueError, OverflowError):
        raise Problem(f"@{word} is neither a moment nor, with a +, seconds") from None
    dialogue.begun = dialogue.begun or moment
    return (moment - dialogue.begun).total_seconds()


def _take_line(dialogue: Dialogue, line: int, words: list[str]) -> None:
    seconds = None
    if words[0].startswith("@"):
        seconds = _moment(dialogue, words.pop(0)[1:])
        if not words:
            raise Problem("a time and nothing behind it")
    if words[0] == "channel":
        if dialogue.channel:
            raise Problem("a second channel")
        if len(words) != 2 or words[1] not in {channel.value for channel in Channel}:
            raise Problem("channel app or pc")
        dialogue.channel = words[1]
    elif words == ["handset", "fresh"]:
        dialogue.is_fresh = True
    elif not dialogue.channel:
        raise Problem("the channel comes first")
    else:
        dialogue.steps.append(_step(line, words, seconds))


def parse(path: Path, text: str, is_held: bool = True) -> Dialogue:
    """Read a dialogue; ``path`` is for messages. In one that is to be held, the station speaks."""
    dialogue = Dialogue(path, lines=text.splitlines())
    line = 0
    for line, content in enumerate(dialogue.lines, start=1):
        try:
            words = tokens(content)
            if words:
                _take_line(dialogue, line, words)
        except Problem as problem:
            raise DialogueError(path, line, str(problem)) from None
    if is_held and not any(step.action == SAYS for step in dialogue.steps):
        raise DialogueError(path, line, "the station says nothing at all")
    return dialogue


def read_trace(path: Path) -> Dialogue:
    """Read the trace, or the dialogue, in a file; ``DamagedTrace`` says where it is none."""
    try:
        data = path.read_bytes()
    except OSError as error:
        raise DamagedTrace(f"{path}: {error.strerror}") from error
    last = data.count(b"\n") + 1
    try:
        text = data.decode("utf-8")
    except UnicodeDecodeError as error:
        line = data.count(b"\n", 0, error.start) + 1
        raise DamagedTrace(f"{path}:{line}: this is no text") from None
    try:
        dialogue = parse(path, text, is_held=False)
    except DialogueError as error:
        raise DamagedTrace(f"{path}:{error.line}: {error.problem}") from None
    if not dialogue.channel:
        raise DamagedTrace(f"{path}:{last}: there is no channel, so this is no trace")
    if not data.endswith(b"\n"):
        raise DamagedTrace(f"{path}:{last}: the last line has no end: the file was cut")
    return dialogue
