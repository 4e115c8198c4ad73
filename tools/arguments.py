"""Words of the tools' command lines, and what is said of wrong ones."""

import argparse
from typing import Iterable


def positive(word: str) -> int:
    """A whole number above 0."""
    number = int(word)
    if number < 1:
        raise ValueError(word)
    return number


def refuse_unknown(parser: argparse.ArgumentParser, kind: str, asked: Iterable[str],
                   known: Iterable[str]) -> None:
    """End with a line that names what was asked for and is not known, and what is."""
    names = list(known)
    unknown = sorted(set(asked) - set(names))
    if unknown:
        parser.error(f"no such {kind}: {', '.join(unknown)} (there are: {', '.join(names)})")
