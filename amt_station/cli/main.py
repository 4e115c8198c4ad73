"""``amt-station``: the command-line test station."""

from __future__ import annotations

import os
import sys
from typing import NoReturn, Sequence

import click

from amt_station.cli import console
from amt_station.cli.at import at
from amt_station.cli.commands import commands
from amt_station.cli.options import Settings, common_options
from amt_station.cli.plan import plan
from amt_station.cli.recover import recover
from amt_station.cli.send import send
from amt_station.cli.typed import add_typed_commands
from amt_station.errors import EXIT_PASS, Interrupted, Refused, StationError, UsageProblem

_EPILOG = ("Exit status: 0 pass, 1 the handset said no, 2 usage, 3 no port, 4 port busy, "
           "5 no answer, 6 bad frame, 130 interrupted.")


@click.group(epilog=_EPILOG, context_settings={"help_option_names": ["-h", "--help"]})
@common_options
def cli() -> None:
    """Test a handset over its serial line, as the production line's station does.

    Data goes to standard output, talk to standard error.
    """


for _command in (send, at, commands, plan, recover):
    cli.add_command(_command)
add_typed_commands(cli)


def _fail(settings: Settings, error: StationError) -> int:
    advice = f"; {error.advice}" if isinstance(error, Refused) and error.advice else ""
    console.complain(f"{error}{advice}")
    if settings.json and not error.reported:
        console.data_json({"ok": False, "error": error.details()})
    return error.exit_status


def run(arguments: Sequence[str]) -> int:
    """Carry out one command line and return its exit status."""
    settings = Settings(json="--json" in arguments)
    try:
        with cli.make_context("amt-station", list(arguments), obj=settings) as context:
            cli.invoke(context)
        sys.stdout.flush()
        return EXIT_PASS
    except click.exceptions.Exit as end:
        return end.exit_code
    except StationError as error:
        return _fail(settings, error)
    except (KeyboardInterrupt, click.Abort):
        return _fail(settings, Interrupted())
    except click.ClickException as error:
        message = " ".join(error.format_message().split())
        return _fail(settings, UsageProblem(f"{message} (see --help)"))
    except BrokenPipeError:
        # Whoever read the output went away; there is nobody left to tell.
        os.dup2(os.open(os.devnull, os.O_WRONLY), sys.stdout.fileno())
        return 1


def main() -> NoReturn:
    """The ``amt-station`` program."""
    sys.exit(run(sys.argv[1:]))


if __name__ == "__main__":
    main()
