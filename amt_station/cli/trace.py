"""The commands for traces: show, diff, export, dissector, replay, listen."""

from __future__ import annotations

import os
import subprocess
import sys
from pathlib import Path
from typing import TYPE_CHECKING, Sequence

import click

from amt_station.cli import console
from amt_station.cli.options import CHANNEL_VARIABLE, PORT_VARIABLE, Settings, common_options
from amt_station.errors import UsageProblem
from amt_station.trace.dialogue import read_trace
from amt_station.trace.shown import differences, shown_json, shown_lines

if TYPE_CHECKING:
    from amt_station.trace.listening import Listener

_FILE = click.Path(path_type=Path)
_LINK = click.option("--link", type=_FILE, metavar="PATH",
                     help="Give the port this further name, a symbolic link")
_SIGNALLED = 128


@click.group(no_args_is_help=False)
@common_options
def trace() -> None:
    """Work with traces: files of what went over a line, as --trace writes them."""


@trace.command()
@click.argument("file", type=_FILE)
@common_options
@click.pass_obj
def show(settings: Settings, file: Path) -> None:
    """Decode a trace: packets with their names, texts, the times between."""
    read = read_trace(file)
    if settings.json:
        console.data_json(shown_json(read))
        return
    for line in shown_lines(read):
        console.data(line)


@trace.command()
@click.argument("first", type=_FILE)
@click.argument("second", type=_FILE)
@common_options
@click.pass_context
def diff(context: click.Context, first: Path, second: Path) -> None:
    """Compare two traces by content, not by time or by how it was cut into pieces.

    The exit status is 0 when both say the same, else 1.
    """
    settings: Settings = context.ensure_object(Settings)
    found = differences(read_trace(first), read_trace(second))
    if settings.json:
        console.data_json({"ok": not found, "differences": [one.json() for one in found]})
    else:
        for one in found:
            sign, path = ("-", first) if one.is_first else ("+", second)
            console.data(f"{sign} {path}:{one.line}: {one.text}")
    context.exit(1 if found else 0)


@trace.command()
@click.argument("file", type=_FILE)
@click.option("--pcapng", required=True, metavar="FILE", type=click.Path(path_type=Path),
              help="Write a capture file, for Wireshark with the dissector; - is standard output")
@common_options
@click.pass_obj
def export(settings: Settings, file: Path, pcapng: Path) -> None:
    """Write a trace in another form."""
    from amt_station.trace.pcapng import capture

    data = capture(read_trace(file))
    if str(pcapng) == "-":
        sys.stdout.buffer.write(data)
        return
    try:
        pcapng.write_bytes(data)
    except OSError as error:
        raise UsageProblem(f"{pcapng}: {error.strerror}") from error
    if settings.json:
        console.data_json({"ok": True, "file": str(pcapng), "bytes": len(data)})


@trace.command()
@common_options
def dissector() -> None:
    """Print the dissector for captures: a script for the Lua in Wireshark and tshark."""
    from amt_station.trace.dissector import dissector as script

    sys.stdout.write(script())


@trace.command()
@click.argument("file", type=_FILE)
@click.argument("command", nargs=-1, metavar="[-- COMMAND...]")
@click.option("--timed", is_flag=True, help="Answer after the pauses of the trace, not at once")
@_LINK
@common_options
@click.pass_context
def replay(context: click.Context, file: Path, command: Sequence[str], timed: bool,
           link: Path | None) -> None:
    """Play the handset's side of a trace on a pseudo-terminal, whose name is printed.

    Whoever opens it and says what the station has said gets the same answers; whoever says
    something else is hung up on. With a COMMAND this is run with the port in its environment, and
    its exit status passed on. The exit status is 1 when the station said something else.
    """
    from amt_station.trace.replay import Replay

    read = read_trace(file)
    with Replay(read, link, timed) as playing:
        if command:
            status = _run(command, playing.port, read.channel)
            playing.nobody_else()
            if status:
                if difference := playing.wait().difference:
                    console.complain(f"{file}:{playing.standing.line}: {difference}")
                context.exit(status)
        else:
            _tell(context.ensure_object(Settings), playing.port)
        playing.wait()
        playing.check()
    if not command:
        console.talk("the whole trace was played")


@trace.command()
@click.argument("file", type=_FILE)
@click.argument("command", nargs=-1, metavar="[-- COMMAND...]")
@_LINK
@common_options
@click.pass_context
def listen(context: click.Context, file: Path, command: Sequence[str], link: Path | None) -> None:
    """Record a line in the middle: between the handset's port and a pseudo-terminal.

    The station is given the pseudo-terminal, whose name is printed, in place of the port. Ctrl-C
    ends the recording; with a COMMAND its end does. This is run with the pseudo-terminal in its
    environment, and its exit status passed on.
    """
    from amt_station.trace.listening import Listener
    from amt_station.trace.recording import Recording

    settings: Settings = context.ensure_object(Settings)
    channel = settings.chosen_channel
    recording = Recording(file, channel, "what was listened to")
    status = 0
    try:
        with Listener(settings.open_port(), recording, link) as listener:
            if command:
                status = _run(command, listener.port, channel.value)
            else:
                _tell(settings, listener.port)
                _until_interrupted(listener)
    finally:
        recording.close("listened no longer")
        if recording.problem:
            console.complain(recording.problem)
    context.exit(status)


def _tell(settings: Settings, port: str) -> None:
    if settings.json:
        console.data_json({"ok": True, "port": port})
    else:
        console.data(port)
    sys.stdout.flush()


def _until_interrupted(listener: Listener) -> None:
    try:
        listener.wait()
    except KeyboardInterrupt as end:
        # Ctrl-C is how it ends; SIGTERM is somebody else's wish.
        if type(end) is not KeyboardInterrupt:
            raise


def _run(command: Sequence[str], port: str, channel: str) -> int:
    """Run a command at a port; its exit status."""
    environment = {**os.environ, PORT_VARIABLE: port, CHANNEL_VARIABLE: channel}
    try:
        child = subprocess.Popen(command, env=environment)
    except OSError as error:
        raise UsageProblem(f"{command[0]}: {error.strerror}") from error
    try:
        status = child.wait()
    except BaseException:
        child.terminate()
        child.wait()
        raise
    return status if status >= 0 else _SIGNALLED - status
