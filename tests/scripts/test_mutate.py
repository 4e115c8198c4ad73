"""The small defects that `./dev mutate` puts into the daemon, and how it counts them."""

import subprocess
import sys
from pathlib import Path
from typing import Callable

import pytest

PROJECT = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(PROJECT))

from tools.mutants import copy, draw  # noqa: E402
from tools.mutants.areas import AREAS, further  # noqa: E402
from tools.mutants.daemon_workshop import DaemonWorkshop  # noqa: E402
from tools.mutants import main as mutate  # noqa: E402
from tools.mutants.fate import Fate, Trial  # noqa: E402
from tools.mutants.masked import masked, masked_python  # noqa: E402
from tools.mutants.operators import Mutant, mutants_of  # noqa: E402
from tools.mutants.pc_workshop import PcWorkshop  # noqa: E402

SOURCE = '''#include "a < b"
#define LESS(a, b) \\
    ((a) < (b))
/* if (a < b) {
   1 == 2 */
int f(int a) // a == 3
{
    if (a < 40) {
        PUB_LOG(g_log, "a is %d\\n",
                a);
        g(a);
    }
    bool is_done = a != 'x' && true;
    a += 0x1F;
    switch (a) {
    case 5u:
        break;
    }
    return PUB_ERR_INPUT;
}
'''


PYTHON = '''"""Of 1 == 2."""


def f(a: int, b: "list[int]") -> bool:
    """If a < b, and 3."""
    text = f"{a + 4} is it"  # a == 5
    if a is not None and a < 6:
        raise ValueError("too much")
    while a in b:
        a += 0x1F
        b.append(a)
        continue
    call(a,
         True)
    return a - 7 != 8
'''


def of_kind(kind: str, path: str = "f.cpp", source: str = SOURCE) -> list[tuple[int, str, str]]:
    return [(mutant.line, mutant.before, mutant.text)
            for mutant in mutants_of(path, source) if mutant.operator == kind]


@pytest.mark.parametrize("kind, expected", [
    ("comparison", [(8, "<", "<="), (13, "!=", "==")]),
    ("logic", [(13, "&&", "||")]),
    ("condition", [(8, "a < 40", "!(a < 40)")]),
    ("constant", [(8, "40", "41"), (14, "0x1F", "32"), (16, "5u", "6u")]),
    ("arithmetic", [(14, "+=", "-=")]),
    ("flag", [(13, "true", "false")]),
    ("log", [(9, 'PUB_LOG(g_log, "a is %d\\n",\n                a);', ";")]),
    ("statement", [(11, "g(a);", ";"), (14, "a += 0x1F;", ";")]),
    ("status", [(19, "PUB_ERR_INPUT", "PUB_ERR_NONE")]),
    ("text", [(9, '"a is %d\\n"', '"a ix %d\\n"')]),
    ("break", [(17, "break;", ";")]),
])
def test_each_kind(kind: str, expected: list[tuple[int, str, str]]) -> None:
    assert of_kind(kind) == expected


@pytest.mark.parametrize("kind, expected", [
    ("comparison", [(7, "<", "<="), (15, "!=", "==")]),
    ("identity", [(7, "is not", "is")]),
    ("logic", [(7, "and", "or")]),
    ("condition", [(7, "a is not None and a < 6", "not (a is not None and a < 6)")]),
    ("constant", [(7, "6", "7"), (10, "0x1F", "32"), (15, "7", "8"), (15, "8", "9")]),
    ("arithmetic", [(10, "+=", "-="), (15, "-", "+")]),
    ("flag", [(14, "True", "False")]),
    ("statement", [(10, "a += 0x1F", "pass"), (11, "b.append(a)", "pass")]),
    ("return", [(15, "return a - 7 != 8", "return None")]),
    ("refusal", [(8, 'raise ValueError("too much")', "pass")]),
    ("text", [(4, '"list[int]"', '"list[inx]"'), (8, '"too much"', '"too mucx"')]),
    ("break", [(12, "continue", "pass")]),
])
def test_kinds_of_the_packages(kind: str, expected: list[tuple[int, str, str]]) -> None:
    found = of_kind(kind, "f.py", PYTHON)
    assert found == expected


@pytest.mark.parametrize("path, source", [("f.cpp", SOURCE), ("f.py", PYTHON)])
def test_a_mutant_changes_one_place_only(path: str, source: str) -> None:
    for mutant in mutants_of(path, source):
        changed = mutant.applied(source)
        assert changed != source
        assert changed[:mutant.start] == source[:mutant.start]
        assert changed[mutant.start + len(mutant.text):] == source[mutant.end:]
        assert source[mutant.start:mutant.end] == mutant.before


