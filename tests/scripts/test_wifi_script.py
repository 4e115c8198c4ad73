"""The Wi-Fi radio test script, run with a fake of the chip's tool.

The fake notes its calls and fails where it is told to.
"""

import os
import re
import subprocess
from collections.abc import Sequence
from dataclasses import dataclass
from pathlib import Path

import pytest

SCRIPT = Path(__file__).parents[2] / "scripts" / "wifi-radio-test.sh"
TOOL_LINE = "WL_PATH=/system/bin/wl"

# Notes its words one by one, so that quoting shows; fails on the given words from a given call on.
FAKE_TOOL = """#!/bin/sh
for word in "$@"; do printf '[%s]' "$word" >> "$FAKE_CALLS"; done
echo >> "$FAKE_CALLS"
case "$*" in
"$FAKE_FAILURE") seen=$(grep -c . "$FAKE_CALLS"); [ "$seen" -ge "$FAKE_FROM" ] && exit 3 ;;
esac
case "$1 $#" in
"ver 1") echo "wl 1.2  spaced" ;;
"txpwr1 1") echo "15.25 dBm" ;;
esac
exit 0
"""

TX_STEPS = [
    "ver",
    "down",
    "mpc 0",
    "up",
    "country ALL",
    "PM 0",
    "down",
    "channel 6",
    "rate 11",
    "rateset 11b",
    "up",
    "txpwr1 -o -d 15",
    "txpwr1",
    "pkteng_start 00:11:22:33:44:55: tx 1000 1024 0",
]
RX_STEPS = [
    "disassoc",
    "mpc 0",
    "up",
    "down",
    "channel 6",
    "bi 50000",
    "rate 11",
    "rateset 11b",
    "up",
]
RX_RATESET_LINE = "Set rateset to 11 success exit 1"


@dataclass
class Run:
    """What one run of the script left."""

    status: int
    lines: list[str]
    calls: list[str]


@dataclass
class Bench:
    """A copy of the script whose tool is the fake one."""

    folder: Path

    def run(self, *arguments: str, failure: str = "", first_failure: int = 1) -> Run:
        """Runs the copy; the tool fails on calls that are `failure`, from the numbered one on."""
        calls = self.folder / "calls"
        calls.write_text("")
        environment = {
            **os.environ,
            "FAKE_CALLS": str(calls),
            "FAKE_FAILURE": failure,
            "FAKE_FROM": str(first_failure),
        }
        done = subprocess.run(
            ["sh", str(self.folder / "script"), *arguments],
            env=environment, capture_output=True, text=True, timeout=30, check=False,
        )
        assert done.stderr == ""
        noted = [re.findall(r"\[(.*?)\]", line) for line in calls.read_text().splitlines()]
        return Run(done.returncode, done.stdout.splitlines(), [" ".join(words) for words in noted])


@pytest.fixture
def bench(tmp_path: Path) -> Bench:
    """The fake tool in place; only the line that names the tool differs from the script."""
    tool = tmp_path / "wl"
    tool.write_text(FAKE_TOOL)
    tool.chmod(0o755)
    text = SCRIPT.read_text()
    assert text.count(TOOL_LINE) == 1
    (tmp_path / "script").write_text(text.replace(TOOL_LINE, f"WL_PATH={tool}"))
    return Bench(tmp_path)


def ok_lines(steps: Sequence[str]) -> list[str]:
    """The lines of the steps that say OK."""
    special = {"txpwr1": "the power is:15.25 dBm"}
    short = {
        "rateset 11b": "rateset 11 OK",
        "txpwr1 -o -d 15": "txpwr1 15 OK",
        "pkteng_start 00:11:22:33:44:55: tx 1000 1024 0": "pkteng_start tx OK",
    }
    return [special.get(step) or short.get(step) or f"{step} OK" for step in steps]


def opening(bench: Bench, command: str, function: str) -> list[str]:
    """The lines before the first step."""
    return [str(bench.folder / "wl"), f"cmdType is {command}", f"enter {function}"]


def test_interpreter_and_end() -> None:
    """The handset's shell runs it, and the last line is its status."""
    lines = SCRIPT.read_text().splitlines()
    assert lines[0] == "#!/system/bin/sh"
    assert lines[-1] == "exit 0"


def test_parts_stand_in_order() -> None:
    """The functions come before the main part."""
    text = SCRIPT.read_text()
    marks = [
        "startWifiTxFunc()", "stopWifiTxFunc()", "startWifiRxFunc()", "stopWifiRxFunc()",
        TOOL_LINE, "version=0", "power=0", "PER=0", "cmdType=$1",
    ]
    positions = [text.index(mark) for mark in marks]
    assert positions == sorted(positions)
    for exact in (
        "version=$($WL_PATH ver)",
        "rateset $mRate'b'",
        "echo Set rateset to $mRate success exit 1",
        "wifi test: 11'('start Tx')', 12'('start Rx')', 13'('stop Tx')', 14'('stop Rx')'",
    ):
        assert exact in text


