"""The wheels, the source archive and the handset's bundle: made twice, installed, taken away."""

from __future__ import annotations

import hashlib
import json
import os
import re
import signal
import subprocess
import tarfile
import zipfile
from pathlib import Path

import pytest
from packages import PROJECT, SECONDS, package, run

from amt_simulator.program import PARTS
from amt_station import __version__
from tools.package import elf
from tools.package.fresh_root import differences, listing
from tools.package.handset_build import made as made_build

pytestmark = [pytest.mark.xdist_group("package-wheels"), pytest.mark.timeout(2 * SECONDS)]

KINDS = ("wheel", "platform", "bundle")
PROGRAMS = ("amt-station", "amt-handset")


@pytest.fixture(scope="module")
def build(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A release build of what a handset needs."""
    return made_build("release", tmp_path_factory.mktemp("build")).folder


def make(build: Path, into: Path) -> Path:
    done = package(*KINDS, "--build", build, "--into", into)
    assert done.returncode == 0, done.stdout + done.stderr
    assert sorted(done.stdout.split()) == sorted(str(path) for path in into.iterdir())
    return into


@pytest.fixture(scope="module")
def made(build: Path, tmp_path_factory: pytest.TempPathFactory) -> Path:
    """All of them."""
    return make(build, tmp_path_factory.mktemp("made"))


def one(made: Path, pattern: str) -> Path:
    (path,) = made.glob(pattern)
    return path


class Environment:
    """A virtual environment beside which nothing is installed but the system's libraries."""

    def __init__(self, folder: Path) -> None:
        self.folder = folder / "venv"
        self.elsewhere = folder / "elsewhere"
        self.elsewhere.mkdir()
        done = run("/usr/bin/python3", "-m", "venv", "--system-site-packages", "--without-pip",
                   self.folder, cwd=folder)
        assert done.returncode == 0, done.stdout + done.stderr
        self.before = listing(self.folder, ())

    def pip(self, *words: str | Path) -> None:
        done = run("/usr/bin/python3", "-m", "pip", "--python", self.folder / "bin/python3",
                   *words, cwd=self.elsewhere)
        assert done.returncode == 0, done.stdout + done.stderr

    def install(self, wheel: Path) -> None:
        self.pip("install", "-q", "--no-index", wheel)

    @property
    def variables(self) -> dict[str, str]:
        return {"PATH": f"{self.folder}/bin:{os.environ['PATH']}",
                "HANDSET_BASE": str(self.elsewhere / "handsets")}

    def run(self, *words: str, **environment: str) -> "subprocess.CompletedProcess[str]":
        return run(*words, cwd=self.elsewhere, **{**self.variables, **environment})

    def remove(self) -> None:
        self.pip("uninstall", "-q", "-y", "vx-kel-amt")
        left = listing(self.folder, ())
        # Directories that are empty are nobody's.
        gone = {name: said for name, said in left.items()
                if name in self.before or not (self.folder / name).is_dir()}
        assert differences(self.before, gone) == []


@pytest.fixture
def environment(tmp_path: Path) -> Environment:
    """A virtual environment of a test's own."""
    return Environment(tmp_path)


def test_the_same_again(build: Path, made: Path, tmp_path: Path) -> None:
    """The bytes do not depend on when and where they are made."""
    again = make(build, tmp_path / "again")
    for path in made.iterdir():
        assert (again / path.name).read_bytes() == path.read_bytes(), path.name
    assert len(list(again.iterdir())) == len(list(made.iterdir())) == 4


def test_the_wheel_for_this_platform(made: Path, environment: Environment) -> None:
    environment.install(one(made, "*linux*.whl"))
    done = environment.run("amt-handset", "run", "--n", "2", "--", "sh", "-c",
                           'amt-station -p "$AMT_STATION_PORT_1" at AT && '
                           'amt-station -p "$AMT_STATION_PORT_2" version --module software')
    assert done.returncode == 0, done.stderr
    assert done.stdout.startswith("OK\nmodule: 16 (software)\n")
    done = environment.run("amt-station", "run", "--help")
    assert done.returncode == 0 and "PLAN" in done.stdout
    without = environment.elsewhere / "programs"
    without.mkdir()
    done = environment.run(str(environment.folder / "bin/amt-handset"), "up", PATH=str(without))
    assert (done.returncode, done.stderr) == (
        1, "amt-handset: bubblewrap is not installed; it is the sandbox of the handset: "
        "apt-get install bubblewrap\n")
    environment.remove()


def test_up(made: Path, environment: Environment) -> None:
    """A handset comes up in a directory that has nothing to do with the installation."""
    environment.install(one(made, "*linux*.whl"))
    with subprocess.Popen(["amt-handset", "up", "--json"], cwd=environment.elsewhere,
                          env={**os.environ, **environment.variables, "PYTHONPATH": ""},
                          stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True) as up:
        assert up.stdout is not None
        told = json.loads(up.stdout.readline())
        done = environment.run("amt-station", "-p", told["ports"]["pc"], "at", "AT")
        assert (done.returncode, done.stdout) == (0, "OK\n"), done.stderr
        up.send_signal(signal.SIGINT)
        up.communicate(timeout=SECONDS)
    assert up.returncode == 0 and not Path(told["directory"]).exists()


def test_what_the_platform_wheel_says_of_itself(made: Path, build: Path, tmp_path: Path) -> None:
    wheel = one(made, "*linux*.whl")
    tag = wheel.stem.split("-", 2)[2]
    with zipfile.ZipFile(wheel) as archive:
        names = [name for name in archive.namelist() if "/builds/" in name]
        archive.extractall(tmp_path)
        said = archive.read(f"vx_kel_amt-{__version__}.dist-info/WHEEL").decode()
        assert all(archive.getinfo(name).external_attr >> 16 & 0o111 for name in names
                   if "/bin/" in name)
    assert names == [f"amt_simulator/builds/release/{part}" for part in sorted(PARTS)]
    assert f"Root-Is-Purelib: false\nTag: {tag}\n" in said
    platform = elf.platform_tag(tmp_path / name for name in names)
    assert tag == f"py3-none-{platform}"
    # Any system that is new enough for the tag has each version that is asked for.
    newest = tuple(int(number) for number in platform.split("_")[1:3])
    for name in names:
        asked = [version.removeprefix("GLIBC_") for version in elf.versions(tmp_path / name)
                 if version.startswith("GLIBC_")]
        assert all(tuple(map(int, version.split(".")[:2])) <= newest for version in asked)
        assert os.path.getsize(tmp_path / name) < os.path.getsize(build / name[len(
            "amt_simulator/builds/release/"):])


def test_the_wheel_for_every_system(made: Path, environment: Environment) -> None:
    environment.install(one(made, "*-none-any.whl"))
    done = environment.run("amt-station", "--version")
    assert done.stdout == f"amt-station, version {__version__}\n", done.stderr
    done = environment.run("amt-handset", "run", "--", "true")
    assert done.returncode == 1 and done.stderr.endswith(
        "bin/vx-kel-amt is not there: the wheel for a platform and the Debian package bring the "
        "build release, and --build takes the directory of another\n")
    shared = environment.folder / "share"
    for program in PROGRAMS:
        assert (shared / "man/man1" / f"{program}.1").is_file()
        assert (shared / "bash-completion/completions" / program).is_file()
        assert (shared / "zsh/vendor-completions" / f"_{program}").is_file()
        assert (shared / "fish/vendor_completions.d" / f"{program}.fish").is_file()
    environment.remove()


def test_a_build_beside_the_wheel_for_every_system(made: Path, build: Path,
                                                   environment: Environment) -> None:
    environment.install(one(made, "*-none-any.whl"))
    done = environment.run("amt-handset", "run", "--build", f"{build}/", "--", "amt-station", "at",
                           "AT")
    assert (done.returncode, done.stdout) == (0, "OK\n"), done.stderr


def test_the_source_archive_has_what_the_wheel_has(made: Path) -> None:
    with tarfile.open(made / f"vx-kel-amt-{__version__}.tar.gz") as archive:
        members = archive.getmembers()
    names = {member.name.split("/", 1)[1] for member in members}
    with zipfile.ZipFile(one(made, "*-none-any.whl")) as wheel:
        packed = {name.split(".data/data/")[-1] for name in wheel.namelist()
                  if ".dist-info/" not in name}
    assert packed <= names and {"LICENSE", "README.md", "pyproject.toml"} <= names
    assert not any(name.startswith(("tests/", "build/")) for name in names)
    assert {(member.uid, member.uname, member.mtime) for member in members} == {
        (0, "root", members[0].mtime)}


@pytest.fixture
def unpacked(made: Path, tmp_path: Path) -> Path:
    """The bundle as a board's engineer unpacks it."""
    done = run("tar", "-x", "-p", "-f", one(made, "*-handset-*.tar.gz"), cwd=tmp_path)
    assert done.returncode == 0, done.stderr
    (folder,) = tmp_path.iterdir()
    return folder


def manifest(folder: Path) -> list[list[str]]:
    lines = (folder / "MANIFEST").read_text("utf-8").splitlines()
    return [line.split(" ", 3) for line in lines if not line.startswith("#")]


def test_the_bundle_is_what_its_manifest_says(unpacked: Path) -> None:
    rows = manifest(unpacked)
    files = [path for path in (unpacked / "root").rglob("*") if path.is_file()]
    assert sorted(f"/{path.relative_to(unpacked / 'root')}" for path in files) == [
        path for *_, path in rows]
    numbers = {"root": 0, "shell": 2000}
    for mode, owner, digest, path in rows:
        file = unpacked / "root" / path.lstrip("/")
        assert f"{file.stat().st_mode & 0o7777:04o}" == mode
        assert hashlib.sha256(file.read_bytes()).hexdigest() == digest
        if os.getuid() == 0:
            assert [file.stat().st_uid, file.stat().st_gid] == [
                numbers[name] for name in owner.split(":")]
    assert len(rows) == 4 and {path.name for path in unpacked.iterdir()} == {
        "LICENSE", "MANIFEST", "board", "root"}


def test_the_bundle_is_what_the_porting_guide_says(unpacked: Path) -> None:
    guide = (PROJECT / "docs" / "porting.md").read_text("utf-8")
    permissions = (unpacked / "board" / "permissions.md").read_text("utf-8")
    for mode, owner, _, path in manifest(unpacked):
        assert f"`{path}`" in guide
        (row,) = [line for line in permissions.splitlines()
                  if line.startswith("|") and f"`{path}`" in line.split("|")[1]]
        assert f"| {owner} {mode} |" in row
    for file in (unpacked / "board").iterdir():
        assert file.name in guide


def test_the_commands_of_the_porting_guide(made: Path, unpacked: Path, tmp_path: Path) -> None:
    guide = (PROJECT / "docs" / "porting.md").read_text("utf-8")
    (unpack,) = re.findall(r"^    (tar -x .*)$", guide, re.MULTILINE)
    (compare,) = re.findall(r"^    (sed -n .*MANIFEST.*)$", guide, re.MULTILINE)
    image = tmp_path / "image"
    image.mkdir()
    for command, folder in ((unpack, made), (compare, unpacked)):
        command = command.replace("IMAGE", str(image)).replace(
            "vx-kel-amt-1.1-handset-arm", unpacked.name)
        done = run("sh", "-c", command, cwd=folder)
        assert done.returncode == 0, done.stderr
    assert done.stdout.count(": OK\n") == len(manifest(unpacked))
    (image / "system/etc/vx-kel-amt.cfg").write_text("", "utf-8")
    done = run("sh", "-c", compare.replace("IMAGE", str(image)), cwd=unpacked)
    assert done.returncode == 1 and "system/etc/vx-kel-amt.cfg: FAILED\n" in done.stdout


def test_the_daemon_of_the_bundle_is_stripped_and_named(unpacked: Path, build: Path) -> None:
    daemon = unpacked / "root/system/bin/vx-kel-amt"
    assert daemon.stat().st_size < (build / "bin/vx-kel-amt").stat().st_size
    told = f"# /system/bin/vx-kel-amt: {elf.machine(daemon)}, {elf.interpreter(daemon)}\n"
    assert told in (unpacked / "MANIFEST").read_text("utf-8")
    assert unpacked.name == f"vx-kel-amt-{__version__}-handset-{elf.machine(daemon)}"
