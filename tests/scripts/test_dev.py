"""The developer's entry: help, directories, failures and interruptions."""

import os
import signal
import subprocess
import time
from pathlib import Path

import pytest

from dev_copy import Copy

COMMANDS = ("demo", "line", "test", "build", "handset", "station", "manual", "package", "bench",
            "fuzz", "coverage", "mutate", "soak", "stateful", "torture", "cross", "lint", "setup")
SECONDS = 120


def dev(copy: Copy, *words: str) -> "subprocess.CompletedProcess[str]":
    """Run ./dev from a directory that has nothing to do with it."""
    return subprocess.run([copy.root / "dev", *words], cwd=copy.elsewhere, env=copy.environment,
                          capture_output=True, text=True, timeout=SECONDS, check=False)


def interrupt(copy: Copy, *words: str, when: Path, number: int = signal.SIGINT) -> tuple[int, str]:
    """Interrupt ./dev, with all that runs in its foreground, once a file is there."""
    # Whoever runs the tests in the background may have had the signal ignored.
    process = subprocess.Popen(["env", "--default-signal=INT", copy.root / "dev", *words],
                               cwd=copy.elsewhere, env=copy.environment, stdout=subprocess.PIPE,
                               stderr=subprocess.STDOUT, text=True, start_new_session=True)
    end = time.monotonic() + SECONDS
    while not when.exists():
        assert process.poll() is None and time.monotonic() < end, process.communicate()[0]
        time.sleep(0.01)
    os.killpg(process.pid, number)
    said, _ = process.communicate(timeout=SECONDS)
    return process.returncode, said


@pytest.mark.parametrize("flag", ["--help", "-h"])
@pytest.mark.parametrize("command", COMMANDS)
def test_help_neither_builds_nor_installs(copy: Copy, command: str, flag: str) -> None:
    ended = dev(copy, command, flag)
    assert ended.returncode == 0, ended.stderr
    assert "usage:" in ended.stdout.lower()
    assert copy.calls == [] and not (copy.root / "build").exists()


@pytest.mark.parametrize("command", COMMANDS)
def test_help_without_the_packages(copy: Copy, command: str) -> None:
    copy.program("dpkg-query", "echo unknown ok not-installed")
    ended = dev(copy, command, "--help")
    assert ended.returncode == 0, ended.stderr
    assert ended.stdout.startswith("Usage: ./dev") and command in ended.stdout
    assert "python3" in ended.stdout
    assert copy.calls == []


def test_its_own_help_names_every_command(copy: Copy) -> None:
    for words in ((), ("--help",), ("-h",), ("help",)):
        ended = dev(copy, *words)
        assert ended.returncode == 0
        named = [line.split()[0] for line in ended.stdout.splitlines() if line.startswith("  ")]
        assert sorted(named) == sorted(COMMANDS)


def test_an_unknown_command_is_named(copy: Copy) -> None:
    ended = dev(copy, "bild")
    assert ended.returncode == 1
    assert ended.stderr.endswith("dev: no such command: bild\n")


def test_packages_that_cannot_be_installed_are_told(copy: Copy) -> None:
    copy.program("dpkg-query", "echo unknown ok not-installed")
    copy.program("apt-get", "echo the mirror is gone >&2; exit 100")
    copy.program("sudo", 'exec "$@"')
    ended = dev(copy, "lint")
    assert ended.returncode == 1
    assert "the mirror is gone\ndev: the packages could not be installed\n" in ended.stderr


def test_paths_are_the_callers(copy: Copy) -> None:
    (copy.elsewhere / "plan.toml").write_text("no plan\n")
    for name in ("json.py", "click.py"):
        (copy.elsewhere / name).write_text("raise SystemExit('taken from the caller')\n")
    ended = dev(copy, "station", "check", "plan.toml")
    assert "plan.toml" in ended.stderr and "taken from" not in ended.stderr
    assert "No such file" not in ended.stderr and "does not exist" not in ended.stderr


def test_a_failed_build_shows_why(copy: Copy) -> None:
    copy.program("cmake", """
        case $1 in
            --build)
                echo '[1/3] Building one.o'
                echo 'FAILED: two.o'
                echo 'two.cpp:1: error: no such thing'
                exit 1 ;;
        esac""")
    ended = dev(copy, "build", "release", "--target", "handset")
    assert ended.returncode == 1
    assert ended.stderr.splitlines()[-3:] == [
        "dev: FAILED: two.o", "two.cpp:1: error: no such thing",
        f"the release build failed; all of it: {copy.root}/build/release.log"]


def test_an_unknown_preset_is_refused(copy: Copy) -> None:
    ended = dev(copy, "build", "relase")
    assert ended.returncode == 1
    assert ended.stderr.startswith("dev: no such preset: relase (there are: release, asan,")
    assert copy.calls == []


@pytest.mark.parametrize("number, status, word", [
    (signal.SIGINT, 130, "interrupted"), (signal.SIGTERM, 143, "terminated")])
def test_an_interrupted_build_is_one_line(copy: Copy, tmp_path: Path, number: int, status: int,
                                          word: str) -> None:
    began = tmp_path / "began"
    copy.slow_program("cmake", began)
    assert interrupt(copy, "build", when=began, number=number) == (
        status, f"\n== building release\n\ndev: {word}\n")


def test_an_interrupted_suite_cleans_up_and_is_one_line(copy: Copy, tmp_path: Path) -> None:
    began, cleaned = tmp_path / "began", tmp_path / "cleaned"
    folder = copy.root / "tests" / "station"
    folder.mkdir(parents=True)
    for other in ("line", "scripts"):
        (copy.root / "tests" / other).mkdir()
    (folder / "test_slow.py").write_text(
        "import pathlib, time\n"
        "def test_slow():\n"
        "    try:\n"
        f"        pathlib.Path({str(began)!r}).touch()\n"
        "        time.sleep(300)\n"
        "    finally:\n"
        f"        pathlib.Path({str(cleaned)!r}).touch()\n")
    status, said = interrupt(copy, "test", "station", when=began)
    assert status == 130
    assert said.splitlines()[-1] == "dev: interrupted" and "Interrupt" not in said
    assert cleaned.exists()


def test_an_interrupted_installation_is_one_line(copy: Copy, tmp_path: Path) -> None:
    began = tmp_path / "began"
    copy.program("dpkg-query", "echo unknown ok not-installed")
    copy.program("sudo", 'exec "$@"')
    copy.slow_program("apt-get", began)
    status, said = interrupt(copy, "setup", when=began)
    assert status == 130
    assert said.splitlines()[1].startswith("== installing Debian packages: ")
    assert said.splitlines()[2:] == ["", "dev: interrupted"]


def test_an_unknown_suite_is_named(copy: Copy) -> None:
    ended = dev(copy, "test", "sistem")
    assert ended.returncode == 2
    assert "no such suite: sistem (there are: station, system, " in ended.stderr


@pytest.mark.parametrize("words", [("--repeat", "0"), ("--repeat", "x"), ("--beside", "1"),
                                   ("--repeat", "2", "--beside", "3")])
def test_repetitions_that_make_no_sense_are_refused(copy: Copy, words: tuple[str, ...]) -> None:
    ended = dev(copy, "test", *words)
    assert ended.returncode == 2 and "error:" in ended.stderr
    assert copy.calls == []
