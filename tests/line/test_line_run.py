"""Runs with a scripted handset: what is sent, how it is judged, and what comes behind."""

from __future__ import annotations

import threading
import time
from pathlib import Path
from typing import Any, Callable

import pytest
from line_bench import ADC, OK, Bench, Script, adc, in_thread, load, verdicts
from station_peer import Peer, error_packet, ok

from amt_line.run.operator import Answer, Question
from amt_line.run.stop import INTERRUPTED, TERMINATED
from amt_station.errors import NoPort
from amt_station.port import FdPort, Port
from amt_station.requests.model import Channel
from amt_station.wire import ACKNOWLEDGEMENT, Atom, Frame, Packet
from amt_station.wire.decoder import EnvelopeDecoder, Item

FLUSH = "AT^DBTADDR=?"
WRITE_VERDICT = ("[[always]]\ncommand = 'test-result write'\n"
                 "with = { station = 3, verdict = '${verdict}' }\n")


def script(*answers: int, **texts: Any) -> Script:
    """A handset whose battery has these ADC values, the last one for ever."""
    return Script(requests={224: [[ACKNOWLEDGEMENT, adc(value)] for value in answers]},
                  texts=texts)


def stored_verdict(bench: Bench) -> int:
    """The verdict that the run wrote into the handset."""
    always = bench.runner.record.steps[-1]  # type: ignore[union-attr]
    atoms = always["exchanges"][-1]["sent_decoded"][0]["packet"]["atoms"]
    return int(next(atom["value"] for atom in atoms if atom["name"] == "verdict"))


def test_a_run_that_passes(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = script(15)
    bench = Bench(load(tmp_path, "title = 'end'\ndut = 'D 1'\n" + ADC + WRITE_VERDICT), peer,
                  records=records)
    document = bench.run()
    assert peer.script.asked == [FLUSH, 224, 91], "a run begins by finding the link's place"
    assert (document["verdict"], document["exit_status"], document["state"]) == ("PASS", 0, "ended")
    assert verdicts(document) == ["pass", "pass"] and stored_verdict(bench) == 1
    step = document["steps"][0]
    assert step["values"][0] == {"name": "adc", "value": 15, "limits": {"min": 10, "max": 20},
                                 "verdict": "pass"}
    exchange = step["exchanges"][0]
    assert bytes.fromhex(exchange["sent"])[:4] == b"\xaa\xbb\xcc\xdd"
    assert [item["decoded"]["kind"] for item in exchange["received"]] == ["acknowledgement",
                                                                          "packet"]
    assert [event["event"] for event in bench.events] == [
        "run-began", "step-began", "step-ended", "step-began", "step-ended", "run-ended"]
    assert document["dut"] == "D 1" and list(records.glob("D_1-*.json"))


@pytest.mark.parametrize("text, answers, expected, status, word", [
    (ADC * 2, [15, 21], ["pass", "fail"], 1, "FAIL"),
    (ADC + "stop = true\n" + ADC, [9], ["fail", "skipped"], 1, "FAIL"),
    (ADC.replace("step", "setup") + ADC, [9], ["fail", "skipped"], 1, "FAIL"),
    (ADC + "retry = { times = 2 }\n", [9, 9, 15], ["pass"], 0, "PASS"),
    (ADC + "retry = { times = 1 }\n", [9, 9, 15], ["fail"], 1, "FAIL"),
    (ADC + ADC + "when = 'failed'\n", [15], ["pass", "skipped"], 0, "PASS"),
    (ADC + ADC + "when = 'passed'\n", [9], ["fail", "skipped"], 1, "FAIL"),
    (ADC + ADC + "when = 'failed'\n", [9, 15], ["fail", "pass"], 1, "FAIL"),
    (ADC + ADC + "when = 'connected'\n", [15], ["pass", "pass"], 0, "PASS"),
    (ADC + "when = 'failed'\n", [15], ["skipped"], 7, "ERROR"),
])
def test_verdicts_and_the_flow(tmp_path: Path, peer: Peer, text: str, answers: list[int],
                               expected: list[str], status: int, word: str) -> None:
    peer.script = script(*answers)
    bench = Bench(load(tmp_path, text + WRITE_VERDICT), peer)
    document = bench.run()
    assert verdicts(document) == [*expected, "pass"]
    assert (document["exit_status"], document["verdict"]) == (status, word)
    assert stored_verdict(bench) == (1 if word == "PASS" else 2)


def test_what_is_told_of_a_failure(tmp_path: Path, peer: Peer) -> None:
    peer.script = script(21)
    document = Bench(load(tmp_path, ADC + "retry = { times = 1 }\n"), peer).run()
    assert document["reason"] == "adc: adc 21 is above 20" and document["advice"]
    step = document["steps"][0]
    assert step["attempts"] == 2 and step["earlier"] == [
        {"attempt": 1, "verdict": "fail", "reason": "adc 21 is above 20"}]
    assert [exchange["attempt"] for exchange in step["exchanges"]] == [1, 2]


def test_saved_values_reach_later_steps(tmp_path: Path, peer: Peer) -> None:
    peer.script = script(15, 14)
    plan = load(tmp_path, ADC + "save = { adc = 'a' }\nstop = true\n"
                + "[[step]]\ncommand = 'battery adc'\nlimits.adc = { max = '${a}' }\n"
                + "[[step]]\nat = 'AT^X=${a},${n}'\n[input.n]\nformat = 'int'\n")
    document = Bench(plan, peer, {"n": 7}).run()
    assert verdicts(document) == ["pass"] * 3 and peer.script.asked[-1] == "AT^X=15,7"
    assert document["inputs"] == {"n": 7}


def test_an_answer_without_its_value_is_no_pass(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, ok(225)]]})
    document = Bench(load(tmp_path, "[[step]]\ncommand = 'battery adc'\n"), peer).run()
    assert verdicts(document) == ["fail"] and "holds no adc" in document["reason"]


