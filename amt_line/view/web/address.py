"""Where the page listens, and under which names a browser may ask for it."""

from __future__ import annotations

import ipaddress
import re
import socket
from dataclasses import dataclass

from amt_station.errors import UsageProblem
from amt_station.text import printable

LOOPBACK = "127.0.0.1"
_WANTED = re.compile(r"(?:(?P<host>\[[0-9A-Fa-f:.%]+\]|[^:\[\]]+):)?(?P<port>[0-9]{1,5})")
_LOCAL_NAMES = frozenset({"localhost"})


@dataclass(frozen=True)
class Address:
    """A host and a port; port 0 is any that is free."""

    host: str = LOOPBACK
    port: int = 8080

    @property
    def is_loopback(self) -> bool:
        """Whether only this machine can reach it."""
        number = ip_number(self.host)
        return self.host in _LOCAL_NAMES if number is None else number.is_loopback

    @property
    def url_host(self) -> str:
        """The host as it stands in a URL that others can use."""
        number = ip_number(self.host)
        host = _own_number() if number is not None and number.is_unspecified else self.host
        return f"[{host}]" if ":" in host else host


def read_address(text: str) -> Address:
    """``[HOST:]PORT``; ``UsageProblem`` when it is none."""
    found = _WANTED.fullmatch(text)
    if found is None or int(found["port"]) > 65535:
        raise UsageProblem(f"--http {printable(text)!r}: a port, or HOST:PORT, is needed "
                           "(an IPv6 address stands in brackets)")
    host = (found["host"] or LOOPBACK).strip("[]")
    return Address(host, int(found["port"]))


def ip_number(host: str) -> ipaddress.IPv4Address | ipaddress.IPv6Address | None:
    """The address that a text is; None for a name."""
    try:
        return ipaddress.ip_address(host)
    except ValueError:
        return None


def _own_number() -> str:
    """This machine's address on its network; its name where it has none."""
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as probe:
        try:
            # Nothing is sent: the system only says from where it would be.
            probe.connect(("192.0.2.1", 9))
            return str(probe.getsockname()[0])
        except OSError:
            return socket.gethostname()


def bound(address: Address) -> socket.socket:
    """A socket that listens; ``UsageProblem`` when it cannot."""
    host = LOOPBACK if address.host in _LOCAL_NAMES else address.host
    try:
        found = socket.getaddrinfo(host, address.port, type=socket.SOCK_STREAM,
                                   flags=socket.AI_PASSIVE)
        family, _, _, _, place = found[0]
        return socket.create_server(place[:2], family=family, backlog=128)
    except OSError as error:
        # A name that nobody knows has a text of its own, in which no errno stands.
        raise UsageProblem(f"--http {address.url_host}:{address.port}: the page cannot be served "
                           f"there: {error.strerror or error}") from error


class Names:
    """The names in the Host header that mean this server.

    A page of somebody else whose name was made to point here would be of the same origin as this
    one; it comes with its own name. An address in numbers cannot be made to point elsewhere.
    """

    def __init__(self, address: Address) -> None:
        own = socket.gethostname().lower()
        self._loopback = address.is_loopback
        self._names = set(_LOCAL_NAMES)
        if not self._loopback:
            self._names |= {own, own.partition(".")[0], f"{own.partition('.')[0]}.local",
                            address.host.lower()}

    def mean_this(self, host: str) -> bool:
        """Whether the Host header names this server."""
        found = re.fullmatch(r"(\[[0-9A-Fa-f:.]+\]|[^:\[\]]+)(?::[0-9]{1,5})?", host)
        if found is None:
            return False
        name = found[1].strip("[]").lower()
        number = ip_number(name)
        if number is None:
            return name in self._names
        return number.is_loopback or not self._loopback
