"""What the views say about a step and about a whole run."""

from __future__ import annotations

from typing import Any, Mapping

from amt_line.report.records import duration, remark
from amt_station.text import printable


def place(event: Mapping[str, Any], total: int) -> str:
    """Where in the run a step stands."""
    return f"[{event['number']:>{len(str(total))}}/{total}]"


def step_remark(event: Mapping[str, Any]) -> str:
    """Why a step did not pass, or else its values."""
    parts = [remark(event)] + [printable(text) for text in event["remarks"]]
    if event["attempts"] > 1:
        parts.append(f"{event['attempts']} attempts")
    if event["forced"]:
        parts.append("forced")
    if any(value.get("marginal") for value in event["values"]):
        parts.append("near its limit")
    return "; ".join(part for part in parts if part)


def step_time(event: Mapping[str, Any]) -> str:
    """How long a step took; nothing for one that was left out."""
    return "" if event["verdict"] == "skipped" else duration(event["seconds"])


def closing(event: Mapping[str, Any]) -> list[str]:
    """The lines below a run's verdict: what it was, the first failure, and what to do."""
    tally = ", ".join(f"{number} {word}" for word, number in event["counts"].items())
    dut = f"{printable(event['dut'])}: " if event["dut"] else ""
    lines = [f"{dut}{printable(event['plan']['title'])}: {event['verdict']} ({tally}) after "
             f"{duration(event['seconds'])}"]
    if event["reason"]:
        lines.append(f"first: {printable(event['reason'])}")
    if event["advice"]:
        lines.append(f"what to do: {printable(event['advice'])}")
    return lines


def counts_text(counts: Mapping[str, int]) -> str:
    """How many runs came to what, and how many of all have passed."""
    total = sum(counts.values())
    share = f", {100 * counts['PASS'] / total:.0f} % passed" if total else ""
    return f"{total} runs: " + ", ".join(f"{counts[word]} {word}" for word in counts) + share
