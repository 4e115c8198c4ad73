"""Where the handset of a slot is plugged in: what stands there now, and whether it is another one.

A mark is equal as long as the same device stands at the place without having been away.
"""

from __future__ import annotations

import os
import stat
import threading
import time
from dataclasses import dataclass
from pathlib import Path
from typing import Callable, Protocol

from amt_station.errors import NoPort
from amt_station.found_ports import FoundPort, found_ports
from amt_station.port import Port, SerialPort

USB_PREFIX = "usb:"
DEFAULT_BAUD = 115200
_LISTING_SECONDS = 0.2
_TTYS = Path("/sys/class/tty")

Mark = tuple[object, ...]


@dataclass(frozen=True)
class Seen:
    """A port that is there: its name, and the mark of what stands behind it."""

    url: str
    mark: Mark


class Plug(Protocol):
    """A place for a handset."""

    name: str

    @property
    def stays(self) -> bool:
        """Whether its port stays where it is without a handset, so that only an answer tells."""

    def look(self) -> Seen | None:
        """What is there now."""

    def open(self, seen: Seen) -> Port:
        """Open what was seen."""


class PathPlug:
    """A place with a device of a fixed name; a link that leads to it is followed."""

    def __init__(self, path: str, baud: int = DEFAULT_BAUD, stays: bool | None = None) -> None:
        """``stays`` in place of what can be seen of it."""
        self.name = path
        self._baud = baud
        self._stays = stays

    @property
    def stays(self) -> bool:
        """As in ``Plug``: a USB port, and a link that somebody keeps, go with the handset."""
        if self._stays is not None:
            return self._stays
        return not os.path.islink(self.name) and not usb_device(self.name)

    def look(self) -> Seen | None:
        """As in ``Plug``."""
        try:
            link, device = os.lstat(self.name), os.stat(self.name)
        except OSError:
            return None
        mark: Mark = (device.st_dev, device.st_ino, device.st_rdev, usb_device(self.name))
        if stat.S_ISLNK(link.st_mode):
            mark += (link.st_dev, link.st_ino, link.st_ctime_ns)
        return Seen(self.name, mark)

    def open(self, seen: Seen) -> Port:
        """As in ``Plug``."""
        return SerialPort(seen.url, self._baud)


class UrlPlug:
    """A port by any other pySerial URL, which says nothing before it is opened."""

    stays = True

    def __init__(self, url: str, baud: int = DEFAULT_BAUD) -> None:
        self.name = url
        self._baud = baud

    def look(self) -> Seen | None:
        """As in ``Plug``."""
        return Seen(self.name, ())

    def open(self, seen: Seen) -> Port:
        """As in ``Plug``."""
        return SerialPort(seen.url, self._baud)


class Listing:
    """The ports of this computer, looked up now and then for all slots together."""

    def __init__(self, find: Callable[[], list[FoundPort]] = found_ports) -> None:
        self._find = find
        self._turn = threading.Lock()
        self._ports: list[FoundPort] = []
        self._until = 0.0

    def ports(self) -> list[FoundPort]:
        """What is there, or was a moment ago."""
        with self._turn:
            if time.monotonic() >= self._until:
                self._ports = self._find()
                self._until = time.monotonic() + _LISTING_SECONDS
            return self._ports


class UsbPlug:
    """A socket of the USB tree (`1-2.3`), whatever the port there is called.

    Where a handset has several ports, ``1-2.3:1.2`` names the one of an interface.
    """

    stays = False

    def __init__(self, location: str, listing: Listing, baud: int = DEFAULT_BAUD) -> None:
        self.name = f"{USB_PREFIX}{location}"
        self._location = location
        self._listing = listing
        self._baud = baud

    def look(self) -> Seen | None:
        """As in ``Plug``; of several ports the first."""
        fitting = [port for port in self._listing.ports()
                   if self._location in (port.location, port.location.partition(":")[0])]
        if not fitting:
            return None
        port = fitting[0]
        return Seen(port.device, (port.device, port.serial, usb_device(port.device)))

    def open(self, seen: Seen) -> Port:
        """As in ``Plug``."""
        return SerialPort(seen.url, self._baud)


def plug_of(text: str, listing: Listing, baud: int = DEFAULT_BAUD,
            stays: bool | None = None) -> Plug:
    """The place that a text names: a device, ``usb:`` and a USB path, or a pySerial URL.

    ``stays``: whether a device stays where it is when its handset goes; None: as it looks.
    """
    if text.startswith(USB_PREFIX):
        return UsbPlug(text.removeprefix(USB_PREFIX), listing, baud)
    if "://" in text:
        return UrlPlug(text, baud)
    return PathPlug(text, baud, stays)


def usb_device(path: str) -> str:
    """The USB device behind a tty, with a number that is new for each plugging in; or empty."""
    place = _TTYS / os.path.basename(os.path.realpath(path)) / "device"
    try:
        device = place.resolve(strict=True)
    except OSError:
        return ""
    for folder in (device, *device.parents):
        try:
            return f"{folder.name} {(folder / 'devnum').read_text(encoding='ascii').strip()}"
        except OSError:
            continue
    return ""


def open_again(plug: Plug) -> tuple[Seen, Port]:
    """Open whatever stands there now; ``NoPort`` when nothing does."""
    seen = plug.look()
    if seen is None:
        raise NoPort(f"no port {plug.name}")
    return seen, plug.open(seen)
