"""The `amt-handset` command: brings a simulated handset up, and works on one that is up."""

import os
import signal
import sys
from pathlib import Path
from typing import Any

import click

from amt_simulator.commands import COMMANDS
from amt_simulator.errors import PROGRAM, HandsetError
from amt_simulator.handset import Handset
from amt_simulator.kinds import KINDS
from amt_simulator.inside.modem_table import MODES
from amt_simulator.parse import CardSize, Escaped, Pair, Screen, file_contents, pairs
from amt_simulator.tree import ROOT
from amt_simulator.running import Announcement, NoHandset, find

FAILED, NO_HANDSET = 1, 3
ENDS = (signal.SIGINT, signal.SIGTERM, signal.SIGHUP)
PAIR = Pair(needs_value=True)
OPTIONAL_PAIR = Pair(needs_value=False)


class HandsetGroup(click.Group):
    """Says what went wrong in one line, with an exit status."""

    def invoke(self, ctx: click.Context) -> Any:
        """Run the command."""
        try:
            return super().invoke(ctx)
        except HandsetError as error:
            click.echo(f"{PROGRAM}: {error}", err=True)
            ctx.exit(NO_HANDSET if isinstance(error, NoHandset) else FAILED)
        except BrokenPipeError:
            # Whoever read the output has seen enough.
            os.dup2(os.open(os.devnull, os.O_WRONLY), sys.stdout.fileno())
            ctx.exit(FAILED)
        except OSError as error:
            where = f"{error.filename}: " if error.filename else ""
            click.echo(f"{PROGRAM}: {where}{error.strerror or error}", err=True)
            ctx.exit(FAILED)


@click.group(cls=HandsetGroup, context_settings={"help_option_names": ["-h", "--help"]})
@click.option("--dir", "directory", type=click.Path(path_type=Path), envvar="HANDSET_DIR",
              help="Directory of the handset to work on, when several are up.")
@click.pass_context
def handset(ctx: click.Context, directory: Path | None) -> None:
    """A simulated handset: the real daemon in a handset that a PC makes up."""
    # Parsing a subcommand's --help must not need a handset.
    if ctx.invoked_subcommand != "up" and not {"-h", "--help"} & set(sys.argv[1:]):
        ctx.obj = find(directory)


def _announce(made: Handset, build: str) -> Announcement:
    names = [name for name in ("pc", "app", "modem", "mux") if (made.directory / name).exists()]
    announced = Announcement(str(made.directory), made.kind.name, build, os.getpid(),
                             {name: str(made.directory / name) for name in names})
    announced.write()
    return announced


def _introduce(made: Handset, announced: Announcement) -> None:
    """Tell where everything is."""
    labels = {"pc": "station's port", "app": "app's port", "modem": "modem's line",
              "mux": "multiplexer's line"}
    rows = [(labels[name], path) for name, path in announced.ports.items()]
    rows += [("log", str(made.log.path)), ("files", str(made.directory / ROOT)),
             ("stand-ins", str(made.path("/handset")))]
    click.echo(f"handset is up: {made.kind.name}, {made.kind.summary}")
    for label, path in rows:
        click.echo(f"  {label:20} {path}")


def _options(given: dict[str, Any]) -> dict[str, Any]:
    """The options of `up` as those of the handset."""
    answers: dict[str, list[str]] = {}
    for function, line in given["answers"]:
        answers.setdefault(function, []).append(line)
    return {
        "args": given["args"], "config": pairs(given["config"]),
        "files": file_contents(given["files"]), "properties": pairs(given["properties"]),
        "answers": answers, "modem": given["modem"],
        "modem_answers": dict(given["modem_answers"]),
        "restart": given["restart"], "start": given["start"], "screen": given["screen"],
        "card": given["card"] or None, "usb_state": given["usb_state"],
        "env": dict(given["env"]), "keep": given["keep"], "ports": True,
    }


@handset.command("up")
@click.option("--path", type=click.Choice(list(KINDS)), default="pc", show_default=True,
              help="How the daemon is started.")
@click.option("--build", default="release", show_default=True,
              help="Preset, or directory of a build.")
@click.option("--arg", "args", multiple=True, help="Further argument for the daemon.")
@click.option("--config", multiple=True, type=OPTIONAL_PAIR,
              help="Configuration setting; KEY alone takes it out.")
@click.option("--file", "files", multiple=True, type=OPTIONAL_PAIR, metavar="PATH[=FILE]",
              help="Place FILE of the PC at PATH; PATH alone takes the file away.")
@click.option("--property", "properties", multiple=True, type=OPTIONAL_PAIR,
              help="System property; KEY alone takes it away.")
@click.option("--answer", "answers", multiple=True, type=PAIR, metavar="FUNCTION=LINE",
              help="Scripted answer of a stand-in; repeat for the next calls.")
@click.option("--modem", type=click.Choice(MODES), default="table", show_default=True,
              help="What the modem does.")
@click.option("--modem-answer", "modem_answers", multiple=True, type=(str, Escaped()),
              metavar="COMMAND TEXT",
              help=r"The modem's answer to a command line; \r and \n are understood.")
@click.option("--restart/--no-restart", default=None,
              help="Whether init starts the daemon again (default: as the init file says).")
@click.option("--start/--no-start", default=True, help="Whether init starts the daemon.")
@click.option("--screen", type=Screen(), default="480x800", show_default=True,
              help="Size of the screen.")
@click.option("--card", type=CardSize(), default="64M", show_default=True,
              help="Size of the memory card.")
@click.option("--usb-state", help="USB state at the beginning, such as DISCONNECTED.")
@click.option("--env", multiple=True, type=PAIR, help="Environment of the daemon.")
@click.option("--keep", is_flag=True, help="Leave the handset's directory in place at the end.")
def up(path: str, build: str, **given: Any) -> None:
    """Bring a handset up and stay until Ctrl-C."""
    # Only who stays needs the library for typing.
    from amt_simulator import prompt

    end = prompt.End()
    for number in ENDS:
        signal.signal(number, end)
    place: str | Path = Path(build).resolve() if os.sep in build else build
    made = Handset(path, place, **_options(given))
    death = ""
    try:
        with made:
            _introduce(made, _announce(made, build))
            sys.stdout.flush()
            prompt.serve(made, handset, end)
            death = made.death
    except KeyboardInterrupt:
        pass
    if given["keep"]:
        click.echo(f"kept: {made.directory}", err=True)
    if death:
        raise HandsetError(death)
    click.echo("the handset has been powered off" if made.powered_off else "handset is down",
               err=True)


for command in COMMANDS:
    handset.add_command(command)


def main() -> None:
    """The program."""
    handset.main(prog_name=PROGRAM)


if __name__ == "__main__":
    main()
