"""The page for a command: served until it is closed, with what a browser has to know."""

from __future__ import annotations

from functools import partial
from typing import TYPE_CHECKING, Callable

from amt_station.state import state_directory

if TYPE_CHECKING:
    from amt_line.run.desk import Desk
    from amt_line.store import Store
    from amt_line.view.web import Page

TOKEN_FILE = "page-token"


def open_page(http: str, desk: Desk | None, store_url: str | None,
              delivery: Callable[[], str] = lambda: "ok") -> Page:
    """Serve the page at ``http`` (``[HOST:]PORT``); ``UsageProblem`` when it cannot.

    It is a listener to the events of a line; its ``url`` is for the person at the terminal and has
    the token in it where one is needed. ``desk`` is None without a line, ``store_url`` when no
    records are kept; ``delivery`` says how far the store is. The database is opened when somebody
    looks at records, so one that is away keeps no line from beginning.
    """
    from amt_line.view.web import start
    from amt_line.view.web.address import read_address
    from amt_line.view.web.token import kept_token

    address = read_address(http)
    access = None if address.is_loopback else kept_token(state_directory() / TOKEN_FILE)
    return start(address, desk=desk, access=access, delivery=delivery,
                 store=None if store_url is None else partial(_open_store, store_url))


def _open_store(url: str) -> Store:
    from amt_line.store import Store

    return Store.open(url)
