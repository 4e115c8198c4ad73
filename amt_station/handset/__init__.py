"""The typed interface: a handset with a method for every typed command of the request table."""

from __future__ import annotations

from types import TracebackType
from typing import Literal

from amt_station.errors import UsageProblem
from amt_station.handset.base import Done, Reply, Result
from amt_station.handset.commands import Commands
from amt_station.link import Link, Place
from amt_station.perform import perform
from amt_station.requests.model import Channel
from amt_station.requests.operations import prepare_text

__all__ = ["Done", "Handset", "Reply", "Result", "connect"]


class Handset(Commands):
    """A handset at the end of a link; a context manager that closes it.

    Every method sends one command and returns a frozen record, or raises a ``StationError``:
    ``Refused`` when the handset says no, ``UsageProblem`` before anything is sent.
    """

    def __init__(self, link: Link) -> None:
        super().__init__(link)
        self.link = link

    def __enter__(self) -> Handset:
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.close()

    def close(self) -> None:
        """Give the port back."""
        self.link.close()

    def at(self, text: str, *, force: bool = False, timeout: float | None = None) -> Reply:
        """Send an AT text; another final result than OK raises ``Refused``."""
        outcome = perform(self.link, prepare_text(text, self.link.channel, force), timeout)
        return Reply(outcome, tuple(str(outcome["reply"].value).split("\n"))
                     if outcome["reply"].value else ())

    def find_place(self) -> Place:
        """Drop what an earlier user of the port may have left behind; a run begins with it."""
        return self.link.find_place()


def connect(port: str, *, channel: Channel | Literal["pc", "app"] = Channel.PC,
            timeout: float | None = None, baud: int = 115200) -> Handset:
    """Open a port, by its name or any pySerial URL, to a handset on one of its two lines.

    ``timeout`` in seconds overrides the time that each command is given by itself.
    """
    try:
        chosen = Channel(channel)
    except ValueError:
        raise UsageProblem(f"{channel!r} is neither pc nor app") from None
    return Handset(Link.open(port, chosen, timeout, baud))