@pytest.mark.parametrize("mask, source", [(masked, SOURCE), (masked_python, PYTHON)])
def test_the_mask_keeps_every_place(mask: Callable[[str], str], source: str) -> None:
    code = mask(source)
    assert [len(line) for line in code.split("\n")] == [len(line) for line in source.split("\n")]


def test_a_list_tells_mutants_of_like_lines_apart() -> None:
    source = "int f(int a)\n{\n    a += 1 + 1;\n    g();\n    a += 1 + 1;\n    return a;\n}\n"
    listed = [mutant.listed for mutant in mutants_of("f.cpp", source)]
    constant = "f.cpp: a += 1 + 1;: constant: 1 -> 2"
    assert [one for one in listed if "constant" in one] == [
        f"{constant} ({turn} of 4)" for turn in (1, 2, 3, 4)]
    assert "f.cpp: g();: statement: g(); -> ;" in listed
    assert len(set(listed)) == len(listed)


def test_what_a_type_checker_is_told_is_no_code() -> None:
    source = "def f(a: int | None) -> int:\n    assert a is not None and a > 7\n    return a\n"
    assert [(mutant.operator, mutant.line) for mutant in mutants_of("f.py", source)] == [
        ("return", 3)]


def test_the_mask_leaves_only_code() -> None:
    code = masked(SOURCE)
    assert "include" not in code and "LESS" not in code and "3" not in code and "40" in code


def test_the_same_seed_draws_the_same() -> None:
    files = {"a.cpp": SOURCE, "b.cpp": SOURCE * 3}
    first, again, other = ([one.name for one in draw.drawn(files, seed)] for seed in (1, 1, 2))
    assert first == again != other
    assert sorted(first) == sorted(other) and len(set(first)) == len(first)
    assert len(first) == sum(len(list(mutants_of(*item))) for item in files.items())


@pytest.mark.parametrize("sources, path, example", [
    (draw.sources, "f.cpp", SOURCE), (draw.pc_sources, "f.py", PYTHON)])
def test_of_the_code_itself(sources: Callable[[], dict[str, str]], path: str,
                            example: str) -> None:
    """Every kind has something to change there, in every file with code."""
    files = sources()
    found = [mutant for name, source in files.items() for mutant in mutants_of(name, source)]
    assert {mutant.operator for mutant in found} == {
        mutant.operator for mutant in mutants_of(path, example)}
    without = {name for name in files if not name.endswith("__init__.py")} - {
        mutant.path for mutant in found}
    assert len(without) < len(files) / 20, without


EQUAL = sorted(draw.known_equal(draw.EQUAL.read_text()))


@pytest.mark.parametrize("path", sorted({name.split(":", 1)[0] for name in EQUAL}))
def test_what_is_known_to_be_equal_is_still_a_mutant(path: str) -> None:
    mutants = {mutant.listed for mutant in mutants_of(path, (PROJECT / path).read_text())}
    assert [name for name in EQUAL if name.startswith(f"{path}: ") and name not in mutants] == []


def test_the_list_of_equal_ones() -> None:
    text = "# a word\n\na.cpp: f(\"#\");: text: \"#\" -> \"x\" # nobody reads it\n"
    assert draw.known_equal(text) == {'a.cpp: f("#");: text: "#" -> "x"': "nobody reads it"}


def mutant(number: int) -> Mutant:
    return Mutant("a.cpp", "constant", number, number + 1, "2", number, "1", "f(1);")


def test_the_score(capsys: pytest.CaptureFixture[str], tmp_path: Path,
                   monkeypatch: pytest.MonkeyPatch) -> None:
    equal = tmp_path / "equal.txt"
    equal.write_text("")
    monkeypatch.setattr(mutate, "EQUAL", equal)
    found = [Trial(mutant(number), fate) for number, fate in
             enumerate((Fate.UNIT, Fate.AREA, Fate.SYSTEM, Fate.SANITIZED))]
    lost = Trial(mutant(9), Fate.SURVIVED)
    assert mutate.report(found, [Trial(mutant(8), Fate.SAME)]) == 0
    assert capsys.readouterr().out == (
        "4 of 4 mutants found, 100.0 %; 0 more are known to be equal\n")
    assert mutate.report([*found, lost], []) == 1
    assert capsys.readouterr().out == (
        "survived: a.cpp:9: constant: 1 -> 2\n"
        "    ./dev mutate --of daemon --only a.cpp:9:constant\n"
        "4 of 5 mutants found, 80.0 %; 0 more are known to be equal\n")
    equal.write_text("a.cpp: f(1);: constant: 1 -> 2 # nobody can tell\n")
    assert mutate.report([*found, lost], []) == 0
    assert capsys.readouterr().out.endswith("\n4 of 4 mutants found, 100.0 %; 1 more are known to "
                                            "be equal\n")


