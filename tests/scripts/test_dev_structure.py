"""The check that holds the house: what may include what, and how small a header may be."""

from pathlib import Path

import pytest

from tools.lint import imports, includes, structure, tested

FLOORS = (("ground",), ("left", "right", "right/low"), ("roof",))


@pytest.mark.parametrize("links", [
    {"roof/a.h": ["ground/b.h", "left/c.h", "roof/d.h"]},
    {"left/a.h": ["left/b.h", "right/b.h"], "right/c.h": ["right/low/d.h"]},
    {"right/low.h": ["ground/a.h"], "right-hand.cpp": ["right/a.h"]},
])
def test_what_goes_down_or_stays_is_no_finding(links: dict[str, list[str]]) -> None:
    assert structure.check_floors(links, FLOORS) == []


def test_an_include_that_goes_up_is_named() -> None:
    assert structure.check_floors({"ground/a.h": ["left/b.h"]}, FLOORS) == [
        "ground/a.h: error: includes left/b.h, which stands above it (ground is below left)"]


def test_rooms_that_include_each_other_are_named_once() -> None:
    links = {"right/a.h": ["left/b.h"], "left/c.h": ["right/d.h"], "left/e.h": ["right/d.h"]}
    assert structure.check_floors(links, FLOORS) == [
        "left: error: left and right include each other: left/c.h includes right/d.h, "
        "right/a.h includes left/b.h"]


def test_a_file_in_no_room_is_named() -> None:
    assert structure.check_floors({"cellar/a.h": []}, FLOORS) == [
        "cellar/a.h: error: lies in no room that tools/lint/rooms.py names"]


def test_the_longest_name_is_the_room() -> None:
    assert structure.room_of("right/low/a.h", FLOORS) == (1, "right/low")
    assert structure.room_of("right/lower/a.h", FLOORS) == (1, "right")
    assert structure.room_of("rights.h", FLOORS) is None


def test_short_headers_want_a_reason(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    for name, lines in (("short.h", 12), ("known.h", 5), ("long.h", 13), ("grown.h", 20)):
        (tmp_path / name).write_text("\n" * lines)
    monkeypatch.setattr(structure, "PROJECT", tmp_path)
    monkeypatch.setattr(structure, "SHORT_HEADERS", {"known.h": "why", "grown.h": "was short"})
    findings = structure.check_headers(["short.h", "known.h", "long.h", "grown.h"])
    assert [finding.split(":")[0] for finding in findings] == ["short.h", "grown.h"]


def test_imports_of_every_form_are_seen(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    for name in ("__init__.py", "one.py", "two.py", "sub/__init__.py", "sub/three.py"):
        path = tmp_path / "house" / name
        path.parent.mkdir(exist_ok=True)
        path.touch()
    (tmp_path / "house" / "sub" / "four.py").write_text(
        "import os\nimport house.one\nfrom house import two, NAME\nfrom . import three\n"
        "def late():\n    from house.sub.three import thing\n")
    monkeypatch.setattr(imports, "PROJECT", tmp_path)
    assert imports.imported_by("house/sub/four.py") == {
        "house/one.py", "house/two.py", "house/__init__.py", "house/sub/three.py"}


def test_includes_are_found_where_the_compiler_finds_them(
        tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    for name in ("room/a.h", "room/b.h", "platform/include/p.h"):
        path = tmp_path / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text('#include "b.h"\n' if name == "room/a.h" else "")
    (tmp_path / "room" / "c.cpp").write_text(
        '#include <p.h>\n#include "room/a.h"\n  #  include "p.h"\n#include "not/there.h"\n')
    monkeypatch.setattr(includes, "PROJECT", tmp_path)
    includes.included_by.cache_clear()
    assert includes.included_by("room/c.cpp") == {"room/a.h", "platform/include/p.h"}
    assert includes.all_included("room/c.cpp") == [
        "platform/include/p.h", "room/a.h", "room/b.h", "room/c.cpp"]
    includes.included_by.cache_clear()


TABLE = """
| source | held by |
|---|---|
| `amt/one.cpp`, `amt/two.cpp` | `tests/system/test_a.py`, together |
| `host/devices` | `tests/unit/devices-test.cpp` |
| `not/a/row` | no test at all |
"""


def test_a_source_is_held_by_a_test_of_its_name_or_by_a_row() -> None:
    rows = tested.read_rows(TABLE)
    assert rows == [(["amt/one.cpp", "amt/two.cpp"], ["tests/system/test_a.py"]),
                    (["host/devices"], ["tests/unit/devices-test.cpp"])]
    sources = ["amt/one.cpp", "amt/two.cpp", "host/devices/a.cpp", "pub/three.cpp"]
    files = [*sources, "tests/system/test_a.py", "tests/unit/devices-test.cpp"]
    assert tested.compare(sources, ["tests/unit/pub/three-test.cpp"], rows, files) == []


def test_a_source_that_nothing_holds_is_named() -> None:
    assert tested.compare(["pub/three.cpp"], ["tests/unit/pub/three-tests.cpp"], [], []) == [
        "pub/three.cpp: error: has no three-test.cpp, and docs/architecture.md does not say which "
        "test holds it"]


def test_a_row_that_names_what_is_gone_is_named() -> None:
    rows = [(["amt/old.cpp"], ["tests/system/test_old.py"])]
    assert tested.compare([], [], rows, ["amt/older.cpp"]) == [
        "docs/architecture.md: error: amt/old.cpp is not there",
        "docs/architecture.md: error: tests/system/test_old.py is not there"]
