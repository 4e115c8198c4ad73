"""The documents as a program reads them: their commands, links and headings."""

from __future__ import annotations

import re
import shlex
from dataclasses import dataclass
from functools import lru_cache
from typing import Iterator, Sequence

from markdown_it import MarkdownIt
from markdown_it.token import Token

from support.command import PROJECT

DOCUMENTS = sorted(str(path.relative_to(PROJECT)) for path in (
    *PROJECT.glob("*.md"), *(PROJECT / "docs").glob("*.md"), *(PROJECT / "platform").rglob("*.md"),
    PROJECT / "amt_station" / "README.md", PROJECT / "amt_simulator" / "README.md"))

# What a line of commands begins with.
PROGRAMS = ("./dev", "amt-station", "amt-handset", "ctest", "echo", "export", "g++", "python3",
            "rsync", "sed", "sqlite3", "sudo", "tar", "wireshark", "tshark", "pip")
DEV = "./dev"
OWN = ("amt-station", "amt-handset", DEV)
LENT = {"station": "amt-station", "handset": "amt-handset"}
# Fences of other things.
NO_COMMANDS = ("cpp", "python", "toml", "trace", "shown")
SHELL = ("sh", "console", "bash")


@dataclass(frozen=True)
class Command:
    """A command line in a document, without its remark and in one line."""

    line: int
    text: str


@dataclass(frozen=True)
class Block:
    """Something set apart in a document; the fence's word is empty without a fence."""

    line: int
    word: str
    text: str

    @property
    def holds_commands(self) -> bool:
        """Whether it is there to be typed."""
        first = self.text.split(maxsplit=1)[0] if self.text.strip() else ""
        return self.word in SHELL or not self.word and first in PROGRAMS

    def commands(self) -> Iterator[Command]:
        """One for each line, a backslash at whose end joins the next to it."""
        joined = ""
        for number, line in enumerate(self.text.splitlines(), start=self.line):
            joined += line
            if joined.endswith("\\"):
                joined = joined[:-1]
                continue
            text = " ".join(re.sub(r"\s+#\s.*$", "", joined.removeprefix("$ ")).split())
            joined = ""
            if text and not text.startswith("#"):
                yield Command(number, text)


@lru_cache(maxsize=None)
def _tokens(document: str) -> tuple[Token, ...]:
    parser = MarkdownIt("commonmark").enable("table")
    return tuple(parser.parse((PROJECT / document).read_text(encoding="utf-8")))


def blocks(document: str) -> list[Block]:
    """Everything that is set apart, in order."""
    return [Block(token.map[0] + (2 if token.type == "fence" else 1), token.info.strip(),
                  token.content)
            for token in _tokens(document)
            if token.type in ("fence", "code_block") and token.map is not None]


def commands(document: str) -> list[Command]:
    """What is set apart to be typed, in order."""
    return [command for block in blocks(document) if block.holds_commands
            for command in block.commands()]


def mentions(document: str) -> list[Command]:
    """Commands of this project that are named within a sentence."""
    return [Command(line, " ".join(child.content.split())) for line, child in _inline(document)
            if child.type == "code_inline" and child.content.split()[0] in OWN]


def _inline(document: str) -> Iterator[tuple[int, Token]]:
    line = 1
    for token in _tokens(document):
        line = token.map[0] + 1 if token.map is not None else line
        for child in token.children or ():
            yield line, child


def links(document: str) -> list[Command]:
    """Where its links lead, as they are written."""
    return [Command(line, str(child.attrs["href"])) for line, child in _inline(document)
            if child.type == "link_open"]


def anchors(document: str) -> set[str]:
    """The anchors of its headings, as web pages of documents make them."""
    tokens = _tokens(document)
    texts = ["".join(child.content for child in behind.children or ())
             for token, behind in zip(tokens, tokens[1:]) if token.type == "heading_open"]
    return {re.sub(r"[^\w\- ]", "", text.lower()).replace(" ", "-") for text in texts}


def words(text: str) -> list[list[str]]:
    """The words of each command that a shell would carry out, without where its output goes."""
    lexer = shlex.shlex(text, posix=True, punctuation_chars="|&;<>")
    lexer.whitespace_split = True
    parts: list[list[str]] = [[]]
    skip = False
    for word in lexer:
        if word in ("|", "&&", "&", ";", "||"):
            parts.append([])
        elif set(word) <= set("<>"):
            skip = True
        elif skip:
            skip = False
        else:
            parts[-1].append(word)
    return [part for part in parts if part]


def own(parts: Sequence[Sequence[str]]) -> list[list[str]]:
    """Those of this project's own programs; `./dev` lends two of them its name."""
    return [[LENT[part[1]], *part[2:]] if part[0] == DEV and part[1] in LENT else list(part)
            for part in parts if part[0] in OWN]
