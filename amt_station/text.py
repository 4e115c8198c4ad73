"""Text from a handset, a plan or a command line, made safe for terminals, reports and JSON."""

from __future__ import annotations

_SHORT = 60
_NAMED = {"\r": "\\r", "\n": "\\n", "\t": "\\t"}


def printable(text: str) -> str:
    """``text`` on one line, whatever is in it: what acts instead of being shown is escaped.

    Control characters, C1 and bidirectional ones, line separators and bytes that are no characters
    are all escaped; printable characters of any language are not.
    """
    return text if text.isprintable() else "".join(
        character if character.isprintable() else _escape(character) for character in text)


def plain(text: str) -> str:
    """``text`` as JSON can carry it: bytes that are no characters are written out."""
    return text.encode("utf-8", "surrogateescape").decode("utf-8", "backslashreplace")


def shortened(text: str, length: int = _SHORT) -> str:
    """``text`` printable and no longer than a remark may be."""
    shown = printable(text[:length + 1])
    return shown if len(text) <= length else f"{shown[:length]}..."


def _escape(character: str) -> str:
    short = _NAMED.get(character)
    if short:
        return short
    return character.encode("unicode_escape", "surrogatepass").decode("ascii")
