"""``amt-station stats``: what the store's runs come to."""

from __future__ import annotations

import sys
from datetime import datetime, timezone
from pathlib import Path
from typing import Callable, Mapping

import click

from amt_line.cli.outputs import Outputs
from amt_line.cli.store_option import STORE_OPTION
from amt_line.statistics.figures import Statistics
from amt_line.statistics.filter import Filter, since_from, until_from, zone_named
from amt_line.store import checked_url, shown_url
from amt_line.store.url import sqlite_path
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.errors import EXIT_NO_PORT, StationError, UsageProblem

_FILE = click.Path(path_type=Path, dir_okay=False)


class NoStore(StationError):
    """The database is not there."""

    exit_status = EXIT_NO_PORT
    kind = "no-store"


def _csv(found: Statistics) -> str:
    from amt_line.report.statistics_data import statistics_csv

    return statistics_csv(found)


def _html(found: Statistics) -> str:
    from amt_line.report.statistics_file import statistics_page

    return statistics_page(found)


_MAKERS: Mapping[str, Callable[[Statistics], str]] = {"csv": _csv, "html": _html}


@click.command()
@STORE_OPTION
@click.option("--plan", default="", metavar="TITLE", help="Runs of the plans of this title only")
@click.option("--plan-version", default="", metavar="VERSION", help="Of this version only")
@click.option("--station", default="", metavar="NAME", help="Of this station only")
@click.option("--slot", default="", metavar="NAME", help="Of this slot only")
@click.option("--since", metavar="TIME", help="Runs that began then or later: a day (2026-01-31, "
              "today, yesterday) or a time (2026-01-31T06:00)")
@click.option("--until", metavar="TIME", help="Runs that began before: a day is included whole")
@click.option("--zone", default="UTC", metavar="NAME", show_default=True,
              help="Time zone of days and of times without one, such as Europe/Berlin")
@click.option("--html", type=_FILE, metavar="FILE", help="One page with drawings that opens "
              "without a network")
@click.option("--csv", type=_FILE, metavar="FILE", help="A line a figure")
@common_options
@click.pass_obj
def stats(settings: Settings, store_url: str | None, plan: str, plan_version: str, station: str,
          slot: str, since: str | None, until: str | None, zone: str, html: Path | None,
          csv: Path | None) -> None:
    """Show yields, failures by step, the spread of values, and times.

    docs/line.md says how each figure is counted. Exit status: 0 done, 2 usage, 3 no such
    database, 7 the database cannot be read.
    """
    chosen = _filter(Filter(plan, plan_version, station, slot), since, until, zone)
    url = checked_url(store_url)
    path = sqlite_path(url)
    if path is not None and not path.exists():
        raise NoStore(f"{shown_url(url)}: there is no such database; runs make it, or "
                      "`amt-station store sync`")
    outputs = Outputs({"html": html, "csv": csv}, _MAKERS)
    try:
        found = _gather(url, chosen)
        if settings.json:
            from amt_line.report.statistics_data import statistics_document

            console.data_json({"ok": True, "store": shown_url(url),
                               **statistics_document(found)})
        else:
            from amt_line.view.statistics import show

            show(found, sys.stdout)
        outputs.write(found)
    finally:
        outputs.close()


def _filter(chosen: Filter, since: str | None, until: str | None, zone: str) -> Filter:
    now = datetime.now(timezone.utc)
    option = "--zone"
    try:
        where = zone_named(zone)
        option = "--since"
        begin = since_from(since, where, now) if since is not None else None
        option = "--until"
        end = until_from(until, where, now) if until is not None else None
    except ValueError as error:
        raise UsageProblem(f"{option}: {error}") from error
    if begin is not None and end is not None and begin >= end:
        raise UsageProblem("--since and --until: the period ends before it begins")
    return Filter(chosen.plan, chosen.plan_version, chosen.station, chosen.slot, begin, end,
                  where)


def _gather(url: str, chosen: Filter) -> Statistics:
    from amt_line.store import Store
    from amt_line.store.figures import gather

    with Store.open(url, create=False) as store:
        return gather(store, chosen)
