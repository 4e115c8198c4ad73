"""Where the bytes go: a serial port by any pySerial URL, or an open file descriptor."""

from __future__ import annotations

import errno
import math
import os
import select
import termios
import time
from typing import Any, Callable, Protocol, runtime_checkable

import serial

from amt_station.errors import NoAnswer, NoPort, PortBusy, UsageProblem

_CHUNK = 4096
_BUSY = (errno.EBUSY, errno.EAGAIN, errno.EWOULDBLOCK)
_POLL_SECONDS = 0.05
_LONGEST_POLL = 0x7FFFFFFF

# Linux gives this control character no meaning: what it holds outlives every process, however it
# ends, and goes with the device.
_CONTROLS, _MEMORY = 6, termios.VSWTC
_OUT_OF_STEP, _NOTHING = b"\x01", b"\0"


class Port(Protocol):
    """What a link needs of a port."""

    name: str

    def read(self, timeout: float) -> bytes:
        """The next bytes, at least one; empty when ``timeout`` seconds pass without any."""

    def write(self, data: bytes, timeout: float) -> None:
        """Send all of ``data``; ``NoAnswer`` when the peer does not take it within ``timeout``."""

    def close(self) -> None:
        """Give the port back."""


@runtime_checkable
class LastingPort(Port, Protocol):
    """A port that remembers, beyond the process, whether an answer is still to come on it."""

    def left_out_of_step(self) -> bool:
        """Whether whoever used the port last left it without an answer."""

    def remember(self, out_of_step: bool) -> None:
        """Keep it in mind; nothing happens where the port cannot."""


def _ready(fd: int, event: int, timeout: float) -> bool:
    """Whether the descriptor is ready, or has an error to tell, within ``timeout`` seconds."""
    poll = select.poll()
    poll.register(fd, event)
    return bool(poll.poll(min(math.ceil(max(0.0, timeout) * 1000), _LONGEST_POLL)))


def _hung_up(fd: int) -> bool:
    """Whether the other end is gone, without reading what it has left."""
    poll = select.poll()
    poll.register(fd, 0)
    return bool(poll.poll(0))


def _write_all(fd: int, data: bytes, timeout: float, name: str, check: Callable[[], None]
               ) -> None:
    """Write with a deadline, whether the descriptor blocks or not; ``check`` may end it."""
    end = time.monotonic() + timeout
    blocking = os.get_blocking(fd)
    os.set_blocking(fd, False)
    try:
        while data:
            check()
            left = end - time.monotonic()
            if not _ready(fd, select.POLLOUT, min(left, _POLL_SECONDS)):
                if left > _POLL_SECONDS:
                    continue
                raise _not_taken(name, timeout)
            try:
                data = data[os.write(fd, data):]
            except BlockingIOError:
                continue
    except BaseException:
        _drop_output(fd)
        raise
    finally:
        os.set_blocking(fd, blocking)


def _drop_output(fd: int) -> None:
    """Forget what the peer has not taken: a close would wait for it."""
    try:
        termios.tcflush(fd, termios.TCOFLUSH)
    except termios.error:
        pass  # no terminal: nothing is kept for it


def _not_taken(name: str, timeout: float) -> NoAnswer:
    return NoAnswer(f"{name}: nobody takes what is sent, within {timeout:g} s")


def _nothing() -> None:
    """A writing that nobody ends."""


class _Waiting:
    """A port that does not wait blindly while it writes.

    ``check`` is called again and again while the peer does not take what is sent; what it raises
    ends that.
    """

    check: Callable[[], None] = staticmethod(_nothing)


class FdPort(_Waiting):
    """A port over an open descriptor, such as the master side of a pseudo-terminal.

    The descriptor stays the caller's unless ``owned``.
    """

    def __init__(self, fd: int, name: str = "", owned: bool = False) -> None:
        self.name = name or f"descriptor {fd}"
        self._fd = fd
        self._owned = owned

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        if not _ready(self._fd, select.POLLIN, timeout):
            return b""
        try:
            data = os.read(self._fd, _CHUNK)
        except OSError as error:
            raise NoPort(f"{self.name} went away: {error.strerror}") from error
        if not data:
            raise NoPort(f"{self.name} went away: end of data")
        return data

    def write(self, data: bytes, timeout: float) -> None:
        """As in ``Port``."""
        try:
            _write_all(self._fd, data, timeout, self.name, self.check)
        except OSError as error:
            raise NoPort(f"{self.name} went away: {error.strerror}") from error

    def is_gone(self) -> bool:
        """Whether the other end has hung up."""
        return self._fd < 0 or _hung_up(self._fd)

    def close(self) -> None:
        """As in ``Port``."""
        if self._owned:
            os.close(self._fd)
            self._fd, self._owned = -1, False


