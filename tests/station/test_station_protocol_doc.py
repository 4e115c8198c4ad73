"""The protocol reference is the one that the table makes, and it leaves nothing out."""

from __future__ import annotations

import re

import pytest
from station_peer import ROOT

from amt_station.protocol_doc import protocol_document
from amt_station.requests.at_commands import AT_COMMANDS
from amt_station.requests.catalogue import command_names
from amt_station.requests.model import Request
from amt_station.requests.table import FAMILIES, REQUESTS, tunnel

DOCUMENT = protocol_document()


def section(title: str) -> str:
    return re.split(r"^#{2,3} ", DOCUMENT.split(title, 1)[1], maxsplit=1, flags=re.M)[0]


def test_the_document_is_current() -> None:
    written = (ROOT / "docs" / "protocol.md").read_text(encoding="utf-8")
    assert written == DOCUMENT, "run: python3 -m amt_station.protocol_doc > docs/protocol.md"


def test_no_mark_is_left() -> None:
    assert "<!--" not in DOCUMENT


@pytest.mark.parametrize("row", [row for row in REQUESTS if row not in tunnel.REQUESTS],
                         ids=lambda row: row.name)
def test_a_request_has_its_section(row: Request) -> None:
    text = section(f"### {row.id} (0x{row.id:02X}) {row.name}\n")
    assert f"{row.answer_id} (0x{row.answer_id:02X})" in text
    for field in (*row.fields, *row.answer_fields):
        assert f"| {field.atom} | {field.type.label}" in text
        assert field.unit in text
    for service in (row.pc, row.app):
        for refusal in service.refusals if service else ():
            assert f"refused with code {refusal.code}" in text and refusal.when in text
    for operation in row.operations:
        assert f"`amt-station {operation.name}" in text


def test_tunnelled_requests_at_commands_and_ids_are_listed() -> None:
    for row in tunnel.REQUESTS:
        assert f"| {row.id} | {row.catalogue_name} |" in section("## The tunnel\n")
    for command in AT_COMMANDS:
        assert f"| `{command.text}` |" in section("## AT commands\n")
    for number, name in command_names().items():
        assert f"| {number} (0x{number:02X}) | {name} |" in section("## All command ids\n")


def test_links_lead_to_headings() -> None:
    headings = {re.sub(r"[^\w -]", "", title.lower()).replace(" ", "-")
                for title in re.findall(r"^#+ (.+)$", DOCUMENT, re.M)}
    assert set(re.findall(r"\(#([^)]+)\)", DOCUMENT)) <= headings


def test_every_family_is_in_the_overview() -> None:
    for title, rows in FAMILIES:
        if rows is not tunnel.REQUESTS:
            assert f"**{title}**" in DOCUMENT
