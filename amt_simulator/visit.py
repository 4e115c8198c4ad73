"""Handsets for the time of one command: brought up, named in its environment, taken down."""

from __future__ import annotations

import os
import signal
import subprocess
from contextlib import ExitStack
from typing import Any, Sequence

import click

from amt_simulator.handset import Handset
from amt_simulator.errors import HandsetError

PORT, CHANNEL, DIRECTORY = "AMT_STATION_PORT", "AMT_STATION_CHANNEL", "HANDSET_DIR"
FORWARDED = (signal.SIGINT, signal.SIGTERM, signal.SIGHUP)
SIGNALLED = 128


def environment(handsets: Sequence[Handset]) -> dict[str, str]:
    """The environment that names the handsets' ports and directories, the first without number."""
    is_app = handsets[0].kind.name == "packet"
    found = {**os.environ, CHANNEL: "app" if is_app else "pc"}
    for number, handset in enumerate(handsets, start=1):
        port = handset.directory / found[CHANNEL]
        if not port.is_symlink():
            raise HandsetError(f"a handset on the path {handset.kind.name} has no port to begin "
                               "with: its cable is not in")
        found[f"{PORT}_{number}"], found[f"{DIRECTORY}_{number}"] = str(port), str(
            handset.directory)
    found[PORT], found[DIRECTORY] = found[f"{PORT}_1"], found[f"{DIRECTORY}_1"]
    return found


def bring_up(stack: ExitStack, path: str, build: Any, options: dict[str, Any],
             count: int) -> list[Handset]:
    """So many handsets, each with a daemon that serves; the stack takes them down."""
    handsets = [stack.enter_context(Handset(path, build, **options)) for _ in range(count)]
    for handset in handsets:
        if handset.options.start and handset.options.plugged or handset.kind.name == "packet":
            handset.wait_ready()
    return handsets


def run(command: Sequence[str], env: dict[str, str]) -> int:
    """Run a command to its end, pass signals on to it; its exit status."""
    child: list[subprocess.Popen[bytes]] = []
    early: list[int] = []

    def forward(number: int, _frame: object) -> None:
        # At a terminal, Ctrl-C reaches the command by itself.
        if number == signal.SIGINT and _has_terminal():
            return
        if child:
            child[0].send_signal(number)
        else:
            early.append(number)

    before = {number: signal.signal(number, forward) for number in FORWARDED}
    try:
        child.append(subprocess.Popen(command, env=env))
        # The command may run before this process has learnt its id.
        for number in early:
            child[0].send_signal(number)
        status = child[0].wait()
    except OSError as error:
        raise click.UsageError(f"{command[0]}: {error.strerror}") from None
    finally:
        for number, handler in before.items():
            signal.signal(number, handler)
    return status if status >= 0 else SIGNALLED - status


def _has_terminal() -> bool:
    try:
        return os.tcgetpgrp(0) == os.getpgrp()
    except OSError:
        return False
