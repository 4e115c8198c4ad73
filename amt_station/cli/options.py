"""Options that every command takes, before or after its name, and what they come to."""

from __future__ import annotations

import math
import os
from dataclasses import dataclass
from typing import TYPE_CHECKING, Any, Callable, TypeVar

import click

from amt_station.cli import console
from amt_station.errors import NoPort, UsageProblem
from amt_station.requests.model import Channel

if TYPE_CHECKING:
    from amt_station.found_ports import Wanted
    from amt_station.link import Link
    from amt_station.port import Port
    from amt_station.trace.recording import Recording

_Command = TypeVar("_Command", bound=Callable[..., Any])

PORT_VARIABLE = "AMT_STATION_PORT"
CHANNEL_VARIABLE = "AMT_STATION_CHANNEL"
TIMEOUT_VARIABLE = "AMT_STATION_TIMEOUT"

DEFAULT_BAUD = 115200
AUTO = "auto"
_FASTEST = 4_000_000


@dataclass
class Settings:
    """What was said on the command line; None where nothing was."""

    port: str | None = None
    line: str | None = None
    timeout: float | None = None
    baud: int | None = None
    json: bool = False
    usb_serial: str | None = None
    vid_pid: str | None = None
    trace: str | None = None
    recording: Recording | None = None

    def say(self, name: str, value: Any) -> None:
        """Take what an option says; two that contradict each other are refused."""
        said = getattr(self, name)
        if said is not None and said is not False and said != value:
            raise UsageProblem(f"{said} and {value} contradict each other")
        setattr(self, name, value)

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
            return seconds_of(word)
        except ValueError as error:
            raise UsageProblem(f"{TIMEOUT_VARIABLE}: {error}") from None

    @property
    def wanted(self) -> Wanted | None:
        """The port that --serial and --vid-pid choose; None without them."""
        if not self.usb_serial and not self.vid_pid:
            return None
        if self.port not in (None, AUTO):
            raise UsageProblem(f"--port {self.port} and --serial or --vid-pid contradict each "
                               "other")
        return self.wanted_port

    @property
    def wanted_port(self) -> Wanted:
        """As ``wanted``; without choice any port on USB."""
        from amt_station.found_ports import Wanted

        return Wanted(self.usb_serial or "", self.vid_pid or "")

    @property
    def chosen_port(self) -> str:
        """Flag before environment; the port that is meant where its name is not given."""
        return self.port_or("")

    def port_or(self, default: str) -> str:
        """As ``chosen_port``, with a default where nothing is said at all."""
        wanted = self.wanted
        if wanted is not None:
            return wanted.find().device
        port = self.port or os.environ.get(PORT_VARIABLE) or default
        if not port:
            raise NoPort(f"no port named; give --port or set {PORT_VARIABLE}")
        return self.wanted_port.find().device if port == AUTO else port

    def open_port(self) -> Port:
        """Open the port; one that came back under another name is found again."""
        return self.open_named(self.chosen_port)

    def open_named(self, url: str) -> Port:
        """Open a port that has been chosen already."""
        from amt_station.port import SerialPort

        port = SerialPort(url, self.baud or DEFAULT_BAUD)
        return port if self.trace is None else self._traced(port, self.trace)

    def _traced(self, port: Port, path: str) -> Port:
        """The port with everything that goes over it noted in the one trace of this command."""
        from amt_station.trace.recording import begun

        try:
            self.recording = self.recording or begun(path, self.chosen_channel)
            return self.recording.traced(port)
        except BaseException:
            port.close()
            raise

    def open_link(self) -> Link:
        """Open the port with a link on it."""
        from amt_station.link import Link

        channel, timeout = self.chosen_channel, self.chosen_timeout
        link = Link(self.open_port(), channel, timeout, self.open_port)
        if not link.in_step:
            console.talk("the port was left out of step: what still comes is dropped first, which "
                         "may take some seconds")
        return link


def seconds_of(text: str) -> float:
    """A time in seconds: a finite number above 0."""
    try:
        seconds = float(text)
    except ValueError:
        seconds = math.nan
    if not (math.isfinite(seconds) and seconds > 0):
        raise ValueError(f"{text!r} is not a finite number of seconds above 0")
    return seconds


class Seconds(click.ParamType):
    """A time on the command line."""

    name = "seconds"

    def convert(self, value: Any, param: click.Parameter | None,
                ctx: click.Context | None) -> float:
        """As ``seconds_of``."""
        try:
            return seconds_of(str(value))
        except ValueError as error:
            self.fail(str(error), param, ctx)


def _remember(context: click.Context, parameter: click.Parameter, value: Any) -> None:
    settings = context.ensure_object(Settings)
    for one in value if isinstance(value, tuple) else (value,):
        if parameter.name in ("pc", "app"):
            if one:
                settings.say("line", parameter.name)
        elif one is not None and one is not False and parameter.name is not None:
            settings.say(parameter.name, one)


_OPTIONS = (
    click.option("-p", "--port", metavar="URL", multiple=True, expose_value=False,
                 callback=_remember,
                 help="Port to the handset, any pySerial URL, or auto for the only one on USB  "
                 f"[${PORT_VARIABLE}]"),
    click.option("--serial", "usb_serial", metavar="NUMBER", multiple=True, expose_value=False,
                 callback=_remember, help="The USB port with this serial number"),
    click.option("--vid-pid", metavar="VID:PID", multiple=True, expose_value=False,
                 callback=_remember, help="The USB port with these ids"),
    click.option("--pc", is_flag=True, expose_value=False, callback=_remember,
                 help=f"The port is the PC line (default)  [${CHANNEL_VARIABLE}]"),
    click.option("--app", is_flag=True, expose_value=False, callback=_remember,
                 help="The port is the app channel: packets without envelope"),
    click.option("--timeout", type=Seconds(), metavar="SECONDS", multiple=True,
                 expose_value=False, callback=_remember,
                 help=f"Wait so long for an answer  [${TIMEOUT_VARIABLE}]"),
    click.option("--baud", type=click.IntRange(1, _FASTEST), multiple=True, expose_value=False,
                 callback=_remember,
                 help=f"Speed of a real serial port (default {DEFAULT_BAUD})"),
    click.option("--trace", metavar="FILE", multiple=True, expose_value=False,
                 callback=_remember, help="Keep what goes over the line in this new file"),
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
