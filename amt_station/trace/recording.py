"""Writes a trace while a line is used: what is in the file is whole, however the program ends."""

from __future__ import annotations

import os
import shlex
import stat
import sys
import threading
import time
from datetime import datetime, timezone
from pathlib import Path

from amt_station import __version__
from amt_station.errors import NoPort, StationError, UsageProblem
from amt_station.port import Port
from amt_station.requests.model import Channel
from amt_station.text import printable
from amt_station.trace.dialogue import HEARS, LOSES, OPENS, SAYS
from amt_station.trace.message import write_messages
from amt_station.trace.words import quoted


class Recording:
    """A trace that is being written, a line at a time; threads may share it.

    What cannot be written any more never stops what is being recorded: ``problem`` keeps it.
    """

    def __init__(self, path: Path, channel: Channel, title: str = "") -> None:
        """Begin a new file; ``UsageProblem`` when it is there already or cannot be made."""
        self.path = path
        self.channel = channel
        self.problem = ""
        self._turn = threading.RLock()
        self._started = time.monotonic()
        self._used = False
        self._fd = _opened(path)
        self._is_file = stat.S_ISREG(os.fstat(self._fd).st_mode)
        begun = datetime.now(timezone.utc).isoformat(timespec="microseconds")
        self.comment(f"A trace of {title}" if title else "A trace")
        self._write(f"@{begun.replace('+00:00', 'Z')} channel {channel.value}\n")

    def comment(self, text: str) -> None:
        """Note something that is no statement."""
        self._write(f"# {printable(text)}\n")

    def note(self, action: str, *rests: str) -> None:
        """Note a statement, or several of the same moment, now."""
        with self._turn:
            self._used = True
            moment = f"@+{time.monotonic() - self._started:.6f}"
            for rest in rests or ("",):
                self._write(f"{moment:13} {action:13} {rest}".rstrip() + "\n")

    def says(self, data: bytes) -> None:
        """The station sends ``data`` at once."""
        self.note(SAYS, *write_messages(data, self.channel))

    def hears(self, data: bytes) -> None:
        """``data`` has come in one piece."""
        self.note(HEARS, *write_messages(data, self.channel))

    def _write(self, text: str) -> None:
        with self._turn:
            if self._fd < 0 or self.problem:
                return
            begin = os.lseek(self._fd, 0, os.SEEK_CUR) if self._is_file else 0
            left = text.encode("ascii", "backslashreplace")
            try:
                while left:
                    left = left[os.write(self._fd, left):]
            except OSError as error:
                self.problem = f"the trace {self.path} could not be written: {error.strerror}"
                if self._is_file:
                    os.ftruncate(self._fd, begin)

    def close(self, end: str = "") -> None:
        """End the file with a remark; one in which nothing was noted goes away again."""
        with self._turn:
            if self._fd < 0:
                return
            if end:
                self.comment(end)
            os.close(self._fd)
            self._fd = -1
            if self._is_file and not self._used:
                self.path.unlink(missing_ok=True)

    def traced(self, port: Port) -> Port:
        """A port that notes what goes over ``port``, which has just been opened."""
        self.note(OPENS, quoted(os.fsencode(port.name)))
        return TracedPort(port, self)


def begun(path: str, channel: Channel) -> Recording:
    """The trace of this process's command line."""
    return Recording(Path(path), channel, f"amt-station {__version__}: {shlex.join(sys.argv[1:])}")


def _opened(path: Path) -> int:
    try:
        return os.open(path, os.O_WRONLY | os.O_CREAT | os.O_EXCL | os.O_CLOEXEC, 0o666)
    except FileExistsError:
        pass
    except OSError as error:
        raise UsageProblem(f"--trace {path}: {error.strerror}") from error
    # A device or a pipe takes everything; a file may be the only trace of a failure.
    try:
        if stat.S_ISREG(os.stat(path).st_mode):
            raise UsageProblem(f"--trace {path}: this file is there already, and a trace is never "
                               "written over another")
        return os.open(path, os.O_WRONLY | os.O_CLOEXEC)
    except OSError as error:
        raise UsageProblem(f"--trace {path}: {error.strerror}") from error


class TracedPort:
    """A port whose every byte is noted: what is sent before it goes, what comes when it came."""

    def __init__(self, port: Port, recording: Recording) -> None:
        self.name = port.name
        self._port = port
        self._recording = recording
        self._is_lost = False

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        data = b""
        try:
            data = self._port.read(timeout)
        except NoPort as error:
            self._lose(error)
            raise
        finally:
            # Also when a signal ends the program just now.
            if data:
                self._recording.hears(data)
        return data

    def write(self, data: bytes, timeout: float) -> None:
        """As in ``Port``."""
        self._recording.says(data)
        try:
            self._port.write(data, timeout)
        except NoPort as error:
            self._lose(error)
            raise
        except StationError as error:
            self._recording.comment(str(error))
            raise

    def _lose(self, error: NoPort) -> None:
        if not self._is_lost:
            self._is_lost = True
            self._recording.comment(str(error))
            self._recording.note(LOSES)

    def close(self) -> None:
        """As in ``Port``."""
        self._port.close()