def test_the_area_of_a_source() -> None:
    workshop = DaemonWorkshop.__new__(DaemonWorkshop)
    workshop._rows = [(["amt/amt-handle/at"], ["tests/system/test_at_commands.py",
                                               "tests/unit/amt/x-test.cpp"])]
    assert workshop.area("amt/amt-handle/at/at-radio.cpp")[0] == "tests/system/test_at_commands.py"
    assert all(name.startswith("tests/system/") for name in
               workshop.area("amt/amt-handle/at/at-radio.cpp"))


@pytest.mark.parametrize("row", sorted(AREAS))
def test_a_row_of_the_further_areas(row: str) -> None:
    """It is about a source that is there, and names tests that are."""
    assert [path for path in draw.sources() if path.startswith(row)]
    assert [name for name in AREAS[row]
            if not (PROJECT / "tests" / "system" / f"test_{name}.py").is_file()] == []


def test_the_further_areas_of_a_source() -> None:
    assert further("amt/amt-device/hal-library.cpp") == [
        "tests/system/test_hal.py", "tests/system/test_audio.py", "tests/system/test_dialogues.py"]
    assert not further("amt/amt-packet.cpp")


@pytest.mark.parametrize("finder, fate", [
    ("unit release", Fate.UNIT), ("a.py", Fate.AREA),
    ("tests/system --ignore=a.py", Fate.SYSTEM),
    ("unit asan", Fate.SANITIZED), ("nobody", Fate.SURVIVED)])
def test_the_stages(finder: str, fate: Fate, monkeypatch: pytest.MonkeyPatch) -> None:
    """In this order, each only when the one before has found nothing."""
    workshop = DaemonWorkshop.__new__(DaemonWorkshop)
    tried: list[str] = []

    def run(stage: str) -> str:
        tried.append(stage)
        return "a test" if stage == finder else ""

    monkeypatch.setattr(workshop, "area", lambda path: ["a.py"])
    monkeypatch.setattr(workshop, "_build", lambda preset: (0, ""))
    monkeypatch.setattr(workshop, "_unit", lambda preset="release": run(f"unit {preset}"))
    monkeypatch.setattr(workshop, "_system", lambda tests: run(" ".join(tests)))
    assert workshop._tested(mutant(1)).fate is fate
    stages = ["unit release", "a.py", "tests/system --ignore=a.py", "unit asan"]
    assert tried == stages[:stages.index(finder) + 1 if finder in stages else None]


def test_the_area_of_a_package(monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setattr("tools.mutants.pc_workshop.COPY", PROJECT)
    workshop = PcWorkshop.__new__(PcWorkshop)
    assert workshop.area("amt_station/wire/decoder.py") == (
        "tests/station/test_station_decoder.py", "tests/station/test_station_wire.py")
    assert "tests/line/test_line_limits.py" in workshop.area("amt_line/plan/limits.py")


def test_the_copy(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    """It becomes what the project is, links too, whatever an earlier try has left in it."""
    monkeypatch.setattr(copy, "COPY", tmp_path)
    source, link = "amt/main.cpp", "amt_station/requests/amt-command.def"
    for name, text in ((source, "a mutant\n"), ("amt/gone.cpp", ""), ("build/kept", "")):
        (tmp_path / name).parent.mkdir(parents=True, exist_ok=True)
        (tmp_path / name).write_text(text)
    copy.bring_up_to_date()
    assert (tmp_path / source).read_bytes() == (PROJECT / source).read_bytes()
    assert (tmp_path / link).is_symlink() and (tmp_path / link).read_bytes()
    assert not (tmp_path / "amt/gone.cpp").exists() and (tmp_path / "build/kept").exists()
    before = (tmp_path / source).stat().st_mtime_ns
    copy.bring_up_to_date()
    assert (tmp_path / source).stat().st_mtime_ns == before, "what is unchanged is not built again"


@pytest.mark.parametrize("words, status, said", [
    (("--list", "5"), 0, ": "), (("--of", "pc", "--list", "5"), 0, ".py:"),
    (("0",), 2, "positive"), (("--only", "x:1:y"), 1, "no such mutant"),
])
def test_the_command_line(words: tuple[str, ...], status: int, said: str) -> None:
    ended = subprocess.run([PROJECT / "dev", "mutate", *words], capture_output=True, text=True,
                           timeout=300, check=False)
    assert ended.returncode == status
    assert said in ended.stdout + ended.stderr
    assert status or len(ended.stdout.splitlines()) == 5
