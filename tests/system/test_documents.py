"""The documents: every command in them is typed, every link leads somewhere."""

from __future__ import annotations

import re
import subprocess
from pathlib import Path
from typing import Callable

import pytest

from conftest import HandsetFactory
from support import documents, typed
from support.command import PATIENCE, PROJECT
from support.desk import Desk
from support.documents import DOCUMENTS
from support.untyped import NO_COMMANDS, UNTYPED, Row

# The pictures, tables and bytes of the protocol reference stand in fences without a word.
FENCED = "docs/protocol.md"
# Names of commands that are no more are part of what has changed.
HISTORY = "CHANGELOG.md"
WITH_COMMANDS = [name for name in DOCUMENTS if documents.commands(name)]
# Whose commands look at runs that have been.
AFTER_A_RUN = ("docs/line.md", "docs/plans.md")
GUIDE_TO_PLANS, GUIDE_TO_TRACES = "docs/plans.md", "docs/station.md"
HARMLESS = ("amt-handset", "amt-station", "chmod", "echo", "export")
FETCHED = re.compile(r"[a-z]+:")

MakeDesk = Callable[[str], Desk]


def fenced(document: str, word: str) -> str:
    """What stands in the first fence with this word."""
    return next(block.text for block in documents.blocks(document) if block.word == word)


@pytest.fixture
def make_desk(make_handset: HandsetFactory, tmp_path: Path) -> MakeDesk:
    """A desk for a document, with a handset for each line that it speaks on."""
    ports: dict[str, str] = {}

    def find_port(line: str) -> str:
        if line not in ports:
            made = make_handset("pc" if line == "pc" else "packet", ports=True)
            ports[line] = str(made.directory / line)
        return ports[line]

    def make(document: str) -> Desk:
        desk = Desk(tmp_path, find_port)
        if document == GUIDE_TO_PLANS:
            desk.write("end-of-line.toml", fenced(document, "toml"))
        if document != GUIDE_TO_TRACES:
            desk.write("field.trace", fenced(GUIDE_TO_TRACES, "trace"))
        if document in AFTER_A_RUN:
            done = desk.run("amt-station -p PORT run PLAN")
            assert done.returncode == 0, done.stderr
            (record,) = (desk.state / "records").glob("*.json")
            desk.write("RECORD", record.read_text(encoding="utf-8"))
        return desk

    return make


@pytest.mark.parametrize("document", WITH_COMMANDS)
def test_the_commands_of_a_document(document: str, make_desk: MakeDesk) -> None:
    desk = make_desk(document)
    for command in documents.commands(document):
        where = f"{document}:{command.line}: {command.text}"
        assert command.text in UNTYPED or is_harmless(command.text), (
            f"{where}: say in support/untyped.py why it is not typed, or what is in its place")
        row = UNTYPED.get(command.text, Row("", command.text))
        if row.instead:
            done = desk.run(row.instead.replace("PROJECT", str(PROJECT)))
            assert done.returncode in row.statuses, f"{where}\n{done.stdout}{done.stderr}"
        else:
            read(desk, command.text, where)


def is_harmless(text: str) -> bool:
    """Whether a line may be typed as it stands, whatever machine this is."""
    parts = documents.words(text.replace("./dev station ", "amt-station "))
    return all(part[0] in HARMLESS for part in parts)


def read(desk: Desk, text: str, where: str) -> None:
    """Have the programs read the words that are theirs."""
    for part in documents.own(documents.words(desk.meant(text))):
        if part[0] != "./dev" and "uptime" not in part:
            assert typed.unknown_words(part) == [], where
            typed.parse(part)


def dev(*words: str) -> str:
    """What ./dev prints."""
    return subprocess.run([PROJECT / "dev", *words], capture_output=True, text=True,
                          timeout=PATIENCE, check=True).stdout


def test_the_commands_of_dev() -> None:
    used: dict[str, set[str]] = {}
    for text in (command.text for name in DOCUMENTS for command in documents.commands(name)):
        for _, name, *words in (part for part in documents.own(documents.words(text))
                                if part[0] == "./dev"):
            used.setdefault(name, set()).update(word for word in words if word.startswith("--"))
    assert {"build", "demo", "lint", "test"} <= set(used)
    for name in set(used) - {"handset", "station"}:
        said = dev(name, "--help")
        assert "usage:" in said.lower() and all(option in said for option in used[name]), name


def test_every_row_is_of_a_command() -> None:
    there = {command.text for name in DOCUMENTS for command in documents.commands(name)}
    assert not set(UNTYPED) - there
    assert all(row.why for row in UNTYPED.values())


@pytest.mark.parametrize("document", DOCUMENTS)
def test_what_is_set_apart_is_known(document: str) -> None:
    for block in documents.blocks(document):
        if not block.holds_commands and block.word not in documents.NO_COMMANDS:
            first = block.text.split(maxsplit=1)[0]
            assert document == FENCED or first in NO_COMMANDS.get(document, ()), (
                f"{document}:{block.line}: neither commands nor anything that is known: {first}")


def test_commands_within_sentences() -> None:
    names = {"COMMAND", *re.findall(r"^  (\w+) ", dev("--help"), re.M)}
    assert {"demo", "handset", "station"} <= names
    wrong = []
    for document in set(DOCUMENTS) - {HISTORY}:
        for mention in documents.mentions(document):
            unknown = unknown_of(mention.text, names)
            wrong += [f"{document}:{mention.line}: {mention.text}: {unknown}"] * bool(unknown)
    assert wrong == []


def unknown_of(text: str, names: set[str]) -> list[str]:
    """What no program knows of a command, whose values may be named in capitals."""
    program, *words = (word for word in text.replace("[--", "--").split() if word != "...")
    if not words:
        return []
    (part,) = documents.own([[program, *words]])
    if part[0] == documents.DEV:
        return [word for word in words[:1] if word not in names]
    return typed.unknown_words(part)


@pytest.mark.parametrize("document", DOCUMENTS)
def test_links_lead_somewhere(document: str) -> None:
    for link in documents.links(document):
        if FETCHED.match(link.text):
            continue
        place, _, anchor = link.text.partition("#")
        where = f"{document}:{link.line}: {link.text}"
        target = (PROJECT / document).parent / place if place else PROJECT / document
        assert target.exists(), where
        if anchor:
            name = str(target.resolve().relative_to(PROJECT))
            assert anchor in documents.anchors(name), where


def test_every_document_is_two_clicks_away() -> None:
    first = {link.text for link in documents.links("README.md")}
    assert "docs/README.md" in first
    second = {link.text.partition("#")[0] for link in documents.links("docs/README.md")}
    there = {path.name for path in (PROJECT / "docs").glob("*.md")}
    assert there - {"README.md"} <= second
