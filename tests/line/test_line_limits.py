"""Limits, units, references and patterns by themselves."""

from __future__ import annotations

from decimal import Decimal
from typing import Any

import pytest

from amt_line.plan.inputs import Input
from amt_line.plan.limits import Limit
from amt_line.plan.measure import Measure
from amt_line.plan.pattern import BadPattern, PatternTooSlow, compiled, is_whole
from amt_line.plan.references import fill, names
from amt_station.errors import UsageProblem

VOLT = Measure("voltage", True, "V", Decimal("0.000001"))
MODULE = Measure("module", True, choices={"software": 16, "l1": 17})
TEXT = Measure("serial", False)
PLAIN = Measure("x", True)


@pytest.mark.parametrize("measure, limit, value, words", [
    (PLAIN, {"min": 2}, 2, ""), (PLAIN, {"min": 2}, 1, "x 1 is below 2"),
    (PLAIN, {"max": 2.5}, 2, ""), (PLAIN, {"max": 2.5}, 3, "x 3 is above 2.5"),
    (PLAIN, {"equals": 0}, 0, ""), (PLAIN, {"equals": 0}, 1, "x is 1 instead of 0"),
    (PLAIN, {"min": 0, "max": 0}, 0, ""), (PLAIN, {"min": 0}, "text", "x 'text' is no number"),
    (PLAIN, {"one_of": [1, 2]}, 2, ""), (PLAIN, {"one_of": [1, 2]}, 3, "x is 3 instead of 1 or 2"),
    (TEXT, {"equals": "a"}, "a", ""), (TEXT, {"equals": "a"}, "a\r\n", ""),
    (TEXT, {"equals": "a"}, "a\0\0", ""), (TEXT, {"equals": "a"}, "A", "instead of 'a'"),
    (TEXT, {"equals": "16"}, "16.0", "instead of '16'"),
    (TEXT, {"matches": "^a.c$"}, "abc", ""), (TEXT, {"matches": "^a.c$"}, "abd", "does not match"),
    (TEXT, {"one_of": ["a", "b"]}, "c", "instead of 'a' or 'b'"),
    (MODULE, {"equals": "software"}, 16, ""),
    (MODULE, {"equals": "software"}, 17, "module is l1 instead of software"),
    (MODULE, {"one_of": ["l1", 16]}, 16, ""),
    (VOLT, {"min": "3.6 V", "max": "4.4 V"}, 3600000, ""),
    (VOLT, {"min": "3.6 V", "max": "4.4 V"}, 3599999, "voltage 3.599999 V is below 3.6 V"),
    (VOLT, {"max": "4400 mV"}, 4400001, "voltage 4.400001 V is above 4.4 V"),
    (VOLT, {"matches": r"^3\.6$"}, 3600000, ""),
    (VOLT, {"max": 4.4}, 4400000, ""), (VOLT, {"equals": "3.6V"}, 3600000, ""),
    (VOLT, {"min": "3.6 V"}, 3, "below"), (VOLT, {"max": "4200000 µV"}, 4200000, ""),
])
def test_limits(measure: Measure, limit: dict[str, Any], value: Any, words: str) -> None:
    judgement = Limit(measure, limit).resolve({}).judge(value)
    assert bool(judgement.reason) is bool(words)
    assert words in judgement.reason


@pytest.mark.parametrize("value, marginal", [(11, True), (12, False), (18, False), (19, True)])
def test_a_pass_that_is_near(value: int, marginal: bool) -> None:
    bounds = Limit(PLAIN, {"min": 10, "max": 20, "marginal": {"min": 12, "max": 18}}).resolve({})
    assert bounds.judge(value).marginal is marginal and not bounds.judge(value).reason
    assert not bounds.judge(9).marginal, "a failure is no near pass"


@pytest.mark.parametrize("measure, given, words", [
    (VOLT, "3.6 A", "voltage is in V"), (VOLT, "3.6", "is no number in V"), (VOLT, True, "neither"),
    (PLAIN, "3 V", "x has no unit"), (PLAIN, "x", "is no number"), (TEXT, 3, "is no text"),
    (VOLT, "V", "is no number"), (VOLT, float("nan"), "no number"), (PLAIN, 10**40, "too large"),
    (VOLT, "1e3 V", "voltage is in V"), (MODULE, "hardware", "nor one of software, l1")])
def test_limits_that_cannot_be(measure: Measure, given: Any, words: str) -> None:
    with pytest.raises(ValueError, match=words):
        measure.read(given)


def test_references_keep_types() -> None:
    variables: dict[str, Any] = {"n": 15, "t": "a", "v": 3.5}
    assert fill("${n}", variables) == 15 and fill("${v}", variables) == 3.5
    assert fill("${n}${t}", variables) == "15a" and fill("$${n} ${t}", variables) == "${n} a"
    assert fill(7, variables) == 7 and names("$${n} ${t}") == ["t"]


def test_a_variable_in_a_pattern_stands_for_itself() -> None:
    limit = Limit(TEXT, {"matches": "^${p}$"})
    assert not limit.resolve({"p": "a.c"}).judge("a.c").reason
    assert limit.resolve({"p": "a.c"}).judge("abc").reason


def test_a_pattern_that_takes_too_long_comes_to_an_end() -> None:
    with pytest.raises(PatternTooSlow, match="took longer than 1 s"):
        is_whole("(a|aa)+$", "a" * 64 + "b")


@pytest.mark.parametrize("pattern", [
    "(?:(?:(?:ab?){99}){99}){99}", "(?:a{1000}){1000}", "a{400}{400}", "[a]{2}{99999}",
    "x{" + "9" * 1900 + "}"])
def test_a_pattern_that_would_fill_the_memory_is_refused(pattern: str) -> None:
    with pytest.raises(BadPattern, match="counted repeats"):
        compiled(pattern)


@pytest.mark.parametrize("pattern, text", [
    (r"KEL\d{10}", "KEL0123456789"), (r"(?:[0-9A-F]{2}:){5}[0-9A-F]{2}", "00:11:22:33:44:55"),
    (r"[]{99999}{99999}]", "{"), (r"\{400}{40}", "{400" + "}" * 40),
    (".{0,65536}", "x" * 5000)])
def test_counted_repeats_that_are_meant(pattern: str, text: str) -> None:
    assert is_whole(pattern, text)


@pytest.mark.parametrize("item, good, bad", [
    (Input("x", "X"), ["a", "ä 1"], ["", "a\n", "\x1b[2J", "a\u202eb", "\udc80", "a" * 5000]),
    (Input("x", "X", "int"), ["15", "-3", 15], ["", "1.5", "0x10", "1_0", "9" * 30, 1.0, True]),
    (Input("x", "X", "imei"), ["490154203237518"], ["490154203237519", "4901542032375", "x"]),
    (Input("x", "X", "mac"), ["00:1A:7D:DA:71:13"],
     ["00:00:00:00:00:00", "FF:FF:FF:FF:FF:FF", "01:00:5e:00:00:01", "00:1A:7D:DA:71"]),
    (Input("x", "X", pattern=r"KEL\d{10}"), ["KEL0000000042"], ["KEL1", "xKEL0000000042"])])
def test_inputs(item: Input, good: list[Any], bad: list[Any]) -> None:
    for value in good:
        assert str(item.read(value)) == str(value)
    for value in bad:
        with pytest.raises(UsageProblem, match="input x: "):
            item.read(value)