def test_transmission(bench: Bench) -> None:
    """All steps in order, each with its line."""
    run = bench.run("11", "6", "11", "15")
    assert run.status == 0
    assert run.calls == TX_STEPS
    assert run.lines == [
        *opening(bench, "11", "startWifiTxFunc"), "wl 1.2  spaced", *ok_lines(TX_STEPS[1:]),
    ]


@pytest.mark.parametrize("index", range(1, len(TX_STEPS)))
def test_transmission_step_fails(bench: Bench, index: int) -> None:
    """A failing step ends the script at once, without its line."""
    run = bench.run("11", "6", "11", "15", failure=TX_STEPS[index], first_failure=index + 1)
    assert run.status == 1
    assert run.calls == TX_STEPS[:index + 1]
    assert run.lines[4:] == ok_lines(TX_STEPS[1:index])


def test_version_failure_is_not_fatal(bench: Bench) -> None:
    """The version is only shown."""
    run = bench.run("11", "6", "11", "15", failure="ver")
    assert run.status == 0
    assert run.calls == TX_STEPS
    assert run.lines[3] == ""


def test_reception(bench: Bench) -> None:
    """All steps in order, each with its line; that of the rate set reads oddly."""
    run = bench.run("12", "6", "11")
    assert run.status == 0
    assert run.calls == RX_STEPS
    expected = ok_lines(RX_STEPS)
    expected[RX_STEPS.index("rateset 11b")] = RX_RATESET_LINE
    assert run.lines == [*opening(bench, "12", "startWifiRxFunc"), *expected]


@pytest.mark.parametrize("index", range(len(RX_STEPS)))
def test_reception_step_fails(bench: Bench, index: int) -> None:
    """A failing step ends the script, but for the disassociation and the rate set."""
    step = RX_STEPS[index]
    run = bench.run("12", "6", "11", failure=step, first_failure=index + 1)
    lines = [RX_RATESET_LINE if done == "rateset 11b" else line
             for done, line in zip(RX_STEPS, ok_lines(RX_STEPS))]
    if step in ("disassoc", "rateset 11b"):
        assert run.status == 0
        assert run.calls == RX_STEPS
        assert run.lines[3:] == lines[:index] + lines[index + 1:]
        return
    assert run.status == 1
    assert run.calls == RX_STEPS[:index + 1]
    assert run.lines[3:] == lines[:index]


def test_stop_transmission(bench: Bench) -> None:
    """One step."""
    run = bench.run("13")
    assert (run.status, run.calls) == (0, ["pkteng_stop tx"])
    assert run.lines == [*opening(bench, "13", "stopWifiTxFunc"), "tx stop OK"]


def test_stop_transmission_fails(bench: Bench) -> None:
    """Its failure is the script's."""
    run = bench.run("13", failure="pkteng_stop tx")
    assert run.status == 1
    assert run.lines == opening(bench, "13", "stopWifiTxFunc")


def test_stop_reception(bench: Bench) -> None:
    """It only says so."""
    run = bench.run("14")
    assert (run.status, run.calls) == (0, [])
    assert run.lines == opening(bench, "14", "stopWifiRxFunc")


@pytest.mark.parametrize(
    ("given", "used"), [("550", "5.5"), ("55", "55"), ("1100", "1100"), ("5.5", "5.5")],
)
@pytest.mark.parametrize("command", ["11", "12"])
def test_rate_550_is_5_5(bench: Bench, command: str, given: str, used: str) -> None:
    """This one rate is given in hundredths."""
    run = bench.run(command, "6", given, "15")
    assert run.status == 0
    assert f"rate {used}" in run.calls
    assert f"rateset {used}b" in run.calls


@pytest.mark.parametrize("command", ["", "1", "10", "15", "110", "*", "start"])
def test_other_commands(bench: Bench, command: str) -> None:
    """They are refused with the usage."""
    run = bench.run(*([command] if command else []))
    assert (run.status, run.calls) == (1, [])
    assert run.lines[1:] == [
        f"cmdType is {command}",
        "invalid command option",
        "wifi test: 11(start Tx), 12(start Rx), 13(stop Tx), 14(stop Rx)",
    ]


def test_missing_operands_leave_their_words_out(bench: Bench) -> None:
    """A word that is missing is not replaced by an empty one."""
    run = bench.run("12")
    assert "channel" in run.calls
    assert "rateset b" in run.calls
