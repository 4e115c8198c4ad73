"""``amt-station store``: deliver to the database what it has missed, and compare the two."""

from __future__ import annotations

from pathlib import Path
from typing import Any, Callable, TypeVar

import click

from amt_line.cli import places
from amt_line.cli.store_option import STORE_OPTION
from amt_line.store import Store, checked_url, shown_url
from amt_line.store.gap import Comparison, compare, synchronise
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.errors import UsageProblem
from amt_station.text import printable

_Command = TypeVar("_Command", bound=Callable[..., Any])

_RECORDS = click.option("--records", type=click.Path(path_type=Path, file_okay=False),
                        metavar="DIR", help="The directory of records (default: below the XDG "
                        "state directory)")


def _options(command: _Command) -> _Command:
    return STORE_OPTION(_RECORDS(common_options(command)))


@click.group("store", no_args_is_help=False)
def store() -> None:
    """The database that every record goes into."""


@store.command()
@_options
@click.pass_context
def sync(context: click.Context, store_url: str | None, records: Path | None) -> None:
    """Deliver to the database every record that it has missed, in order.

    Runs do this by themselves; this does it at once, and makes or migrates the database. Exit
    status 1: a file in the directory is no record (it is named and left alone).
    """
    settings: Settings = context.ensure_object(Settings)
    url, directory = checked_url(store_url), _directory(records)
    with Store.open(url) as database:
        result = synchronise(database, directory)
    for name, reason in result.bad.items():
        console.talk(f"skipped {directory / name}: {reason}")
    if settings.json:
        console.data_json({"ok": not result.bad, "store": shown_url(url),
                           "records": str(directory), "files": result.files,
                           "delivered": result.delivered, "skipped": result.bad})
    else:
        console.data(f"{printable(str(directory))}: {_files(result.files)}, "
                     f"{result.delivered} delivered")
    context.exit(1 if result.bad else 0)


@store.command()
@_options
@click.pass_context
def check(context: click.Context, store_url: str | None, records: Path | None) -> None:
    """Compare the directory of records with the database, both ways.

    Exit status 0: they agree. 1: a record is missing in the database, differs (by its SHA-256),
    has gone from the directory, or a file is no record.
    """
    settings: Settings = context.ensure_object(Settings)
    url, directory = checked_url(store_url), _directory(records)
    with Store.open(url, create=False) as database:
        result = compare(database, directory)
    if settings.json:
        console.data_json({
            "ok": result.agree, "store": shown_url(url), "records": str(directory),
            "files": result.files, "stored": result.stored, "missing": result.missing,
            "differing": result.differing, "unknown": result.unknown, "skipped": result.bad})
    else:
        _show(result, directory)
    context.exit(0 if result.agree else 1)


def _show(result: Comparison, directory: Path) -> None:
    for name in result.missing:
        console.data(f"{name}: missing in the database")
    for name, reason in result.differing.items():
        console.data(f"{name}: differs: {reason}")
    for name in result.unknown:
        console.data(f"{name}: in the database, but not in the directory any more")
    for name, reason in result.bad.items():
        console.data(f"{name}: {reason}")
    console.data(f"{directory}: {_files(result.files)}, {result.stored} in the database as they "
                 f"are, {len(result.missing)} missing, {len(result.differing)} differing, "
                 f"{len(result.unknown)} only in the database, {len(result.bad)} no records")


def _files(count: int) -> str:
    return "1 file" if count == 1 else f"{count} files"


def _directory(said: Path | None) -> Path:
    directory = said or places.records_directory()
    if said is not None and not said.is_dir():
        raise UsageProblem(f"{said}: no such directory")
    return directory
