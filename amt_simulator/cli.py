"""The `amt-handset` command: brings a simulated handset up, and works on one that is up."""

import json
import os
import signal
import sys
from contextlib import ExitStack
from pathlib import Path
from typing import Any, Sequence

import click

from amt_simulator import scenarios as ready
from amt_simulator.commands import COMMANDS
from amt_simulator.errors import PROGRAM, HandsetError
from amt_simulator.handset import Handset
from amt_simulator.kinds import KINDS
from amt_simulator.inside.modem_table import MODES
from amt_simulator.parse import CardSize, Escaped, Pair, Screen, Words, file_contents, pairs
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
    is_before = ctx.invoked_subcommand in ("up", "run", "scenarios")
    if not is_before and not {"-h", "--help"} & set(sys.argv[1:]):
        ctx.obj = find(directory)


def _announce(made: Handset, build: str) -> Announcement:
    names = [name for name in ("pc", "app", "modem", "mux") if (made.directory / name).exists()]
    announced = Announcement(str(made.directory), made.kind.name, build, os.getpid(),
                             {name: str(made.directory / name) for name in names})
    announced.write()
    return announced


def _introduction(made: Handset, announced: Announcement, scenario: str | None) -> dict[str, Any]:
    """The same for programs."""
    return {"ok": True, "directory": announced.directory, "path": announced.path,
            "scenario": scenario, "build": announced.build, "pid": announced.pid,
            "ports": announced.ports, "log": str(made.log.path),
            "files": str(made.directory / ROOT), "stand_ins": str(made.path("/handset"))}


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
        "args": given["args"], "through": given["through"], "config": pairs(given["config"]),
        "files": file_contents(given["files"]), "properties": pairs(given["properties"]),
        "answers": answers, "modem": given["modem"],
        "modem_answers": dict(given["modem_answers"]),
        "restart": given["restart"], "start": given["start"], "screen": given["screen"],
        "card": given["card"] or None, "usb_state": given["usb_state"],
        "env": dict(given["env"]), "keep": given["keep"], "ports": True,
    }


def _in_scenario(name: str | None, given: dict[str, Any]) -> dict[str, Any]:
    """The options of a handset in a scenario; what was said on the command line goes before."""
    if name is None:
        return given
    source = click.get_current_context().get_parameter_source
    said = {key: value for key, value in given.items()
            if key == "ports" or isinstance(value, dict) and value
            or source(key) not in (None, click.core.ParameterSource.DEFAULT)}
    return {"path": given["path"], **ready.find(name).with_options(said)}


def _place(build: str) -> str | Path:
    return Path(build).resolve() if os.sep in build else build


SCENARIO = click.option("--scenario", metavar="NAME",
                        help="One of those that `amt-handset scenarios` lists, or a file's path; "
                        "other options go before it.")
BUILD = click.option("--build", default="release", show_default=True,
                     help="Preset, or directory of a build.")


@handset.command("up")
@click.option("--path", type=click.Choice(list(KINDS)), default="pc", show_default=True,
              help="How the daemon is started.")
@BUILD
@SCENARIO
@click.option("--json", "as_json", is_flag=True,
              help="Tell where everything is as one line of JSON.")
@click.option("--arg", "args", multiple=True, help="Further argument for the daemon.")
@click.option("--through", type=Words(), default="", metavar="WORDS",
              help="A program, with its arguments, that runs the daemon: an emulator, a tracer.")
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
def up(path: str, build: str, scenario: str | None, as_json: bool, **given: Any) -> None:
    """Bring a handset up and stay until Ctrl-C."""
    # Only who stays needs the library for typing.
    from amt_simulator import prompt

    end = prompt.End()
    for number in ENDS:
        signal.signal(number, end)
    options = _in_scenario(scenario, {"path": path, **_options(given)})
    made = Handset(build=_place(build), **options)
    death = ""
    try:
        with made:
            announced = _announce(made, build)
            if as_json:
                click.echo(json.dumps(_introduction(made, announced, scenario)))
            else:
                _introduce(made, announced)
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


@handset.command("run")
@click.option("--n", "count", type=click.IntRange(1, 64), default=1, show_default=True,
              help="How many handsets.")
@click.option("--path", type=click.Choice(list(KINDS)), default="pc", show_default=True,
              help="How the daemon is started.")
@BUILD
@SCENARIO
@click.argument("command", nargs=-1, required=True, metavar="-- COMMAND...")
def run(count: int, path: str, build: str, scenario: str | None, command: Sequence[str]) -> None:
    """Bring handsets up, run a command with them, and take them down.

    AMT_STATION_PORT (and AMT_STATION_PORT_1, _2 ...) name their ports in the command's
    environment, AMT_STATION_CHANNEL the line, HANDSET_DIR (_1, _2 ...) their directories. The
    exit status is the command's.
    """
    from amt_simulator import visit

    options = _in_scenario(scenario, {"path": path, "ports": True})
    try:
        with ExitStack() as stack:
            handsets = visit.bring_up(stack, options.pop("path"), _place(build), options, count)
            for made in handsets:
                _announce(made, build)
            status = visit.run(command, visit.environment(handsets))
    except KeyboardInterrupt:
        status = visit.SIGNALLED + signal.SIGINT
    click.get_current_context().exit(status)


@handset.command("scenarios")
def scenarios() -> None:
    """List the ready scenarios for `up` and `run`, and what each shows."""
    for name in ready.names():
        click.echo(f"{name:18} {ready.find(name).shows}")


for command in COMMANDS:
    handset.add_command(command)


def main() -> None:
    """The program."""
    handset.main(prog_name=PROGRAM)


if __name__ == "__main__":
    main()
