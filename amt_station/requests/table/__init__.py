"""The request table, a family a module, and the ways to find a row in it."""

from __future__ import annotations

from functools import lru_cache
from typing import Mapping

from amt_station.errors import UsageProblem
from amt_station.requests.catalogue import command_ids, command_name, command_names
from amt_station.requests.model import Operation, Request
from amt_station.requests.table import (device, identity, mode, modem_value, radio, test_result,
                                        tunnel)

FAMILIES: tuple[tuple[str, tuple[Request, ...]], ...] = (
    ("Versions and modem values", modem_value.REQUESTS),
    ("Identity data", identity.REQUESTS),
    ("Test results", test_result.REQUESTS),
    ("Modes, SIM and power", mode.REQUESTS),
    ("Device tests", device.REQUESTS),
    ("Radios", radio.REQUESTS),
    ("Requests tunnelled to the modem", tunnel.REQUESTS),
)

REQUESTS: tuple[Request, ...] = tuple(row for _, rows in FAMILIES for row in rows)


@lru_cache(maxsize=1)
def requests_by_id() -> Mapping[int, Request]:
    """Command id to row."""
    return {row.id: row for row in REQUESTS}


def operations() -> list[tuple[Request, Operation]]:
    """Every typed command with its row."""
    return [(row, operation) for row in REQUESTS for operation in row.operations]


def find_operation(path: tuple[str, ...]) -> tuple[Request, Operation]:
    """The typed command with this path."""
    for row, operation in operations():
        if operation.path == path:
            return row, operation
    raise UsageProblem(f"no command {' '.join(path)!r}")


def display_name(command: int) -> str:
    """The best name of an id: the catalogue's, else the table's, else its number."""
    if command in command_names():
        return command_name(command)
    row = requests_by_id().get(command) or requests_by_id().get(command - 1)
    if row is None:
        return f"command {command}"
    return row.name if row.id == command else f"{row.name} answer"


def find_command(text: str) -> int:
    """The id that ``text`` means: a number, a catalogue name or the table's name."""
    try:
        command = int(text, 0)
    except ValueError:
        return _find_name(text)
    if not 0 <= command <= 255:
        raise UsageProblem(f"command id {text} is not a byte")
    return command


def _find_name(text: str) -> int:
    by_name = {row.name: row.id for row in REQUESTS}
    wanted = text.upper()
    for candidate in (wanted, f"AMT_{wanted}", f"{wanted}_CMD", f"AMT_{wanted}_CMD"):
        if candidate in command_ids():
            return command_ids()[candidate]
    if text.lower() in by_name:
        return by_name[text.lower()]
    raise UsageProblem(f"no command {text!r}; `amt-station commands` lists them")
