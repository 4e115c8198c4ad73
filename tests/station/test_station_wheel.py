"""The wheel as its users have it: built, installed, used from another directory."""

from __future__ import annotations

import os
import re
import shutil
import subprocess
import sys
import zipfile
from pathlib import Path

import pytest
from station_peer import ROOT, Peer, answering, station_environment

from amt_station import __version__
from amt_station.wire.atoms import Atom

# One worker builds the wheel, for all of them.
pytestmark = pytest.mark.xdist_group("wheel")
PACKAGES = ("amt_station", "amt_line", "amt_simulator")


def run(*command: str | Path, cwd: Path, **environment: str) -> "subprocess.CompletedProcess[str]":
    kept = station_environment(**environment)
    kept.pop("PYTHONPATH", None)
    return subprocess.run([str(part) for part in command], cwd=cwd, env=kept, capture_output=True,
                          text=True, timeout=300, check=False)


@pytest.fixture(scope="module")
def wheel(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """The wheel, built from a copy so that the tree stays as it is."""
    source = tmp_path_factory.mktemp("source")
    for name in PACKAGES:
        shutil.copytree(ROOT / name, source / name,
                        ignore=shutil.ignore_patterns("__pycache__"))
    for name in ("pyproject.toml", "README.md"):
        shutil.copy(ROOT / name, source / name)
    built = run(sys.executable, "-m", "pip", "wheel", "-q", "--no-deps", "--no-build-isolation",
                "--no-index", "-w", source / "dist", ".", cwd=source)
    assert built.returncode == 0, built.stderr
    (path,) = (source / "dist").glob("*.whl")
    return Path(path)


@pytest.fixture(scope="module")
def environment(wheel: Path, tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A virtual environment with the wheel in it and the system's libraries."""
    directory = tmp_path_factory.mktemp("venv")
    made = run("/usr/bin/python3", "-m", "venv", "--system-site-packages", directory,
               cwd=directory)
    assert made.returncode == 0, made.stdout + made.stderr
    installed = run(directory / "bin" / "python", "-m", "pip", "install", "-q", "--no-deps",
                    "--no-index", wheel, cwd=directory)
    assert installed.returncode == 0, installed.stderr
    return directory


def test_what_is_in_it(wheel: Path) -> None:
    assert wheel.name.startswith(f"vx_kel_amt-{__version__}-")
    with zipfile.ZipFile(wheel) as archive:
        names = set(archive.namelist())
        catalogue = archive.read("amt_station/requests/amt-command.def")
    assert catalogue == (ROOT / "amt" / "amt-command.def").read_bytes()
    assert {"amt_station/py.typed", "amt_station/protocol-prose.md"} <= names
    for package in PACKAGES:
        for path in (ROOT / package).rglob("*"):
            if path.suffix in (".py", ".lua", ".rules", ".toml"):
                assert str(path.relative_to(ROOT)) in names
    assert not [name for name in names if name.startswith("tests/")]


def test_the_program(environment: Path, tmp_path: Path, peer: Peer) -> None:
    program = environment / "bin" / "amt-station"
    peer.script = answering(Atom.integer(19, 16), Atom.raw(18, b"1.2"))
    result = run(program, "-p", peer.path, "version", "--module", "software", cwd=tmp_path)
    assert (result.returncode, result.stdout) == (0, "module: 16 (software)\nversion: 1.2\n")
    assert run(program, "--version", cwd=tmp_path).stdout == f"amt-station, version {__version__}\n"
    assert "AMT_VERSION_CMD" in run(program, "commands", cwd=tmp_path).stdout
    script = run(program, cwd=tmp_path, _AMT_STATION_COMPLETE="bash_source").stdout
    assert re.search(r"complete .*amt-station", script)
    assert run(program, "wifi", cwd=tmp_path).returncode == 2


def test_the_library_is_the_installed_one_and_typed(environment: Path, tmp_path: Path) -> None:
    code = ("import amt_station, pathlib; here = pathlib.Path(amt_station.__file__).parent;"
            "print(here); print((here / 'py.typed').is_file());"
            "from amt_station.protocol_doc import protocol_document;"
            "print(len(protocol_document()) > 1000)")
    result = run(environment / "bin" / "python", "-c", code, cwd=tmp_path)
    where, *rest = result.stdout.splitlines()
    assert where.startswith(os.fspath(environment)) and rest == ["True", "True"], result.stderr


def test_the_store_brings_its_migrations(environment: Path, tmp_path: Path) -> None:
    program = environment / "bin" / "amt-station"
    for command in ("sync", "check"):
        result = run(program, "store", command, cwd=tmp_path, XDG_STATE_HOME=str(tmp_path))
        assert result.returncode == 0, result.stderr
    assert (tmp_path / "amt-station" / "line.sqlite").stat().st_size > 0


def test_pytest_finds_the_plugin(environment: Path, tmp_path: Path, peer: Peer) -> None:
    peer.script = lambda item: [b"\r\nOK\r\n"]
    (tmp_path / "test_line.py").write_text(
        "def test_probe(handset):\n    assert handset.at('AT').lines == ()\n", encoding="utf-8")
    result = run(environment / "bin" / "python", "-m", "pytest", "-q", "-p", "no:cacheprovider",
                 "--amt-port", peer.path, cwd=tmp_path)
    assert result.returncode == 0, result.stdout + result.stderr


def test_a_plan_and_its_reports(environment: Path, tmp_path: Path, peer: Peer) -> None:
    """What a run reads beside its modules is installed too: schemas, templates, letters."""
    program = environment / "bin" / "amt-station"
    peer.script = lambda item: [b"\r\nOK\r\n"]
    (tmp_path / "line.toml").write_text('[[step]]\nat = "AT"\n', encoding="utf-8")
    assert run(program, "check", "line.toml", cwd=tmp_path).returncode == 0
    assert run(program, "schema", "plan", cwd=tmp_path).stdout.startswith("{")
    result = run(program, "-p", peer.path, "run", "line.toml", "--records", "kept", "--html",
                 "a.html", "--junit", "a.xml", "--csv", "a.csv", cwd=tmp_path)
    assert result.returncode == 0, result.stdout + result.stderr
    (record,) = (tmp_path / "kept").iterdir()
    result = run(program, "report", record, "--html", "b.html", cwd=tmp_path)
    assert result.returncode == 0, result.stderr
    pages = [(tmp_path / name).read_text(encoding="utf-8") for name in ("a.html", "b.html")]
    assert pages[0] == pages[1] and "PASS" in pages[0] and ".verdict {" in pages[0]
    assert run(program, "show", record, cwd=tmp_path).stdout.startswith("PASS  ")
