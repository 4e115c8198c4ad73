"""The view for whatever is no terminal: plain lines."""

from __future__ import annotations

from typing import Any, Mapping, TextIO

from amt_line.view.banner import banner
from amt_line.view.words import closing, place, step_remark, step_time
from amt_station.text import printable


class LineView:
    """A line when a step begins, one when it ends, and the verdict."""

    def __init__(self, stream: TextIO) -> None:
        self._stream = stream
        self._total = 0

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""
        name = event["event"]
        if name == "run-began":
            self._total = len(event["steps"])
        elif name == "step-began":
            self._say(f"{place(event, self._total)} {printable(event['name'])} ...")
        elif name == "step-again":
            self._say(f"{place(event, self._total)} attempt {event['attempt']}: "
                      f"{printable(event['reason'])}")
        elif name == "notice":
            self._say(f"{place(event, self._total)} {printable(event['text'])}")
        elif name == "step-ended":
            self._say(self._ended(event))
        elif name == "run-ended":
            for line in ("", *banner(event["verdict"], wide=False), "", *closing(event)):
                self._say(line)

    def _ended(self, event: Mapping[str, Any]) -> str:
        parts = [f"{place(event, self._total)} {printable(event['name'])}: {event['verdict']}",
                 step_time(event), step_remark(event)]
        return "  ".join(part for part in parts if part)

    def _say(self, text: str) -> None:
        encoding = self._stream.encoding or "ascii"
        safe = text.encode(encoding, "backslashreplace").decode(encoding)
        print(safe, file=self._stream, flush=True)

    def close(self) -> None:
        """Nothing is left to do."""
