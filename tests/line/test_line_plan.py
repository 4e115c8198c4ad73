"""Plans: what is refused when one is read, where it is said to be wrong, and what is read."""

from __future__ import annotations

from pathlib import Path

import pytest
from hypothesis import given, settings
from hypothesis import strategies as st
from line_bench import ADC, load, problems, toml_text, write_plan

from amt_line.plan.problems import PlanProblem
from amt_line.plan.reader import load_plan
from amt_station.requests.model import Channel

SN = '[input.sn]\nprompt = "Scan"\n'
IMEI = "490154203237518"


@pytest.mark.parametrize("text, words", [
    # the file as a whole
    ("", "step: missing"),
    ("[[step", "Expected"),
    ("step = []", "step: holds nothing"),
    ("title = 3\n" + ADC, "title: 3 is no text"),
    ("colour = 1\n" + ADC, "colour: unknown key"),
    ("chanel = 'pc'\n" + ADC, "chanel: unknown key, did you mean 'channel'?"),
    ("channel = 'usb'\n" + ADC, "channel: 'usb' is none of pc, app"),
    ("deadline = 0\n" + ADC, "deadline: 0 is not a number of seconds above 0"),
    ("deadline = nan\n" + ADC, "deadline: nan is no number"),
    ("deadline = inf\n" + ADC, "deadline: inf is no number"),
    ("title = 2026-01-01\n" + ADC, "title: datetime.date(2026, 1, 1) is no text"),
    # the kind of a step
    ("[[step]]\n", "step 1: needs exactly one of command, request, at, ask, enter, wait"),
    ("[[step]]\nat = 'AT'\ncommand = 'version'", "step 1: needs exactly one of"),
    ("[[step]]\nat = 'AT'\nwith = {}", "step 1: with: a step of this kind has no such key"),
    ("[[step]]\nwait = 1\nlimits.x = 1", "step 1: limits: a step of this kind has no such key"),
    ("[[step]]\nat = 3", "step 1: at: 3 is no text"),
    ("[[step]]\nat = ''", "step 1: at: is empty"),
    ("[[step]]\nat = 'AT^DAMT1='", "step 1 'AT^DAMT1=': at: the handset is known to refuse"),
    ("[[step]]\nname = 'a'\nat = \"AT\\u0007\"", "step 1 'a': at: an AT text with U+0007"),
    ("[[step]]\nat = 'AT'\ntimeout = 0", "step 1: timeout: 0 is not a number of seconds"),
    ("[[step]]\nat = 'AT'\nstop = 1", "step 1: stop: 1 is no true or false"),
    ("[[step]]\nat = 'AT'\nwhen = 'later'", "step 1: when: 'later' is none of passed"),
    ("[[step]]\nat = 'AT'\nexpect = ''", "expect: '' is no final result"),
    ("[[step]]\nat = 'AT'\nexpect = true", "expect: True is no text"),
    ("[[step]]\nask = 'x?'\nexpect = 'yes'", "expect: 'yes' is neither true nor false"),
    ("[[step]]\nwait = -1", "step 1: wait: -1 is not a number of seconds"),
    ("[[step]]\nwait = true", "step 1: wait: True is no number"),
    ("[[step]]\nat = 'AT'\nretry = { times = 1.0 }", "retry.times: 1.0 is no whole number"),
    ("[[step]]\nat = 'AT'\nretry = { delay = 1 }", "step 1: retry.times: missing"),
    ("[[step]]\nask = 'x?'\npicture = 'no.png'", "picture: no file 'no.png' beside the plan"),
    ("[[step]]\nask = 'x?'\npicture = '../x.png'", "picture: the file must stand beside the plan"),
    ("[[step]]\nask = 'x?'\npicture = 'x.svg'", "picture: 'x.svg' is none of .png"),
    ("[[step]]\nask = 'x?'\n[[step]]\nask = 'x?'", "step 2 'x?': name: another operator step"),
    # commands and their values
    ("[[step]]\ncommand = 'no such'", "step 1: command: no 'no such'"),
    ("[[step]]\ncommand = 'version'", "step 1: with: missing"),
    ("[[step]]\ncommand = 'version'\nwith = {}", "step 1: with.module: missing"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 'x' }", "with.module: 'x' is not a whole"),
    ("[[step]]\ncommand = 'version'\nwith = { module = '16' }", "with.module: '16' is not a whole"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 16.0 }", "with.module: "),
    ("[[step]]\ncommand = 'version'\nwith = { module = true }", "with.module: True is"),
    ("[[step]]\ncommand = 'version'\nwith = { module = [16] }", "with.module: [16] is"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 16, colour = 1 }", "with.colour: unknown"),
    ("[[step]]\ncommand = 'vibrator on'", "served on the app channel only"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = true }", "with.imei: True is no text"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = 490154203237518.0 }", "with.imei: 4901542"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = 490154203237518 }", "is no text"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = 2026-01-01 }", "is no text"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = '' }", "with.imei: is empty"),
    ("[[step]]\ncommand = 'imei write'\nwith = { imei = '490154203237519' }", "check digit"),
    ("[[step]]\ncommand = 'imei write'\nforce = true\nwith = { imei = \"a\\u0007\" }", "U+0007"),
    ("[[step]]\ncommand = 'test-result write'\nwith = { station = 3, verdict = 7 }",
     "with.verdict: 7 is not a whole number 0 to 2"),
    ("[[step]]\ncommand = 'test-result write'\nforce = true\n"
     "with = { station = 3, verdict = 7.5 }", "with.verdict: 7.5 is"),
    # requests
    ("[[step]]\nrequest = 'NONE_SUCH'", "request: no command 'NONE_SUCH'"),
    ("[[step]]\nrequest = '45'\natoms = ['19']", "atoms: '19' is not ATOM=TYPE:VALUE"),
    ("[[step]]\nrequest = '300'", "request: "),
    # limits
    ("[[step]]\nat = 'AT'\nlimits.reply = { matches = '(' }", "limits.reply.matches: '(' is no"),
    ("[[step]]\nat = 'AT'\nlimits.reply = {}", "limits.reply: is empty"),
    ("[[step]]\nat = 'AT'\nlimits = {}", "limits: is empty"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { about = 3 }", "limits.reply.about: unknown key"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { min = true }", "limits.reply.min: True is not"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { min = 3 }", "limits.reply.min: reply is a text"),
    ("[[step]]\nat = 'AT'\nlimits.final = 'OK'", "limits.final: the answer has no such value"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.volt = 1", "limits.volt: the answer has no such"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = 2, max = 1 }",
     "limits.adc: min 2 is above max 1"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = 2, marginal = { min = 1 } }",
     "limits.adc: min 2 is above marginal.min 1"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { marginal = { min = 1 } }",
     "limits.adc: marginal alone limits nothing"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { one_of = [] }",
     "limits.adc.one_of: holds nothing"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { equals = 1, one_of = [1] }",
     "limits.adc: equals and one_of contradict each other"),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = '3 V' }",
     "limits.adc.min: '3 V': adc "),
    ("[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = 1e30 }", "limits.adc.min: 1e+30"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 16 }\nlimits.module = 'sofware'",
     "limits.module.equals: 'sofware' is no number nor one of product, software"),
    # saving
    ("[[step]]\ncommand = 'battery adc'\nsave = { volt = 'x' }", "save.volt: the answer has no"),
    ("[[step]]\ncommand = 'battery adc'\nsave = { adc = 'a b' }", "save.adc: 'a b' is"),
    ("[[step]]\ncommand = 'battery adc'\nsave = 'x'", "save: "),
    ("[[step]]\ncommand = 'battery adc'\nsave = { adc = 'verdict' }", "'verdict' is no free name"),
    # inputs
    ("[input.'a b']\n" + ADC, "input.a b: this cannot be a variable's name"),
    ("[input.verdict]\n" + ADC, "input.verdict: the run itself gives"),
    ("[input.x]\nformat = 'date'\n" + ADC, "input.x.format: 'date' is none of text, int"),
    ("[input.x]\npattern = '['\n" + ADC, "input.x.pattern: '[' is no regular expression"),
    ("[input.x]\ndefault = 3\n" + ADC, "input.x.default: 3 is no text"),
    ("[input.x]\nformat = 'int'\ndefault = 3.0\n" + ADC, "input.x.default: 3.0 is no"),
    ("[input.x]\nformat = 'imei'\ndefault = '1'\n" + ADC, "input.x.default: '1': an IMEI"),
    ("[input.x]\npattern = 'a'\ndefault = 'ab'\n" + ADC, "'ab' is not of the form 'a'"),
])
def test_a_wrong_plan_is_refused_with_step_and_key(tmp_path: Path, text: str, words: str) -> None:
    found = problems(tmp_path, text)
    assert found, "the plan is refused"
    assert any(words in line for line in found), found


