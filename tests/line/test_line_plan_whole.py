"""A plan is checked whole: schema and reader agree, and a reference hides nothing beside it."""

from __future__ import annotations

import tomllib
from pathlib import Path
from typing import Any

import pytest
from hypothesis import given, settings
from hypothesis import strategies as st
from jsonschema import Draft7Validator
from line_bench import ADC, OK, Bench, Script, load, problems, toml_text, verdicts, write_plan
from station_peer import Peer, ok

from amt_line.plan.problems import PlanProblem
from amt_line.plan.reader import load_plan
from amt_line.plan.schema import KIND_KEYS, keys_of, plan_schema
from amt_station.requests.model import Channel
from amt_station.wire import ACKNOWLEDGEMENT, Atom

BATTERY = "[[step]]\nname = 'b'\ncommand = 'battery adc'\n"
X = "[input.x]\nformat = 'int'\n"
VALIDATOR = Draft7Validator(plan_schema())


@pytest.mark.parametrize("text, words", [
    # limits that nothing can be within
    (BATTERY + "limits.adc = { min = 10, equals = 5 }", "step 1 'b': limits.adc.equals: 5 is"),
    (BATTERY + "limits.adc = { max = 3, one_of = [5, 6] }", "limits.adc.one_of: 5 is above 3"),
    # a reference hides no problem beside it
    (BATTERY + "limits.adc = { min = 5, max = 3, equals = '${x}' }\n" + X,
     "step 1 'b': limits.adc: min 5 is above max 3"),
    (BATTERY + "limits.adc = { min = '3 A', max = '${x}' }\n" + X, "limits.adc.min: '3 A'"),
    (BATTERY + "limits.adc = { one_of = ['3 A', '${x}'] }\n" + X, "limits.adc.one_of: '3 A'"),
    (BATTERY + "limits.adc = { matches = '(${x}' }\n" + X, "limits.adc.matches: '(x' is no"),
    (BATTERY + "limits.adc = { min = 5, marginal = { min = 3, max = '${x}' } }\n" + X,
     "limits.adc: min 5 is above marginal.min 3"),
    ("[[step]]\nrequest = '45'\natoms = ['module=${x}', '19=int:y']\n" + X, "atoms: atom 19: "),
    # every problem names its step, numbers that are none too
    (BATTERY + "limits.adc = { min = -inf }", "step 1 'b': limits.adc.min: -inf is no number"),
    ("[[always]]\nname = 'w'\nwait = nan\n" + BATTERY, "always 1 'w': wait: nan is no number"),
    # names, texts and sizes
    (BATTERY + "save = { adc = \"x\\n\" }", "step 1 'b': save.adc: 'x\\n' is not a name"),
    ("[input.\"x\\n\"]\n" + BATTERY, "input.x\\n: this cannot be a variable's name"),
    ("title = \"a\\u0007\"\n" + BATTERY, "title: 'a\\x07' holds a character that cannot be shown"),
    ("version = \"\\u202e\"\n" + BATTERY, "version: "), ("dut = \"a\\nb\"\n" + BATTERY, "dut: "),
    ("[[step]]\nname = 'l'\nat = '" + "A" * 5000 + "'", "step 1 'l': at: an AT text of 5001 bytes"),
    ("[[step]]\nat = 'AT'\nexpect = '+CME ERRORx'", "expect: '+CME ERRORx' is no final result"),
    ("[[step]]\nat = 'AT'\nexpect = '+CME ERROR: '", "expect: '+CME ERROR: ' is no final result"),
    # force goes past formats, never past types
    ("[[step]]\nat = 'AT^DBTADDR=\"\"'", "what follows (force = true sends it)"),
    ("[[step]]\nrequest = '45'\natoms = ['module=99']", "atoms: module: 99 is neither"),
    ("[[step]]\nrequest = '45'\natoms = ['module=a']\nforce = true", "atoms: module: 'a' is not"),
    ("[[step]]\nrequest = '45'\natoms = ['module=str:a']\nforce = true", "type int, not str"),
])
def test_what_is_wrong_beside_what_is_right(tmp_path: Path, text: str, words: str) -> None:
    (found,) = problems(tmp_path, text)
    assert words in found and "--" not in found, "a plan has no flags"


def test_a_very_long_name_is_cut(tmp_path: Path) -> None:
    (found,) = problems(tmp_path, "x" * 900_000 + " = 1\n" + ADC)
    assert len(found) < 200 and "unknown key" in found


@pytest.mark.parametrize("text", [
    BATTERY + "limits.adc = { min = 10, one_of = [5, 12] }",
    BATTERY + "limits.adc = { min = 4, one_of = [3, '${x}'] }\n" + X,
    BATTERY + "limits.adc = { min = '${x}', marginal = { min = 3 } }\n" + X,
    "[[step]]\nat = 'AT'\nexpect = '+CMS ERROR: no: way'", "[[step]]\nat = 'AT'\nexpect = '+CMS'",
    "[[step]]\nrequest = '45'\natoms = ['module=99']\nforce = true",
])
def test_what_only_looks_wrong(tmp_path: Path, text: str) -> None:
    assert problems(tmp_path, text) == []