def test_units_are_shown(tmp_path: Path, app_peer: Peer) -> None:
    def answer(item: Item) -> list[bytes]:
        number = item.packet.command  # type: ignore[union-attr]
        if number == 9:
            return [Packet(10, (Atom.integer(5, 3999000), Atom.integer(1, 0))).encode()]
        return [Packet(number + 1, (Atom.integer(1, 1),)).encode()]

    app_peer.script = answer
    plan = load(tmp_path, "[[step]]\ncommand = 'battery voltage'\n"
                "limits.voltage = { min = '3.6 V', max = '4.4 V' }\n", Channel.APP)
    document = Bench(plan, app_peer).run()
    assert document["verdict"] == "PASS" and document["channel"] == "app"
    assert document["steps"][0]["values"][0] == {
        "name": "voltage", "value": 3.999, "unit": "V", "raw": 3999000,
        "limits": {"min": 3.6, "max": 4.4}, "verdict": "pass"}


@pytest.mark.parametrize("expect, answer, verdict", [
    ("OK", b"\r\nOK\r\n", "pass"), ("OK", b"\r\nERROR\r\n", "fail"),
    ("ERROR", b"\r\nERROR\r\n", "pass"), ("ERROR", b"\r\nOK\r\n", "fail"),
    ("+CME", b"\r\n+CME ERROR: 4\r\n", "pass"), ("+CME ERROR: 4", b"\r\n+CME ERROR: 4\r\n", "pass"),
    ("+CME ERROR: 1", b"\r\n+CME ERROR: 10\r\n", "fail")])
def test_expected_finals(tmp_path: Path, peer: Peer, expect: str, answer: bytes,
                         verdict: str) -> None:
    peer.script = Script(texts={"AT+X": [answer]})
    plan = load(tmp_path, f"[[step]]\nat = 'AT+X'\nexpect = '{expect}'\n")
    assert verdicts(Bench(plan, peer).run()) == [verdict]


