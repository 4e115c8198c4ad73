"""What to do about a step that did not pass."""

from __future__ import annotations

from typing import Mapping

_BY_STATUS: Mapping[int, str] = {
    3: "check the cable, that the handset is on, and the port's name",
    4: "end the program that has the port open",
    5: "check that the handset is on and in the test mode, then run the plan again",
    6: "check cable and port: what came could not be read",
    7: "see to the station: the handset may be in order",
    130: "run the plan again", 143: "run the plan again"}

_FAILED = "the handset is out of its limits or refused: set it aside, or run the plan again"
_OPERATOR = "set the handset aside: the operator found it wanting"


def advice_for(exit_status: int, by_operator: bool) -> str:
    """The advice for a status, where the error itself has none."""
    return _BY_STATUS.get(exit_status, _OPERATOR if by_operator else _FAILED)
