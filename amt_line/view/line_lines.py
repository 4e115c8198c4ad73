"""A line's view for whatever is no terminal: plain lines, each with its slot."""

from __future__ import annotations

import threading
from typing import Any, Mapping, TextIO

from amt_line.view.board import VERDICTS
from amt_line.view.words import closing, counts_text, place, step_remark, step_time
from amt_station.text import printable


class LineLines:
    """A line for what a slot does, for each step that does not pass, and for each verdict."""

    def __init__(self, stream: TextIO) -> None:
        self._stream = stream
        self._turn = threading.Lock()
        self._steps: dict[str, int] = {}
        self._counts = dict.fromkeys(VERDICTS, 0)

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        slot = printable(str(event.get("slot", "")))
        for line in self._lines(event, slot):
            self.say(f"{slot}: {line}")

    def _lines(self, event: Mapping[str, Any], slot: str) -> list[str]:
        name = event["event"]
        if name == "slot-state":
            text = f": {printable(event['text'])}" if event["text"] else ""
            return [] if event["state"] in ("running", "verdict") else [f"{event['state']}{text}"]
        if name == "run-began":
            self._steps[slot] = len(event["steps"])
            return [f"begins{_of(event)} at {printable(event['port'])}"]
        if name == "notice":
            return [printable(event["text"])]
        if name == "question":
            return [f"asks: {printable(event['text'])}"]
        if name == "step-ended" and event["verdict"] in ("fail", "error"):
            parts = [f"{place(event, self._steps.get(slot, 0))} {printable(event['name'])}: "
                     f"{event['verdict']}", step_time(event), step_remark(event)]
            return ["  ".join(part for part in parts if part)]
        if name == "run-ended":
            self._counts[event["verdict"]] += 1
            first, *rest = closing(event)
            return [f"*** {event['verdict']} ***  {first}", *rest]
        return []

    def problem(self, text: str) -> None:
        """Say something that belongs to no slot."""
        self.say(text)

    def say(self, text: str) -> None:
        """Write a line, in characters that the stream can carry."""
        encoding = self._stream.encoding or "ascii"
        safe = text.encode(encoding, "backslashreplace").decode(encoding)
        with self._turn:
            print(safe, file=self._stream, flush=True)

    def close(self) -> None:
        """Tell the counts of the shift."""
        self.say(counts_text(self._counts))


def _of(event: Mapping[str, Any]) -> str:
    return f" with {printable(event['dut'])}" if event["dut"] else ""