def test_a_request_by_number(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script(requests={176: [[ACKNOWLEDGEMENT, ok(175)]]})
    plan = load(tmp_path, "[[step]]\nrequest = 'gps-test'\nlimits.result = 0\n")
    assert Bench(plan, peer).run()["verdict"] == "PASS"


# late, missing and refused answers

def test_an_answer_that_comes_late_passes_nothing_and_is_named(tmp_path: Path,
                                                               peer: Peer) -> None:
    peer.script = Script(requests={224: [[], [ACKNOWLEDGEMENT, adc(11)]]},
                         texts={FLUSH: [ACKNOWLEDGEMENT, adc(15), OK]})
    plan = load(tmp_path, ADC + "timeout = 0.3\n" + ADC)
    document = Bench(plan, peer).run()
    assert verdicts(document) == ["error", "pass"] and document["exit_status"] == 5
    assert document["steps"][1]["values"][0]["value"] == 11
    assert any("came late and passes nothing" in text for text in document["steps"][1]["remarks"])
    assert document["remarks"], "what an earlier process left behind is named too"


def test_without_a_place_nothing_is_sent(tmp_path: Path, peer: Peer) -> None:
    peer.script = lambda item: ()
    bench = Bench(load(tmp_path, ADC + WRITE_VERDICT + "when = 'connected'\n"), peer)
    document = bench.run()
    assert verdicts(document) == ["skipped", "skipped"]
    assert (document["verdict"], document["exit_status"]) == ("ERROR", 5)
    assert peer.raw.replace(b"AT^DBTADDR=?\r", b"") == b""


def test_a_held_text_is_flushed_between_the_steps(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script(texts={"AT+LONG": [error_packet(0)]},
                         requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})
    document = Bench(load(tmp_path, "[[step]]\nat = 'AT+LONG'\n" + ADC), peer).run()
    assert verdicts(document) == ["fail", "pass"]
    assert peer.script.asked == [FLUSH, "AT+LONG", FLUSH, 224]


def test_a_held_packet_ends_the_run_with_the_advice(tmp_path: Path, peer: Peer) -> None:
    flushes = []

    def answer(item: Item) -> list[bytes]:
        if isinstance(item, Frame):
            return [ACKNOWLEDGEMENT, error_packet(225)]
        flushes.append(item)
        return [OK] if len(flushes) == 1 else [error_packet(225)]

    peer.script = answer
    document = Bench(load(tmp_path, ADC + ADC), peer).run()
    assert verdicts(document) == ["fail", "skipped"]
    assert "unplug" in document["steps"][1]["reason"] and "unplug" in document["advice"]


class Hand:
    """An operator who pulls the cable when asked to."""

    def expect(self, question: Question) -> None:
        """As in ``Operator``."""

    def answer(self, question: Question, check: Callable[[], None]) -> Answer | None:
        """As in ``Operator``: never an answer."""
        while question:
            check()
            time.sleep(0.02)
        return None

    def can_act(self) -> bool:
        """As in ``Operator``."""
        return True


def test_an_operator_is_asked_to_unplug_and_the_run_goes_on(tmp_path: Path, peer: Peer) -> None:
    flushes: list[Item] = []

    def held(item: Item) -> list[bytes]:
        if isinstance(item, Frame):
            return [ACKNOWLEDGEMENT, error_packet(225)]
        flushes.append(item)
        return [OK] if len(flushes) == 1 else [error_packet(225)]

    second = Peer(EnvelopeDecoder())
    second.script = script(15)
    peer.script = held
    left = [peer, second]

    def pull(event: dict[str, Any]) -> None:
        if event["event"] == "notice":
            peer.hang_up()

    bench = Bench(load(tmp_path, ADC + ADC), peer, operator=Hand(), on_event=pull,
                  open_port=lambda: FdPort(left.pop(0).slave))
    document = bench.run()
    second.close()
    assert verdicts(document) == ["fail", "pass"]
    notice = next(event for event in bench.events if event["event"] == "notice")
    assert "unplug the USB cable" in notice["text"]


def test_what_an_earlier_program_left_is_unplugged_before_the_first_step(tmp_path: Path,
                                                                         peer: Peer) -> None:
    peer.script = lambda item: [error_packet(225)]
    second = Peer(EnvelopeDecoder())
    second.script = script(15)
    left = [peer, second]

    def pull(event: dict[str, Any]) -> None:
        if event["event"] == "notice":
            peer.hang_up()

    document = Bench(load(tmp_path, ADC), peer, operator=Hand(), on_event=pull,
                     open_port=lambda: FdPort(left.pop(0).slave)).run()
    second.close()
    assert document["verdict"] == "PASS" and len(document["begin"]) >= 2


def test_what_an_earlier_program_left_passes_nothing(tmp_path: Path, peer: Peer) -> None:
    peer.script = lambda item: [error_packet(225)]
    document = Bench(load(tmp_path, ADC + WRITE_VERDICT + "when = 'connected'\n"), peer).run()
    assert verdicts(document) == ["skipped", "skipped"] and document["exit_status"] == 1
    assert "unplug" in document["advice"]


def test_an_operator_who_does_not_answer(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script()
    document = Bench(load(tmp_path, ASK + "timeout = 0.2\n"), peer, operator=Hand()).run()
    assert verdicts(document) == ["error"] and "within 0.2 s" in document["reason"]


def test_a_lost_port_skips_the_rest(tmp_path: Path, peer: Peer) -> None:
    def gone() -> Port:
        raise NoPort("no port /dev/x")

    document = Bench(load(tmp_path, ADC + WRITE_VERDICT), peer, open_port=gone).run()
    assert verdicts(document) == ["skipped", "error"] and document["exit_status"] == 3


# operators

ASK = "[[step]]\nname = 'screen'\nask = 'Is the screen white?'\n"


@pytest.mark.parametrize("text, answers, verdict, status", [
    (ASK, {"screen": "yes"}, "pass", 0), (ASK, {"screen": "no"}, "fail", 1),
    (ASK + "expect = false\n", {"screen": "no"}, "pass", 0),
    (ASK + "expect = false\n", {"screen": "yes"}, "fail", 1),
    (ASK, {}, "error", 7), (ASK, {"screen": "maybe"}, "error", 7)])
def test_what_the_operator_says(tmp_path: Path, peer: Peer, text: str, answers: dict[str, str],
                                verdict: str, status: int) -> None:
    peer.script = Script()
    bench = Bench(load(tmp_path, text), peer, answers=answers)
    document = bench.run()
    assert verdicts(document) == [verdict] and document["exit_status"] == status
    question = next(event for event in bench.events if event["event"] == "question")
    assert question["text"] == "Is the screen white?" and question["yes_or_no"] is True
    if verdict in ("pass", "fail"):
        assert document["steps"][0]["answer"] == {"text": answers["screen"], "by": "given"}


def test_an_entered_text_is_a_variable(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script()
    plan = load(tmp_path, "[[step]]\nname = 'box'\nenter = 'Box?'\nsave = 'box'\nstop = true\n"
                "limits.text = { matches = '^B' }\n[[step]]\nat = 'AT^B=${box}'\n")
    assert verdicts(Bench(plan, peer, answers={"box": "B7"}).run()) == ["pass", "pass"]
    assert peer.script.asked[-1] == "AT^B=B7"
    assert verdicts(Bench(plan, peer, answers={"box": "C7"}).run()) == ["fail", "skipped"]


def test_a_slow_pattern_ends_the_step_not_the_run(tmp_path: Path, peer: Peer) -> None:
    slow = (b"a" * 64 + b"b\r\n" + OK)
    peer.script = Script(texts={"AT+X": [slow]}, requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})
    plan = load(tmp_path,
                "[[step]]\nat = 'AT+X'\nlimits.reply = { matches = '(a|aa)+$' }\n" + ADC)
    document = Bench(plan, peer).run()
    assert verdicts(document) == ["error", "pass"] and "took longer" in document["reason"]


# the end from outside

@pytest.mark.parametrize("how", [INTERRUPTED, TERMINATED])
@pytest.mark.parametrize("step", ["[[step]]\nat = 'AT+SILENT'\n", "[[step]]\nwait = 60\n"])
def test_the_first_request_ends_the_step_and_does_what_is_always_done(
        tmp_path: Path, peer: Peer, records: Path, how: Any, step: str) -> None:
    peer.script = Script(texts={"AT+SILENT": []})

    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["number"] == 1:
            bench.abort(how)

    bench = Bench(load(tmp_path, step + ADC + WRITE_VERDICT), peer, records=records, on_event=stop)
    document = bench.run()
    assert verdicts(document) == ["error", "skipped", "pass"] and stored_verdict(bench) == 2
    assert (document["verdict"], document["state"]) == ("ABORTED", "aborted")
    assert document["exit_status"] == how.exit_status and document["reason"].endswith(how.reason)


def test_the_second_request_leaves_at_once(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = Script(texts={"AT+SILENT": []})

    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began":
            bench.abort(INTERRUPTED)

    bench = Bench(load(tmp_path, "[[step]]\nwait = 60\n[[always]]\nat = 'AT+SILENT'\n"
                       + WRITE_VERDICT), peer, records=records, on_event=stop)
    document = bench.run()
    assert verdicts(document) == ["error", "error", "skipped"]
    assert document["verdict"] == "ABORTED"


def test_always_steps_have_seconds_only_once_a_run_was_ended(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script(texts={"AT+SILENT": []})

    def stop(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["number"] == 1:
            bench.abort(INTERRUPTED)

    bench = Bench(load(tmp_path, "[[step]]\nwait = 60\n[[always]]\nwait = 60\n"), peer,
                  on_event=stop)
    document = bench.run()
    assert verdicts(document) == ["error", "error"]
    assert "no time is left" in document["steps"][1]["reason"]


def test_the_deadline_of_a_run(tmp_path: Path, peer: Peer) -> None:
    peer.script = Script()
    bench = Bench(load(tmp_path, "deadline = 0.5\n[[step]]\nwait = 60\n" + ADC + WRITE_VERDICT),
                  peer)
    document = bench.run()
    assert verdicts(document) == ["error", "skipped", "pass"] and stored_verdict(bench) == 2
    assert document["verdict"] == "ERROR" and "deadline of 0.5 s" in document["reason"]


def test_a_view_that_fails_harms_nobody(tmp_path: Path, peer: Peer) -> None:
    peer.script = script(15)

    def fail(event: dict[str, Any]) -> None:
        raise BrokenPipeError("nobody reads")

    assert Bench(load(tmp_path, ADC), peer, on_event=fail).run()["verdict"] == "PASS"


def test_runs_side_by_side(tmp_path: Path) -> None:
    peers = [Peer(EnvelopeDecoder()) for _ in range(4)]
    plan = load(tmp_path, ADC * 10)
    documents: dict[int, Any] = {}

    def work(number: int) -> None:
        peers[number].script = script(10 + number)
        documents[number] = Bench(plan, peers[number]).run()

    threads = [in_thread(lambda number=number: work(number))  # type: ignore[misc]
               for number in range(4)]
    for thread in threads:
        thread.join(300)
    for number in range(4):
        assert documents[number]["verdict"] == "PASS"
        assert {step["values"][0]["value"] for step in documents[number]["steps"]} == {10 + number}
    for peer in peers:
        peer.close()


def test_a_port_that_goes_and_comes_back(tmp_path: Path, peer: Peer) -> None:
    second = Peer(EnvelopeDecoder())
    second.script = script(15)
    first_script = Script()
    peer.script = first_script
    opened: list[Peer] = []

    def open_port() -> Port:
        opened.append(peer if not opened else second)
        return FdPort(opened[-1].slave)

    def pull(event: dict[str, Any]) -> None:
        if event["event"] == "step-began" and event["number"] == 1:
            threading.Timer(0.3, peer.hang_up).start()

    plan = load(tmp_path, "[[step]]\nwait = 0.1\nreconnect = 20\n" + ADC)
    document = Bench(plan, peer, open_port=open_port, on_event=pull).run()
    second.close()
    assert verdicts(document) == ["pass", "pass"] and document["verdict"] == "PASS"
