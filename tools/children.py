"""The programs that ./dev runs: an interruption ends them all, with one line instead of many.

Each child has a session of its own, so that Ctrl-C reaches ./dev alone. It then interrupts the
children, waits for them to clean up behind themselves, and shows nothing of what they say of it.
"""

import os
import signal
import subprocess
import sys
import threading
from contextlib import contextmanager
from pathlib import Path
from types import FrameType
from typing import IO, Callable, Iterator, Mapping, Sequence

from tools.project import PROJECT

WORDS = {signal.SIGINT: "interrupted", signal.SIGTERM: "terminated", signal.SIGHUP: "hung up"}

# How a child is told to end, and how long it may then take to clean up before it is told harder.
ENDINGS = ((signal.SIGINT, 20.0), (signal.SIGTERM, 5.0), (signal.SIGKILL, 5.0))

Taker = Callable[[bytes], None]


class Stopped(BaseException):
    """A signal has asked for the end."""

    def __init__(self, number: int) -> None:
        super().__init__(number)
        self.number = signal.Signals(number)


class _State:
    """What the signals and the threads share."""

    def __init__(self) -> None:
        self.lock = threading.Lock()
        self.living: set["subprocess.Popen[bytes]"] = set()
        self.stopped: Stopped | None = None
        # Set where a signal would lose a child that has just been started.
        self.is_held = False


_state = _State()


def _stop(number: int, _frame: FrameType | None) -> None:
    """The first signal begins the end; what comes behind it changes nothing."""
    if _state.stopped is None:
        _state.stopped = Stopped(number)
        if not _state.is_held:
            raise _state.stopped


@contextmanager
def _held_signals() -> Iterator[None]:
    """Signals, which only the main thread sees, wait until the block is left."""
    if threading.current_thread() is not threading.main_thread():
        yield
        return
    _state.is_held = True
    try:
        yield
    finally:
        _state.is_held = False
    if _state.stopped is not None:
        raise _state.stopped


def start(command: Sequence[str], environment: Mapping[str, str] | None = None,
          folder: Path = PROJECT) -> "subprocess.Popen[bytes]":
    """Start a child, its output in a pipe, nothing to read."""
    with _held_signals(), _state.lock:
        if _state.stopped is not None:
            raise _state.stopped
        child = subprocess.Popen(
            command, cwd=folder, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
            stderr=subprocess.STDOUT, start_new_session=True,
            env={**os.environ, **(environment or {})})
        _state.living.add(child)
    return child


def follow(child: "subprocess.Popen[bytes]", take: Taker) -> int:
    """Give what a child says to TAKE until its end; its status."""
    assert child.stdout is not None
    while piece := os.read(child.stdout.fileno(), 1 << 16):
        if _state.stopped is None:
            take(piece)
    status = child.wait()
    with _held_signals(), _state.lock:
        _state.living.discard(child)
    return status


def run(command: Sequence[str], take: Taker, environment: Mapping[str, str] | None = None,
        folder: Path = PROJECT) -> int:
    """Run a child to its end; its status."""
    return follow(start(command, environment, folder), take)


def end(child: "subprocess.Popen[bytes]") -> None:
    """End a child and all that it has started, gently at first."""
    assert child.stdout is not None
    # It must meet neither a closed nor a full pipe while it cleans up.
    threading.Thread(target=_drain, args=(child.stdout,), daemon=True).start()
    for number, seconds in ENDINGS:
        try:
            os.killpg(child.pid, number)
            child.wait(seconds)
            return
        except ProcessLookupError:
            return
        except subprocess.TimeoutExpired:
            continue


def _drain(stream: IO[bytes]) -> None:
    while os.read(stream.fileno(), 1 << 16):
        pass


def _end_all() -> None:
    enders = [threading.Thread(target=end, args=(child,)) for child in list(_state.living)]
    for ender in enders:
        ender.start()
    for ender in enders:
        ender.join()


def show(piece: bytes) -> None:
    """Take a child's words for the caller's."""
    sys.stdout.buffer.write(piece)
    sys.stdout.buffer.flush()


def guard(main: Callable[[], int]) -> int:
    """Run a program's main; a signal ends it with one line and the status 128 + its number."""
    for number in WORDS:
        signal.signal(number, _stop)
    try:
        status = main()
        sys.stdout.flush()
        return status
    except Stopped as stopped:
        _end_all()
        print(f"\ndev: {WORDS[stopped.number]}", file=sys.stderr, flush=True)
        return 128 + stopped.number
    except BrokenPipeError:
        # Whoever read the output has seen enough.
        _state.stopped = Stopped(signal.SIGPIPE)
        _end_all()
        os.dup2(os.open(os.devnull, os.O_WRONLY), sys.stdout.fileno())
        return 1
