"""The desk: questions of many slots, answered once, by whoever is first."""

from __future__ import annotations

import threading
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, Script, in_thread
from line_slots import PATIENCE, Bench, battery

from amt_line.plan.inputs import Input
from amt_line.run.desk import (INPUT, TEXT, YES_NO, Desk, NoSuchQuestion, NoSuchSlot, NotAnAnswer,
                               OpenQuestion, fits_kind)
from amt_line.run.stop import Aborted
from amt_line.view.keyboard import Typing

ASKS = ("[input.sn]\nprompt = 'Scan it'\npattern = 'K[0-9]+'\n" + ADC
        + "[[step]]\nname = 'screen'\nask = 'White?'\n")
PNG = b"\x89PNG\r\n\x1a\n"


def laid(desk: Desk, number: str, kind: str = YES_NO, slot: str = "A", fits: Any = None
         ) -> OpenQuestion:
    """A question on the desk."""
    question = OpenQuestion(number, slot, "run", kind, f"name {number}", f"text {number}?")
    desk.open(question, fits or fits_kind(kind))
    return question


def no_end() -> None:
    """Nobody ends the waiting."""


def test_the_first_answer_counts() -> None:
    desk = Desk()
    question = laid(desk, "1")
    assert desk.questions() == [question]
    desk.answer("1", " YES ", "page")
    with pytest.raises(NoSuchQuestion):
        desk.answer("1", "no", "terminal")
    assert desk.questions() == []
    answer = desk.wait("1", no_end)
    assert (answer.text, answer.by, answer.yes) == ("YES", "page", True)


@pytest.mark.parametrize("kind, text", [(YES_NO, "perhaps"), (YES_NO, ""), (TEXT, ""),
                                        (TEXT, "a\x07b"), (TEXT, "x" * 4097), (INPUT, "X1")])
def test_what_is_no_answer_leaves_the_question_open(kind: str, text: str) -> None:
    desk = Desk()
    laid(desk, "1", kind, fits=Input("sn", "sn", pattern="K.*").read if kind == INPUT else None)
    with pytest.raises(NotAnAnswer):
        desk.answer("1", text, "page")
    assert len(desk.questions()) == 1


def test_of_many_who_answer_at_once_one_wins() -> None:
    desk, won = Desk(), []
    laid(desk, "1", TEXT)
    start = threading.Barrier(8)

    def work(number: int) -> None:
        start.wait(PATIENCE)
        try:
            desk.answer("1", f"answer {number}", "page")
            won.append(f"answer {number}")
        except NoSuchQuestion:
            pass

    threads = [in_thread(lambda number=number: work(number))  # type: ignore[misc]
               for number in range(8)]
    for thread in threads:
        thread.join(PATIENCE)
    assert won == [desk.wait("1", no_end).text]


def test_a_question_that_nobody_wants_any_more() -> None:
    desk = Desk()
    laid(desk, "1")

    def end() -> None:
        raise Aborted("ended")

    with pytest.raises(Aborted):
        desk.wait("1", end)
    assert desk.questions() == []
    with pytest.raises(NoSuchQuestion):
        desk.answer("1", "yes", "page")
    with pytest.raises(NoSuchQuestion):
        desk.picture("1")


def test_the_stop_of_a_slot() -> None:
    desk, stopped = Desk(), []
    desk.add_slot("A", lambda: stopped.append("A"))
    desk.stop("A")
    with pytest.raises(NoSuchSlot):
        desk.stop("B")
    assert stopped == ["A"]


def test_ask_is_open_and_wait() -> None:
    desk, got = Desk(), []
    thread = in_thread(lambda: got.append(
        desk.ask("A", "", "name", "text", TEXT, Path("p.png"), no_end)))
    while not desk.questions():
        thread.join(0.01)
    (question,) = desk.questions()
    assert desk.picture(question.id) == Path("p.png")
    desk.answer(question.id, "L1", "page")
    thread.join(PATIENCE)
    assert got[0].text == "L1"


