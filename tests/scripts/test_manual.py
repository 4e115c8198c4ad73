"""The man pages and the completion that the build makes of the programs themselves."""

import subprocess
import sys
from pathlib import Path

import pytest

from amt_station.cli.lazy import COMMANDS

# One worker makes the pages, for all of them.
pytestmark = pytest.mark.xdist_group("manual")
PROJECT = Path(__file__).resolve().parents[2]
# Only a machine that stands still takes so long.
SECONDS = 600


def manual(*words: str) -> "subprocess.CompletedProcess[str]":
    code = "from tools.manual import main; raise SystemExit(main())"
    return subprocess.run([sys.executable, "-c", code, *words], cwd=PROJECT, capture_output=True,
                          text=True, timeout=SECONDS, check=False)


@pytest.fixture(scope="module")
def made(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """Everything that is made, in a directory that is there and empty."""
    into = tmp_path_factory.mktemp("manual")
    done = manual("--into", str(into))
    assert done.returncode == 0, done.stderr
    count = len(list((into / "share" / "man" / "man1").iterdir()))
    assert done.stdout == f"{count} man pages, completion for bash, zsh, fish: {into}\n"
    return into / "share"


def test_every_command_has_a_page(made: Path) -> None:
    names = {path.stem for path in (made / "man" / "man1").glob("*.1")}
    wanted = {f"amt-station-{name}" for name in COMMANDS} | {
        "amt-station", "amt-station-trace-replay", "amt-station-wifi-tx-start", "amt-handset",
        "amt-handset-run", "amt-handset-modem-answer"}
    assert wanted <= names and len(names) > 120


def test_the_pages_can_be_formatted(made: Path) -> None:
    pages = sorted((made / "man" / "man1").glob("*.1"))
    done = subprocess.run(["groff", "-man", "-ww", "-K", "utf-8", "-T", "utf8", "-z",
                           *(str(path) for path in pages)], capture_output=True, text=True,
                          timeout=SECONDS, check=False)
    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")


@pytest.mark.parametrize("name, words", [
    ("amt-station", ["Exit status: 0 pass, 1 the handset said no", "Keep what goes over the line"]),
    ("amt-station-trace-replay", ["[-- COMMAND...]", "[$AMT_STATION_PORT]"]),
    ("amt-handset-up", [r"\r and \n are understood"]),
])
def test_what_a_page_says(made: Path, name: str, words: list[str]) -> None:
    page = made / "man" / "man1" / f"{name}.1"
    done = subprocess.run(["groff", "-man", "-K", "utf-8", "-T", "utf8", "-P-cbou", str(page)],
                          capture_output=True, text=True, timeout=SECONDS, check=True)
    said = " ".join(done.stdout.replace("\u2010\n", "-").split()).replace("\u2212", "-")
    assert all(word in said for word in words), said


@pytest.mark.parametrize("program", ["amt-station", "amt-handset"])
def test_completion(made: Path, program: str) -> None:
    bash = made / "bash-completion" / "completions" / program
    subprocess.run(["bash", "-n", str(bash)], check=True, timeout=SECONDS)
    variable = f"_{program.upper().replace('-', '_')}_COMPLETE"
    for path in (bash, made / "zsh" / "vendor-completions" / f"_{program}",
                 made / "fish" / "vendor_completions.d" / f"{program}.fish"):
        text = path.read_text("utf-8")
        assert variable in text and program in text and "%(" not in text
    said = subprocess.run(
        ["bash", "-c", f"source {bash}; complete -p {program}"], capture_output=True, text=True,
        timeout=SECONDS, check=True)
    assert said.stdout.rstrip().endswith(program)


def test_nothing_else_is_taken_away(tmp_path: Path) -> None:
    (tmp_path / "mine").write_text("mine", "utf-8")
    done = manual("--into", str(tmp_path))
    assert done.returncode == 2 and "holds something else" in done.stderr
    assert (tmp_path / "mine").read_text("utf-8") == "mine"