class SerialPort(_Waiting):
    """A port opened by its pySerial URL, for this process alone."""

    def __init__(self, url: str, baud: int = 115200) -> None:
        self.name = url
        try:
            self._serial: Any = serial.serial_for_url(
                url, baudrate=baud, exclusive=True, timeout=_POLL_SECONDS)
        except (OSError, serial.SerialException) as error:
            if getattr(error, "errno", None) in _BUSY:
                raise PortBusy(f"port {url} is busy: {_who_holds(url)}") from error
            raise NoPort(f"no port {url}: {_reason(error)}") from error
        except Exception as error:
            # A URL goes to one of many handlers of pySerial, which raise what they like.
            if "baud" in str(error).lower():
                raise UsageProblem(f"{url} does not take {baud} baud") from error
            raise NoPort(f"no port {url}: {_reason(error)}") from error
        self._fd: int | None = self._descriptor()

    def _descriptor(self) -> int | None:
        try:
            return int(self._serial.fileno())
        except (AttributeError, OSError):
            return None

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        self._check_open()
        try:
            if self._fd is not None:
                if not _ready(self._fd, select.POLLIN, timeout):
                    return b""
                return bytes(self._serial.read(min(_CHUNK, max(1, self._serial.in_waiting))))
            return self._poll(timeout)
        except (OSError, serial.SerialException) as error:
            raise NoPort(f"port {self.name} went away: {_reason(error)}") from error

    def _check_open(self) -> None:
        if not self._serial.is_open:
            raise NoPort(f"port {self.name} is closed")

    def _poll(self, timeout: float) -> bytes:
        """Ports without a descriptor can only be asked again and again."""
        end = time.monotonic() + timeout
        while True:
            data = bytes(self._serial.read(min(_CHUNK, max(1, self._serial.in_waiting))))
            if data or time.monotonic() >= end:
                return data

    def write(self, data: bytes, timeout: float) -> None:
        """As in ``Port``."""
        self._check_open()
        try:
            if self._fd is not None:
                _write_all(self._fd, data, timeout, f"port {self.name}", self.check)
            else:
                self._serial.write_timeout = timeout
                self._serial.write(data)
        except serial.SerialTimeoutException as error:
            raise _not_taken(f"port {self.name}", timeout) from error
        except (OSError, serial.SerialException) as error:
            raise NoPort(f"port {self.name} went away: {_reason(error)}") from error

    def is_gone(self) -> bool:
        """Whether the other end has hung up; False for a port that cannot tell."""
        return self._fd is not None and _hung_up(self._fd)

    def left_out_of_step(self) -> bool:
        """As in ``LastingPort``; the terminal remembers it."""
        try:
            return (self._fd is not None
                    and termios.tcgetattr(self._fd)[_CONTROLS][_MEMORY] == _OUT_OF_STEP)
        except termios.error:
            return False

    def remember(self, out_of_step: bool) -> None:
        """As in ``LastingPort``."""
        if self._fd is None:
            return
        try:
            attributes = termios.tcgetattr(self._fd)
            attributes[_CONTROLS][_MEMORY] = _OUT_OF_STEP if out_of_step else _NOTHING
            termios.tcsetattr(self._fd, termios.TCSANOW, attributes)
        except termios.error:
            pass  # no terminal, or one that went away: a new one has no past

    def close(self) -> None:
        """As in ``Port``."""
        # The number may become another file's.
        self._fd = None
        self._serial.close()


def _reason(error: Exception) -> str:
    number = getattr(error, "errno", None)
    if isinstance(number, int) and number:
        return os.strerror(number)
    return next(iter(str(error).splitlines()), type(error).__name__)


def _who_holds(url: str) -> str:
    """Who has the port open, as far as this user may know."""
    from amt_station.found_ports import holders

    names = ", ".join(map(str, holders(url)))
    return f"{names} has it open" if names else "somebody else has it open"
