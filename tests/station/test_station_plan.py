"""Test plans: what is refused before anything is sent, how steps are judged, and the reports."""

from __future__ import annotations

import json
import signal
import subprocess
from pathlib import Path
from xml.etree import ElementTree

import pytest
from station_peer import (PATIENCE, ROOT, Peer, Run, answering, error_packet, sequence,
                          station_command, station_environment)

from amt_station.errors import UsageProblem
from amt_station.link import Link
from amt_station.plan import Limit, Plan, load_plan
from amt_station.plan_run import StepResult, Verdict, exit_status, run_plan
from amt_station.report import junit_xml, summary
from amt_station.requests.model import Channel
from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Frame, Item
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

ADC = '[[step]]\nname = "adc"\ncommand = "battery adc"\nlimits.adc = { min = 10, max = 20 }\n'


def load(tmp_path: Path, text: str, channel: Channel = Channel.PC) -> Plan:
    path = tmp_path / "line.toml"
    path.write_text(text, encoding="utf-8")
    return load_plan(path, channel)


def adc(value: int) -> bytes:
    return encode_envelope(Packet(225, (Atom.integer(151, value), Atom.integer(1, 0))))


@pytest.mark.parametrize("text, words", [
    ("", r"no \[\[step\]\]"),
    ("title = 3\n" + ADC, "title has the wrong type"),
    ("colour = 1\n" + ADC, "unknown key 'colour'"),
    ("[[step]]\n", "exactly one of"),
    ("[[step]]\nat = 'AT'\ncommand = 'version'", "exactly one of"),
    ("[[step]]\nat = 'AT'\nwith = {}", "unknown key 'with'"),
    ("[[step]]\nat = 3", "at has the wrong type"),
    ("[[step]]\nat = 'AT^DAMT1='", "known to refuse"),
    ("[[step]]\nat = 'AT'\ntimeout = 0", "not a time"),
    ("[[step]]\nat = 'AT'\nstop = 1", "stop has the wrong type"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { matches = '(' }", "limit of reply"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { about = 3 }", "unknown key 'about'"),
    ("[[step]]\nat = 'AT'\nlimits.reply = { min = true }", "min has the wrong type"),
    ("[[step]]\ncommand = 'no such'", "no command 'no such'"),
    ("[[step]]\ncommand = 'version'", "needs module"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 'x' }", "module"),
    ("[[step]]\ncommand = 'version'\nwith = { module = 16, colour = 1 }", "no atom colour"),
    ("[[step]]\ncommand = 'vibrator on'", "app channel only"),
    ("[[step]]\nrequest = 'NONE_SUCH'", "no command"),
    ("[[step]]\nrequest = '45'\natoms = ['19']", "ATOM=TYPE:VALUE"),
    (ADC + "[[step]]\ncommand = 'x'", "step 2"),
    ("[[step", "line.toml"),
])
def test_a_wrong_plan_is_refused_whole(tmp_path: Path, text: str, words: str) -> None:
    with pytest.raises(UsageProblem, match=words):
        load(tmp_path, text)


def test_a_plan_that_is_not_there(tmp_path: Path) -> None:
    with pytest.raises(UsageProblem, match="none.toml"):
        load_plan(tmp_path / "none.toml", Channel.PC)


def test_at_steps_need_the_pc_line(tmp_path: Path) -> None:
    with pytest.raises(UsageProblem, match="PC line only"):
        load(tmp_path, "[[step]]\nat = 'AT'", Channel.APP)


@pytest.mark.parametrize("limit, value, words", [
    (Limit("x", low=2), 2, ""), (Limit("x", low=2), 1, "below 2"),
    (Limit("x", high=2.5), 2, ""), (Limit("x", high=2.5), 3, "above 2.5"),
    (Limit("x", equals="a"), "a", ""), (Limit("x", equals="a"), "b", "instead of"),
    (Limit("x", equals=0), 0, ""), (Limit("x", equals=0), 1, "instead of"),
    (Limit("x", matches="^a.c$"), "abc", ""), (Limit("x", matches="^a.c$"), "abd", "not match"),
    (Limit("x", low=0), "text", "no number"), (Limit("y"), 1, "no y"),
    (Limit("x", low=0, high=0), 0, "")])
