"""The request table against the catalogue, the two registration lists and itself."""

from __future__ import annotations

from collections import Counter
from typing import Hashable

import click
import pytest

from amt_station.cli.typed import typed_command
from amt_station.errors import UsageProblem
from amt_station.perform import run_operation
from amt_station.requests.at_commands import AT_COMMANDS, FLUSH_COMMAND, known_refusal
from amt_station.requests.catalogue import (UNDEFINED, command_ids, command_name, command_names,
                                            parse_catalogue)
from amt_station.requests.model import Channel, Field, Operation, Request
from amt_station.requests.operations import build_packet, operation_packet, read_answer
from amt_station.requests.table import (FAMILIES, REQUESTS, display_name, find_command,
                                        find_operation, operations, requests_by_id)
from amt_station.wire.atoms import Atom, AtomType
from amt_station.wire.packet import Packet
from tests.system.support.registrations import APP_ROWS, PC_ROWS

# What the handset registers; everything else is passed on (PC line) or refused (app channel).
# 91 sends no acknowledgement.
ACKNOWLEDGED_ON_PC = set(PC_ROWS) - {91}
SERVED_ON_APP = set(APP_ROWS)
# What the handset hands to the modem in one AT command.
TUNNELLED = {
    1, 3, 5, 7, *range(11, 28, 2), 39, 41, 42, 43, 47, 49, 51, 53, 59, 61, 63, *range(67, 84, 2),
    87, 93, 95, 97, *range(101, 136, 2), 149, 151, 153, 155, 201, 204, *range(205, 214, 2), 221}

row_ids = pytest.mark.parametrize("row", REQUESTS, ids=lambda row: row.name)


def test_the_catalogue_has_198_names() -> None:
    names = command_names()
    assert len(names) == len(set(names.values())) == 198
    assert list(names) == sorted(names)
    undefined = {0x2C, *range(0x9D, 0xAA), *range(0xB6, 0xB9), *range(0xBD, 0xC1), 0xC7, 0xC8,
                 0xCB, *range(0xD7, 0xDB), *range(0xDE, 0xEE), *range(0xF2, 0x100)}
    assert undefined == set(range(256)) - set(names)
    assert {command_name(command) for command in undefined} == {UNDEFINED}


@pytest.mark.parametrize("command, name", [
    (0x00, "AMT_NONE_CMD"), (0x2B, "AMT_KEYVALUE_CMD"), (0x2D, "AMT_VERSION_CMD"),
    (0xBB, "AMT_WIFI_RTX_TEST_CMD"), (0xCC, "CELL_RECIEVE_RSPDATA"),
    (0xDD, "AMT_DSP_TRANSPARENT_CONTROL_INDCMD"), (0xF1, "AMT_ENTER_IDLE_RSPCMD")])
def test_names_of_the_catalogue(command: int, name: str) -> None:
    assert command_name(command) == name
    assert command_ids()[name] == command


def test_a_response_is_its_request_plus_one() -> None:
    for command, name in command_names().items():
        if name.endswith("_RSPCMD"):
            assert command_name(command - 1) == name.replace("_RSPCMD", "_CMD")


@pytest.mark.parametrize("text", ["AMT_COMMAND(0x01, X)\nAMT_COMMAND(0x01, Y)",
                                  "AMT_COMMAND(1, X)", "something else"])
def test_a_broken_catalogue_is_noticed(text: str) -> None:
    with pytest.raises(ValueError, match="catalogue line"):
        parse_catalogue(text)


def test_rows_are_unique() -> None:
    columns: list[list[Hashable]] = [
        [row.id for row in REQUESTS], [row.name for row in REQUESTS],
        [operation.path for _, operation in operations()]]
    for values in columns:
        assert [value for value, count in Counter(values).items() if count > 1] == []


def test_the_channels_of_every_row() -> None:
    assert {row.id for row in REQUESTS if row.pc and row.pc.acknowledged} == ACKNOWLEDGED_ON_PC
    assert {row.id for row in REQUESTS if row.app} == SERVED_ON_APP
    assert {row.id for rows in dict(FAMILIES).values() for row in rows} == {
        row.id for row in REQUESTS}
    tunnelled = {row.id for row in REQUESTS if row.app and "AT^DTTEST" in row.app.how}
    assert tunnelled == TUNNELLED
    assert all(row.pc and row.pc.by == "modem" for row in REQUESTS
               if row.id not in ACKNOWLEDGED_ON_PC)


