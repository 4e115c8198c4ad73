"""The Debian package: built by Debian's tools, installed in a bare root, tried, taken away."""

from __future__ import annotations

import shutil
from pathlib import Path

import pytest
from packages import PROJECT, SECONDS, BareRoot, package

from amt_simulator.program import PARTS
from tools.package.fresh_root import differences, listing

pytestmark = [pytest.mark.xdist_group("package-debian"), pytest.mark.timeout(2 * SECONDS)]

# dpkg's own books, which remember a package that has gone.
BOOKS = ("var/lib/dpkg", "var/log", "proc", "dev")


@pytest.fixture(scope="module")
def made(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """The package."""
    into = tmp_path_factory.mktemp("debian")
    done = package("debian", "--into", into)
    assert done.returncode == 0, done.stdout + done.stderr
    (path,) = into.iterdir()
    assert done.stdout == f"{path}\n" and path.name.startswith("amt-station_")
    return path


@pytest.fixture(scope="module")
def bare(tmp_path_factory: pytest.TempPathFactory) -> BareRoot:
    """A root in which nothing is installed."""
    return BareRoot(tmp_path_factory.mktemp("root"))


@pytest.fixture(scope="module")
def installed(made: Path, bare: BareRoot) -> BareRoot:
    """The root with the package, whose scripts have run."""
    shutil.copy(made, bare.root / "tmp")
    done = bare.enter("dpkg", "--force-depends", "--force-unsafe-io", "-i", f"/tmp/{made.name}")
    assert done.returncode == 0, done.stdout + done.stderr
    (bare.root / "tmp" / made.name).unlink()
    return bare


def test_what_is_installed(installed: BareRoot) -> None:
    usr = installed.root / "usr"
    for program in ("amt-station", "amt-handset"):
        assert (usr / "share/man/man1" / f"{program}.1.gz").is_file()
        assert (usr / "share/bash-completion/completions" / program).is_file()
        assert (usr / "share/zsh/vendor-completions" / f"_{program}").is_file()
        assert (usr / "share/fish/vendor_completions.d" / f"{program}.fish").is_file()
    assert "Apache" in (usr / "share/doc/amt-station/copyright").read_text("utf-8")
    for part in PARTS:
        assert (usr / "lib/amt-station/builds/release" / part).is_file()
    # Its script has run.
    assert list(usr.glob("lib/python3/dist-packages/amt_station/__pycache__/*.pyc"))


def test_the_rules_for_ports_are_where_udev_looks(installed: BareRoot) -> None:
    rules = {path.name: path.read_bytes() for path in
             (PROJECT / "amt_station" / "udev").glob("*.rules")}
    placed = {path.name: path.read_bytes() for path in
              (installed.root / "usr/lib/udev/rules.d").glob("*")}
    assert placed == rules


def test_the_programs(installed: BareRoot) -> None:
    done = installed.enter("amt-station", "--version")
    assert (done.returncode, done.stdout[:20]) == (0, "amt-station, version"), done.stderr
    done = installed.enter("env", "_AMT_HANDSET_COMPLETE=bash_complete", "COMP_CWORD=1",
                           "COMP_WORDS=amt-handset sce", "amt-handset")
    assert done.stdout == "plain,scenarios\n", done.stderr


@pytest.mark.parametrize("path, words, said", [
    ("pc", ("at", "AT"), "OK\n"),
    ("packet", ("--json", "version", "--module", "product"), '"ok": true'),
])
def test_a_simulated_handset(installed: BareRoot, path: str, words: tuple[str, ...],
                             said: str) -> None:
    done = installed.enter("amt-handset", "run", "--path", path, "--", "amt-station", *words)
    assert done.returncode == 0 and said in done.stdout, done.stdout + done.stderr


def test_it_goes_without_residue(made: Path, tmp_path: Path) -> None:
    bare = BareRoot(tmp_path / "root")
    before = listing(bare.root, BOOKS)
    shutil.copy(made, bare.root / "var/log")
    for words in (("--force-depends", "--force-unsafe-io", "-i", f"/var/log/{made.name}"),
                  ("--purge", "amt-station")):
        done = bare.enter("dpkg", *words)
        assert done.returncode == 0, done.stdout + done.stderr
        if "-i" in words:
            assert len(listing(bare.root, BOOKS)) > len(before) + 100
            # What a run leaves beside the modules goes with them.
            assert bare.enter("amt-station", "commands").returncode == 0
    assert differences(before, listing(bare.root, BOOKS)) == []
