"""What the packages are made with: the platform's tag, refusals, and versions that agree."""

from __future__ import annotations

import re
from pathlib import Path

import pytest
from packages import PROJECT, package

from amt_station import __version__
from tools.package import elf
from tools.package.handset_build import HandsetBuild, made
from tools.package.source import PackageFailed


def test_a_kind_that_is_none(tmp_path: Path) -> None:
    done = package("rpm", "--into", tmp_path / "into")
    assert done.returncode == 2 and done.stderr.endswith(
        "error: no such kind: rpm (there are: wheel, platform, debian, bundle)\n")
    assert not (tmp_path / "into").exists()


@pytest.mark.parametrize("name, said", [
    ("nonsense", "nonsense is no preset (release, "), ("/nowhere/", "/nowhere/ is not there\n"),
])
def test_a_build_that_is_none(name: str, said: str, tmp_path: Path) -> None:
    done = package("bundle", "--build", name, "--into", tmp_path)
    assert done.returncode == 1 and f"\ndev: {said}" in done.stderr
    assert list(tmp_path.iterdir()) == []


def test_a_time_that_is_none(tmp_path: Path) -> None:
    done = package("bundle", "--into", tmp_path, SOURCE_DATE_EPOCH="today")
    assert done.returncode == 1
    assert done.stderr == "dev: SOURCE_DATE_EPOCH is a number of seconds, not 'today'\n"


def test_an_instrumented_build_is_refused(tmp_path: Path) -> None:
    (tmp_path / "build" / "bin").mkdir(parents=True)
    (tmp_path / "build" / "bin" / "vx-kel-amt").write_bytes(b"\x7fELF libasan.so.8\0")
    with pytest.raises(PackageFailed, match="vx-kel-amt is instrumented for tests"):
        made(str(tmp_path / "build"), tmp_path)


def test_a_build_without_stand_ins_is_refused(tmp_path: Path) -> None:
    with pytest.raises(PackageFailed, match="bin/vx-kel-amt is not there; a handset needs all"):
        HandsetBuild(tmp_path).put_all(tmp_path / "into")


def test_the_strip_of_the_build(tmp_path: Path) -> None:
    assert HandsetBuild(tmp_path).strip == "strip"
    (tmp_path / "CMakeCache.txt").write_text("A:B=c\nCMAKE_STRIP:FILEPATH=/x/arm-strip\n", "utf-8")
    assert HandsetBuild(tmp_path).strip == "/x/arm-strip"


def test_a_library_that_not_every_system_has() -> None:
    with pytest.raises(PackageFailed, match="bwrap needs lib.*, which not every system has"):
        elf.platform_tag([Path("/usr/bin/bwrap")])


def test_a_library_of_the_wheels_own(tmp_path: Path) -> None:
    foreign = [tmp_path / name for name in elf.libraries(Path("/usr/bin/bwrap"))]
    for path in foreign:
        path.write_bytes(Path("/usr/bin/true").read_bytes())
    assert elf.platform_tag([Path("/usr/bin/bwrap"), *foreign]).startswith("manylinux_2_")


def test_a_newer_library_of_the_compiler(monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setattr(elf, "NEWEST_CXX", {"GLIBCXX": (3, 4, 1)})
    with pytest.raises(PackageFailed, match="ninja needs GLIBCXX_3.*, which older systems lack"):
        elf.platform_tag([Path("/usr/bin/ninja")])


def test_what_is_no_program(tmp_path: Path) -> None:
    (tmp_path / "text").write_text("text", "utf-8")
    with pytest.raises(PackageFailed, match="text is neither a program nor a library"):
        elf.machine(tmp_path / "text")


def test_all_name_the_same_version() -> None:
    cmake = (PROJECT / "CMakeLists.txt").read_text("utf-8")
    changes = (PROJECT / "packaging" / "debian" / "changelog").read_text("utf-8")
    assert re.findall(r"project\(vx-kel-amt VERSION (\S+)", cmake) == [__version__]
    assert re.findall(r"^vx-kel-amt \((\S+)\)", changes, re.MULTILINE)[0] == __version__