def test_limits(limit: Limit, value: int | str, words: str) -> None:
    violation = limit.violation({"x": value})
    assert bool(violation) is bool(words)
    assert words in violation


def test_steps_and_their_verdicts(tmp_path: Path, peer: Peer, link: Link) -> None:
    plan = load(tmp_path, ADC * 3 + "[[step]]\nat = 'AT^DSVER'\nlimits.reply = '^DSVER: 1'\n"
                + "[[step]]\nat = 'AT^DSVER'\n[[step]]\nat = 'AT+X'\nexpect = '+CME'\n"
                + "[[step]]\nrequest = 'gps-test'\nlimits.result = 0\n")
    peer.script = sequence(
        [ACKNOWLEDGEMENT, adc(10)], [ACKNOWLEDGEMENT, adc(21)],
        [ACKNOWLEDGEMENT, error_packet(225, 10)], [b"\r\n^DSVER: 1\r\n\r\nOK\r\n"],
        [b"\r\nERROR\r\n"], [b"\r\n+CME ERROR: 4\r\n"],
        [ACKNOWLEDGEMENT, encode_envelope(Packet(175, (Atom.integer(1, 0),)))])
    results = list(run_plan(link, plan))
    assert [result.verdict.value for result in results] == [
        "pass", "fail", "fail", "pass", "fail", "pass", "pass"]
    assert results[0].values == {"adc": 10, "result": 0}
    assert results[1].reason == "adc 21 is above 20"
    assert "code 10" in results[2].reason
    assert results[3].values == {"reply": "^DSVER: 1"}
    assert "answered with ERROR" in results[4].reason
    assert exit_status(results) == 1 and exit_status(results[3:4]) == 0


def test_a_failed_step_can_end_the_plan(tmp_path: Path, peer: Peer, link: Link) -> None:
    plan = load(tmp_path, ADC + "stop = true\n" + ADC)
    peer.script = sequence([ACKNOWLEDGEMENT, adc(9)])
    results = list(run_plan(link, plan))
    assert [result.verdict.value for result in results] == ["fail", "skipped"]
    assert results[1].reason == "step 'adc' did not pass"


def test_a_step_without_an_answer_is_an_error_and_the_plan_goes_on(tmp_path: Path, peer: Peer,
                                                                   link: Link) -> None:
    plan = load(tmp_path, ADC + "timeout = 0.3\n" + ADC)
    peer.script = sequence([], [b"\r\nOK\r\n"], [ACKNOWLEDGEMENT, adc(15)])
    assert [result.verdict.value for result in run_plan(link, plan)] == ["error", "pass"]


def test_a_held_packet_ends_the_plan_with_the_advice(tmp_path: Path, peer: Peer,
                                                     link: Link) -> None:
    refusal = [ACKNOWLEDGEMENT, error_packet(225)]
    peer.script = sequence(refusal, refusal)
    results = list(run_plan(link, load(tmp_path, ADC + ADC)))
    assert [result.verdict.value for result in results] == ["fail", "skipped"]
    assert "unplug" in results[1].reason
    assert peer.raw.endswith(b"AT^DBTADDR=?\r"), "the plan has tried to recover"


def test_a_held_text_is_flushed_between_the_steps(tmp_path: Path, peer: Peer, link: Link) -> None:
    plan = load(tmp_path, "[[step]]\nat = 'AT+LONG'\n" + ADC)
    peer.script = sequence([error_packet(0)], [b"\r\nOK\r\n"], [ACKNOWLEDGEMENT, adc(15)])
    assert [result.verdict.value for result in run_plan(link, plan)] == ["fail", "pass"]
    assert peer.raw.startswith(b"AT+LONG\rAT^DBTADDR=?\r")


def test_a_lost_port_skips_the_rest(tmp_path: Path, peer: Peer, link: Link) -> None:
    plan = load(tmp_path, "[[step]]\nat = 'AT'\n" + ADC)
    peer.hang_up()
    results = list(run_plan(link, plan))
    assert [result.verdict.value for result in results] == ["error", "skipped"]
    assert exit_status(results) == 3