def test_answers_follow_their_requests_with_two_exceptions() -> None:
    assert {row.id: row.answer_id for row in REQUESTS if row.answer_id != row.id + 1} == {
        176: 175, 221: 221}
    assert [row.id for row in REQUESTS if row.answers != 1] == [170]


@row_ids
def test_a_row_is_complete(row: Request) -> None:
    assert row.summary
    assert len({field.atom for field in row.fields}) == len(row.fields)
    assert len({field.name for field in row.fields}) == len(row.fields)
    assert row.id == 99 or 1 in [field.atom for field in row.answer_fields]
    for field in (*row.fields, *row.answer_fields):
        assert field.meaning and field.name == field.name.lower()
        assert field.width in (0, 1, 2) and (not field.width or field.type is AtomType.BYTES)
        assert not field.length_of or row.field(field.length_of)
        if field.low is not None and field.high is not None:
            assert all(field.low <= value <= field.high for value in field.choices.values())
    assert find_command(row.name) == row.id
    assert find_command(str(row.id)) == find_command(hex(row.id)) == row.id


SAMPLES = {"imei": "490154203237518", "mac": "00:11:22:33:44:55"}


def sample(field: Field) -> int | str:
    if field.choices:
        return next(iter(field.choices))
    if field.format in SAMPLES:
        return SAMPLES[field.format]
    return (field.low or 0) if field.numeric else "x" * (field.longest or 5)


@pytest.mark.parametrize("row, operation", operations(),
                         ids=[operation.name for _, operation in operations()])
def test_a_typed_command_makes_a_packet(row: Request, operation: Operation) -> None:
    names = (*operation.takes, *operation.may_take)
    packet = operation_packet(row, operation, {name: sample(row.field(name)) for name in names})
    assert packet.command == row.id
    sent = {atom.id for atom in packet.atoms}
    assert {row.field(name).atom for name in (*names, *operation.fixed)} <= sent
    assert any(row.service(channel) for channel in operation.channels)
    if operation.before:
        assert find_operation(operation.before)[0].id == row.id
    if operation.takes:
        with pytest.raises(UsageProblem, match="needs"):
            operation_packet(row, operation)


def test_every_atom_of_every_row_can_be_sent_by_some_typed_command() -> None:
    for row in REQUESTS:
        if not row.operations:
            continue
        reachable = {name for operation in row.operations
                     for name in (*operation.takes, *operation.may_take, *operation.fixed)}
        assert {field.name for field in row.fields if not field.length_of} == reachable, row.name


@pytest.mark.parametrize("field, value, expected", [
    (Field(1, AtomType.INT, "n", "m"), "0x10", Atom.integer(1, 16)),
    (Field(1, AtomType.INT, "n", "m", choices={"up": 4}), "up", Atom.integer(1, 4)),
    (Field(1, AtomType.BYTES, "n", "m", width=2), 0x1234, Atom.raw(1, b"\x34\x12")),
    (Field(1, AtomType.BYTES, "n", "m", text=True), "ab", Atom.raw(1, b"ab")),
    (Field(1, AtomType.STRING, "n", "m", longest=2), "ab", Atom.string(1, "ab")),
    (Field(1, AtomType.BOOL, "n", "m"), 2, Atom.boolean(1, 2))])
def test_a_field_makes_its_atom(field: Field, value: int | str, expected: Atom) -> None:
    assert field.encode(value) == expected


@pytest.mark.parametrize("field, value, words", [
    (Field(1, AtomType.INT, "n", "m", low=1), 0, "below 1"),
    (Field(1, AtomType.INT, "n", "m", high=1), "2", "above 1"),
    (Field(1, AtomType.INT, "n", "m"), "x", "not a number"),
    (Field(1, AtomType.INT, "n", "m"), 2**31, "32-bit"),
    (Field(1, AtomType.STRING, "n", "m", longest=2), "abc", "at most 2"),
    (Field(1, AtomType.STRING, "n", "m", longest=2), "éé", "4 bytes"),
    (Field(1, AtomType.STRING, "n", "m"), "", "empty"),
    (Field(1, AtomType.STRING, "n", "m"), "a\0b", "zero byte")])
