"""``amt-station show``: a record for people."""

from __future__ import annotations

from pathlib import Path
from typing import Any, Iterator, Mapping

import click

from amt_line.report.records import (decoded_text, duration, limits_text, load_record, value_text,
                                     verdict_word)
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.text import printable

_INDENT = " " * 6


@click.command()
@click.argument("record", type=click.Path(path_type=Path))
@click.option("--exchanges", is_flag=True, help="Every exchange with its bytes too")
@common_options
@click.pass_obj
def show(settings: Settings, record: Path, exchanges: bool) -> None:
    """Print the record of a run."""
    document = load_record(record)
    if settings.json:
        console.data_json(document)
        return
    for line in record_lines(document, exchanges):
        console.data(line)


def record_lines(record: Mapping[str, Any], exchanges: bool = False) -> Iterator[str]:
    """The record, a line each."""
    plan = record["plan"]
    yield f"{verdict_word(record)}  {printable(record['dut']) or 'no name'}"
    version = f", version {printable(plan['version'])}" if plan["version"] else ""
    rows = {"plan": f"{printable(plan['title'])}{version} ({printable(plan['path'])})",
            "begin": record["began"],
            "time": duration(record["seconds"]) or f"not ended, {record['state']}",
            "station": printable(record["station"]), "operator": printable(record["operator"]),
            "port": f"{printable(record['port'])} ({record['channel']})",
            "run": record["run"], "exit status": record["exit_status"],
            **{f"input {printable(name)}": printable(str(value))
               for name, value in record["inputs"].items()},
            "first": printable(record["reason"]), "what to do": printable(record["advice"])}
    for name, text in rows.items():
        if text not in ("", None):
            yield f"  {name}: {text}"
    for text in record["remarks"]:
        yield f"  {printable(text)}"
    if exchanges:
        yield from _exchange_lines(record["begin"])
    for step in record["steps"]:
        yield from _step_lines(step, exchanges)


def _step_lines(step: Mapping[str, Any], exchanges: bool) -> Iterator[str]:
    tried = f", {step['attempts']} attempts" if step["attempts"] > 1 else ""
    forced = ", forced" if step["forced"] else ""
    section = "" if step["section"] == "step" else f" ({step['section']})"
    yield (f"{step['number']:>3}  {step['verdict']:7}  {printable(step['name'])}{section}, "
           f"{duration(step['seconds'])}{tried}{forced}")
    if step["reason"]:
        yield f"{_INDENT}{printable(step['reason'])}"
    for earlier in step["earlier"]:
        yield (f"{_INDENT}attempt {earlier['attempt']}: {earlier['verdict']}, "
               f"{printable(earlier['reason'])}")
    if "answer" in step:
        yield (f"{_INDENT}answered: {printable(step['answer']['text'])} "
               f"({printable(step['answer']['by'])})")
    for value in step["values"]:
        limits = limits_text(value)
        near = ", near" if value.get("marginal") else ""
        judged = f"  [{value['verdict']}{near}: {limits}]" if "verdict" in value else ""
        yield f"{_INDENT}{printable(value['name'])}: {value_text(value)}{judged}"
    for text in step["remarks"]:
        yield f"{_INDENT}{printable(text)}"
    if exchanges:
        yield from _exchange_lines(step["exchanges"])


def _exchange_lines(exchanges: list[Mapping[str, Any]]) -> Iterator[str]:
    for exchange in exchanges:
        yield f"{_INDENT}{exchange['began']}  -> {exchange['sent']}"
        for item in exchange["sent_decoded"]:
            yield f"{_INDENT}    {decoded_text(item)}"
        for item in exchange["received"]:
            late = " (late)" if "late" in item else ""
            yield f"{_INDENT}+{duration(item['seconds'])}{late}  <- {item['bytes']}"
            yield f"{_INDENT}    {decoded_text(item['decoded'])}"
        if exchange["error"]:
            yield f"{_INDENT}{printable(exchange['error'])}"
