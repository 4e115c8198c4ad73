"""What the numbers of requests and answers stand for.

Made from the request table by ``python3 -m amt_station.handset_source``; do not change it by hand.
"""

from __future__ import annotations

from enum import IntEnum
from typing import Mapping


class Camera(IntEnum):
    """1 main, 2 second camera."""

    MAIN = 1
    SECOND = 2


class Module(IntEnum):
    """Which module."""

    PRODUCT = 1
    SOFTWARE = 16
    L1 = 17
    HLS = 18
    PLATFORM = 19
    APP = 20
    HARDWARE = 32
    WHOLE = 64


class Permission(IntEnum):
    """0 denied, 1 allowed; meant for the query, app channel only."""

    DENY = 0
    ALLOW = 1


class Sim(IntEnum):
    """1 when the SIM type is 1 or 2, else 0."""

    NONE = 0
    PRESENT = 1


class Step(IntEnum):
    """The step asked for."""

    START = 1
    STOP = 2
    TX_START = 3
    TX_STOP = 4
    RX_START = 5
    RX_STOP = 6


class Verdict(IntEnum):
    """1 pass, 2 fail, anything else unknown."""

    UNKNOWN = 0
    PASS = 1
    FAIL = 2


ENUMS: Mapping[str, type[IntEnum]] = {
    "camera": Camera,
    "module": Module,
    "permission": Permission,
    "sim": Sim,
    "step": Step,
    "verdict": Verdict,
}
