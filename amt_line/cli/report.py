"""``amt-station report``: make reports of records."""

from __future__ import annotations

from pathlib import Path
from typing import Sequence

import click

from amt_line.cli.outputs import Outputs
from amt_line.report.records import load_records
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.errors import UsageProblem

_FILE = click.Path(path_type=Path, dir_okay=False)


@click.command()
@click.argument("records", nargs=-1, required=True, type=click.Path(path_type=Path))
@click.option("--junit", type=_FILE, metavar="FILE", help="A JUnit suite a run")
@click.option("--csv", type=_FILE, metavar="FILE", help="A line a value")
@click.option("--html", type=_FILE, metavar="FILE", help="One page that opens without a network")
@common_options
@click.pass_obj
def report(settings: Settings, records: Sequence[Path], junit: Path | None, csv: Path | None,
           html: Path | None) -> None:
    """Make report files of one or many records. A directory stands for the records in it."""
    if junit is None and csv is None and html is None:
        raise UsageProblem("no report is asked for: give --junit, --csv or --html")
    files = [file for path in records for file in _files(path)]
    found = load_records(files)
    outputs = Outputs({"junit": junit, "csv": csv, "html": html}, files)
    try:
        outputs.write(found)
    finally:
        outputs.close()
    if settings.json:
        console.data_json({"ok": True, "records": len(found)})


def _files(path: Path) -> list[Path]:
    if not path.is_dir():
        return [path]
    files = sorted(file for file in path.glob("*.json") if not file.name.startswith("."))
    if not files:
        raise UsageProblem(f"{path}: no records in this directory")
    return files
