"""How ./dev counts tests, names the failed ones, and repeats a suite."""

import subprocess
from contextlib import contextmanager
from pathlib import Path
from typing import Iterator

import pytest

from tools import repeat as repeat_tool
from tools.ctest import run_ctest
from tools.results import Count, describe, read_results
from tools.suites import SUITES

PROJECT = """
cmake_minimum_required(VERSION 3.25)
project(sample NONE)
enable_testing()
add_test(NAME good COMMAND true)
add_test(NAME bad COMMAND sh -c "echo expected 4, got 5; exit 1")
add_test(NAME absent COMMAND sh -c "echo no such device here; exit 77")
set_tests_properties(absent PROPERTIES SKIP_RETURN_CODE 77)
"""

PYTEST_REPORT = """<?xml version="1.0"?><testsuites><testsuite>
<testcase classname="tests.a" name="good"/>
<testcase classname="tests.a" name="bad"><failure message="assert 4 == 5">text</failure>
</testcase>
<testcase classname="tests.a" name="broken"><error message="no fixture"/></testcase>
<testcase classname="tests.a" name="left_out"><skipped message="no kernel for it"/></testcase>
</testsuite></testsuites>
"""


@pytest.fixture
def sample(tmp_path: Path) -> Path:
    """A build with a test that passes, one that fails and one that is skipped."""
    (tmp_path / "CMakeLists.txt").write_text(PROJECT)
    build = tmp_path / "build"
    subprocess.run(["cmake", "-S", tmp_path, "-B", build], check=True, capture_output=True)
    return build


def test_failed_unit_tests_are_named_with_their_output(
        sample: Path, capsys: pytest.CaptureFixture[str]) -> None:
    results = run_ctest(sample, "sample")
    assert str(results.count) == "1 passed, 1 failed, 1 skipped"
    assert capsys.readouterr().out.splitlines() == [
        "FAILED bad", "    expected 4, got 5", "SKIPPED absent: no such device here"]


def test_a_runner_without_tests_has_failed(tmp_path: Path) -> None:
    (tmp_path / "build").mkdir()
    assert run_ctest(tmp_path / "build", "nothing").count == Count(failed=1)


def test_a_report_is_counted(tmp_path: Path) -> None:
    report = tmp_path / "report.xml"
    report.write_text(PYTEST_REPORT)
    results = read_results(report)
    assert results.count == Count(1, 2, 1)
    assert describe(results).splitlines() == [
        "FAILED tests.a::bad", "    assert 4 == 5", "FAILED tests.a::broken", "    no fixture",
        "SKIPPED tests.a::left_out: no kernel for it"]


@pytest.mark.parametrize("content", [None, "", "<testsuite><testcase name="])
def test_a_report_that_is_none_counts_nothing(tmp_path: Path, content: str | None) -> None:
    report = tmp_path / "report.xml"
    if content is not None:
        report.write_text(content)
    assert read_results(report).count == Count()


def test_a_long_output_is_shown_from_its_end(tmp_path: Path) -> None:
    report = tmp_path / "report.xml"
    text = "\n".join(f"line {number}" for number in range(100))
    report.write_text(f'<a><testcase name="t"><failure message="">{text}</failure></testcase></a>')
    lines = describe(read_results(report)).splitlines()
    assert lines[:3] == ["FAILED t", "    (40 more lines)", "    line 40"]
    assert lines[-1] == "    line 99"


def test_repeated_runs_are_told_one_by_one(monkeypatch: pytest.MonkeyPatch,
                                           capsys: pytest.CaptureFixture[str]) -> None:
    counts = iter([Count(5), Count(4, 1), Count(4, 0, 1)])
    builds = []

    @contextmanager
    def beside() -> Iterator[None]:
        builds.append("begun")
        yield
        builds.append("ended")

    monkeypatch.setattr(repeat_tool, "build_beside", beside)
    total = repeat_tool.repeat(SUITES[:1], 3, 1, lambda suites: next(counts))
    assert (total, builds) == (Count(13, 1, 1), ["begun", "ended"])
    told = capsys.readouterr().err.splitlines()[-3:]
    assert [line.split(" in ")[0].strip() for line in told] == [
        "run 1: 5 passed, 0 failed, 0 skipped", "run 2: 4 passed, 1 failed, 0 skipped",
        "run 3: 4 passed, 0 failed, 1 skipped"]
    assert [line.endswith("(a build beside)") for line in told] == [True, False, False]


def test_a_build_beside_goes_on_until_the_run_is_over(monkeypatch: pytest.MonkeyPatch,
                                                      tmp_path: Path) -> None:
    count = tmp_path / "count"
    count.touch()
    monkeypatch.setattr(repeat_tool, "BESIDE", tmp_path / "beside")
    monkeypatch.setattr(repeat_tool, "CONFIGURE", ("true",))
    monkeypatch.setattr(repeat_tool, "BUILD", ("sh", "-c", f"echo one >>{count}; sleep 0.01"))
    with repeat_tool.build_beside():
        while count.read_text().count("one") < 3:
            pass
    built = count.read_text()
    assert count.read_text() == built


def test_a_build_beside_that_fails_is_an_error(monkeypatch: pytest.MonkeyPatch,
                                               tmp_path: Path) -> None:
    began = tmp_path / "began"
    monkeypatch.setattr(repeat_tool, "BESIDE", tmp_path / "beside")
    monkeypatch.setattr(repeat_tool, "CONFIGURE", ("true",))
    monkeypatch.setattr(repeat_tool, "BUILD", ("sh", "-c", f"touch {began}; exit 3"))
    with pytest.raises(SystemExit, match="the build beside ended with status 3"):
        with repeat_tool.build_beside() as beside:
            beside.ended.wait()