def test_a_field_refuses_what_the_handset_would(field: Field, value: int | str,
                                                words: str) -> None:
    with pytest.raises(UsageProblem, match=words):
        field.encode(value)


def test_a_length_is_measured_in_bytes() -> None:
    packet = build_packet(requests_by_id()[191], {"operation": "write", "serial": "né"},
                          force=True)
    assert packet.get_int(162) == 3


def test_an_atom_that_a_request_does_not_have() -> None:
    with pytest.raises(UsageProblem, match="no atom colour"):
        build_packet(requests_by_id()[45], {"colour": 1})


def test_an_answer_with_names() -> None:
    answer = Packet(90, (Atom.integer(39, 3), Atom.integer(36, 2), Atom.string(37, "t"),
                         Atom.raw(99, b"\1"), Atom.integer(1, 0)))
    values = read_answer(89, answer)
    assert [(value.name, value.value, value.word) for value in values] == [
        ("station", 3, ""), ("verdict", 2, "fail"), ("description", "t", ""),
        ("atom 99", "01", ""), ("result", 0, "")]
    assert [value.name for value in read_answer(255, Packet(0, (Atom.integer(1, 1),)))] == [
        "result"]


@pytest.mark.parametrize("command, name", [
    (45, "AMT_VERSION_CMD"), (46, "AMT_VERSION_RSPCMD"), (191, "adb-serial"),
    (192, "adb-serial answer"), (200, "command 200")])
def test_the_best_name_of_an_id(command: int, name: str) -> None:
    assert display_name(command) == name


@pytest.mark.parametrize("text, command", [
    ("AMT_VERSION_CMD", 45), ("amt_version_cmd", 45), ("VERSION", 45), ("0xF6", 246),
    ("AMT_VERSION_RSPCMD", 46), ("adb-serial", 191), ("255", 255)])
def test_ways_to_name_a_command(text: str, command: int) -> None:
    assert find_command(text) == command


@pytest.mark.parametrize("text", ["256", "-1", "", "AMT_", "no such"])
def test_what_is_no_command(text: str) -> None:
    with pytest.raises(UsageProblem):
        find_command(text)


@pytest.mark.parametrize("operation", [operation for _, operation in operations()],
                         ids=lambda operation: operation.name)
def test_no_value_is_named_like_an_option_of_all_commands(operation: Operation) -> None:
    command = typed_command(operation.path[0])
    for word in operation.path[1:]:
        assert isinstance(command, click.Group)
        command = command.commands[word]
    assert command is not None
    names = [parameter.name for parameter in command.params]
    flags = [flag for parameter in command.params for flag in parameter.opts]
    assert len(set(names)) == len(names) and len(set(flags)) == len(flags)


class NoLink:
    """A link that must not be used."""

    channel = Channel.PC


def test_what_the_pc_line_would_do_otherwise_is_not_sent() -> None:
    with pytest.raises(UsageProblem, match="app channel only"):
        run_operation(NoLink(), ("damt1", "allow"))  # type: ignore[arg-type]
    with pytest.raises(UsageProblem, match="no command"):
        find_operation(("damt1",))


@pytest.mark.parametrize("text", [
    'AT^DBTADDR=""', "AT^DGPSCTRL=", "AT^DGPSCTRL=\r", "AT^DWLTSD=", "AT^DWLTRD=\r",
    "AT^DPCBACTRL=", "AT^DPCBACTRL=2", "AT^DPCBACTRL=2,", "AT^DAMT1="])
def test_texts_that_are_known_to_be_refused(text: str) -> None:
    assert known_refusal(text)


@pytest.mark.parametrize("text", [
    "AT", FLUSH_COMMAND, 'AT^DBTADDR="00:11:22:33:44:55"', "AT^DGPSCTRL=2,5", "AT^DWLTSD=0",
    "AT^DPCBACTRL=1", "AT^DPCBACTRL=2,123", "AT^DAMT1=2", 'AT^DWIFIADDR=""', "AT^DDEVCONNCHK="])
def test_texts_that_are_answered(text: str) -> None:
    assert known_refusal(text) == ""


def test_the_flush_is_tested_before_everything_that_can_be_refused() -> None:
    texts = [row.text for row in AT_COMMANDS]
    flush = texts.index(FLUSH_COMMAND)
    assert len(texts) == 19
    assert all(index > flush for index, row in enumerate(AT_COMMANDS) if row.refused)