def test_at_steps_need_the_pc_line(tmp_path: Path) -> None:
    assert problems(tmp_path, "[[step]]\nat = 'AT'", Channel.APP) == [
        "step 1 'AT': at: AT text is understood on the PC line only"]


def test_every_problem_is_told_at_once(tmp_path: Path) -> None:
    found = problems(tmp_path, ADC + "[[step]]\ncommand = 'x'\n[[always]]\nat = 3\n")
    assert found == ["step 2: command: no 'x'; `amt-station commands` lists them",
                     "always 1: at: 3 is no text"]


def test_the_problem_names_file_step_and_key(tmp_path: Path) -> None:
    path = write_plan(tmp_path, "[[step]]\nname = 'a'\nat = 'AT'\nstop = 1\n")
    with pytest.raises(PlanProblem) as caught:
        load_plan(path, Channel.PC)
    assert str(caught.value) == f"{path}: step 1 'a': stop: 1 is no true or false"
    assert caught.value.exit_status == 2
    assert caught.value.details()["problems"] == [
        {"file": str(path), "step": "step 1 'a'", "key": "stop", "reason": "1 is no true or false"}]


@pytest.mark.parametrize("content, words", [
    (b"\xff", "utf-8"), (b"a = " + b"[" * 5000, "deep"), (b"a = " + b"9" * 5000, ""),
    (b"#" * 1_100_000, "larger than"),
    (("[[step]]\nat = 'AT'\nlimits.reply = " + "{a=" * 300 + "1" + "}" * 300).encode(), "limits")])
