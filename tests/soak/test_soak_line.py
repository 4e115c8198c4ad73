"""A line keeps the size it had, and every record; and growth, or a loss, would be seen."""

from dataclasses import replace
from pathlib import Path

import pytest

from tools.soak_line import (DESCRIPTORS_BOUND, RESIDENT_BOUND_KIB, THREADS_BOUND, Look, Result,
                             soak)

RUNS = 240
HELD = Look(descriptors=40, threads=20, resident_kib=60000)


def test_no_run_is_lost_and_nothing_is_left(tmp_path: Path) -> None:
    """So few runs say little of memory: what is left behind, or lost, they show."""
    result = soak(RUNS, tmp_path)
    print(result)
    assert [text for text in result.problems if not text.startswith("resident_kib")] == []
    assert sum(result.verdicts.values()) == RUNS
    assert set(result.verdicts) == {"PASS", "FAIL", "ABORTED"}


@pytest.mark.parametrize("name, bound", [
    ("descriptors", DESCRIPTORS_BOUND), ("threads", THREADS_BOUND),
    ("resident_kib", RESIDENT_BOUND_KIB)])
def test_growth_is_seen(name: str, bound: int) -> None:
    """Within the bound is nothing; one more is named."""
    for more, problems in ((bound, 0), (bound + 1, 1)):
        grown = replace(HELD, **{name: getattr(HELD, name) + more})
        result = Result(8, looks=[HELD, HELD, HELD, grown])
        result.judge()
        assert len(result.problems) == problems
        assert not problems or result.problems[0].startswith(name)
