"""Make the man pages and the shells' completion of both programs: `./dev manual`.

They come from the programs themselves: what a command's help says is what its page says.
"""

import argparse
import inspect
import os
import shutil
from pathlib import Path
from typing import Iterator

import click
from click.shell_completion import get_completion_class
from click_man.man import ManPage

from amt_simulator.cli import handset
from amt_station import __version__
from amt_station.cli.main import cli
from tools.project import PROJECT

PROGRAMS: dict[str, click.Command] = {"amt-station": cli, "amt-handset": handset}
SECTION = "man1"
# Where each shell looks for the completion of a program, below the directory of all.
COMPLETIONS = {"bash": "bash-completion/completions/{}", "zsh": "zsh/vendor-completions/_{}",
               "fish": "fish/vendor_completions.d/{}.fish"}


def commands(context: click.Context) -> Iterator[click.Context]:
    """A command and all below it."""
    yield context
    group = context.command
    if not isinstance(group, click.Group):
        return
    for name in group.list_commands(context):
        command = group.get_command(context, name)
        if command is not None and not command.hidden:
            yield from commands(click.Context(command, info_name=name, parent=context))


def plain(text: str) -> str:
    """Text in which nothing is an order to the formatter."""
    lines = inspect.cleandoc(text).replace("\\", r"\e").replace("`", r"\(ga").splitlines()
    return "\n".join(r"\&" + line if line.startswith((".", "'")) else line for line in lines)


def page(context: click.Context) -> str:
    """The man page of a command."""
    command = context.command
    made = ManPage(context.command_path)
    made.version = __version__
    made.short_help = plain(command.get_short_help_str(limit=200)).rstrip(".")
    made.description = "\n\n".join(
        plain(text) for text in (command.help, command.epilog) if text)
    made.synopsis = plain(" ".join(command.collect_usage_pieces(context)))
    records = [parameter.get_help_record(context) for parameter in command.get_params(context)
               if isinstance(parameter, click.Option)]
    made.options = [(plain(option), plain(text)) for option, text in filter(None, records)]
    if isinstance(command, click.Group):
        below = [(name, command.get_command(context, name))
                 for name in command.list_commands(context)]
        made.commands = [(name, plain(found.get_short_help_str(limit=200)))
                         for name, found in below if found is not None and not found.hidden]
    return str(made)


def write_pages(into: Path) -> int:
    """Write every page; returns how many."""
    folder = into / "man" / SECTION
    folder.mkdir(parents=True)
    count = 0
    for name, program in PROGRAMS.items():
        for context in commands(click.Context(program, info_name=name)):
            path = folder / f"{context.command_path.replace(' ', '-')}.1"
            path.write_text(page(context), encoding="utf-8")
            count += 1
    return count


def write_completions(into: Path) -> None:
    """Write what each shell reads."""
    for name, program in PROGRAMS.items():
        variable = f"_{name.replace('-', '_').upper()}_COMPLETE"
        for shell, place in COMPLETIONS.items():
            path = into / place.format(name)
            path.parent.mkdir(parents=True, exist_ok=True)
            kind = get_completion_class(shell)
            assert kind is not None
            # A shell that is missing here may be there where the file is read.
            script = kind(program, {}, name, variable)
            path.write_text(script.source_template % script.source_vars(), encoding="utf-8")


def main() -> int:
    """Make all of it anew, in one directory."""
    parser = argparse.ArgumentParser(prog="./dev manual", description=__doc__)
    parser.add_argument("--into", type=Path, default=PROJECT / "build" / "manual",
                        help="an own directory, which is made anew (default: build/manual)")
    into = parser.parse_args().into.resolve()
    made = into.with_name(f".{into.name}-{os.getpid()}")
    try:
        count = write_pages(made / "share")
        write_completions(made / "share")
        if into.exists():
            if not (into / "share" / "man").is_dir() and any(into.iterdir()):
                parser.error(f"{into} is there and holds something else")
            shutil.rmtree(into)
        made.rename(into)
    finally:
        shutil.rmtree(made, ignore_errors=True)
    print(f"{count} man pages, completion for {', '.join(COMPLETIONS)}: {into}")
    return 0