def test_odd_files(tmp_path: Path, content: bytes, words: str) -> None:
    path = tmp_path / "odd.toml"
    path.write_bytes(content)
    with pytest.raises(PlanProblem, match=words):
        load_plan(path, Channel.PC)


@pytest.mark.parametrize("path", ["none.toml", "", "/dev/zero", "a\0b", "/dev"])
def test_what_is_no_file(tmp_path: Path, path: str) -> None:
    with pytest.raises(PlanProblem):
        load_plan(tmp_path / path, Channel.PC)


# references

ASKS = "[[step]]\nenter = 'Text?'\nname = 'e'\nsave = 'x'\n"
USES = "[[step]]\nat = 'AT^A=${x}'\n"
SAVED = "[[step]]\ncommand = 'battery adc'\nsave = { adc = 'a' }\nstop = true\n"


@pytest.mark.parametrize("text, words", [
    (USES, "step 1 'AT^A=${x}': at: no input has the name 'x', and no step before saves it"),
    (USES + ASKS, "no input has the name 'x', and no step before saves it"),
    (ASKS + USES, "'x' is not saved on every way there: step 1 'e' may be skipped or not pass"),
    (ASKS + "stop = true\nwhen = 'failed'\n" + USES, "'x' is not saved on every way there"),
    (ASKS + "stop = true\n[[always]]\nat = 'AT^A=${x}'\n", "not saved on every way there"),
    ("[[step]]\nat = 'AT^A=${verdict}'\n", "'verdict' is known in [[always]] only"),
    ("[[step]]\nat = 'AT^A=${'\n", "at: '${' without its '}'"),
    ("[[step]]\nat = 'AT^A=${a b}'\n", "'${a b}' names no variable"),
    ("dut = '${x}'\n" + ADC, "dut: no input has the name 'x'"),
    ("dut = '${x'\n" + ADC, "dut: '${' without its '}'"),
    (SN + "[[step]]\ncommand = 'version'\nwith = { module = 'a${sn}' }", ""),
    (SN + "[[step]]\ncommand = 'gps read'\nwith = { index = '${sn}' }",
     "with.index: a text, and index is a whole number"),
    ("[input.n]\nformat = 'int'\n[[step]]\ncommand = 'imei write'\nwith = { imei = '${n}' }",
     "with.imei: 'n' is a number, and imei is a text"),
    (SAVED + "[[step]]\ncommand = 'imei write'\nwith = { imei = '${a}' }",
     "with.imei: 'a' is a number, and imei is a text"),
    (SN + "[[step]]\ncommand = 'battery adc'\nlimits.adc = { min = '${sn}' }",
     "limits.adc.min: 'sn' is a text, adc a number"),
    (SN + ASKS.replace("'x'", "'sn'"), "'sn' is no free name"),
    (ADC + "[[always]]\ncommand = 'gps read'\nwith = { index = '${verdict}' }",
     "index knows no fail and no pass"),
])
def test_references_are_followed_when_the_plan_is_read(tmp_path: Path, text: str,
                                                       words: str) -> None:
    assert any(words in line for line in problems(tmp_path, text)) or not words


