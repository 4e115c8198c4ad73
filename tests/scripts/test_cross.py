"""What `./dev cross` compares, and what it takes for the same."""

import json
import re
import subprocess
from dataclasses import replace
from pathlib import Path
from typing import Any

import pytest

from dev_copy import Copy
from tools.cross import alike, emulated, limits, warnings
from tools.cross.alike import LOG, NOT_PLAYED, RULES, Seen, differences, normal
from tools.cross.main import PARTS
from tools.project import PROJECT

SECONDS = 120
# For each row of the table: where it stands, and two contents that differ only there.
SAME = (
    (LOG, b"D vx-kel-amt:     Build time: Nov 22 2026 03:26:01",
     b"D vx-kel-amt:     Build time: Nov  1 2027 13:00:59"),
    (LOG, b"D vx-kel-pub: thread 18 will be end", b"D vx-kel-pub: thread 126 will be end"),
    (LOG, b"D vx-kel-pub: pub_util_get_pid_and_check_run return is_run_ptr[1] pid_ptr[21]",
     b"D vx-kel-pub: pub_util_get_pid_and_check_run return is_run_ptr[1] pid_ptr[130]"),
    (LOG, b"D vx-kel-pub: pub_util_get_pid_and_check_run fopen buf_a[/proc/21/cmdline]",
     b"D vx-kel-pub: pub_util_get_pid_and_check_run fopen buf_a[/proc/30/cmdline]"),
    ("/system/lib/hw/amt.tq5530.misc.so", b"\x7fELF\2\n\1", b"\x7fELF\1"),
    ("/handset/answers/.taken/sync", b"27736 179532.847994673 3 2\n", b"9 18.4 3 2\n"),
    ("/handset/init.json", b"{}", b'{\n "daemon"}'),
    ("/handset/init.txt", b"04:38:34.738 start #1 pid 2: daemon: /system/bin/vx-kel-amt -u\n",
     b"14:08:34.003 start #1 pid 2: daemon: /usr/bin/qemu-arm -L /x /system/bin/vx-kel-amt -u\n"),
)
OTHER = (
    (LOG, b"D vx-kel-amt: Build date: 1", b"D vx-kel-amt: Build date: 2"),
    (LOG, b"D vx-kel-pub: thread 18 will end", b"D vx-kel-pub: thread 19 will end"),
    (LOG, b"D vx-kel-pub: PID of x: 2", b"D vx-kel-pub: PID of x: 3"),
    (LOG, b"D vx-kel-pub: errno=11", b"D vx-kel-pub: errno=35"),
    ("/amt/amt_result.txt", b"thread 18 will be end", b"thread 19 will be end"),
    ("/system/libs/x", b"1", b"2"),
    ("/handset/answers/sync", b"1 2.3 4\n", b"2 2.3 4\n"),
    ("/handset/answers/.taken/sync", b"1 2.3 3 2\n", b"1 2.3 3 1\n"),
    ("/handset/init.txt.x", b"04:38:34.738 start", b"04:38:34.739 start"),
)
BOTH = Seen(heard=[("pc", b"a\r\n"), ("modem", b"AT\r")],
            files={"/amt/x": ("-rw-r--r-- 0:0", b"1\n2\n"), "/amt": ("drwxr-xr-x 0:0", b"")},
            threads=[["D a: one", "D a: two"], ["D a: three"]], starts=1, exits=[0])


@pytest.mark.parametrize("path, one, other", SAME)
def test_what_has_to_differ_is_the_same(path: str, one: bytes, other: bytes) -> None:
    assert one != other and normal(path, one) == normal(path, other)


def test_every_row_of_the_table_is_needed() -> None:
    for rule in RULES:
        # Rows without a pattern name what is not even taken down.
        if rule.pattern:
            left = tuple(other for other in RULES if other is not rule)
            assert any(normal(path, one, left) != normal(path, other, left)
                       for path, one, other in SAME), rule


@pytest.mark.parametrize("path, one, other", OTHER)
def test_everything_else_is_seen(path: str, one: bytes, other: bytes) -> None:
    assert normal(path, one) != normal(path, other)


def test_the_table_says_why() -> None:
    assert all(rule.what and rule.reason and re.compile(rule.where) for rule in RULES)
    dialogues = {path.stem for path in (PROJECT / "tests/system/dialogues").glob("*.txt")}
    assert set(NOT_PLAYED) <= dialogues and all(NOT_PLAYED.values())


def test_two_alike() -> None:
    assert differences(BOTH, replace(BOTH, threads=BOTH.threads[::-1])) == []
    files = {**BOTH.files, **{path: ("", b"") for path in alike.ONLY_EMULATED}}
    assert differences(BOTH, replace(BOTH, files=files)) == []


def test_a_shut_down_may_be_cut_short() -> None:
    begun = ["D a: one", "D vx-kel-amt: signal_treatment()"]
    ends: list[list[str]] = [["D a: end"], []]
    whole, cut = (replace(BOTH, threads=[begun + end]) for end in ends)
    assert differences(whole, cut) == []
    assert differences(whole, replace(BOTH, threads=[begun[:1]])) == [
        "the log:", "   0: D a: one", "  -0: D vx-kel-amt: signal_treatment()"]