def test_junit_and_summary() -> None:
    plan = Plan("line 3 \x01", ())
    results = [StepResult("a & b", Verdict.PASS, {"adc": 3, "result": 0}),
               StepResult("c", Verdict.FAIL, reason="adc 1 is below 2", seconds=1.5),
               StepResult("d", Verdict.ERROR, reason="no answer"),
               StepResult("e", Verdict.SKIPPED, reason="stopped")]
    suite = ElementTree.fromstring(junit_xml(plan, results))
    assert suite.attrib == {"name": "line 3 ?", "tests": "4", "failures": "1", "errors": "1",
                            "skipped": "1", "time": "1.500"}
    assert [case.attrib["name"] for case in suite] == ["a & b", "c", "d", "e"]
    assert [[child.tag for child in case] for case in suite] == [
        ["system-out"], ["failure"], ["error"], ["skipped"]]
    assert suite[0][0].text == "adc 3"
    assert suite[1][0].attrib["message"] == "adc 1 is below 2"
    assert summary(plan, results).endswith("FAIL (1 pass, 1 fail, 1 error, 1 skipped)")
    assert summary(plan, results[:1]).endswith("PASS (1 pass)")


def write_plan(tmp_path: Path, text: str) -> str:
    path = tmp_path / "plan.toml"
    path.write_text(text, encoding="utf-8")
    return str(path)


def test_the_command(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    peer.script = answering(Atom.integer(151, 15))
    path = write_plan(tmp_path, 'title = "end of line"\n' + ADC)
    junit = tmp_path / "junit.xml"
    result = run_station("-p", peer.path, "plan", path, "--junit", str(junit))
    assert result.returncode == 0
    first, last = result.stdout.splitlines()
    assert first.startswith("pass  ") and first.endswith("  adc  adc 15")
    assert last == "end of line: PASS (1 pass)"
    assert result.stderr == "1/1 adc: pass\n"
    assert ElementTree.parse(junit).getroot().attrib["tests"] == "1"


def test_the_command_as_json_and_failing(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    peer.script = answering(Atom.integer(151, 99))
    result = run_station("-p", peer.path, "plan", "--json", write_plan(tmp_path, ADC))
    document = json.loads(result.stdout)
    assert result.returncode == 1
    assert document["ok"] is False and document["title"] == "plan"
    assert document["steps"][0].pop("seconds") > 0
    assert document["steps"] == [{"name": "adc", "verdict": "fail", "reason": "adc 99 is above 20",
                                  "values": {"adc": 99, "result": 0}}]


def test_a_wrong_plan_never_opens_the_port(tmp_path: Path, run_station: Run) -> None:
    result = run_station("-p", "/dev/no-such-port", "plan", write_plan(tmp_path, "x = 1"))
    assert result.returncode == 2 and "unknown key 'x'" in result.stderr


def test_a_report_that_cannot_be_written(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    peer.script = answering(Atom.integer(151, 15))
    result = run_station("-p", peer.path, "plan", write_plan(tmp_path, ADC), "--json",
                         "--junit", str(tmp_path / "no" / "such"))
    assert result.returncode == 2
    assert json.loads(result.stdout)["ok"] is True, "the results are told all the same"


def test_an_interrupted_plan_still_reports(tmp_path: Path, peer: Peer) -> None:
    def script(item: Item) -> list[bytes]:
        if isinstance(item, Frame):
            return [ACKNOWLEDGEMENT, adc(15)]
        return []

    peer.script = script
    path = write_plan(tmp_path, ADC + "[[step]]\nat = 'AT'\n" + ADC)
    with subprocess.Popen(station_command("-p", peer.path, "plan", "--json", path), cwd=ROOT,
                          env=station_environment(), stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, text=True) as process:
        peer.next()
        peer.next()
        process.send_signal(signal.SIGINT)
        out, talk = process.communicate(timeout=PATIENCE)
    assert process.returncode == 130
    assert talk.splitlines()[-1] == "amt-station: interrupted"
    assert [step["verdict"] for step in json.loads(out)["steps"]] == ["pass", "skipped", "skipped"]


def test_the_example_in_the_help_is_a_plan(tmp_path: Path, run_station: Run) -> None:
    text = run_station("plan", "--help").stdout
    example = text[text.index("title = "):text.index("A limit has")]
    plan = load(tmp_path, "\n".join(line.strip() for line in example.splitlines()))
    assert len(plan.steps) == 4
