"""The store: every record in a database too, for searching and counting.

The database library is imported when ``Store`` is first asked for, and no sooner: a run begins
without it.
"""

from __future__ import annotations

from typing import TYPE_CHECKING, Any

from amt_line.store.delivery import Delivery
from amt_line.store.problems import BadRecord, StoreAway, StoreProblem
from amt_line.store.search import Found, RunRow, Search
from amt_line.store.url import checked_url, default_store_url, shown_url

if TYPE_CHECKING:
    from amt_line.store.store import Store

__all__ = ["BadRecord", "Delivery", "Found", "RunRow", "Search", "Store", "StoreAway",
           "StoreProblem", "checked_url", "default_store_url", "shown_url"]


def __getattr__(name: str) -> Any:
    if name == "Store":
        from amt_line.store.store import Store

        return Store
    raise AttributeError(f"module {__name__!r} has no attribute {name!r}")
