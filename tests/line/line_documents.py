"""Records of runs that no handset has made, for whatever shows or counts records."""

from __future__ import annotations

import uuid
from datetime import datetime, timedelta, timezone
from typing import Any

NOON = datetime(2026, 1, 31, 12, 0, 0, tzinfo=timezone.utc)


def utc(moment: datetime) -> str:
    """A time as records have it."""
    return moment.astimezone(timezone.utc).isoformat(timespec="milliseconds").replace(
        "+00:00", "Z")


def step(number: int, name: str, verdict: str = "pass", **values: Any) -> dict[str, Any]:
    """A step of a record."""
    return {"number": number, "section": "step", "name": name, "kind": "command",
            "verdict": verdict, "attempts": 1, "began": utc(NOON), "seconds": 0.25, "reason": "",
            "advice": "", "exit_status": 0, "forced": [], "values": [], "earlier": [],
            "exchanges": [], "remarks": [], **values}


def value(number: float, low: float, high: float, name: str = "adc",
          **more: Any) -> dict[str, Any]:
    """A value that was held to limits."""
    inside = low <= number <= high
    return {"name": name, "value": number, "unit": "mV", "limits": {"min": low, "max": high},
            "verdict": "pass" if inside else "fail", **more}


def exchange(sent: str = "7e01", text: str = "OK") -> dict[str, Any]:
    """What went over a port."""
    return {"purpose": "text", "what": "AT", "began": utc(NOON), "seconds": 0.01, "sent": sent,
            "sent_decoded": [{"kind": "text", "text": "AT"}], "error": "", "attempt": 1,
            "received": [{"seconds": 0.01, "bytes": "4f4b",
                          "decoded": {"kind": "text", "text": text}}]}


def record(number: int = 0, verdict: str | None = "PASS", **values: Any) -> dict[str, Any]:
    """A whole record; the later its number, the later it began."""
    began = NOON + timedelta(minutes=number)
    ended = verdict is not None
    return {
        "record": 1, "run": str(uuid.UUID(int=number + 1, version=4)),
        "state": {None: "running", "ABORTED": "aborted"}.get(verdict, "ended"),
        "verdict": verdict, "exit_status": 0 if ended else None, "reason": "", "advice": "",
        "dut": f"KEL{number:010d}", "station": "bench", "operator": "me", "slot": str(number % 4),
        "port": "/dev/ttyUSB0", "channel": "pc", "tool": {"name": "amt-station", "version": "1"},
        "plan": {"title": "End of line", "version": "7", "path": "end.toml", "sha256": "0" * 64,
                 "steps": 2},
        "inputs": {"sn": f"KEL{number:010d}"}, "began": utc(began),
        "ended": utc(began + timedelta(seconds=30)) if ended else None,
        "seconds": 30.0 + number if ended else None, "begin": [], "remarks": [],
        "steps": [step(1, "battery ADC", values=[value(3600, 100, 4000)]), step(2, "version")],
        **values}
