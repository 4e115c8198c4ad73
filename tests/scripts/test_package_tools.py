"""What the packages are made with: the platform's tag, refusals, and versions that agree."""

from __future__ import annotations

import re
from pathlib import Path

import pytest
from packages import PROJECT, package

from amt_station import __version__
from tools.package import elf, fresh_root
from tools.package import main as command
from tools.package.handset_build import HandsetBuild, made
from tools.package.source import PackageFailed, run


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


def test_a_package_that_is_not_the_same_again(tmp_path: Path,
                                              monkeypatch: pytest.MonkeyPatch) -> None:
    """Each is compared with what was made first, by its name."""
    first = tmp_path / "some.whl"
    first.write_bytes(b"first")

    def make_all(kinds: object, into: Path, build: str) -> list[Path]:
        (into / first.name).write_bytes(content)
        return [into / first.name]

    monkeypatch.setattr(command, "make_all", make_all)
    content = b"first"
    command.check(["wheel"], [first], "release")
    content = b"again"
    with pytest.raises(PackageFailed, match="some.whl is not the same when it is made again"):
        command.check(["wheel"], [first], "release")


@pytest.fixture
def root(tmp_path: Path) -> Path:
    """Some files, one of which nobody looks at."""
    for name in ("etc/one", "etc/two", "usr/three", "var/log/four"):
        (tmp_path / name).parent.mkdir(parents=True, exist_ok=True)
        (tmp_path / name).write_text(name, "utf-8")
    (tmp_path / "link").symlink_to("etc/one")
    return tmp_path


def test_what_has_changed_below_a_root(root: Path) -> None:
    before = fresh_root.listing(root)
    assert {"link", "etc", "etc/one", "usr/three", "var"} <= set(before)
    assert fresh_root.differences(before, fresh_root.listing(root)) == []
    (root / "var/log/four").unlink()
    (root / "etc/one").write_text("other", "utf-8")
    (root / "etc/two").chmod(0o600)
    (root / "usr/three").unlink()
    (root / "new").mkdir()
    (root / "link").unlink()
    (root / "link").symlink_to("etc/two")
    assert fresh_root.differences(before, fresh_root.listing(root)) == [
        "etc/one", "etc/two", "link", "new", "usr/three"]


def test_what_a_removed_package_has_left(root: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    """A file of its own is found by its name, whatever was there before."""
    monkeypatch.setattr(fresh_root, "enter", lambda *words: "")
    assert "etc/one" in fresh_root.purge(root)
    (root / "usr" / "amt_station").mkdir()
    with pytest.raises(PackageFailed, match="left behind: usr/amt_station$"):
        fresh_root.purge(root)


def test_a_trial_that_says_something_else(root: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setattr(fresh_root, "enter", lambda *words: "nothing")
    with pytest.raises(PackageFailed, match="amt-station at --help says: nothing"):
        fresh_root.install(root, root / "some.deb")


def test_a_program_that_fails_leaves_what_it_has_said(tmp_path: Path) -> None:
    """The end of it is shown, all of it is kept."""
    with pytest.raises(PackageFailed) as failed:
        run(["sh", "-c", "seq 100; exit 3"], tmp_path)
    assert str(failed.value).splitlines()[-2:] == ["100", "sh ended with status 3"]
    assert failed.value.said.splitlines() == [str(number) for number in range(1, 101)]
    with pytest.raises(PackageFailed, match="nowhere-to-be-found: No such file"):
        run(["nowhere-to-be-found"], tmp_path)
