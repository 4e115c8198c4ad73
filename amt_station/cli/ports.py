"""The commands that look for ports: ports, wait."""

from __future__ import annotations

import os
import time

import click

from amt_station.cli import console
from amt_station.cli.options import AUTO, PORT_VARIABLE, Seconds, Settings, common_options
from amt_station.errors import NoPort
from amt_station.found_ports import FoundPort, Holder, found_ports, holders
from amt_station.render import columns

_LOOK_SECONDS = 0.1


def _held_by(found: list[Holder]) -> str:
    return ", ".join(map(str, found))


def _port_json(port: FoundPort, found: list[Holder]) -> dict[str, object]:
    return {"device": port.device, "description": port.description,
            "vid_pid": port.vid_pid or None, "serial": port.serial or None,
            "location": port.location or None,
            "held_by": [{"pid": holder.pid, "command": holder.command} for holder in found]}


@click.command()
@common_options
@click.pass_obj
def ports(settings: Settings) -> None:
    """List the serial ports of this computer, and who holds one."""
    rows = [(port, holders(port.device)) for port in found_ports()]
    if settings.json:
        console.data_json([_port_json(port, found) for port, found in rows])
        return
    if not rows:
        console.talk("no serial port is there")
        return
    header = ("port", "ids", "serial number", "held by", "what")
    for line in columns([header, *((port.device, port.vid_pid or "-", port.serial or "-",
                                    _held_by(found) or "-", port.description or "-")
                                   for port, found in rows)]):
        console.data(line)


@click.command()
@click.option("--for", "seconds", type=Seconds(), metavar="SECONDS",
              help="Give up after so long (default: never)")
@common_options
@click.pass_obj
def wait(settings: Settings, seconds: float | None) -> None:
    """Wait for a port to appear, and print its name.

    That is the port of -p, of --serial and --vid-pid, or else the only one on USB.
    """
    named = settings.port or os.environ.get(PORT_VARIABLE)
    with console.waiting("the port"):
        if named and named != AUTO and settings.wanted is None:
            device = _wait_for_name(named, seconds)
        else:
            device = settings.wanted_port.wait(seconds or float("inf")).device
    if settings.json:
        console.data_json({"ok": True, "port": device})
    else:
        console.data(device)


def _wait_for_name(name: str, seconds: float | None) -> str:
    end = time.monotonic() + (seconds or float("inf"))
    while not os.path.exists(name):
        if time.monotonic() >= end:
            raise NoPort(f"no port {name} within {seconds:g} s")
        time.sleep(_LOOK_SECONDS)
    return name
