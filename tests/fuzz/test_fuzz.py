"""Every fuzz target, run for a while from its corpus: nothing it finds may crash or hang."""

from pathlib import Path

import pytest

from tools.fuzz import targets


@pytest.mark.parametrize("target", targets.names())
def test_target(target: str, tmp_path: Path, request: pytest.FixtureRequest) -> None:
    """So few seconds find little that is new; they show that the corpus still passes."""
    seconds = request.config.getoption("--fuzz-seconds")
    figures = targets.run(target, seconds, tmp_path / "found")
    assert figures.status == 0, figures.report
    assert figures.executions > 100, "the target hardly ran\n" + figures.report
    assert figures.edges >= figures.edges_before > 0
    print(f"{target}: {figures.executions} runs in {seconds} s")
