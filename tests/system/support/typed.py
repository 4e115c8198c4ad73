"""Whether a command line is one that a program takes, without carrying it out."""

from __future__ import annotations

import re
from typing import Sequence

import click

from amt_simulator.cli import handset
from amt_station.cli.main import cli
from amt_station.cli.options import Settings

PROGRAMS: dict[str, click.Command] = {"amt-station": cli, "amt-handset": handset}


def parse(words: Sequence[str]) -> None:
    """Read the words as the program does; raises what the program would complain about."""
    command: click.Command = PROGRAMS[words[0]]
    context = command.make_context(words[0], list(words[1:]), obj=Settings())
    while isinstance(command, click.Group):
        rest = [*context.protected_args, *context.args]
        name, found, rest = command.resolve_command(context, rest)
        assert found is not None
        command = found
        context = command.make_context(name, rest, parent=context)


def unknown_words(words: Sequence[str]) -> list[str]:
    """What a program does not know of a usage's words, where values are named in capitals.

    ``[--option VALUE]`` may be left out, ``--one|--other`` are options of which one is said.
    """
    command: click.Command = PROGRAMS[words[0]]
    chain = [command]
    unknown = []
    value_follows = False
    for word in (part for word in words[1:] for part in re.split(r"\|", word.strip("[]"))):
        if word == "--":
            break
        if value_follows:
            value_follows = False
        elif word.startswith("-") and word not in ("--help", "-h"):
            option = _option(chain, word)
            unknown += [word] * (option is None)
            value_follows = option is not None and not option.is_flag
        elif isinstance(command, click.Group) and not word.startswith("-"):
            found = command.get_command(click.Context(command), word)
            if found is None:
                return [*unknown, word]
            command = found
            chain.append(found)
    return unknown


def _option(chain: Sequence[click.Command], word: str) -> click.Option | None:
    return next((option for command in reversed(chain) for option in command.params
                 if isinstance(option, click.Option)
                 and word in (*option.opts, *option.secondary_opts)), None)
