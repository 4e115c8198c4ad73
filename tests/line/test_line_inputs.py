"""Inputs of a line's runs: rows of a file in order, the slot's own, or whoever is asked."""

from __future__ import annotations

from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, load
from line_slots import Bench, battery

from amt_line.cli.slots import check_slots, said_slots, slots_of_file
from amt_line.plan.rows import rows_of_slots
from amt_line.run.desk import Desk
from amt_line.run.inputs import Supply
from amt_station.errors import UsageProblem

SN = "dut = '${sn}'\n[input.sn]\npattern = 'K[0-9]+'\n[input.power]\nformat = 'int'\ndefault = 3\n"


def test_rows_are_used_in_their_order(tmp_path: Path) -> None:
    table = tmp_path / "rows.csv"
    table.write_text("slot,sn,power,box\nA,K1,,x\nB,K9,7,\nA,K2,5,\n", encoding="utf-8")
    rows = rows_of_slots(table, ["A", "B"])
    with Bench(tmp_path, SN + ADC, ("A", "B"), rows=rows) as bench:
        for number, slot in ((1, "A"), (1, "B"), (2, "A")):
            bench.sockets[slot].plug(battery(15))
            bench.wait("run-ended", number, slot=slot)
            bench.sockets[slot].pull()
        assert bench.join() == 0, "a line without rows has nothing more to do"
    assert [(event["slot"], event["dut"]) for event in bench.found("run-ended")] == [
        ("A", "K1"), ("B", "K9"), ("A", "K2")]
    assert [bench.record(event["run"])["inputs"]["power"]
            for event in bench.found("run-ended")] == [3, 7, 5]
    assert {event["text"] for event in bench.found("slot-state", state="ended")} == {
        "no row of inputs is left"}


def test_behind_the_last_row_somebody_is_asked(tmp_path: Path) -> None:
    with Bench(tmp_path, SN + ADC, rows={"A": [{"sn": "K1"}]}, attended=True) as bench:
        bench.sockets["A"].plug(battery(15))
        bench.wait("run-ended")
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(battery(15))
        bench.desk.answer(bench.wait("question")["id"], "K2", "page")
        assert bench.wait("run-ended", 2)["dut"] == "K2"


def test_a_row_names_the_handset_of_a_plan_that_names_none(tmp_path: Path) -> None:
    with Bench(tmp_path, ADC, rows={"A": [{"dut": "D7"}]}) as bench:
        bench.sockets["A"].plug(battery(15))
        assert bench.wait("run-ended")["dut"] == "D7"


@pytest.mark.parametrize("said, rows, attended, reason", [
    ({}, [], False, "slot A: no value for sn"),
    ({}, [{"sn": "X1"}], False, "slot A, row 1: input sn: 'X1' is not of the form"),
    ({}, [{"sn": "K1"}, {}], False, "slot A, row 2: no value for sn"),
    ({"sn": "K1", "colour": "red"}, [], False, "the plan has no input 'colour'"),
    ({}, [{"power": "much"}], True, "'much' is no whole number"),
])
def test_what_is_wrong_is_told_before_anything_is_sent(
        tmp_path: Path, said: Any, rows: Any, attended: bool, reason: str) -> None:
    plan = load(tmp_path, SN + ADC)
    with pytest.raises(UsageProblem, match=reason.replace("[", r"\[")):
        Supply("A", plan, said, rows, Desk() if attended else None)


@pytest.mark.parametrize("text, reason", [
    ("sn\nK1\n", "no column 'slot'"), ("slot,sn,sn\n", "two columns have one name"),
    ("slot,sn\nC,K1\n", "line 2: the line has no slot 'C'"),
    ("slot,sn\nA,K1,7\n", "line 2: more cells than columns"),
    ('slot,sn\nA,"K1\n', "unexpected end"), ("", "no column 'slot'")])
def test_a_file_of_rows_that_is_not_in_order(tmp_path: Path, text: str, reason: str) -> None:
    path = tmp_path / "rows.csv"
    path.write_text(text, encoding="utf-8")
    with pytest.raises(UsageProblem, match=reason):
        rows_of_slots(path, ["A", "B"])


# the slots file

GOOD = """
[[slot]]
name = "left"
port = "/dev/ttyUSB0"
presence = "answer"
baud = 9600
[slot.inputs]
fixture = 7
[[slot]]
name = "right"
usb = "1-2.3"
"""


def slots_file(folder: Path, text: str) -> Path:
    path = folder / "slots.toml"
    path.write_text(text, encoding="utf-8")
    return path


def test_a_slots_file(tmp_path: Path) -> None:
    left, right = slots_of_file(slots_file(tmp_path, GOOD), 115200)
    check_slots([left, right])
    assert (left.name, left.port, left.baud, left.stays, left.inputs) == (
        "left", "/dev/ttyUSB0", 9600, True, {"fixture": "7"})
    assert (right.name, right.port, right.baud, right.stays, right.inputs) == (
        "right", "usb:1-2.3", 115200, None, {})


@pytest.mark.parametrize("text, reason", [
    ("x = 1\n", "x: unknown key"), ("", r"no \[\[slot\]\]"), ("slot = 3\n", r"no \[\[slot\]\]"),
    ("[[slot]]\nport = '/dev/x'\n", "slot 1: name: missing"),
    ("[[slot]]\nname = 'A'\n", "exactly one of port, usb"),
    ("[[slot]]\nname = 'A'\nport = 'x'\nusb = 'y'\n", "exactly one of port, usb"),
    ("[[slot]]\nname = 7\nport = 'x'\n", "name: 7 is no text"),
    ("[[slot]]\nname = 'A'\nport = 'x'\nbaud = '1'\n", "baud: '1' is no speed"),
    ("[[slot]]\nname = 'A'\nport = 'x'\npresence = 'maybe'\n", "is none of port, answer"),
    ("[[slot]]\nname = 'A'\nport = 'x'\ncolour = 'red'\n", "colour: unknown key"),
    ("[[slot]]\nname = 'A'\nport = 'x'\ninputs = { sn = 1.5 }\n", "inputs.sn: 1.5 is neither"),
    ("[[slot\n", "line 1"), ("slot = [1]\n", "is no table")])
def test_a_slots_file_that_is_not_in_order(tmp_path: Path, text: str, reason: str) -> None:
    with pytest.raises(UsageProblem, match=reason):
        slots_of_file(slots_file(tmp_path, text), 115200)


@pytest.mark.parametrize("texts, reason", [
    (["A=/dev/x", "A=/dev/y"], "two slots have the name 'A'"),
    (["A=/dev/null", "B=/dev/../dev/null"], "slots A and B have one port"),
    (["A=usb:1-2", "B=usb:1-2"], "slots A and B have one port"),
    (["A"], "a name, '=' and a port are needed"), (["=x"], "a name, '=' and a port are needed"),
    (["A\x07=x"], "cannot be a slot's name"), (["A" * 41 + "=x"], "cannot be a slot's name"),
    ([], "no slots")])
def test_slots_that_cannot_be(texts: list[str], reason: str) -> None:
    with pytest.raises(UsageProblem, match=reason):
        check_slots(said_slots(texts, 115200))


def test_a_link_to_a_port_is_that_port(tmp_path: Path) -> None:
    (tmp_path / "handset").symlink_to("/dev/null")
    with pytest.raises(UsageProblem, match="have one port"):
        check_slots(said_slots([f"A={tmp_path}/handset", "B=/dev/null"], 115200))
