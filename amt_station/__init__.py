"""The test station's side of the handset's manufacturing-test protocol.

``connect`` is the way in for scripts::

    from amt_station import connect

    with connect("/dev/ttyACM0") as handset:
        print(handset.pcba.read().serial)
"""

from __future__ import annotations

# Like the one of ``typing``, whose import would keep a command's handlers of signals waiting.
TYPE_CHECKING = False

if TYPE_CHECKING:
    from amt_station.errors import (BadFrame, IncompleteAnswer, NoAnswer, NoPort, OutOfStep,
                                    PortBusy, Refused, StationError, UsageProblem, ValueProblem)
    from amt_station.handset import Handset, connect
    from amt_station.handset.enums import Camera, Module, Permission, Sim, Step, Verdict
    from amt_station.requests.model import Channel

__version__ = "1.1"

__all__ = [
    "BadFrame", "Camera", "Channel", "Handset", "IncompleteAnswer", "Module", "NoAnswer", "NoPort",
    "OutOfStep", "Permission", "PortBusy", "Refused", "Sim", "StationError", "Step",
    "UsageProblem", "ValueProblem", "Verdict", "connect",
]

_ENUMS = ("Camera", "Module", "Permission", "Sim", "Step", "Verdict")
_PLACES = {"connect": "amt_station.handset", "Handset": "amt_station.handset",
           "Channel": "amt_station.requests.model",
           **{name: "amt_station.handset.enums" for name in _ENUMS}}


def __getattr__(name: str) -> object:
    """Import what a script asks for; the codec alone needs nothing of it."""
    if name not in __all__:
        raise AttributeError(f"module {__name__!r} has no attribute {name!r}")
    import importlib

    return getattr(importlib.import_module(_PLACES.get(name, "amt_station.errors")), name)
