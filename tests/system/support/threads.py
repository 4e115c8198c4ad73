"""The daemon's threads when all is calm: the start is over, and no request has one of its own."""

from amt_simulator import Handset
from amt_simulator.control import ProcessInfo
from amt_simulator.waiting import wait_until

# The main thread, and the workers: the app's reader, or those of the station, modem and cable.
OF_THE_APP, OF_THE_PC = 2, 4


def threads_of(handset: Handset) -> int:
    """How many threads a calm daemon has; ThreadSanitizer makes one more."""
    own = OF_THE_APP if handset.options.path == "packet" else OF_THE_PC
    return own + (handset.program.sanitizer == "tsan")


def wait_calm(handset: Handset) -> ProcessInfo:
    """A look at the daemon when neither a child nor a thread of the start or a request is left.

    The start's thread may outlive the first answers: it ends when the workers run already.
    """
    def attempt() -> ProcessInfo | None:
        info = handset.inspect()
        return info if not info.children and len(info.threads) == threads_of(handset) else None

    return wait_until(attempt, "the end of all that the start and the requests have started",
                      explain=lambda: f"{handset.inspect()}")
