"""``--store``: which database; the same words for every command that takes it."""

from __future__ import annotations

import click

from amt_line.store.url import VARIABLE

STORE_OPTION = click.option(
    "--store", "store_url", metavar="URL",
    help="The database: sqlite:///FILE or postgresql+psycopg2://USER@HOST/DATABASE (default: a "
    f"SQLite file below the XDG state directory)  [${VARIABLE}]")
