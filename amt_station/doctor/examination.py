"""What is examined: the PC, the port that is meant, and what the one probe of it has brought."""

from __future__ import annotations

from dataclasses import dataclass, field
from pathlib import Path
from typing import Callable

from amt_station.doctor.computer import Computer
from amt_station.doctor.probe import Probe, probe
from amt_station.link import RECOVER_TIMEOUT, Link
from amt_station.port import Port
from amt_station.requests.model import Channel


@dataclass
class Examination:
    """One visit. ``find_port`` gives the port that is meant, or raises why there is none;
    ``open_port`` opens it as every command does. ``records`` and ``store`` are None where nothing
    was said."""

    find_port: Callable[[], str]
    open_port: Callable[[str], Port]
    channel: Channel = Channel.PC
    baud: int = 115200
    timeout: float = RECOVER_TIMEOUT
    records: Path | None = None
    store: str | None = None
    computer: Computer = field(default_factory=Computer)
    failed: set[str] = field(default_factory=set)
    url: str = ""
    link: Link | None = None
    _probe: Probe | None = None

    @property
    def device(self) -> str:
        """The port's file; empty for a URL that leads elsewhere."""
        return "" if "://" in self.url else self.url

    def open(self) -> Link:
        """Open the port for this process alone."""
        if self.link is None:
            self.link = Link(self.open_port(self.url), self.channel)
        return self.link

    def probe(self) -> Probe:
        """Ask the handset, once."""
        if self._probe is None:
            self._probe = probe(self.open(), self.timeout)
        return self._probe

    def close(self) -> None:
        """Give the port back."""
        if self.link is not None:
            self.link.close()
