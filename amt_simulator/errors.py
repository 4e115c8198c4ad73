"""What can go wrong with a simulated handset, each a clear line."""

import signal

# What the messages of the program begin with.
PROGRAM = "amt-handset"


class HandsetError(Exception):
    """The handset cannot do what was asked; the text says why and what helps."""


class HandsetTimeout(HandsetError, AssertionError):
    """Something that was waited for did not happen in time."""


def how_it_ended(status: int) -> str:
    """An exit status in words; one below 0 is the signal that ended the process."""
    if status >= 0:
        return f"status {status}"
    try:
        return f"signal {-status} ({signal.Signals(-status).name})"
    except ValueError:
        return f"signal {-status}"
