"""Calls of the daemon fail, one at a time; and what is not allowed of it would be seen."""

from collections import Counter
from random import Random

import pytest

from amt_station import wire
from tools.torture.cases import MAIN, Case, Counted, Place, draw
from tools.torture.failures import FAILURES, NOTHING, Failure
from tools.torture.main import named, new_seed
from tools.torture.outcomes import RULES, Kind, Outcome, compare, is_allowed, told
from tools.torture.page import Call, Symbols
from tools.torture.play import Heard, Wrong
from tools.torture.report import report
from tools.torture.run import Draw, Torture, sample, whole
from tools.torture.scenes import all_scenes

# Cases that were not stood once. Each must be reached.
MENDED = (
    "app-items:access@readProductResult/g_handle_context#2=EIO",
    "app-items:access@save_result/g_handle_context#4=EIO",
    "app-items:fflush@initTestFile/g_handle_context#1=half",
)


def _show(outcomes: list[Outcome]) -> str:
    return "\n".join(f"./dev torture '{outcome.case}': {'; '.join(outcome.problems)}"
                     for outcome in outcomes if outcome.problems)


def test_calls_that_fail_are_stood(request: pytest.FixtureRequest) -> None:
    """Cases drawn over all scenes and functions."""
    seed, count = new_seed(), request.config.getoption("--torture-cases")
    jobs = request.config.getoption("--torture-jobs")
    torture = Torture(request.config.getoption("--handset-build"),
                      sample(all_scenes(), seed, count, jobs), lambda _outcome: None)
    torture.run()
    print(report(torture.outcomes, list(torture.counted.values())))
    assert not _show(torture.outcomes), f"seed {seed}, {jobs} jobs:\n{_show(torture.outcomes)}"
    assert len(torture.outcomes) == count // jobs * jobs
    reached = [one for one in torture.outcomes if one.verdict is not Kind.NOT_REACHED]
    assert len(reached) > count * 0.7


def test_mended_cases_stay_mended(request: pytest.FixtureRequest) -> None:
    """What was found and mended."""
    torture = Torture(request.config.getoption("--handset-build"), whole(*named(MENDED), 1),
                      lambda _outcome: None)
    torture.run()
    assert not _show(torture.outcomes)
    assert {str(outcome.case): outcome.verdict is Kind.NOT_REACHED
            for outcome in torture.outcomes} == dict.fromkeys(MENDED, False)


# the cases

PLACE = Place("write", "amt_handle_send_rsp", "g_handle_context+24")
CASE = Case("pc-at-probe", PLACE, 2, FAILURES["write"][2])


def test_a_case_is_found_again_by_its_name() -> None:
    name = "pc-at-probe:write@amt_handle_send_rsp/g_handle_context+24#2=short"
    assert str(CASE) == name
    assert Case.parse(name) == CASE


@pytest.mark.parametrize("text", ["pc-at-probe", "a:write@b/c#2=tired", "a:dream@b/c#2=EIO",
                                  "a:write@b/c#x=EIO"])
def test_other_names_are_no_cases(text: str) -> None:
    assert Case.parse(text) is None


def test_names_that_nothing_has_are_refused() -> None:
    with pytest.raises(ValueError, match="no such scene or case: app-nothing"):
        named(["app-nothing"])


class _Names(Symbols):
    """A program of two functions."""

    def __init__(self) -> None:
        self._starts = [0x10, 0x20]
        self._names = ["one", "two"]


def test_calls_are_counted_by_function_place_and_thread() -> None:
    calls = [Call("write", 0x11, 0), Call("write", 0x1f, 0), Call("write", 0x21, 0x20),
             Call("sigtimedwait", 0x11, 0)]
    counted = Counted.of("scene", calls, _Names())
    assert counted.counts == {Place("write", "one", MAIN): 2, Place("write", "two", "two"): 1}
    cases = counted.cases()
    assert len(cases) == 3 * len(FAILURES["write"])
    order = counted.order(cases[-1])
    assert order is not None
    assert (order.low, order.high, order.thread, order.nth) == (0x20, 1 << 31, 0x20, 1)
    assert counted.order(CASE) is None


def _counted(*functions: str) -> Counted:
    counts = Counter({Place(function, "symbol", MAIN): 9 for function in functions})
    return Counted("scene", counts, {}, _Names())


