"""Waits for a port to go away and to come back: an unplug, a mode change, a power cycle."""

from __future__ import annotations

import time
from typing import TYPE_CHECKING, Callable

from amt_station.errors import NoPort, PortBusy
from amt_station.port import Port

if TYPE_CHECKING:
    from amt_station.link import Link

_LOOK_SECONDS = 0.05

UNPLUG_NOW = "unplug the USB cable and plug it in again now"


def wait_for_replug(link: Link, timeout: float, say: Callable[[str], None]) -> None:
    """Ask for the cable to be pulled and put back, and take the port again.

    ``timeout`` seconds in all; ``NoPort`` when it was not pulled or did not come back by then.
    """
    end = time.monotonic() + timeout
    say(UNPLUG_NOW)
    with link.turn():
        wait_until_gone(link.port, end)
        say("unplugged; waiting for the port to come back")
        link.reconnect(max(_LOOK_SECONDS, end - time.monotonic()))
    say("the port is back")


def wait_until_gone(port: Port, end: float) -> None:
    """Until the port's other end has gone away; what still arrives is nobody's."""
    while True:
        left = end - time.monotonic()
        if left <= 0:
            raise NoPort(f"{port.name} was not unplugged in time")
        try:
            port.read(min(left, 1.0))
        except NoPort:
            return


def reopened(reopen: Callable[[], Port], timeout: float) -> Port:
    """The port, as soon as it can be opened within ``timeout`` seconds.

    A port that just appeared may be held for a moment by a program that looks at new ports.
    """
    end = time.monotonic() + timeout
    while True:
        try:
            return reopen()
        except (NoPort, PortBusy):
            if time.monotonic() >= end:
                raise
            time.sleep(_LOOK_SECONDS)
