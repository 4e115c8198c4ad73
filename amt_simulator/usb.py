"""The handset's USB link, as its kernel tells of it."""

from pathlib import Path
from typing import Callable

from amt_simulator import ports
from amt_simulator.client import Client
from amt_simulator.waiting import wait_until

CONNECTED, CONFIGURED, DISCONNECTED = "CONNECTED", "CONFIGURED", "DISCONNECTED"
PLUGGED = (CONNECTED, CONFIGURED)


class Usb:
    """Plugs, configures and unplugs; each sets the driver's state file and sends a kernel event.

    A handset with ports has the station's port while it is plugged in.
    """

    def __init__(self, client: Client, directory: Path, explain: Callable[[], str]) -> None:
        self._client = client
        self._directory = directory
        self._explain = explain

    def plug(self) -> None:
        """A cable comes in: the link is connected."""
        self.set_state(CONNECTED)

    def configure(self) -> None:
        """The PC configures the link."""
        self.set_state(CONFIGURED)

    def unplug(self) -> None:
        """The cable goes: the link is disconnected."""
        self.set_state(DISCONNECTED)

    def set_state(self, state: str) -> None:
        """Bring the link to any state, as `USB_STATE=` tells it."""
        answer = self._client.ask("usb", state=state)
        if state == DISCONNECTED:
            ports.close_port(ports.STATION_LINE, self._directory)
        elif state in PLUGGED and answer["has_ports"] and not answer["has_port"]:
            ports.open_port(self._client, ports.STATION_LINE, self._directory)

    def send(self, *strings: str) -> None:
        """Send any kernel event, made of these strings."""
        self._client.ask("uevent", strings=list(strings))

    def listeners(self) -> int:
        """How many sockets of the handset listen to kernel events."""
        return int(self._client.ask("uevent_listeners")["listeners"])

    def wait_listener(self, timeout: float | None = None) -> None:
        """Wait until the daemon listens, so that the next event is not lost."""
        wait_until(lambda: self.listeners() or None, "a listener to kernel events", timeout,
                   self._explain)
