"""``amt-station check``: read a plan whole, and say everything that is wrong with it."""

from __future__ import annotations

from pathlib import Path

import click

from amt_line.plan.problems import PlanProblem
from amt_line.plan.reader import load_plan
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.text import printable


@click.command()
@click.argument("plan", type=click.Path(path_type=Path))
@common_options
@click.pass_obj
def check(settings: Settings, plan: Path) -> None:
    """Check a plan: every name, value, limit and reference. Nothing is sent.

    Each problem is told with file, step and key.
    """
    try:
        read = load_plan(plan, settings.chosen_channel)
    except PlanProblem as problem:
        for line in problem.lines()[:-1]:
            console.talk(line)
        problem.args = (problem.lines()[-1],)
        raise
    if settings.json:
        console.data_json({"ok": True, "title": read.title, "version": read.version,
                           "channel": read.channel.value, "sha256": read.sha256,
                           "steps": len(read.every_step),
                           "inputs": [item.name for item in read.inputs]})
    else:
        console.data(f"{printable(str(plan))}: a good plan of {len(read.every_step)} steps")
