"""A daemon under constant load keeps the size it had, on either path; and growth would be seen."""

from dataclasses import replace

import pytest

from tools.soak import LOADS, RESIDENT_BOUND_KIB, WARM_UP_ROUNDS, Grown, Look, soak_all

FIRST = Look(pid=7, descriptors=6, threads=4, children=0, resident_kib=3700)


def test_nothing_grows(request: pytest.FixtureRequest) -> None:
    """Requests, AT text and what is passed to the modem, again and again on both paths."""
    results = soak_all(request.config.getoption("--soak-seconds"),
                       request.config.getoption("--handset-build"))
    print(*results.values(), sep="\n")
    assert {name: result.error for name, result in results.items()} == dict.fromkeys(LOADS, "")
    for name, result in results.items():
        assert result.jobs > WARM_UP_ROUNDS * len(LOADS[name].jobs) and result.last


@pytest.mark.parametrize("change, word", [
    ({"descriptors": 7}, "descriptors"), ({"threads": 5}, "threads"), ({"threads": 3}, "threads"),
    ({"children": 1}, "children"), ({"pid": 8}, "pid"),
    ({"resident_kib": 3700 + RESIDENT_BOUND_KIB + 1}, "resident set"),
])
def test_growth_is_seen(change: dict[str, int], word: str) -> None:
    """One thing more than at first is named."""
    with pytest.raises(Grown, match=f"^{word}:"):
        replace(FIRST, **change).check(FIRST)


def test_a_resident_set_may_move_within_its_bound() -> None:
    """The heap's pages come and go."""
    replace(FIRST, resident_kib=3700 + RESIDENT_BOUND_KIB).check(FIRST)
    replace(FIRST, resident_kib=3000).check(FIRST)
