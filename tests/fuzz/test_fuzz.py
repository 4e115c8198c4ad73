"""Every fuzz target, run for a while from its corpus: nothing it finds may crash or hang."""

import os
import subprocess
from pathlib import Path

import pytest

HERE = Path(__file__).resolve().parent
BUILD = HERE.parents[1] / "build" / "fuzz"
TARGETS = sorted(path.name.removesuffix("-fuzz.cpp") for path in HERE.glob("*-fuzz.cpp"))


@pytest.mark.parametrize("target", TARGETS)
def test_target(target: str, tmp_path: Path, request: pytest.FixtureRequest) -> None:
    seconds = request.config.getoption("--fuzz-seconds")
    found = tmp_path / "found"
    found.mkdir()
    ended = subprocess.run(
        [BUILD / "bin" / f"{target}-fuzz", f"-max_total_time={seconds}", "-timeout=10",
         "-rss_limit_mb=2048", "-print_final_stats=1", f"-artifact_prefix={tmp_path}/", str(found),
         str(HERE / "corpus" / target)],
        capture_output=True, text=True, check=False, timeout=seconds + 120,
        env={**os.environ, "ASAN_OPTIONS": "detect_leaks=1"})
    report = ended.stderr
    assert ended.returncode == 0, report[-6000:]
    runs = [int(line.split()[1]) for line in report.splitlines()
            if line.startswith("stat::number_of_executed_units:")]
    assert runs and runs[0] > 100, "the target hardly ran\n" + report[-2000:]
    print(f"{target}: {runs[0]} runs in {seconds} s")
