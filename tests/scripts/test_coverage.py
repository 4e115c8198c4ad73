"""The floors of what the tests must run: what is below one, and what is not."""

import subprocess
import sys
from pathlib import Path

import pytest

PROJECT = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(PROJECT))

from tools.coverage import daemon, floors, parts, pc  # noqa: E402
from tools.coverage.floors import FileCount, Floor, Share, judge  # noqa: E402
from tools.suites import SUITES  # noqa: E402

FLOOR = Floor("checksum", ("amt/amt-checksum.",), 97, 90)


def counted(lines: int, branches: int, path: str = "amt/amt-checksum.cpp") -> FileCount:
    return FileCount(path, Share(lines, 1000), Share(branches, 1000))


@pytest.mark.parametrize("lines, branches, holds", [
    (1000, 1000, True), (970, 900, True), (969, 900, False), (970, 899, False), (0, 0, False)])
def test_a_floor_holds_what_is_not_below_it(lines: int, branches: int, holds: bool) -> None:
    result, = judge([FLOOR], [counted(lines, branches)])
    assert result.holds is holds
    assert str(result).endswith("  BELOW") is not holds


def test_files_below_a_floor_are_taken_together() -> None:
    result, = judge([FLOOR], [counted(1000, 1000), counted(900, 700, "amt/amt-checksum.h"),
                              counted(0, 0, "amt/amt-packet.cpp")])
    assert (result.lines, result.branches) == (Share(1900, 2000), Share(1700, 2000))
    assert not result.holds


def test_almost_all_is_not_all() -> None:
    whole = Floor("registry", ("amt/",), 100, 100)
    result, = judge([whole], [FileCount("amt/x.cpp", Share(99999, 100000), Share(1, 1))])
    assert not result.holds


def test_a_floor_without_files_does_not_hold() -> None:
    result, = judge([FLOOR], [counted(1, 1, "amt/amt-packet.cpp")])
    assert not result.holds
    assert str(result) == "checksum: no file of it was counted"


def test_nothing_to_branch_is_no_shortage() -> None:
    result, = judge([FLOOR], [FileCount("amt/amt-checksum.h", Share(3, 3), Share(0, 0))])
    assert result.holds
    assert str(result) == "checksum: lines 100.00 % (3 of 3), floor 97 %"


def test_where_nothing_was_counted_nothing_is_held(tmp_path: Path,
                                                   monkeypatch: pytest.MonkeyPatch,
                                                   capsys: pytest.CaptureFixture[str]) -> None:
    monkeypatch.setattr(daemon, "BUILD", tmp_path)
    monkeypatch.setattr(pc, "WORK", tmp_path)
    monkeypatch.setattr(pc, "DATA", tmp_path / "counts")
    assert not parts.hold(parts.PARTS)
    said = capsys.readouterr().out
    assert "registry: no file of it was counted\n" in said
    assert "daemon: nothing was counted\n" in said and "pc: nothing was counted\n" in said


def test_every_floor_names_files_that_are_there() -> None:
    listed = subprocess.run(["git", "ls-files"], cwd=PROJECT, check=True, capture_output=True,
                            text=True).stdout.splitlines()
    for floor in (*floors.DAEMON, *floors.PC):
        for begin in floor.begins:
            assert any(path.startswith(begin) for path in listed), begin


def test_what_counts_takes_its_place_among_the_suites(tmp_path: Path,
                                                      monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setattr(daemon, "BUILD", tmp_path)
    old = tmp_path / "amt" / "amt-cfg.gcda"
    old.parent.mkdir()
    old.write_bytes(b"")
    ordinary = [suite for suite in SUITES if not suite.is_extra]
    counted_by = daemon.counting(ordinary)
    names = [suite.name for suite in ordinary]
    assert [suite.name for suite in counted_by] == [
        name.replace("unit", "unit-coverage") for name in names] + ["system-coverage"]
    assert {suite.preset for suite in counted_by if "coverage" in suite.name} == {"coverage"}
    assert not old.exists()


def test_only_who_is_asked_to_counts(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    for name, path in (("WORK", tmp_path), ("STARTER", tmp_path / "start"),
                       ("SETTINGS", tmp_path / "settings.ini"), ("DATA", tmp_path / "counts")):
        monkeypatch.setattr(pc, name, path)
    suite, = pc.counting([suite for suite in SUITES if suite.name in pc.NAMES])
    code = "import sys; print('coverage' in sys.modules)"

    def said(**more: str) -> str:
        return subprocess.run([sys.executable, "-c", code], check=True, capture_output=True,
                              text=True, env=more).stdout

    assert said(**suite.environment) == "True\n"
    assert list(tmp_path.glob("counts.*"))
    assert said(PYTHONPATH=suite.environment["PYTHONPATH"]) == "False\n"


def test_an_unknown_part_is_refused() -> None:
    ended = subprocess.run([sys.executable, "-P", "-m", "tools", "coverage.main", "everything"],
                           cwd=PROJECT, check=False, capture_output=True, text=True,
                           env={"PYTHONPATH": str(PROJECT)})
    assert ended.returncode == 2
    assert ended.stderr.endswith("no such part: everything (there are: daemon, pc)\n")
