"""The command that lists the requests and the AT commands."""

from __future__ import annotations

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.render import columns
from amt_station.requests.at_commands import AT_COMMANDS, WATCHED
from amt_station.requests.model import Request, Service
from amt_station.requests.table import REQUESTS, operations


def _who(service: Service | None) -> str:
    return service.by if service else "-"


@click.command()
@click.option("--at", "at_texts", is_flag=True, help="List the AT commands instead")
@common_options
@click.pass_obj
def commands(settings: Settings, at_texts: bool) -> None:
    """List the requests, who serves them on each channel, and the typed commands."""
    if at_texts:
        _list_at(settings)
    elif settings.json:
        console.data_json([_request_json(row) for row in REQUESTS])
    else:
        header = ("id", "hex", "command", "name", "pc", "app", "what")
        rows = [(str(row.id), f"0x{row.id:02X}", row.name, row.catalogue_name, _who(row.pc),
                 _who(row.app), row.summary) for row in REQUESTS]
        for line in columns([header, *rows]):
            console.data(line)
        console.data("")
        for line in columns([(operation.name, operation.summary)
                             for _, operation in operations()]):
            console.data(line)


def _request_json(row: Request) -> dict[str, object]:
    return {"id": row.id, "name": row.catalogue_name, "command": row.name,
            "summary": row.summary, "pc": _who(row.pc), "app": _who(row.app),
            "acknowledged": bool(row.pc and row.pc.acknowledged), "answer": row.answer_id,
            "atoms": [{"id": field.atom, "name": field.name, "type": field.type.label,
                       "unit": field.unit or None, "meaning": field.meaning}
                      for field in row.fields],
            "operations": [operation.name for operation in row.operations]}


def _list_at(settings: Settings) -> None:
    rows = [(row.text, row.does, row.reply) for row in AT_COMMANDS]
    rows += [(watched.text, watched.does, "the modem's") for watched in WATCHED]
    if settings.json:
        console.data_json([{"text": text, "does": does, "reply": reply}
                           for text, does, reply in rows])
        return
    for line in columns([row[:2] for row in rows]):
        console.data(line)
