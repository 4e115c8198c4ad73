"""What can go wrong at the station, each with the exit status that the command ends with."""

from __future__ import annotations

from enum import Enum
from typing import Any, Sequence

from amt_station.wire.errors import WireError

EXIT_PASS = 0
EXIT_REFUSED = 1
EXIT_USAGE = 2
EXIT_NO_PORT = 3
EXIT_BUSY = 4
EXIT_NO_ANSWER = 5
EXIT_BAD_FRAME = 6
EXIT_DEFECT = 7
EXIT_DOUBT = 8
EXIT_INTERRUPTED = 130
EXIT_TERMINATED = 143


class StationError(Exception):
    """A failed operation; its text is one clear line."""

    exit_status = EXIT_REFUSED
    kind = "error"

    # Set when the JSON document that tells of the failure has been printed.
    reported = False

    def details(self) -> dict[str, Any]:
        """The failure for ``--json``."""
        return {"kind": self.kind, "message": str(self)}


class UsageProblem(StationError):
    """The operation cannot be asked for like this."""

    exit_status = EXIT_USAGE
    kind = "usage"


class ValueProblem(UsageProblem):
    """A value that its field does not take."""

    def __init__(self, key: str, reason: str) -> None:
        """``key`` is the field's name."""
        super().__init__(f"{key}: {reason}")
        self.key = key
        self.reason = reason


class NoPort(StationError):
    """No port was named, it is not there, or it went away."""

    exit_status = EXIT_NO_PORT
    kind = "no-port"


class PortBusy(StationError):
    """Somebody else holds the port."""

    exit_status = EXIT_BUSY
    kind = "port-busy"


class NoAnswer(StationError):
    """The handset did not answer in time."""

    exit_status = EXIT_NO_ANSWER
    kind = "no-answer"

    def __init__(self, message: str, arrived: Sequence[Any] = ()) -> None:
        """``arrived`` is what came instead."""
        super().__init__(message)
        self.arrived = tuple(arrived)


class OutOfStep(NoAnswer):
    """The link lost its place and could not find it again; nothing was sent but the search."""

    kind = "out-of-step"


class IncompleteAnswer(StationError):
    """The handset said yes, but its answer does not hold what was asked for."""

    kind = "incomplete-answer"


class BadFrame(StationError):
    """The handset answered with bytes that are not a proper frame."""

    exit_status = EXIT_BAD_FRAME
    kind = "bad-frame"

    def __init__(self, message: str, cause: WireError | None = None) -> None:
        super().__init__(message)
        self.cause = cause


class Interrupted(StationError):
    """The person at the keyboard ended it."""

    exit_status = EXIT_INTERRUPTED
    kind = "interrupted"

    def __init__(self) -> None:
        super().__init__("interrupted")


class Terminated(StationError):
    """Somebody asked the process to end."""

    exit_status = EXIT_TERMINATED
    kind = "terminated"

    def __init__(self) -> None:
        super().__init__("terminated")


class Held(str, Enum):
    """What a refusal leaves in the handset's request buffer."""

    NOTHING = ""
    TEXT = "text"
    PACKET = "packet"
    UNKNOWN = "unknown"


_ADVICE = {
    Held.NOTHING: "",
    Held.TEXT:
        "the refused text stays in the handset's request buffer and is read again with whatever "
        "follows; flush it with `amt-station recover`, which sends AT^DBTADDR=? and checks its OK",
    Held.PACKET:
        "the refused packet stays in the handset's request buffer and is carried out again with "
        "whatever follows, until the service restarts; unplug the USB cable and plug it in "
        "again, then check with `amt-station recover`",
    Held.UNKNOWN:
        "if it was the handset and not its modem that refused, the request still lies in the "
        "handset's request buffer; check with `amt-station recover`",
}


class Refused(StationError):
    """The handset said no: an error packet, a result code other than 0, or an AT error."""

    kind = "refused"

    def __init__(self, message: str, *, code: int | None = None, response: int | None = None,
                 held: Held = Held.NOTHING, causes: Sequence[str] = ()) -> None:
        """``code`` is the result code, ``response`` the id of the packet that carried it.

        ``causes`` are the known reasons for such a refusal.
        """
        reasons = f": {'; or '.join(causes)}" if causes else ""
        super().__init__(message + reasons)
        self.causes = tuple(causes)
        self.code = code
        self.response = response
        self.held = held

    @property
    def advice(self) -> str:
        """What the station has to do before it goes on; empty when nothing."""
        return _ADVICE[self.held]

    def details(self) -> dict[str, Any]:
        return {**super().details(), "code": self.code, "response": self.response,
                "held": self.held.value or None, "causes": list(self.causes),
                "advice": self.advice or None}