def test_a_run_asks_at_the_desk(tmp_path: Path, records: Path) -> None:
    (tmp_path / "white.png").write_bytes(PNG)
    with Bench(tmp_path, ASKS + "picture = 'white.png'\n", attended=True, once=True) as bench:
        bench.sockets["A"].plug(battery(15))
        asked = bench.wait("question", kind="input")
        assert (asked["slot"], asked["run"], asked["name"], asked["text"], asked["picture"]) == (
            "A", "", "sn", "Scan it", "")
        with pytest.raises(NotAnAnswer, match="not of the form"):
            bench.desk.answer(asked["id"], "X1", "page")
        bench.desk.answer(asked["id"], "K1", "page")
        asked = bench.wait("question", kind="yes-no")
        assert (asked["name"], asked["picture"]) == ("screen", "white.png") and asked["run"]
        # Whoever hears of a question can answer it at once.
        assert bench.desk.picture(asked["id"]) == tmp_path / "white.png"
        bench.desk.answer(asked["id"], "yes", "terminal")
        assert bench.join() == 0
    answers = [(event["text"], event["by"]) for event in bench.found("answer")]
    assert answers == [("K1", "page"), ("yes", "terminal")]
    document = bench.record(bench.wait("run-ended")["run"])
    assert document["inputs"] == {"sn": "K1"}
    assert document["steps"][1]["answer"] == {"text": "yes", "by": "terminal"}


def test_a_question_is_on_the_desk_when_the_views_hear_of_it(tmp_path: Path) -> None:
    bench = Bench(tmp_path, ASKS, attended=True, once=True)

    def answer(event: Any) -> None:
        if event["event"] == "question":
            bench.desk.answer(event["id"], "yes" if event["kind"] == YES_NO else "K1", "page")

    bench.on_event = answer
    with bench:
        bench.sockets["A"].plug(battery(15))
        assert bench.join() == 0


def test_a_handset_that_goes_while_its_inputs_are_asked_for(tmp_path: Path) -> None:
    with Bench(tmp_path, ASKS, attended=True) as bench:
        bench.sockets["A"].plug(battery(15))
        question = bench.wait("question")
        bench.sockets["A"].pull()
        withdrawn = bench.wait("answer", id=question["id"])
        assert (withdrawn["text"], withdrawn["by"]) == ("", "")
        assert not bench.desk.questions() and bench.verdicts("A") == []
        bench.sockets["A"].plug(battery(15))
        bench.wait("question", 2)


def test_stopping_takes_the_asking_for_inputs_away(tmp_path: Path) -> None:
    with Bench(tmp_path, ASKS, attended=True) as bench:
        bench.sockets["A"].plug(battery(15))
        bench.wait("question")
        bench.desk.stop("A")
        bench.wait("answer")
        bench.wait("slot-state", 2, state="waiting")
        assert bench.verdicts("A") == [] and not bench.desk.questions()


def test_nobody_there_is_no_pass(tmp_path: Path) -> None:
    with Bench(tmp_path, "[[step]]\nname = 'screen'\nask = 'White?'\n", once=True) as bench:
        bench.sockets["A"].plug(Script())
        assert bench.join() == 7
    assert bench.verdicts("A") == ["ERROR"]


# at the terminal

def test_typing_answers_the_oldest_question_and_names_its_slot() -> None:
    desk = Desk()
    typing = Typing(desk)
    typing.take("typed too early\n")
    assert typing.prompt() == "" and typing.text == ""
    laid(desk, "1", TEXT, "A")
    laid(desk, "2", YES_NO, "B")
    assert typing.prompt() == "A: text 1? (Tab: 1 more):"
    typing.take("L12\x7f")
    assert typing.text == "L1"
    typing.take("\n")
    assert desk.wait("1", no_end).text == "L1"
    assert typing.prompt() == "B: text 2? [yes/no]"
    typing.take("perhaps\n")
    assert typing.problem == "yes or no is needed" and typing.text == ""
    typing.take("y\r")
    assert desk.wait("2", no_end).yes and typing.prompt() == ""


def test_what_is_typed_for_one_question_never_answers_another() -> None:
    desk = Desk()
    typing = Typing(desk)
    laid(desk, "1", YES_NO, "A")
    assert typing.prompt().startswith("A: ")
    typing.take("ye")
    desk.withdraw("1")
    laid(desk, "2", YES_NO, "B")
    typing.take("s\n")
    assert typing.problem == "yes or no is needed"
    assert [question.slot for question in desk.questions()] == ["B"]


def test_tab_goes_to_the_next_question_and_escapes_are_shown() -> None:
    desk = Desk()
    typing = Typing(desk)
    laid(desk, "1", TEXT, "A\x1b")
    laid(desk, "2", TEXT, "B")
    assert "\x1b" not in typing.prompt()
    typing.take("half\tL2\n")
    assert desk.wait("2", no_end).text == "L2"
    typing.take("wrong\x15L1\n")
    assert desk.wait("1", no_end).text == "L1"
