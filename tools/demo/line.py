"""A line of simulated handsets, for the demo and for trying out."""

import csv
import json
from pathlib import Path
from typing import Any, Collection

from amt_line.cli.line import Wishes, carry_out
from amt_line.cli.simulated import Hand, simulated_handsets, slots_of
from amt_line.plan.reader import load_plan
from amt_station.cli.lazy import COMMANDS
from amt_station.cli.main import run as station
from amt_station.cli.options import Settings
from amt_station.requests.model import Channel
from tools.demo.stage import Stage

PLAN = Path(__file__).with_name("line.toml")
HANDSETS = 3
WEAK = "2"


def serve(count: int, folder: Path, http: str, weak: Collection[str] = (), runs: int = 1,
          replug: float | None = None) -> int:
    """Serve COUNT simulated handsets; without REPLUG, one run each. The line's exit status.

    Records, and the database of them, go to FOLDER.
    """
    plan = load_plan(PLAN, Channel.PC)
    folder.mkdir(parents=True, exist_ok=True)
    wishes = Wishes(inputs=write_inputs(folder / "inputs.csv", count, runs), once=replug is None,
                    http=http, records=folder / "records", store=store_url(folder),
                    station="demo")
    with simulated_handsets(count, Channel.PC, weak) as handsets:
        hand = Hand(handsets, replug) if replug is not None else None
        try:
            return carry_out(Settings(), plan, slots_of(handsets, Channel.PC), wishes, hand)
        finally:
            if hand is not None:
                hand.close()


def store_url(folder: Path) -> str:
    """The database in a folder."""
    return f"sqlite:///{(folder / 'line.sqlite').resolve()}"


def write_inputs(path: Path, slots: int, runs: int) -> Path:
    """A serial number for every run of every slot."""
    with path.open("w", encoding="utf-8", newline="") as file:
        table = csv.writer(file)
        table.writerow(("slot", "sn"))
        for run in range(runs):
            for slot in range(1, slots + 1):
                table.writerow((slot, f"KEL{run * slots + slot:010}"))
    return path


def play(stage: Stage, folder: Path) -> None:
    """Three handsets on a line, one with a weak battery."""
    stage.act("5  Three handsets on a line, one with a weak battery")
    status = serve(HANDSETS, folder, "0", weak=(WEAK,))
    stage.check("the line's exit status", f"{status}, that of the first run that was no pass",
                status == 1)
    records = sorted((json.loads(path.read_text(encoding="utf-8"))
                      for path in (folder / "records").glob("*.json")),
                     key=lambda record: str(record["slot"]))
    for record in records:
        stage.check(f"slot {record['slot']}", _told(record),
                    record["verdict"] == ("FAIL" if record["slot"] == WEAK else "PASS"))
    stage.check("records", f"{len(records)} in {folder / 'records'}", len(records) == HANDSETS)
    if "stats" in COMMANDS:
        status = station(["stats", "--store", store_url(folder)])
        stage.check("statistics", "of these three", status == 0)


def _told(record: dict[str, Any]) -> str:
    reason = f", {record['reason']}" if record["reason"] else ""
    return f"{record['dut']}: {record['verdict']}{reason}"