def test_functions_are_drawn_evenly() -> None:
    cases = _counted("read", "access", "mkdir").cases()
    used: "Counter[str]" = Counter()
    drawn = draw(cases, 9, Random(1), used)
    assert used == {"read": 3, "access": 3, "mkdir": 3}
    assert len(set(drawn)) == 9
    assert draw(cases, 9, Random(1), Counter()) == drawn != draw(cases, 9, Random(2), Counter())


def test_a_draw_ends_when_all_has_been_drawn() -> None:
    scene = all_scenes()[0]
    one = Draw([scene], "seed", float("inf"))
    counted = _counted("access")
    cases = [case for _ in one.scenes() for case in one.choose(counted)]
    assert sorted(map(str, cases)) == sorted(map(str, counted.cases()))


# the outcomes

REFUSAL = wire.Packet(6, (wire.Atom.integer(1, 1),))
DONE = wire.Packet(6, (wire.Atom.integer(1, 0),))


def _heard(*answers: bytes) -> Heard:
    return Heard([b"", *answers, b"served"])


@pytest.mark.parametrize("answer, kind", [
    (DONE.encode(), Kind.AS_USUAL), (REFUSAL.encode(), Kind.REFUSED), (b"", Kind.SILENT),
    (DONE.encode()[:-1], Kind.OTHERWISE),
    (wire.Packet(6, (wire.Atom.integer(1, 0), wire.Atom.integer(2, 1))).encode(), Kind.OTHERWISE)])
def test_answers_on_the_app_line(answer: bytes, kind: Kind) -> None:
    assert compare(_heard(DONE.encode()), _heard(answer), True) is kind


@pytest.mark.parametrize("answer, kind", [
    (wire.ACKNOWLEDGEMENT + wire.encode_envelope(DONE), Kind.AS_USUAL),
    (wire.ACKNOWLEDGEMENT + wire.encode_envelope(REFUSAL), Kind.REFUSED),
    (wire.encode_envelope(REFUSAL), Kind.REFUSED), (wire.ACKNOWLEDGEMENT, Kind.SILENT),
    (b"\r\n+CME ERROR: 100\r\n", Kind.REFUSED), (b"\r\nOK\r\n", Kind.OTHERWISE)])
def test_answers_on_the_pc_line(answer: bytes, kind: Kind) -> None:
    good = _heard(wire.ACKNOWLEDGEMENT + wire.encode_envelope(DONE))
    assert compare(good, _heard(answer), False) is kind


def test_the_first_difference_counts() -> None:
    good = _heard(b"\r\nOK\r\n", b"\r\nOK\r\n")
    assert compare(good, _heard(b"\r\nERROR\r\n", b""), False) is Kind.REFUSED
    assert compare(good, _heard(b"\r\nOK\r\n", b""), False) is Kind.SILENT


def test_silence_is_allowed_only_where_a_rule_says_so() -> None:
    lost = Case("app-items", Place("read", "amt_wait_read", "g_handle_context"), 1,
                FAILURES["read"][0])
    assert is_allowed(Kind.SILENT, lost)
    assert not is_allowed(Kind.SILENT, CASE)
    assert not is_allowed(Kind.OTHERWISE, Case("app-items", PLACE, 1, NOTHING))
    assert all(rule.why for rule in RULES)


def test_a_file_that_was_not_written_may_be_missing_but_not_half_there() -> None:
    def wrong(name: str, there: bytes | None) -> list[str]:
        return told(Heard(wrong=[Wrong(name, there, b"1\n" * 20)]))

    assert wrong("/amt/amt_result.txt", None) == []
    assert wrong("/amt/amt_result.txt", b"0\n" * 20) == []
    assert wrong("/amt/amt_result.txt", b"0\n" * 19)
    assert wrong("/amt/product.txt", None)


def test_the_table_counts_every_outcome_once() -> None:
    outcomes = [Outcome(CASE, Kind.REFUSED), Outcome(CASE, Kind.AS_USUAL, ["half a file"])]
    text = report(outcomes, [_counted("write")])
    assert text.splitlines()[1].split() == ["write", "2", "-", "1", *["-"] * 8, "1"]
    assert f"./dev torture '{CASE}'\n   half a file" in text
    assert text.endswith("FAIL: outcomes that are not allowed")


def test_every_failure_of_a_function_has_its_own_name() -> None:
    for function, failures in FAILURES.items():
        assert len({failure.name for failure in failures}) == len(failures), function
        assert all(isinstance(failure, Failure) for failure in failures)
