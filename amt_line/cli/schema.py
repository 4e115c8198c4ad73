"""``amt-station schema``: the schemas of plans and records."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import common_options


@click.command()
@click.argument("what", type=click.Choice(["plan", "record"]))
@common_options
def schema(what: str) -> None:
    """Print the JSON Schema of plans (for editors) or of records."""
    if what == "plan":
        from amt_line.plan.schema import plan_schema

        console.data_json(plan_schema())
        return
    from amt_line.run.record_schema import record_schema

    console.data_json(record_schema())
