"""Records for the tests of the store, and a place for them."""

from __future__ import annotations

import json
import time
import uuid
from datetime import datetime, timedelta, timezone
from pathlib import Path
from typing import Any, Callable

from amt_line.run.record import Document, document_text
from amt_line.run.record_file import file_name

BEGIN = datetime(2026, 11, 20, 6, 0, tzinfo=timezone.utc)
PATIENCE = 300.0


def stamp(seconds: float) -> str:
    """A time of a record, so many seconds after the first."""
    return (BEGIN + timedelta(seconds=seconds)).isoformat(timespec="milliseconds").replace(
        "+00:00", "Z")


def value(name: str = "adc", number: Any = 15, **more: Any) -> Document:
    """A value of a step."""
    return {"name": name, "value": number, **more}


def step(number: int = 1, **more: Any) -> Document:
    """A step of a record."""
    return {"number": number, "section": "step", "name": f"step {number}", "kind": "command",
            "verdict": "pass", "attempts": 1, "began": stamp(number), "seconds": 0.5,
            "reason": "", "advice": "", "exit_status": 0, "forced": [],
            "values": [value(limits={"min": 10, "max": 20}, verdict="pass")], "earlier": [],
            "exchanges": [], "remarks": [], **more}


def record(at: float = 0.0, **more: Any) -> Document:
    """A record of a run that began so many seconds after the first."""
    plan = {"title": "line", "version": "1", "path": "line.toml", "sha256": "0" * 64, "steps": 1}
    return {"record": 1, "run": str(uuid.uuid4()), "state": "ended", "verdict": "PASS",
            "exit_status": 0, "reason": "", "advice": "", "dut": "KEL1", "station": "bench 1",
            "operator": "somebody", "slot": "1", "port": "/dev/ttyACM0", "channel": "pc",
            "tool": {"name": "amt-station", "version": "1.0"}, "plan": plan, "inputs": {},
            "began": stamp(at), "ended": stamp(at + 2), "seconds": 2.0, "begin": [],
            "remarks": [], "steps": [step()], **more}


def unfinished(at: float = 0.0, **more: Any) -> Document:
    """A record as a run has it in the middle."""
    return record(at, **{"state": "running", "verdict": None, "exit_status": None, "ended": None,
                         "seconds": None, **more})


def keep(folder: Path, document: Document) -> Path:
    """Write a record as a run does, under its name."""
    folder.mkdir(parents=True, exist_ok=True)
    path = folder / file_name(document["dut"], document["began"], document["run"])
    path.write_text(document_text(document), encoding="utf-8")
    return path


def runs_of(folder: Path) -> set[str]:
    """The runs of a directory's records."""
    return {json.loads(path.read_text(encoding="utf-8"))["run"] for path in folder.glob("*.json")}


def until(happened: Callable[[], Any]) -> Any:
    """What a condition comes to, once it comes to something."""
    deadline = time.monotonic() + PATIENCE
    while not (result := happened()):
        assert time.monotonic() < deadline, "it never happened"
        time.sleep(0.01)
    return result
