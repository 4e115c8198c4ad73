"""Options that every command takes, before or after its name, and what they come to."""

from __future__ import annotations

import os
from dataclasses import dataclass
from typing import Any, Callable, TypeVar

import click

from amt_station.errors import NoPort, UsageProblem
from amt_station.link import Link
from amt_station.requests.model import Channel

_Command = TypeVar("_Command", bound=Callable[..., Any])

PORT_VARIABLE = "AMT_STATION_PORT"
CHANNEL_VARIABLE = "AMT_STATION_CHANNEL"
TIMEOUT_VARIABLE = "AMT_STATION_TIMEOUT"


@dataclass
class Settings:
    """What was said on the command line; None where nothing was."""

    port: str | None = None
    line: str | None = None
    timeout: float | None = None
    baud: int = 115200
    json: bool = False

    @property
    def chosen_channel(self) -> Channel:
        """Flag before environment before the PC line."""
        word = self.line or os.environ.get(CHANNEL_VARIABLE) or Channel.PC.value
        try:
            return Channel(word)
        except ValueError:
            raise UsageProblem(f"{CHANNEL_VARIABLE}: {word!r} is neither pc nor app") from None

    @property
    def chosen_timeout(self) -> float | None:
        """Flag before environment before what each request takes by itself."""
        word = os.environ.get(TIMEOUT_VARIABLE)
        if self.timeout is not None or not word:
            return self.timeout
        try:
            seconds = float(word)
        except ValueError:
            seconds = 0.0
        if not seconds > 0:
            raise UsageProblem(f"{TIMEOUT_VARIABLE}: {word!r} is not a number of seconds")
        return seconds

    def open_link(self) -> Link:
        """Open the port."""
        channel, timeout = self.chosen_channel, self.chosen_timeout
        port = self.port or os.environ.get(PORT_VARIABLE)
        if not port:
            raise NoPort(f"no port named; give --port or set {PORT_VARIABLE}")
        return Link.open(port, channel, timeout, self.baud)


def _remember(context: click.Context, parameter: click.Parameter, value: Any) -> None:
    if value is not None and value is not False and parameter.name is not None:
        setattr(context.ensure_object(Settings), parameter.name, value)


_OPTIONS = (
    click.option("-p", "--port", metavar="URL", expose_value=False, callback=_remember,
                 help=f"Port to the handset, any pySerial URL  [${PORT_VARIABLE}]"),
    click.option("--pc", "line", flag_value="pc", expose_value=False, callback=_remember,
                 help=f"The port is the PC line (default)  [${CHANNEL_VARIABLE}]"),
    click.option("--app", "line", flag_value="app", expose_value=False, callback=_remember,
                 help="The port is the app channel: packets without envelope"),
    click.option("--timeout", type=click.FloatRange(min=0, min_open=True), metavar="SECONDS",
                 expose_value=False, callback=_remember,
                 help=f"Wait so long for an answer  [${TIMEOUT_VARIABLE}]"),
    click.option("--baud", type=click.IntRange(min=1), expose_value=False, callback=_remember,
                 help="Speed of a real serial port (default 115200)"),
    click.option("--json", is_flag=True, expose_value=False, callback=_remember,
                 help="Print the result as one JSON document"),
)


def common_options(command: _Command) -> _Command:
    """Give a command the options that all have."""
    for option in reversed(_OPTIONS):
        command = option(command)
    return command


def common_parameters() -> list[click.Parameter]:
    """The same for a command that is made, not decorated."""
    @click.command()
    @common_options
    def carrier() -> None:
        """Never run: only carries the parameters."""

    return list(carrier.params)
