"""./dev fuzz: its options, what it reads of the engine's words, its table, and the corpora."""

from pathlib import Path
from typing import Sequence

import pytest

from tools.fuzz import main as fuzz
from tools.fuzz import properties, targets
from tools.fuzz.properties import Properties
from tools.fuzz.targets import Figures
from tools.project import PROJECT

SAID = b"""INFO: seed corpus: files: 7
#8\tINITED cov: 102 ft: 211 corp: 7/84b exec/s: 0 rss: 31Mb
#4096\tpulse  cov: 104 ft: 213 corp: 7/84b lim: 4 exec/s: 2048 rss: 33Mb
#12960\tDONE   cov: 105 ft: 313 corp: 43/624b lim: 80 exec/s: 1296 rss: 72Mb
stat::number_of_executed_units: 12960
stat::average_exec_per_sec:     1296
stat::new_units_added:          56
"""
# In the engine's place: says what it says, and makes an input, or takes one.
ENGINE = """#!/bin/sh
echo "$(basename "$(dirname "$0")") $1" >> {log}
case $1 in
    -merge=1) cp "$4"/* "$3" ;;
    -runs=0) echo "again: $(cat "$3/one")"; exit {again} ;;
    *) echo input > "$6/one"; cat {said} ;;
esac
exit {status}
"""


def options(monkeypatch: pytest.MonkeyPatch, *words: str) -> dict[str, object]:
    """What a command line asks for."""
    monkeypatch.setattr("sys.argv", ["fuzz", *words])
    return vars(fuzz.parse())


def place_engine(monkeypatch: pytest.MonkeyPatch, folder: Path, status: int = 0,
                 again: int = 0) -> None:
    """Targets that are one shell script; AGAIN is the status of a run with the sanitizers alone."""
    (folder / "said").write_bytes(SAID)
    for name in ("PROGRAMS", "PLAIN_PROGRAMS"):
        program = folder / name / "packet-fuzz"
        program.parent.mkdir()
        program.write_text(ENGINE.format(said=folder / "said", status=status, again=again,
                                         log=folder / "ran"))
        program.chmod(0o755)
        monkeypatch.setattr(targets, name, program.parent)
    monkeypatch.setattr(targets, "CORPORA", folder / "corpus")
    monkeypatch.setattr(fuzz, "FOUND", folder / "found")


@pytest.mark.parametrize("words, seconds", [
    ((), 60), (("5",), 5), (("--nightly",), 3600), (("--nightly", "0.5"), 1800)])
def test_lengths(monkeypatch: pytest.MonkeyPatch, words: Sequence[str], seconds: int) -> None:
    assert options(monkeypatch, *words)["seconds"] == seconds


def test_other_options(monkeypatch: pytest.MonkeyPatch) -> None:
    found = options(monkeypatch, "-j", "3", "--grow", "--target", "packet", "--target", "hub")
    assert (found["jobs"], found["grow"], found["target"]) == (3, True, ["packet", "hub"])
    assert options(monkeypatch)["grow"] is False


@pytest.mark.parametrize("words", [
    ("0",), ("x",), ("5", "--nightly"), ("-j", "0"), ("--nightly", "0"), ("--target", "none"),
    ("--executions", "0"), ("--executions", "2147483648"), ("--executions", "5", "--nightly"),
    ("5", "--executions", "5")])
def test_nonsense_is_refused(monkeypatch: pytest.MonkeyPatch, words: Sequence[str]) -> None:
    with pytest.raises(SystemExit) as ended:
        options(monkeypatch, *words)
    assert ended.value.code == 2


def test_the_engines_words_are_read() -> None:
    figures = targets.read_figures("packet", SAID)
    assert (figures.executions, figures.edges_before, figures.edges) == (12960, 102, 105)
    assert figures.new_edges == 3 and not figures.is_finding


def test_a_target_that_says_nothing_is_a_finding() -> None:
    assert targets.read_figures("packet", b"").is_finding
    assert Figures("packet", status=77, executions=5).is_finding


def test_a_corpus_grows_only_when_asked(monkeypatch: pytest.MonkeyPatch, tmp_path: Path) -> None:
    place_engine(monkeypatch, tmp_path)
    figures = fuzz.run_target("packet", 1, False)
    assert (figures.executions, figures.grown, figures.is_finding) == (12960, 0, False)
    assert not (tmp_path / "corpus").exists()
    assert fuzz.run_target("packet", 1, True).grown == 1
    assert (tmp_path / "corpus" / "packet" / "one").read_text() == "input\n"
    assert fuzz.run_target("packet", 1, True).grown == 0


def test_what_a_finding_needs_is_not_taken(monkeypatch: pytest.MonkeyPatch,
                                           tmp_path: Path) -> None:
    place_engine(monkeypatch, tmp_path, status=77)
    figures = fuzz.run_target("packet", 1, True)
    assert figures.is_finding and not (tmp_path / "corpus").exists()
    assert "number_of_executed_units" in figures.report


@pytest.mark.parametrize("again", [0, 77])
def test_executions_are_counted_without_sanitizers_and_what_is_new_runs_with_them(
        monkeypatch: pytest.MonkeyPatch, tmp_path: Path, again: int) -> None:
    place_engine(monkeypatch, tmp_path, again=again)
    figures = fuzz.run_target("packet", 1, True, 1_000_000_000)
    assert (tmp_path / "ran").read_text().splitlines() == [
        "PLAIN_PROGRAMS -runs=1000000000", "PROGRAMS -runs=0",
        *([] if again else ["PLAIN_PROGRAMS -merge=1"])]
    assert (figures.executions, figures.status, figures.is_finding) == (12960, again, again != 0)
    assert figures.report.endswith("again: input\n")


def test_what_fails_without_sanitizers_is_a_finding(monkeypatch: pytest.MonkeyPatch,
                                                    tmp_path: Path) -> None:
    place_engine(monkeypatch, tmp_path, status=77)
    assert fuzz.run_target("packet", 1, False, 5).is_finding
    assert len((tmp_path / "ran").read_text().splitlines()) == 1


def test_the_table_and_its_last_line() -> None:
    runs = [Figures("packet", 0, 10.0, 2_000_000, 100, 103, 2),
            Figures("log", 0, 10.0, 50, 70, 70, 0)]
    assert fuzz.describe(runs).splitlines() == [
        "target  executions  a second  edges  new edges  inputs taken",
        "packet   2,000,000   200,000    103          3             2",
        "log             50         5     70          0             0", "",
        "2,000,050 executions; new edges: packet; findings: none"]
    runs[1].status = 1
    assert fuzz.describe(runs[1:]).endswith("new edges: none; findings: log")


def test_the_line_of_the_python_readers() -> None:
    assert fuzz.describe_properties(Properties(3000, 2, 60.4)) == (
        "Python readers: 3,000 examples in 2 rounds of 60 s: all held")
    assert fuzz.describe_properties(Properties(1, 1, 1.0, 1)).endswith("NOT ALL HELD")


def test_the_files_of_the_python_readers_are_there() -> None:
    for name in properties.FILES:
        assert (PROJECT / name).is_file()


def test_every_target_has_a_corpus() -> None:
    for name in targets.names():
        inputs = list((targets.CORPORA / name).iterdir())
        assert inputs and all(path.stat().st_size <= 8192 for path in inputs), name
