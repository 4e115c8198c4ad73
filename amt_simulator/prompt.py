"""What `amt-handset up` does while the handset is up: take commands at a terminal, or just wait.

Meanwhile the deaths in the handset are told.
"""

import contextlib
import os
import readline
import shlex
import signal
import sys
from pathlib import Path
from typing import Iterator

import click

from amt_simulator.errors import PROGRAM, HandsetError, how_it_ended
from amt_simulator.handset import Handset

LOOK_SECONDS = 0.2
PROMPT = "handset> "
LEAVE = ("exit", "quit")
# What makes sense without a handset only.
BEFORE = ("up", "run", "scenarios")
HISTORY_LINES = 500


class _Down(Exception):
    """The handset has ended while a command was awaited."""


class End:
    """The handler of the signals that ask for the end: one is enough, it is on its way then.

    It interrupts the main thread only where that waits for somebody. Elsewhere an exception out of
    nowhere could leave a lock taken for ever; there the end is seen as soon as that is done.
    """

    def __init__(self) -> None:
        self.is_asked = False
        self.is_final = False
        self.interrupts = True

    def __call__(self, number: int, _frame: object) -> None:
        """Interrupt the main thread, once."""
        self.is_final = self.is_final or number != signal.SIGINT
        if not self.is_asked:
            self.is_asked = True
            if self.interrupts:
                raise KeyboardInterrupt

    @contextlib.contextmanager
    def interrupting(self) -> Iterator[None]:
        """Interrupt what is waited for in the block, also when the end was asked for before."""
        self.interrupts = True
        try:
            if self.is_asked:
                raise KeyboardInterrupt
            yield
        finally:
            self.interrupts = False


class Watch:
    """Looks at the handset from time to time, in the main thread, whatever that waits for."""

    def __init__(self, handset: Handset, end: "End") -> None:
        self._handset = handset
        self._end = end
        self._told = 0
        self._is_over = False
        self.is_typing = False

    @contextlib.contextmanager
    def set_up(self) -> Iterator[None]:
        """Look until this is left."""
        before = signal.signal(signal.SIGALRM, lambda *_: self.look())
        signal.setitimer(signal.ITIMER_REAL, LOOK_SECONDS, LOOK_SECONDS)
        try:
            yield
        finally:
            self.stop()
            signal.signal(signal.SIGALRM, before)

    def stop(self) -> None:
        """Look no more. May be called twice: an interrupt may have come before the first time."""
        self._is_over = True
        signal.setitimer(signal.ITIMER_REAL, 0)

    def look(self) -> None:
        """Tell of the daemon's deaths; a wait for a command ends with the handset.

        An end that was asked for is repeated: what interrupted a finalizer got lost there.
        """
        if self._end.is_asked and self._end.interrupts and not self._is_over:
            raise KeyboardInterrupt
        with contextlib.suppress(OSError, HandsetError):
            exits = self._handset.exits()
            for status in exits[self._told:]:
                self._tell(f"the daemon has ended with {how_it_ended(status)}")
            self._told = len(exits)
        if self.is_typing and not self._handset.is_up:
            raise _Down

    def _tell(self, text: str) -> None:
        click.echo(("\n" if self.is_typing else "") + f"{PROGRAM}: {text}", err=True)
        if self.is_typing:
            readline.redisplay()


def serve(handset: Handset, group: click.Group, end: End) -> None:
    """Stay until the handset ends; at a terminal, run the commands that are typed."""
    end.interrupts = False
    watch = Watch(handset, end)
    try:
        with watch.set_up():
            if sys.stdin.isatty():
                click.echo("type a command (help lists them), exit or Ctrl-D ends", err=True)
                with history(), contextlib.suppress(_Down):
                    _converse(handset, group, watch, end)
            else:
                while handset.is_up and not end.is_asked:
                    # What comes in between is seen when the alarm ends the pause.
                    signal.pause()
            watch.look()
    finally:
        # Left running, the alarm would interrupt what takes the handset down, and then end us.
        watch.stop()


def _converse(handset: Handset, group: click.Group, watch: Watch, end: End) -> None:
    """Take commands until one ends it."""
    names = ["help", *LEAVE, *(name for name in group.commands if name not in BEFORE)]
    readline.set_completer(lambda text, state: [
        *(name + " " for name in names if name.startswith(text)), None][state])
    readline.parse_and_bind("tab: complete")
    while handset.is_up:
        try:
            watch.is_typing = True
            with end.interrupting():
                line = input(PROMPT)
        except EOFError:
            click.echo(err=True)
            return
        finally:
            watch.is_typing = False
        if line.split()[:1] and line.split()[0] in LEAVE:
            return
        run_line(handset, group, line, end)


@contextlib.contextmanager
def history() -> Iterator[None]:
    """The typed lines of earlier handsets; without a place for them, only those of this one."""
    base = os.environ.get("XDG_STATE_HOME") or os.path.expanduser("~/.local/state")
    path = Path(base) / PROGRAM / "history"
    readline.set_history_length(HISTORY_LINES)
    with contextlib.suppress(OSError):
        readline.read_history_file(path)
    try:
        yield
    finally:
        with contextlib.suppress(OSError):
            path.parent.mkdir(mode=0o700, parents=True, exist_ok=True)
            readline.write_history_file(path)


def run_line(handset: Handset, group: click.Group, line: str, end: End) -> None:
    """Run one typed line as a command; what is wrong with it is said, nothing ends."""
    try:
        words = shlex.split(line)
        if words == ["help"]:
            _help(group)
        elif words:
            with end.interrupting():
                _command(group, words[0]).main(words[1:], prog_name=words[0],
                                               standalone_mode=False, obj=handset)
    except click.ClickException as error:
        error.show()
    except (HandsetError, OSError, ValueError) as error:
        click.echo(f"{PROGRAM}: {error}", err=True)
    except (KeyboardInterrupt, click.Abort):
        if end.is_final:
            raise KeyboardInterrupt from None
        # Ctrl-C ends a log that is followed; the next one ends the handset.
        end.is_asked = False
        click.echo(err=True)


def _help(group: click.Group) -> None:
    for name, command in group.commands.items():
        if name not in BEFORE:
            click.echo(f"  {name:10} {command.get_short_help_str(80)}", err=True)
    click.echo(f"  {'exit':10} Take the handset down (also Ctrl-D).", err=True)


def _command(group: click.Group, name: str) -> click.Command:
    command = group.commands.get(name)
    if command is None or name in BEFORE:
        raise HandsetError(f"no such command: {name} (help lists them)")
    return command