@pytest.mark.parametrize("text", [
    ASKS + "stop = true\n" + USES,
    ASKS + USES + "when = 'passed'\n",
    ASKS.replace("step", "setup") + USES,
    ASKS + "when = 'connected'\n" + USES + "when = 'passed'\n",
    ASKS + "[[always]]\nat = 'AT^A=${x}'\nwhen = 'passed'\n",
    SN + "[[always]]\nat = 'AT^A=${sn}'\n[[step]]\nat = 'AT^A=$${x}${sn}'\n",
    "[input.n]\nformat = 'int'\n[[step]]\ncommand = 'gps read'\nwith = { index = '${n}' }",
    ADC + "[[always]]\ncommand = 'test-result write'\n"
    "with = { station = 3, verdict = '${verdict}' }\n",
    "[[step]]\ncommand = 'test-result write'\nforce = true\n"
    "with = { station = 3, verdict = 7 }\n",
    ADC + "save = { adc = 'a' }\nstop = true\n" + ADC.replace("10", "'${a}'"),
    SAVED + "[[step]]\ncommand = 'gps read'\nwith = { index = '${a}' }\n",
])
def test_good_references(tmp_path: Path, text: str) -> None:
    assert problems(tmp_path, text) == []


def test_a_plan_as_it_is_read(tmp_path: Path) -> None:
    (tmp_path / "white.png").write_bytes(b"")
    plan = load(tmp_path, f'''
title = "End of line"
version = "7"
channel = "app"
deadline = 120
dut = "${{sn}}"
[input.sn]
pattern = 'KEL\\d{{10}}'
[[setup]]
command = "sim check"
[[step]]
command = "battery voltage"
limits.voltage = {{ min = "3600 mV", max = "4.4 V", marginal = {{ max = 4.3 }} }}
retry = {{ times = 2, delay = 0.5 }}
save = {{ voltage = "before" }}
[[step]]
command = "imei write"
with = {{ imei = "{IMEI}" }}
stop = true
[[step]]
ask = "Is the screen white?"
picture = "white.png"
expect = false
[[step]]
wait = 0.5
[[always]]
command = "test-result write"
with = {{ station = 3, verdict = "${{verdict}}" }}
when = "connected"
''')
    assert (plan.title, plan.version, plan.deadline, plan.dut) == ("End of line", "7", 120, "${sn}")
    assert plan.channel is Channel.APP and len(plan.sha256) == 64
    battery, imei, ask, wait = plan.steps
    assert battery.subject == "battery voltage" and battery.retries == 2
    assert imei.stop and not ask.wanted and ask.picture == tmp_path / "white.png"
    assert wait.seconds == 0.5 and wait.name == "wait 0.5 s"
    assert plan.always[0].place == "always 1 'test-result write'"


_KEYS = st.sampled_from(["title", "version", "channel", "deadline", "dut", "input", "setup", "step",
                         "always", "name", "command", "with", "request", "atoms", "at", "expect",
                         "ask", "picture", "enter", "wait", "limits", "save", "timeout", "stop",
                         "when", "retry", "force", "reconnect", "min", "max", "equals", "matches",
                         "one_of", "marginal", "adc", "voltage", "imei", "x"])
_LEAVES = st.one_of(
    st.booleans(), st.integers(), st.floats(), st.text(max_size=8), st.dates(),
    st.sampled_from(["${x}", "${", "3.6 V", "battery adc", "battery voltage", "version", "AT",
                     "pc", "app", "passed", "imei", "(a+)+$", "test-result write"]))
_VALUES = st.recursive(_LEAVES, lambda inner: st.lists(inner, max_size=3)
                       | st.dictionaries(_KEYS, inner, max_size=4), max_leaves=12)


@settings(max_examples=300)
@given(st.one_of(
    st.text(max_size=200),
    st.dictionaries(_KEYS, _VALUES, max_size=5).map(
        lambda table: "\n".join(f"{key} = {toml_text(value)}" for key, value in table.items())),
    st.lists(st.dictionaries(_KEYS, _VALUES, max_size=5), min_size=1, max_size=3).map(
        lambda steps: f"step = {toml_text(steps)}")))
def test_whatever_is_in_the_file_there_is_a_plan_or_a_clear_problem(
        tmp_path_factory: pytest.TempPathFactory, text: str) -> None:
    path = tmp_path_factory.getbasetemp() / "any.toml"
    path.write_text(text, encoding="utf-8", errors="replace", newline="")
    try:
        assert load_plan(path, Channel.PC).steps
    except PlanProblem as problem:
        assert problem.problems and all(line.isprintable() for line in problem.lines())