@pytest.mark.parametrize("change, found", [
    ({"heard": BOTH.heard[:1]}, ["heard:", "   pc: b'a\\r\\n'", "  -modem: b'AT\\r'"]),
    ({"heard": [("app", b"a\r\n"), BOTH.heard[1]]},
     ["heard:", "  -pc: b'a\\r\\n'", "  +app: b'a\\r\\n'", "   modem: b'AT\\r'"]),
    ({"exits": [0, 0]}, ["the daemon's starts and ends: 1 [0], and 1 [0, 0]"]),
    ({"starts": 2}, ["the daemon's starts and ends: 1 [0], and 2 [0]"]),
    ({"exits": [-11]}, ["the daemon's starts and ends: 1 [0], and 1 [-11]"]),
    ({"files": {"/amt": BOTH.files["/amt"]}}, ["/amt/x: only in the first"]),
    ({"files": {**BOTH.files, "/amt/y": ("-rw-r--r-- 0:0", b"")}}, ["/amt/y: only in the second"]),
    ({"files": {**BOTH.files, "/amt/x": ("-rw------- 0:0", b"1\n2\n")}},
     ["/amt/x: -rw-r--r-- 0:0, and -rw------- 0:0"]),
    ({"files": {**BOTH.files, "/amt/x": ("-rw-r--r-- 0:0", b"1\n3\n")}},
     ["/amt/x:", "   1\\n", "  -2\\n", "  +3\\n"]),
    ({"threads": [["D a: one", "D a: two", "D a: three"]]},
     ["the log:", "   0: D a: two", "  -1: D a: three", "  +0: D a: three"]),
    ({"threads": [["D a: two", "D a: one"], ["D a: three"]]},
     ["the log:", "  -0: D a: one", "  -0: D a: two", "  -1: D a: three", "  +0: D a: three",
      "  +1: D a: two", "  +1: D a: one"]),
])
def test_what_is_not_alike_is_told(change: dict[str, Any], found: list[str]) -> None:
    assert differences(BOTH, replace(BOTH, **change)) == found


def test_long_differences_are_cut() -> None:
    many = replace(BOTH, threads=[[f"D a: {number}" for number in range(90)]])
    told = differences(BOTH, many)
    assert len(told) == alike.SHOWN_LINES + 2
    assert told[-1] == f"  ({90 + 3 - alike.SHOWN_LINES} more lines)"
    wide = differences(BOTH, replace(BOTH, heard=[("pc", b"x" * 900)]))
    assert max(len(line) for line in wide) < alike.SHOWN_WIDTH + 20


def test_what_is_left_out_has_its_reason() -> None:
    patterns = {**limits.left_out(), **limits.LEFT_OUT_SANITIZED}
    assert patterns and all(patterns.values()) and all(map(re.compile, patterns))
    assert len({limit.probe for limit in limits.LIMITS}) == len(limits.LIMITS)
    assert limits.judge(True, False) == "measured"
    assert limits.judge(True, True).startswith("NOT SO HERE")
    assert limits.judge(False, False).startswith("NOT MEASURED")


def test_the_probes_can_be_done_without_emulation() -> None:
    source = (PROJECT / "tests/cross/limits.cpp").read_text()
    assert re.findall(r'\{"(\w+)", try_\1\}', source) == [limit.probe for limit in limits.LIMITS]


def test_each_machine_starts_its_own_programs() -> None:
    options = emulated.emulated()
    assert options["build"].name == "armhf" and options["through"][0] == "qemu-arm"
    for name in ("amt-audio", "sync"):
        assert options["files"][f"/system/bin/{name}"].parts[-3:] == ("release", "bin", name)


def test_the_warnings_of_both_machines(tmp_path: Path) -> None:
    command = "ccache g++ -Wall -Werror -Wl,--as-needed -O2 -c a.cpp"
    (tmp_path / "compile_commands.json").write_text(json.dumps(
        [{"file": file, "command": command} for file in ("/p/a.cpp", f"{tmp_path}/made/b.cpp")]))
    given = warnings.flags(tmp_path)
    assert given == dict.fromkeys(("/p/a.cpp", "made/b.cpp"),
                                  frozenset({"-Wall", "-Werror"}))
    own = {"/p/a.cpp": given["/p/a.cpp"]}
    arm = {"/p/a.cpp": own["/p/a.cpp"] | {"-Wno-psabi"}}
    assert not list(warnings.differences({**own, "/p/b.cpp": frozenset()}, arm))
    assert list(warnings.differences(own, {"/p/a.cpp": frozenset({"-Wall"})})) == [
        "/p/a.cpp: -Werror in one of the builds only", "/p/a.cpp: a warning is no error there"]
    assert list(warnings.differences(own, {"/p/a.cpp": arm["/p/a.cpp"] | {"-Wno-format"}})) == [
        "/p/a.cpp: -Wno-format in one of the builds only"]
    assert list(warnings.differences({}, arm)) == [
        "/p/a.cpp: compiled for Arm only (1 such files)", "no file is compiled by both"]


def test_an_unknown_part_is_refused(copy: Copy) -> None:
    ended = subprocess.run([copy.root / "dev", "cross", "units"], cwd=copy.elsewhere,
                           env=copy.environment, capture_output=True, text=True, timeout=SECONDS,
                           check=False)
    assert ended.returncode == 2
    assert ended.stderr.endswith(f"no such part: units (there are: {', '.join(PARTS)})\n")
    assert copy.calls == []