def test_force_of_texts_and_requests_is_done_and_named(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script(requests={45: [[ACKNOWLEDGEMENT, ok(46, Atom.integer(19, module))]
                                        for module in (99, 16)]},
                         texts={'AT^DBTADDR=""': [OK]})
    plan = load(tmp_path, "[[step]]\nat = 'AT^DBTADDR=\"\"'\nforce = true\n"
                "[[step]]\nrequest = '45'\natoms = ['module=99']\nforce = true\n"
                "[[step]]\nrequest = '45'\natoms = ['module=16']\nforce = true\n")
    document = Bench(plan, peer).run()
    assert verdicts(document) == ["pass"] * 3 and peer.script.asked[1:] == ['AT^DBTADDR=""', 45, 45]
    text, request, unforced = (step["forced"] for step in document["steps"])
    assert "the address is empty" in text[0] and "99 is neither" in request[0] and not unforced


# Steps that are nearly right, so that many of them are read, and what is not is so in one place.

_NUMBERS = st.one_of(st.integers(-5, 300), st.floats(-10, 10), st.sampled_from(
    [1e18, 2**31, -(2**31), 1e19, 2**70, 0.5, 5.0]))
_WORDS = st.sampled_from(["software", "pass", "fail", "3.6 V", "3600 mV", "3 A", "16", "", "${x}",
                          "${n}", "${verdict}", "${none}", "490154203237518", "KEL1", "x\n", "OK"])
_ANY = st.one_of(_NUMBERS, _WORDS, st.booleans(), st.lists(_WORDS, max_size=2),
                 st.dictionaries(st.sampled_from(["a", "min"]), _NUMBERS, max_size=1))
_VALUES = st.one_of(_NUMBERS, _WORDS)
_NAMES = st.sampled_from(["adc", "voltage", "version", "module", "imei", "verdict", "station",
                          "index", "result", "reply", "text", "satellite", "atom 7", "x\n"])
_LIMIT_KEYS: dict[str, Any] = {
    "min": _VALUES, "max": _VALUES, "equals": _VALUES, "one_of": st.lists(_VALUES, max_size=3),
    "matches": _VALUES, "marginal": st.dictionaries(st.sampled_from(["min", "max"]), _VALUES)}
_NO_KEYS: dict[str, Any] = {}
_LIMITS = st.one_of(_VALUES, st.fixed_dictionaries(_NO_KEYS, optional=_LIMIT_KEYS))
_KINDS: dict[str, Any] = {
    "command": st.sampled_from(["battery adc", "version", "gps read", "test-result write",
                                "imei write", "battery voltage", "none such"]),
    "request": st.sampled_from(["45", "gps-test", "0x2d", "300"]),
    "at": st.sampled_from(["AT", "AT^A=${x}", "", "AT^DAMT1="]),
    "ask": st.sampled_from(["White?", "${x}?"]), "enter": st.sampled_from(["Label"]),
    "wait": _NUMBERS}
_KEYS: dict[str, Any] = {
    "name": _WORDS, "with": st.dictionaries(_NAMES, _VALUES, max_size=2),
    "atoms": st.lists(st.sampled_from(["19=int:3", "module=16", "module=${x}", "x"]), max_size=2),
    "expect": st.one_of(_WORDS, st.booleans()), "picture": _WORDS,
    "limits": st.dictionaries(_NAMES, _LIMITS, max_size=2),
    "save": st.one_of(_WORDS, st.dictionaries(_NAMES, _WORDS, max_size=2)), "timeout": _NUMBERS,
    "stop": st.booleans(), "when": st.sampled_from(["passed", "failed", "connected", "later"]),
    "retry": st.fixed_dictionaries({"times": _NUMBERS}, optional={"delay": _NUMBERS}),
    "force": st.booleans(), "reconnect": _NUMBERS}


@st.composite
def steps(draw: Any) -> dict[str, Any]:
    """A step of one kind with some of its keys, and perhaps one wrong value anywhere."""
    kind = draw(st.sampled_from(sorted(KIND_KEYS)))
    step = {kind: draw(_KINDS[kind])}
    if step.get("command") == "version":
        step["with"] = {"module": draw(_VALUES)}
    for key in draw(st.lists(st.sampled_from(sorted(keys_of(kind) & set(_KEYS))), max_size=3,
                             unique=True)):
        step[key] = draw(_KEYS[key])
    if draw(st.integers(0, 5)) == 0:
        step[draw(st.sampled_from(sorted({*_KEYS, kind})))] = draw(_ANY)
    return step


INPUTS = "[input.x]\n[input.n]\nformat = 'int'\n"


@settings(max_examples=400)
@given(st.lists(steps(), min_size=1, max_size=3), st.sampled_from(["step", "setup", "always"]))
def test_what_the_schema_refuses_is_refused_and_the_reader_refuses_no_less(
        tmp_path_factory: pytest.TempPathFactory, made: list[dict[str, Any]], last: str) -> None:
    lists = {"step": made[:-1] or made, last: made[-1:]} if last != "step" else {"step": made}
    text = "\n".join(f"{name} = {toml_text(content)}" for name, content in lists.items())
    path = write_plan(tmp_path_factory.getbasetemp(), f"{text}\n{INPUTS}")
    by_the_schema = VALIDATOR.is_valid(tomllib.loads(path.read_text(encoding="utf-8")))
    try:
        load_plan(path, Channel.PC)
    except PlanProblem as problem:
        assert all(found.reason and (found.place or found.key) for found in problem.problems)
        return
    assert by_the_schema, "an editor would mark as wrong what the reader takes"


@settings(max_examples=200)
@given(steps())
def test_what_is_wrong_by_the_schema_alone_is_told_with_step_and_key(
        tmp_path_factory: pytest.TempPathFactory, step: dict[str, Any]) -> None:
    path = write_plan(tmp_path_factory.getbasetemp(), f"step = {toml_text([step])}\n{INPUTS}")
    wrong = not VALIDATOR.is_valid(tomllib.loads(path.read_text(encoding="utf-8")))
    try:
        load_plan(path, Channel.PC)
        assert not wrong
    except PlanProblem as problem:
        assert all(found.place.startswith("step 1") for found in problem.problems)
