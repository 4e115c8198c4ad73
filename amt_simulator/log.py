"""The handset's log, read while it grows."""

import re
from dataclasses import dataclass
from pathlib import Path

from amt_simulator.waiting import wait_until

RECORD = re.compile(r"^(?P<time>\d\d-\d\d \d\d:\d\d:\d\d\.\d{3}) +(?P<pid>\d+) +(?P<tid>\d+) "
                    r"(?P<priority>\w) (?P<tag>.*?): ?(?P<text>.*)$")
EXPLAIN_LINES = 25


@dataclass(frozen=True)
class Record:
    """One log record; `end` is the place in the log behind it, to continue from."""

    time: str
    pid: int
    tid: int
    priority: str
    tag: str
    text: str
    end: int


class Log:
    """The records that the daemon and its libraries have written, in order.

    A place in the log (`mark`) is a number; every reader takes one to look only at what came
    after it.
    """

    def __init__(self, path: Path) -> None:
        self.path = path

    def mark(self) -> int:
        """The place behind everything that has been logged."""
        try:
            return self.path.stat().st_size
        except FileNotFoundError:
            return 0

    def records(self, after: int = 0, tag: str | None = None) -> list[Record]:
        """The complete records behind the place AFTER, of one TAG only when given."""
        try:
            with open(self.path, "rb") as stream:
                stream.seek(after)
                data = stream.read()
        except FileNotFoundError:
            return []
        found = []
        place = after
        for line in data.split(b"\n")[:-1]:
            place += len(line) + 1
            match = RECORD.match(line.decode("utf-8", "surrogateescape"))
            if match and tag in (None, match["tag"]):
                found.append(Record(match["time"], int(match["pid"]), int(match["tid"]),
                                    match["priority"], match["tag"], match["text"], place))
        return found

    def texts(self, tag: str | None = None, after: int = 0) -> list[str]:
        """The message texts behind the place AFTER, in order."""
        return [record.text for record in self.records(after, tag)]

    def find(self, pattern: "str | re.Pattern[str]", after: int = 0,
             tag: str | None = None) -> Record | None:
        """The first record whose text holds the text, or matches the expression, PATTERN."""
        for record in self.records(after, tag):
            if (pattern in record.text if isinstance(pattern, str)
                    else pattern.search(record.text)):
                return record
        return None

    def wait(self, pattern: "str | re.Pattern[str]", after: int = 0,
             timeout: float | None = None, tag: str | None = None) -> Record:
        """Wait for a record that `find` finds."""
        return wait_until(lambda: self.find(pattern, after, tag), f"the log text {pattern!r}",
                          timeout, self.tail)

    def tail(self, count: int = EXPLAIN_LINES) -> str:
        """The last COUNT lines, for messages."""
        try:
            lines = self.path.read_text("utf-8", "replace").splitlines()
        except FileNotFoundError:
            lines = []
        return "\n".join(["the log ends with:", *lines[-count:]])
