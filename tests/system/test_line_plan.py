"""A plan with the whole daemon: what the guide shows is true, and a verdict is stored."""

from __future__ import annotations

import json
import os
import re
import subprocess
import sys
from pathlib import Path
from typing import Any

from amt_simulator import Handset

ROOT = Path(__file__).resolve().parents[2]
GIVEN = ("--set", "sn=KEL0000000042", "--set", "imei=490154203237518",
         "--answer", "screen=yes", "--answer", "label=KEL7")
PATIENCE = 300


def run_plan(handset: Handset, folder: Path, text: str, *arguments: str) -> dict[str, Any]:
    """Carry a plan out at the handset's PC line; the record that was kept."""
    plan = folder / "plan.toml"
    plan.write_text(text, encoding="utf-8")
    ended = subprocess.run(
        [sys.executable, "-m", "amt_station", "-p", str(handset.directory / "pc"), "run",
         str(plan), "--records", str(folder / "records"), *arguments],
        cwd=ROOT, env={**os.environ, "PYTHONPATH": str(ROOT)}, stdin=subprocess.DEVNULL,
        capture_output=True, text=True, timeout=PATIENCE, check=False)
    (path,) = (folder / "records").glob("*.json")
    record: dict[str, Any] = json.loads(path.read_text(encoding="utf-8"))
    assert ended.returncode == record["exit_status"], ended.stdout + ended.stderr
    return record


def stored(handset: Handset) -> str:
    """The verdict of station 3 in the handset's file."""
    return handset.text("/amt/amt_result.txt").split("\n")[3]


def test_the_plan_of_the_guide(make_handset: Any, tmp_path: Path) -> None:
    guide = (ROOT / "docs" / "plans.md").read_text(encoding="utf-8")
    found = re.search(r"```toml\n(.*?)```", guide, re.DOTALL)
    assert found
    handset = make_handset("pc", ports=True)
    record = run_plan(handset, tmp_path, found.group(1), *GIVEN)
    assert record["verdict"] == "PASS", record["reason"]
    assert handset.text("/amt/imei.txt") == "490154203237518" and stored(handset) == "1"


def test_a_failure_is_stored(make_handset: Any, tmp_path: Path) -> None:
    handset = make_handset("pc", ports=True)
    record = run_plan(handset, tmp_path, """
[[step]]
command = "battery adc"
limits.adc = { max = 1 }
[[always]]
command = "test-result write"
with = { station = 3, verdict = "${verdict}" }
""")
    assert (record["verdict"], record["exit_status"]) == ("FAIL", 1)
    assert stored(handset) == "2", "a wrong pass is the worst that a line can do"


def test_the_scripts_of_the_scripting_guide(make_handset: Any, tmp_path: Path) -> None:
    """Its first step brings a simulated handset up: what follows has to pass with that."""
    guide = (ROOT / "docs" / "station.md").read_text(encoding="utf-8")
    handset = make_handset("pc", ports=True)
    port = str(handset.directory / "pc")
    scripts = re.findall(r"```python\n(.*?connect.*?)```", guide, re.DOTALL)
    assert len(scripts) == 3
    for number, script in enumerate(scripts):
        path = tmp_path / f"script{number}.py"
        path.write_text(script.replace("/dev/ttyACM0", port), encoding="utf-8")
        ended = subprocess.run(
            [sys.executable, str(path), port, "KEL0000000042"], cwd=tmp_path,
            env={**os.environ, "PYTHONPATH": str(ROOT)}, stdin=subprocess.DEVNULL,
            capture_output=True, text=True, timeout=PATIENCE, check=False)
        assert ended.returncode == 0, ended.stdout + ended.stderr
    assert stored(handset) == "1"
