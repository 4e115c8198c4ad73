"""One rule for values: types first, then formats, whatever way they come in."""

from __future__ import annotations

import datetime
from typing import Any

import pytest
from hypothesis import given
from hypothesis import strategies as st

from amt_station.errors import UsageProblem, ValueProblem
from amt_station.requests.formats import FORMATS, check_digit, problem
from amt_station.requests.model import Channel
from amt_station.requests.operations import prepare, prepare_text
from amt_station.requests.table import operations

IMEI = "490154203237518"
MAC = "00:11:22:33:44:55"


@pytest.mark.parametrize("value", [
    True, False, 490154203237518, 490154203237518.0, [IMEI], {"imei": IMEI}, None,
    datetime.date(2026, 1, 1), "", "4901542032375\t8", "49015420323751\x00", "4901542032\u202e",
    "490154203237519", "49015420323751", "4901542032375188", "49015420323751A",
    "４９０１５４２０３２３７５１８", "000000000000000"])
def test_what_is_no_imei(value: object) -> None:
    with pytest.raises(UsageProblem, match="imei"):
        prepare("imei write", {"imei": value})


@pytest.mark.parametrize("address", [
    "00:00:00:00:00:00", "ff:ff:ff:ff:ff:ff", "FF:FF:FF:FF:FF:FF", "01:00:5e:00:00:01",
    "00:11:22:33:44", "00:11:22:33:44:55:66", "00-11-22-33-44-55", "001122334455",
    "00:11:22:33:44:5g", "0:11:22:33:44:55", " 00:11:22:33:44:55", True, 17, ""])
@pytest.mark.parametrize("command", ["bt-address write", "wifi-address write"])
def test_what_is_no_address(command: str, address: object) -> None:
    with pytest.raises(ValueProblem) as caught:
        prepare(command, {"address": address})
    assert caught.value.key == "address" and caught.value.reason


@pytest.mark.parametrize("command, key, value, words", [
    ("pcba write", "serial", "with blank", "printable ASCII"),
    ("pcba write", "serial", "Ä1", "printable ASCII"),
    ("pcba write", "serial", "x" * 30, "at most 29"),
    ("adb-serial write", "serial", "x" * 100, "at most 99"),
    ("board write", "board", "x" * 21, "at most 20"),
    ("version", "module", 99, "neither a known number nor one of"),
    ("version", "module", "16", "is a text, not a number"),
    ("version", "module", 16.0, "not a number"),
    ("version", "module", True, "not a number"),
    ("test-result write", "station", "3", "is a text"),
    ("test-result write", "station", -1, "below 0"),
    ("channel-switch", "channel", 10, "above 9"),
    ("channel-switch", "channel", 2**40, "above 2147483647"),
])
def test_values_that_are_not_what_the_row_says(command: str, key: str, value: object,
                                               words: str) -> None:
    values: dict[str, object] = {key: value}
    if command == "test-result write":
        values["verdict"] = "pass"
    with pytest.raises(ValueProblem, match=words) as caught:
        prepare(command, values)
    assert caught.value.key == key


@pytest.mark.parametrize("key, value", [
    ("channel", 0), ("channel", 197), ("channel", 256), ("rate", 0), ("rate", 5401),
    ("power", -1), ("power", 128)])
def test_wifi_values_have_ranges(key: str, value: int) -> None:
    values = {"channel": 6, "rate": 550, "power": 15}
    assert prepare("wifi tx start", values).packet is not None
    with pytest.raises(ValueProblem) as caught:
        prepare("wifi tx start", {**values, key: value})
    assert caught.value.key == key


def test_force_goes_past_formats_and_is_named() -> None:
    prepared = prepare("imei write", {"imei": "123"}, force=True)
    assert prepared.packet is not None and prepared.packet.atoms[0].content == b"123"
    assert prepared.forced == ("imei: '123': an IMEI has 15 digits",)
    assert prepare("imei write", {"imei": IMEI}, force=True).forced == ()


@pytest.mark.parametrize("command, values", [
    ("imei write", {"imei": True}), ("imei write", {"imei": ""}), ("imei write", {"imei": "a\0"}),
    ("imei write", {"imei": "a\n"}), ("wifi rx start", {"channel": 256, "rate": 1}),
    ("wifi rx start", {"channel": "6", "rate": 1}), ("version", {"module": 2**31}),
    ("imei write", {"imei": "x" * 5000})])
def test_force_never_goes_past_types(command: str, values: dict[str, object]) -> None:
    with pytest.raises(UsageProblem):
        prepare(command, values, force=True)


@pytest.mark.parametrize("command, values, words", [
    ("imei write", {}, "needs imei"), ("imei write", {"imei": IMEI, "colour": 1}, "no atom colour"),
    ("imei write", {"operation": 1}, "no atom operation"), ("no such", {}, "no command"),
    ("pcba read", {"operation": 2}, "no atom operation")])
def test_values_that_a_command_does_not_take(command: str, values: dict[str, object],
                                             words: str) -> None:
    with pytest.raises(UsageProblem, match=words):
        prepare(command, values)


@pytest.mark.parametrize("text", ["", "  ", "AT\r", "AT\nAT", "AT\x1b[31m", "AT\u202e", "AT\0"])
def test_what_is_no_at_text(text: str) -> None:
    with pytest.raises(UsageProblem):
        prepare_text(text)


def test_a_text_that_is_known_to_be_refused_is_sent_with_force_only() -> None:
    with pytest.raises(UsageProblem, match="known to refuse"):
        prepare_text("AT^DAMT1=")
    assert prepare_text("AT^DAMT1=", force=True).forced
    with pytest.raises(UsageProblem, match="PC line only"):
        prepare_text("AT", Channel.APP)


@given(st.text("0123456789", min_size=14, max_size=14).filter(lambda text: text != "0" * 14))
def test_one_check_digit_fits(digits: str) -> None:
    good = [digit for digit in "0123456789" if not problem("imei", digits + digit)]
    assert good == [str(check_digit(digits))]


@pytest.mark.parametrize("imei", [IMEI, f"35000000000001{check_digit('35000000000001')}"])
def test_known_identities(imei: str) -> None:
    assert problem("imei", imei) == ""


def test_every_format_of_the_table_is_known() -> None:
    named = {field.format for row, _ in operations() for field in row.fields if field.format}
    assert named <= set(FORMATS)


anything: st.SearchStrategy[Any] = st.recursive(
    st.none() | st.booleans() | st.integers() | st.floats() | st.text() | st.binary()
    | st.dates() | st.just(IMEI) | st.just(MAC),
    lambda inner: st.lists(inner, max_size=3) | st.dictionaries(st.text(), inner, max_size=3),
    max_leaves=5)


@given(st.sampled_from(operations()), st.data(), st.booleans())
def test_any_value_is_taken_or_refused_with_its_key(operation: Any, data: st.DataObject,
                                                    force: bool) -> None:
    row, typed = operation
    values = {name: data.draw(anything) for name in (*typed.takes, *typed.may_take)}
    try:
        prepared = prepare(typed.path, values, typed.channels[0]
                           if row.service(typed.channels[0]) else Channel.PC, force)
    except UsageProblem as refusal:
        assert str(refusal)
    else:
        for name, value in values.items():
            if value is not None:
                assert isinstance(value, (int, str)) and not isinstance(value, bool)
        assert prepared.packet is not None or prepared.text
