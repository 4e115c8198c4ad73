"""The handset's log, read while it grows."""

import os
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


class LogReader:
    """Reads on in a log: each look gives the records that were completed since the last one."""

    def __init__(self, path: Path, place: int) -> None:
        self._path = path
        self._place = place

    def more(self) -> list[Record]:
        """The records that are new."""
        found = []
        data = _read_behind(self._path, self._place)
        for line in data.split(b"\n")[:-1]:
            self._place += len(line) + 1
            match = RECORD.match(line.decode("utf-8", "surrogateescape"))
            if match:
                found.append(Record(match["time"], int(match["pid"]), int(match["tid"]),
                                    match["priority"], match["tag"], match["text"], self._place))
        return found


def _read_behind(path: Path, place: int) -> bytes:
    """What the file holds behind PLACE; nothing when it is not there or has become a link."""
    try:
        fd = os.open(path, os.O_RDONLY | os.O_NOFOLLOW | os.O_NONBLOCK | os.O_CLOEXEC)
    except OSError:
        return b""
    with os.fdopen(fd, "rb") as stream:
        stream.seek(place)
        return stream.read()


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
            return self.path.stat(follow_symlinks=False).st_size
        except FileNotFoundError:
            return 0

    def reader(self, after: int = 0) -> LogReader:
        """A reader that begins behind the place AFTER."""
        return LogReader(self.path, after)

    def content(self, after: int = 0) -> bytes:
        """The log as it stands in its file, behind the place AFTER."""
        return _read_behind(self.path, after)

    def records(self, after: int = 0, tag: str | None = None) -> list[Record]:
        """The complete records behind the place AFTER, of one TAG only when given."""
        return [record for record in self.reader(after).more() if tag in (None, record.tag)]

    def texts(self, tag: str | None = None, after: int = 0) -> list[str]:
        """The message texts behind the place AFTER, in order."""
        return [record.text for record in self.records(after, tag)]

    def find(self, pattern: "str | re.Pattern[str]", after: int = 0,
             tag: str | None = None) -> Record | None:
        """The first record whose text holds the text, or matches the expression, PATTERN."""
        return _first(self.reader(after).more(), pattern, tag)

    def wait(self, pattern: "str | re.Pattern[str]", after: int = 0,
             timeout: float | None = None, tag: str | None = None) -> Record:
        """Wait for a record that `find` finds."""
        reader = self.reader(after)
        return wait_until(lambda: _first(reader.more(), pattern, tag),
                          f"the log text {pattern!r}", timeout, self.tail)

    def tail(self, count: int = EXPLAIN_LINES) -> str:
        """The last COUNT lines, for messages."""
        lines = self.content().decode("utf-8", "replace").splitlines()
        return "\n".join(["the log ends with:", *lines[-count:]])


def _first(records: list[Record], pattern: "str | re.Pattern[str]",
           tag: str | None) -> Record | None:
    for record in records:
        if tag in (None, record.tag) and (pattern in record.text if isinstance(pattern, str)
                                          else pattern.search(record.text)):
            return record
    return None
