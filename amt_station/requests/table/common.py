"""Pieces that several rows of the request table share."""

from __future__ import annotations

from amt_station.requests.model import PASSED_ON, Field, Refusal, Service
from amt_station.wire.atoms import AtomType

INT, STRING, BYTES, BOOL = AtomType.INT, AtomType.STRING, AtomType.BYTES, AtomType.BOOL

NO_MODEM = Refusal("the handset has no modem")
MODEM_ERROR = Refusal("the modem answers ERROR, +CME ERROR or +CMS ERROR, its line fails, or its "
                      "answer cannot be read", code=10)
DEVICE_FILE = Refusal("the kernel file cannot be opened, read or written")
TEST_LIBRARY = Refusal("the test library reports a failure")
TEST_HAL = Refusal("the platform's test library or its entry is missing, or the entry reports a "
                   "failure")

ON = Field(15, BOOL, "on", "1 on, 0 off", choices={"off": 0, "on": 1}, low=0, high=1,
           absent="1 (on)")

VERDICTS = {"unknown": 0, "pass": 1, "fail": 2}


def on_app(how: str, *refusals: Refusal) -> Service:
    """Served by the handset on the app channel."""
    return Service("handset", False, how, refusals)


def on_pc(how: str, *refusals: Refusal) -> Service:
    """Served by the handset on the PC line, which acknowledges first."""
    return Service("handset", True, how, refusals)


def asks_modem(how: str, *refusals: Refusal) -> Service:
    """Served on the app channel by an exchange with the modem."""
    return Service("modem", False, how, (NO_MODEM, *refusals))


REMEMBERED_ON_PC = Service(
    "modem", False, PASSED_ON.how + "; the handset remembers the value and writes it to its "
    "file when the modem's answer has result 0")
