"""``amt-station``: reads the command line, and turns whatever happens into a true exit status."""

from __future__ import annotations

import errno
import os
import signal
import sys
from types import FrameType
from typing import NoReturn, Sequence

import click

from amt_station import __version__
from amt_station.cli import console
from amt_station.cli.lazy import Root
from amt_station.cli.options import Settings, common_options
from amt_station.errors import (EXIT_DEFECT, EXIT_PASS, Interrupted, Refused, StationError,
                                Terminated, UsageProblem)

_PROGRAM = "amt-station"
_COMPLETE = "_AMT_STATION_COMPLETE"
_EPILOG = ("Exit status: 0 pass, 1 the handset said no, 2 usage (nothing was sent), 3 no port, "
           "4 port busy, 5 no answer, 6 bad frame, 7 the station's own error, 8 a doubt (doctor), "
           "130 interrupted, 143 terminated.")


@click.command(cls=Root, epilog=_EPILOG, context_settings={"help_option_names": ["-h", "--help"]})
@click.version_option(__version__, prog_name=_PROGRAM)
@common_options
def cli() -> None:
    """Test a handset over its serial line, as the production line's station does.

    Data goes to standard output, talk to standard error.
    """


class OutputLost(StationError):
    """What the command had to say could not be written."""

    exit_status = EXIT_DEFECT
    kind = "output"


def _fail(settings: Settings, error: StationError) -> int:
    advice = f"; {error.advice}" if isinstance(error, Refused) and error.advice else ""
    console.complain(f"{error}{advice}")
    if settings.json and not error.reported and not isinstance(error, OutputLost):
        console.data_json({"ok": False, "error": error.details()})
    return error.exit_status


def _carry_out(arguments: Sequence[str], settings: Settings) -> int:
    try:
        if wish := os.environ.get(_COMPLETE):
            return _complete(wish)
        with cli.make_context(_PROGRAM, list(arguments), obj=settings) as context:
            cli.invoke(context)
        return EXIT_PASS
    except click.exceptions.Exit as end:
        return end.exit_code
    except StationError as error:
        return _fail(settings, error)
    except (KeyboardInterrupt, click.Abort) as end:
        return _fail(settings, _end(end))
    except click.ClickException as error:
        message = " ".join(error.format_message().split())
        return _fail(settings, UsageProblem(f"{message} (see --help)"))


def _complete(wish: str) -> int:
    """What a shell asks for: its completion script, or the words that fit."""
    from click.shell_completion import shell_complete

    return shell_complete(cli, {}, _PROGRAM, _COMPLETE, wish)


def run(arguments: Sequence[str]) -> int:
    """Carry out one command line and return its exit status; nothing but that comes out."""
    own = list(arguments)
    settings = Settings(json="--json" in own[:own.index("--") if "--" in own else None])
    try:
        status = _carry_out(arguments, settings)
        _end_trace(settings, status)
        sys.stdout.flush()
        sys.stderr.flush()
        return status
    except KeyboardInterrupt as end:
        return _end(end).exit_status
    except OSError as error:
        if error.errno in (errno.EPIPE, errno.ENOSPC, errno.EIO, errno.EBADF, errno.EFBIG):
            return _lost_output(settings, error)
        return _defect(error)
    except Exception as error:
        return _defect(error)


def _end_trace(settings: Settings, status: int) -> None:
    """A trace that could not be written is told; what the command has come to stays."""
    if settings.recording is not None:
        settings.recording.close(f"ended with status {status}")
        if settings.recording.problem:
            console.complain(settings.recording.problem)


def _lost_output(settings: Settings, error: OSError) -> int:
    """Whoever read the output went away, or its disk is full: say so where that is possible."""
    _silence(sys.stdout.fileno())
    try:
        if error.errno != errno.EPIPE:
            _fail(settings, OutputLost(f"the output could not be written: {error.strerror}"))
        sys.stderr.flush()
    except OSError:
        _silence(sys.stderr.fileno())
    return OutputLost.exit_status


def _silence(descriptor: int) -> None:
    """What is still buffered for this descriptor goes nowhere, at the exit too."""
    os.dup2(os.open(os.devnull, os.O_WRONLY), descriptor)


def _defect(error: Exception) -> int:
    """A fault of the station itself: one line for the person, the rest into a file."""
    from amt_station.state import write_defect

    where = write_defect(error)
    kept = f"its traceback is in {where}" if where else "its traceback could not be kept"
    try:
        console.complain(f"a defect of the station itself ({type(error).__name__}); {kept}")
        sys.stdout.flush()
        sys.stderr.flush()
    except OSError:
        _silence(sys.stdout.fileno())
        _silence(sys.stderr.fileno())
    return EXIT_DEFECT


class _Terminate(KeyboardInterrupt):
    """SIGTERM, which ends whatever is being done just as SIGINT does."""


def _end_by(number: int, frame: FrameType | None) -> NoReturn:
    """The first signal ends what is done in order, a second one at once."""
    for one in (signal.SIGINT, signal.SIGTERM):
        signal.signal(one, _leave)
    raise _Terminate() if number == signal.SIGTERM else KeyboardInterrupt()


def _leave(number: int, frame: FrameType | None) -> NoReturn:
    os._exit(128 + number)


def _end(interrupt: BaseException) -> StationError:
    return Terminated() if isinstance(interrupt, _Terminate) else Interrupted()


def main() -> NoReturn:
    """Carry out the command line of this process."""
    try:
        console.prepare_streams()
        signal.signal(signal.SIGTERM, _end_by)
        signal.signal(signal.SIGINT, _end_by)
        status = run(sys.argv[1:])
        signal.signal(signal.SIGINT, signal.SIG_IGN)
        signal.signal(signal.SIGTERM, signal.SIG_IGN)
    except KeyboardInterrupt as end:
        status = _end(end).exit_status
    sys.exit(status)
