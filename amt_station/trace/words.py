"""The words of a line: how bytes are written so that a person reads them, and read again.

Text in quotes (``\\r \\n \\t \\0 \\\\ \\" \\xNN``), text with a count (``"x"*4096``), hexadecimal
digits.
"""

from __future__ import annotations

import re

from amt_station.wire.escapes import unescape

_TOKEN = re.compile(r'(?:[^\s"#]|"(?:[^"\\]|\\.)*")+')
_QUOTED = re.compile(r'"((?:[^"\\]|\\.)*)"')
_TIMES = re.compile(r'("(?:[^"\\]|\\.)*")\*([0-9]{1,7})')
_RUNS = re.compile(rb"[\t\r\n\x20-\x7E]+|[^\t\r\n\x20-\x7E]+")
_ESCAPES = {0x0D: "\\r", 0x0A: "\\n", 0x09: "\\t", 0x22: '\\"', 0x5C: "\\\\"}


class Problem(Exception):
    """What is wrong with a line."""


def tokens(text: str) -> list[str]:
    """The words of a line; what is quoted is one word, and a # begins a comment."""
    words: list[str] = []
    place = 0
    while True:
        while place < len(text) and text[place].isspace():
            place += 1
        if place == len(text) or text[place] == "#":
            return words
        match = _TOKEN.match(text, place)
        if match is None or (match.end() < len(text) and text[match.end()] == '"'):
            raise Problem("a quote that is not closed")
        words.append(match[0])
        place = match.end()


def literal(word: str) -> bytes:
    """The bytes of one word."""
    times = _TIMES.fullmatch(word)
    text, count = (times[1], int(times[2])) if times else (word, 1)
    quoted = _QUOTED.fullmatch(text)
    if quoted:
        try:
            return unescape(quoted[1], "latin-1") * count
        except UnicodeEncodeError:
            raise Problem(f"{text}: write bytes above 0x7F as \\xNN") from None
        except ValueError as error:
            raise Problem(str(error)) from None
    try:
        return bytes.fromhex(word)
    except ValueError:
        raise Problem(f"{word} is neither quoted text nor hexadecimal bytes") from None


def joined(words: list[str]) -> bytes:
    """The bytes of several words."""
    if not words:
        raise Problem("no bytes")
    return b"".join(literal(word) for word in words)


def quoted(data: bytes) -> str:
    """Bytes as one word in quotes; nothing in it acts on a terminal."""
    return '"' + "".join(_ESCAPES.get(byte) or (chr(byte) if 0x20 <= byte < 0x7F
                                                else f"\\x{byte:02X}") for byte in data) + '"'


def word_of(data: bytes) -> str:
    """Bytes as one word: in quotes where all of them are ASCII text, else hexadecimal."""
    runs = _RUNS.findall(data)
    is_text = len(runs) == 1 and not _is_strange(runs[0])
    return quoted(data) if is_text else data.hex().upper()


def words_of(data: bytes) -> str:
    """Bytes as words: text in quotes, the rest hexadecimal."""
    return " ".join(run.hex().upper() if _is_strange(run) else quoted(run)
                    for run in _RUNS.findall(data))


def _is_strange(run: bytes) -> bool:
    return run[0] > 0x7E or run[0] < 0x20 and run[0] not in _ESCAPES
