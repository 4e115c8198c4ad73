"""``amt-station serve``: the pages of records and statistics, without a line."""

from __future__ import annotations

import sys
import threading

import click

from amt_line.cli.page import open_page
from amt_line.store import StoreAway, checked_url
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options

_ANY_PORT = "8080"


@click.command()
@click.option("--store", metavar="URL", help="The database (default: the station's own)")
@click.option("--http", default=_ANY_PORT, metavar="[HOST:]PORT", show_default=True,
              help="Where the page is served; one that others reach wants a token")
@common_options
@click.pass_obj
def serve(settings: Settings, store: str | None, http: str) -> None:
    """Serve the runs in the database, and their statistics, as pages for a browser.

    Ends with Ctrl-C or SIGTERM, with status 0. A database that is away is asked again whenever
    somebody looks.
    """
    from amt_line.store import Store

    url = checked_url(store)
    try:
        # What is no database of ours is told now, and not to whoever looks first.
        Store.open(url).close()
    except StoreAway as error:
        console.complain(str(error))
    page = open_page(http, None, url)
    console.talk(f"page: {page.url}")
    try:
        if settings.json:
            console.data_json({"ok": True, "url": page.url})
            sys.stdout.flush()
        while True:
            threading.Event().wait()
    except KeyboardInterrupt:
        pass
    finally:
        page.close()
