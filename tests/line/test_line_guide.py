"""The guide to plans: its plan is carried out, and it names every key."""

from __future__ import annotations

import re
from pathlib import Path
from typing import Any

from line_bench import Script, adc, write_plan
from station_peer import ROOT, Peer, Run, ok

from amt_line.plan.schema import plan_schema
from amt_station.wire import ACKNOWLEDGEMENT, Atom

GUIDE = (ROOT / "docs" / "plans.md").read_text(encoding="utf-8")


def the_plan() -> str:
    found = re.search(r"```toml\n(.*?)```", GUIDE, re.DOTALL)
    assert found
    return found.group(1)


def test_the_plan_of_the_guide_is_carried_out(tmp_path: Path, peer: Peer, run_station: Run,
                                              records: Path) -> None:
    version = ok(46, Atom.integer(19, 16), Atom.raw(18, b"KEL_1.0"))
    peer.script = Script(
        requests={224: [[ACKNOWLEDGEMENT, adc(2000)]], 45: [[ACKNOWLEDGEMENT, version]],
                  176: [[ACKNOWLEDGEMENT, ok(175)]],
                  178: [[ACKNOWLEDGEMENT, ok(179, Atom.integer(144, 40), Atom.integer(141, 3))]]},
        texts={"AT^DSVER": [b"\r\n^DSVER: KEL_1.0\r\n\r\nOK\r\n"]})
    options = re.search(r"run end-of-line.toml(.*?)\n\n", GUIDE, re.DOTALL)
    assert options
    arguments = options.group(1).replace("\\\n", " ").replace(
        "report.html", str(tmp_path / "report.html")).split()
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, the_plan())), *arguments,
                         "--records", str(records))
    assert result.returncode == 0, result.stdout + result.stderr
    assert "PASS (11 pass)" in result.stdout and (tmp_path / "report.html").stat().st_size > 0
    assert list(records.glob("KEL0000000042-*.json"))


def test_the_plan_of_the_guide_asks_for_what_is_missing(tmp_path: Path, run_station: Run) -> None:
    path = str(write_plan(tmp_path, the_plan()))
    assert run_station("check", path).returncode == 0
    result = run_station("-p", "/dev/null", "run", path)
    assert result.returncode == 2 and "no value for sn, imei" in result.stderr


def test_the_guide_names_every_key() -> None:
    schema: dict[str, Any] = plan_schema()
    step, limit = schema["definitions"]["step"], schema["definitions"]["number"]["then"]
    keys = {*schema["properties"], *schema["definitions"]["input"]["properties"],
            *step["properties"], *limit["properties"], "times", "delay"}
    tables = "\n".join(line for line in GUIDE.splitlines() if line.startswith("|"))
    for key in keys:
        assert re.search(rf"[`\[ .{{]{key}[`\].= ]", tables), f"no row of a table names {key}"
