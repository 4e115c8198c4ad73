"""The page of a line: a view that is served to browsers."""

from __future__ import annotations

from typing import Any, Callable, Mapping, Protocol

from amt_line.run.desk import Desk
from amt_station.errors import UsageProblem


class OpenPage(Protocol):
    """A listener to the events of a line, with the address that it is served at."""

    # What the person at the terminal is told: the address, with the token where one is needed.
    url: str

    def __call__(self, event: Mapping[str, Any]) -> None:
        """Take the next event."""

    def close(self) -> None:
        """End the serving."""


def open_page(http: str, desk: Desk, store_url: str | None,
              delivery: Callable[[], str]) -> OpenPage:
    """Serve the page of a line at ``http`` (``[HOST:]PORT``); ``UsageProblem`` when it cannot.

    ``store_url`` is None when no records are kept; ``delivery`` says how far the store is.
    """
    raise UsageProblem(f"--http {http}: the page is not built in yet")
