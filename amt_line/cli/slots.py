"""The slots of a line as the command line or a file names them."""

from __future__ import annotations

import os
import tomllib
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Mapping, Sequence

from amt_line.run.plug import DEFAULT_BAUD, USB_PREFIX, Listing, Plug, plug_of
from amt_station.errors import UsageProblem
from amt_station.text import printable

LONGEST_NAME = 40
MOST_SLOTS = 256
_LARGEST_FILE = 1024 * 1024
_PRESENCE = {"port": False, "answer": True}
_KEYS = ("name", "port", "usb", "baud", "presence", "inputs")


@dataclass(frozen=True)
class SlotSpec:
    """One slot as it was asked for. ``stays`` is None where it is to be found out."""

    name: str
    port: str
    baud: int = DEFAULT_BAUD
    stays: bool | None = None
    inputs: Mapping[str, str] = field(default_factory=dict)

    def plug(self, listing: Listing) -> Plug:
        """The place of its handsets."""
        return plug_of(self.port, listing, self.baud, self.stays)


def said_slots(texts: Sequence[str], baud: int) -> list[SlotSpec]:
    """The slots of ``--slot NAME=PORT``."""
    slots = []
    for text in texts:
        name, equals, port = text.partition("=")
        if not equals or not name or not port:
            raise UsageProblem(f"--slot {printable(text)!r}: a name, '=' and a port are needed")
        slots.append(SlotSpec(name, port, baud))
    return slots


def slots_of_file(path: Path, baud: int) -> list[SlotSpec]:
    """The slots of a TOML file; ``UsageProblem`` says what is wrong where."""
    try:
        with path.open("rb") as file:
            data = file.read(_LARGEST_FILE + 1)
        if len(data) > _LARGEST_FILE:
            raise UsageProblem(f"{path}: larger than {_LARGEST_FILE} bytes")
        content = tomllib.loads(data.decode("utf-8-sig"))
    except OSError as error:
        raise UsageProblem(f"{path}: {error.strerror}") from error
    except (ValueError, RecursionError) as error:
        raise UsageProblem(f"{path}: {error}") from error
    for key in content:
        if key != "slot":
            raise UsageProblem(f"{path}: {printable(key)}: unknown key (known: slot)")
    tables = content.get("slot")
    if not isinstance(tables, list) or not tables:
        raise UsageProblem(f"{path}: no [[slot]] in it")
    return [_slot(table, f"{path}: slot {number}", baud)
            for number, table in enumerate(tables, start=1)]


def _slot(table: Any, where: str, baud: int) -> SlotSpec:
    if not isinstance(table, dict):
        raise UsageProblem(f"{where}: is no table")
    for key in table:
        if key not in _KEYS:
            raise UsageProblem(f"{where}: {printable(key)}: unknown key (known: "
                               f"{', '.join(_KEYS)})")
    name, port, usb = (_text(table, key, where) for key in ("name", "port", "usb"))
    if not name:
        raise UsageProblem(f"{where}: name: missing")
    if bool(port) == bool(usb):
        raise UsageProblem(f"{where}: needs exactly one of port, usb")
    speed = table.get("baud", baud)
    if not isinstance(speed, int) or isinstance(speed, bool) or speed <= 0:
        raise UsageProblem(f"{where}: baud: {speed!r} is no speed")
    presence = _text(table, "presence", where)
    if presence and presence not in _PRESENCE:
        raise UsageProblem(f"{where}: presence: {printable(presence)!r} is none of "
                           f"{', '.join(_PRESENCE)}")
    return SlotSpec(name, port or USB_PREFIX + usb, speed, _PRESENCE.get(presence),
                    _inputs(table.get("inputs", {}), where))


def _text(table: Mapping[str, Any], key: str, where: str) -> str:
    value = table.get(key, "")
    if not isinstance(value, str) or (key in table and not value):
        raise UsageProblem(f"{where}: {key}: {value!r} is no text")
    return value


def _inputs(table: Any, where: str) -> dict[str, str]:
    if not isinstance(table, dict):
        raise UsageProblem(f"{where}: inputs: is no table")
    for name, value in table.items():
        if not isinstance(value, (str, int)) or isinstance(value, bool):
            raise UsageProblem(f"{where}: inputs.{printable(name)}: {value!r} is neither a text "
                               "nor a whole number")
    return {name: str(value) for name, value in table.items()}


def check_slots(slots: Sequence[SlotSpec]) -> None:
    """Names that can be shown, each name and each port once."""
    if not slots:
        raise UsageProblem("no slots: give --slot NAME=PORT, --slots FILE or --simulate N")
    if len(slots) > MOST_SLOTS:
        raise UsageProblem(f"{len(slots)} slots, at most {MOST_SLOTS}")
    names: set[str] = set()
    ports: dict[str, str] = {}
    for slot in slots:
        if not slot.name.isprintable() or len(slot.name) > LONGEST_NAME:
            raise UsageProblem(f"{printable(slot.name)!r} cannot be a slot's name: at most "
                               f"{LONGEST_NAME} characters that can be shown")
        if slot.name in names:
            raise UsageProblem(f"two slots have the name {printable(slot.name)!r}")
        names.add(slot.name)
        place = slot.port
        if "://" not in place and not place.startswith(USB_PREFIX):
            place = os.path.realpath(place)
        if place in ports:
            raise UsageProblem(f"slots {printable(ports[place])} and {printable(slot.name)} have "
                               f"one port: {printable(slot.port)}")
        ports[place] = slot.name
