"""Where the bytes go: a serial port by any pySerial URL, or an open file descriptor."""

from __future__ import annotations

import errno
import os
import select
import time
from typing import Any, Protocol

import serial

from amt_station.errors import NoPort, PortBusy

_CHUNK = 4096
_BUSY = (errno.EBUSY, errno.EAGAIN, errno.EWOULDBLOCK)
_POLL_SECONDS = 0.05


class Port(Protocol):
    """What a link needs of a port."""

    name: str

    def read(self, timeout: float) -> bytes:
        """The next bytes, at least one; empty when ``timeout`` seconds pass without any."""

    def write(self, data: bytes) -> None:
        """Send all of ``data``."""

    def close(self) -> None:
        """Give the port back."""


def _wait_readable(fd: int, timeout: float) -> bool:
    return bool(select.select([fd], [], [], max(0.0, timeout))[0])


class FdPort:
    """A port over an open descriptor, such as the master side of a pseudo-terminal.

    The descriptor stays the caller's unless ``owned``.
    """

    def __init__(self, fd: int, name: str = "", owned: bool = False) -> None:
        self.name = name or f"descriptor {fd}"
        self._fd = fd
        self._owned = owned

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        if not _wait_readable(self._fd, timeout):
            return b""
        try:
            data = os.read(self._fd, _CHUNK)
        except OSError as error:
            raise NoPort(f"{self.name} went away: {error.strerror}") from error
        if not data:
            raise NoPort(f"{self.name} went away: end of data")
        return data

    def write(self, data: bytes) -> None:
        """As in ``Port``."""
        try:
            while data:
                data = data[os.write(self._fd, data):]
        except OSError as error:
            raise NoPort(f"{self.name} went away: {error.strerror}") from error

    def close(self) -> None:
        """As in ``Port``."""
        if self._owned:
            os.close(self._fd)
            self._owned = False


class SerialPort:
    """A port opened by its pySerial URL, for this process alone."""

    def __init__(self, url: str, baud: int = 115200) -> None:
        self.name = url
        try:
            self._serial: Any = serial.serial_for_url(
                url, baudrate=baud, exclusive=True, timeout=_POLL_SECONDS)
        except ValueError as error:
            raise NoPort(f"no port {url}: {error}") from error
        except (OSError, serial.SerialException) as error:
            if getattr(error, "errno", None) in _BUSY:
                raise PortBusy(f"port {url} is busy: somebody else has it open") from error
            raise NoPort(f"no port {url}: {_reason(error)}") from error
        self._fd = self._descriptor()

    def _descriptor(self) -> int | None:
        try:
            return int(self._serial.fileno())
        except (AttributeError, OSError):
            return None

    def read(self, timeout: float) -> bytes:
        """As in ``Port``."""
        try:
            if self._fd is not None:
                if not _wait_readable(self._fd, timeout):
                    return b""
                return bytes(self._serial.read(max(1, self._serial.in_waiting)))
            return self._poll(timeout)
        except (OSError, serial.SerialException) as error:
            raise NoPort(f"port {self.name} went away: {_reason(error)}") from error

    def _poll(self, timeout: float) -> bytes:
        """Ports without a descriptor can only be asked again and again."""
        end = time.monotonic() + timeout
        while True:
            data = bytes(self._serial.read(max(1, self._serial.in_waiting)))
            if data or time.monotonic() >= end:
                return data

    def write(self, data: bytes) -> None:
        """As in ``Port``."""
        try:
            self._serial.write(data)
        except (OSError, serial.SerialException) as error:
            raise NoPort(f"port {self.name} went away: {_reason(error)}") from error

    def close(self) -> None:
        """As in ``Port``."""
        self._serial.close()


def _reason(error: Exception) -> str:
    number = getattr(error, "errno", None)
    return os.strerror(number) if number else str(error).splitlines()[0]
