"""What `handset up` does while the handset is up: take commands at a terminal, or just wait."""

import select
import shlex
import sys

import click

from amt_simulator.errors import HandsetError
from amt_simulator.handset import Handset

LOOK_SECONDS = 0.2
PROMPT = "handset> "


def serve(handset: Handset, group: click.Group) -> None:
    """Stay until the handset ends; at a terminal, run the commands that are typed."""
    is_terminal = sys.stdin.isatty()
    if is_terminal:
        click.echo("type a command (help lists them), Ctrl-C ends", err=True)
    asked = False
    while handset.is_up:
        if is_terminal and not asked:
            click.echo(PROMPT, nl=False, err=True)
            asked = True
        ready = select.select([sys.stdin] if is_terminal else [], [], [], LOOK_SECONDS)[0]
        if not ready:
            continue
        line = sys.stdin.readline()
        if not line:
            # The terminal's end of file: nothing more is typed, the handset stays.
            is_terminal = False
            continue
        asked = False
        run_line(handset, group, line)


def run_line(handset: Handset, group: click.Group, line: str) -> None:
    """Run one typed line as a command; what is wrong with it is said, nothing ends."""
    try:
        words = shlex.split(line)
        if words == ["help"]:
            _help(group)
        elif words:
            _command(group, words[0]).main(words[1:], prog_name=words[0], standalone_mode=False,
                                           obj=handset)
    except click.ClickException as error:
        error.show()
    except (HandsetError, OSError, ValueError) as error:
        click.echo(f"handset: {error}", err=True)
    except (KeyboardInterrupt, click.Abort):
        # Ends a log that is followed; the next one ends the handset.
        click.echo(err=True)


def _help(group: click.Group) -> None:
    for name, command in group.commands.items():
        if name != "up":
            click.echo(f"  {name:10} {command.get_short_help_str(80)}", err=True)


def _command(group: click.Group, name: str) -> click.Command:
    command = group.commands.get(name)
    if command is None or name == "up":
        raise HandsetError(f"no such command: {name} (help lists them)")
    return command
