"""The raw ends of the handset's lines, as a test holds them."""

import os
import re
import select
import time
from typing import Callable

from amt_simulator.client import Client, Refused
from amt_simulator.errors import HandsetError, HandsetTimeout
from amt_simulator.waiting import DEFAULT_SECONDS, deadline, is_ready, scaled, wait_until

READ_SIZE = 65536


def _shown(data: bytes) -> str:
    return f"{len(data)} bytes: {data[:200]!r}"


class Line:
    """The far end of a tty: what is written here, the handset reads, and the other way round.

    The first use takes the line (from the simulated modem, on its lines); `close` gives it back.
    """

    def __init__(self, client: Client, name: str) -> None:
        self.name = name
        self._client = client
        self._fd = -1
        self._ahead = b""

    # taking and leaving

    @property
    def is_open(self) -> bool:
        """Whether the line is held here."""
        return self._fd >= 0

    def open(self, timeout: float | None = None) -> "Line":
        """Take the line."""
        if not self.is_open:
            self._fd = self._take(timeout)
        return self

    def fileno(self) -> int:
        """The descriptor, raw and non-blocking; takes the line when it is not held yet."""
        self.open()
        return self._fd

    def close(self) -> None:
        """Leave the line; a modem line is the simulated modem's again."""
        if self.is_open:
            self._drop()
            self._client.ask("give_back", line=self.name)

    def forget(self) -> None:
        """Let go of the line without a word, when the handset goes down."""
        self._drop()

    def hang_up(self) -> None:
        """Take the tty away from the handset: its holder gets EIO, its name is gone."""
        self._drop()
        self._client.ask("hang_up", line=self.name)

    def come_back(self, held: bool = False) -> None:
        """Bring the tty back under its name; HELD: keep the simulated modem off it."""
        self._client.ask("come_back", line=self.name, held=held)

    def _take(self, _timeout: float | None) -> int:
        return self._client.ask_fd("take", line=self.name)[0]

    def _drop(self) -> None:
        if self.is_open:
            os.close(self._fd)
            self._fd = -1
            self._ahead = b""

    # talking

    def write(self, data: bytes, timeout: float | None = None) -> None:
        """Write all of DATA, in one piece while the tty has room."""
        end = deadline(timeout)
        fd = self.fileno()
        rest = memoryview(data)
        while rest:
            try:
                rest = rest[os.write(fd, rest):]
            except BlockingIOError:
                if not is_ready(fd, select.POLLOUT, end - time.monotonic()):
                    raise HandsetTimeout(f"{self.name}: nobody reads, {len(rest)} bytes of "
                                         f"{len(data)} are left") from None

    def read(self, timeout: float | None = None) -> bytes:
        """What is there, as soon as there is something; b"" when the other side is gone."""
        if self._ahead:
            data, self._ahead = self._ahead, b""
            return data
        end = deadline(timeout)
        fd = self.fileno()
        while True:
            if not is_ready(fd, select.POLLIN, end - time.monotonic()):
                raise HandsetTimeout(f"{self.name}: nothing arrived")
            try:
                return os.read(fd, READ_SIZE)
            except BlockingIOError:
                continue
            except OSError:
                return b""

    def read_exactly(self, count: int, timeout: float | None = None) -> bytes:
        """The next COUNT bytes."""
        return self._gather(lambda data: count if len(data) >= count else None,
                            f"{count} bytes", timeout)

    def read_until(self, pattern: "bytes | re.Pattern[bytes]",
                   timeout: float | None = None) -> bytes:
        """Everything up to and with the first PATTERN; what follows stays on the line."""
        expression = re.compile(re.escape(pattern)) if isinstance(pattern, bytes) else pattern

        def end_of(data: bytes) -> int | None:
            match = expression.search(data)
            return match.end() if match else None

        return self._gather(end_of, repr(expression.pattern), timeout)

    def read_all(self, quiet: float = 0.2) -> bytes:
        """Everything until the line has been quiet for QUIET seconds."""
        data = b""
        while True:
            try:
                piece = self.read(quiet)
            except HandsetTimeout:
                return data
            if not piece:
                return data
            data += piece

    def expect_silence(self, seconds: float = 0.3) -> None:
        """Fail if anything arrives within SECONDS."""
        data = self.read_all(seconds)
        if data:
            raise AssertionError(f"{self.name}: expected silence, got {_shown(data)}")

    def _gather(self, end_of: Callable[[bytes], int | None], what: str,
                timeout: float | None) -> bytes:
        end = time.monotonic() + scaled(DEFAULT_SECONDS if timeout is None else timeout)
        data = b""
        while True:
            try:
                piece = self.read((end - time.monotonic()) / scaled(1.0))
            except HandsetTimeout:
                raise HandsetTimeout(f"{self.name}: waited in vain for {what}, "
                                     f"got {_shown(data)}") from None
            if not piece:
                raise HandsetTimeout(f"{self.name}: closed while waiting for {what}, "
                                     f"got {_shown(data)}")
            data += piece
            stop = end_of(data)
            if stop is not None:
                # What was read too much belongs to the next read.
                self._ahead = data[stop:]
                return data[:stop]


class AppLine(Line):
    """The app's side of the line that the daemon publishes.

    `close` really closes it: the daemon sees its app go away. The next `open` waits for the
    publication that the daemon makes then.
    """

    def __init__(self, client: Client) -> None:
        super().__init__(client, "app")
        self._passed = ""
        self._publication = ""

    def _take(self, timeout: float | None) -> int:
        def attempt() -> tuple[int, str] | None:
            try:
                fd, answer = self._client.ask_fd("open_app", passed=self._passed)
            except Refused:
                return None
            return fd, answer["publication"]

        fd, self._publication = wait_until(attempt, "the app line to be published", timeout)
        return fd

    def close(self) -> None:
        """Leave the line as an app does that ends."""
        if self.is_open:
            self._passed = self._publication
        self._drop()

    def hang_up(self) -> None:
        """Not for this line: its master is the daemon's."""
        raise HandsetError("the app line's master belongs to the daemon")

    def come_back(self, held: bool = False) -> None:
        """Not for this line: the daemon publishes it."""
        raise HandsetError("the app line's master belongs to the daemon")
