"""How the terminal driver treats the bytes, once the station has set it up for itself."""

from __future__ import annotations

import os
import termios
from dataclasses import dataclass
from typing import Any, Sequence

from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, ok
from amt_station.errors import EXIT_BAD_FRAME

_INPUT, _OUTPUT, _CONTROL, _LOCAL, _IN_SPEED, _OUT_SPEED = range(6)


@dataclass(frozen=True)
class _Setting:
    """Bits of one of the terminal's words, what they have to be, and what is wrong else."""

    word: int
    bits: int
    wanted: int
    wrong: str


_SETTINGS: tuple[_Setting, ...] = (
    _Setting(_CONTROL, termios.CSIZE, termios.CS8, "bytes are not 8 bits wide"),
    _Setting(_CONTROL, termios.PARENB, 0, "there is a parity bit"),
    _Setting(_CONTROL, termios.CSTOPB, 0, "there are two stop bits"),
    _Setting(_CONTROL, termios.CREAD, termios.CREAD, "receiving is switched off"),
    _Setting(_CONTROL, termios.CRTSCTS, 0, "sending waits for a wire (hardware flow control)"),
    _Setting(_INPUT, termios.IXON | termios.IXOFF, 0,
             "two characters stop and start the line (software flow control)"),
    _Setting(_INPUT, termios.ICRNL | termios.INLCR | termios.IGNCR | termios.ISTRIP, 0,
             "what comes is changed on the way"),
    _Setting(_OUTPUT, termios.OPOST, 0, "what is sent is changed on the way"),
    _Setting(_LOCAL, termios.ECHO, 0, "what the handset says is sent back to it (echo)"),
    _Setting(_LOCAL, termios.ICANON | termios.ISIG, 0, "what comes is edited as at a keyboard"),
)


def settings(visit: Examination) -> Sequence[Finding]:
    """Whether the driver has taken the settings, and nobody changes them meanwhile."""
    if not visit.device:
        return [ok("they are the other end's matter")]
    visit.open()
    try:
        attributes = _attributes(visit.device)
    except (OSError, termios.error) as problem:
        return [error(f"{visit.device} has no line settings: {problem.args[-1]}",
                      "it is no serial port: name another", EXIT_BAD_FRAME)]
    found = wrong(attributes, visit.baud)
    if not found:
        return [ok(f"{visit.baud} baud, 8 data bits, no parity, 1 stop bit, no flow control")]
    return [error("; ".join(found), "another program or the driver changes them while the station "
                  f"has the port: end that program; `stty -a -F {visit.device}` shows all",
                  EXIT_BAD_FRAME)]


def _attributes(device: str) -> list[Any]:
    descriptor = os.open(device, os.O_RDONLY | os.O_NOCTTY | os.O_NONBLOCK)
    try:
        return list(termios.tcgetattr(descriptor))
    finally:
        os.close(descriptor)


def wrong(attributes: Sequence[Any], baud: int) -> list[str]:
    """What is not as the station wants it, of what ``tcgetattr`` gives."""
    found = [setting.wrong for setting in _SETTINGS
             if attributes[setting.word] & setting.bits != setting.wanted]
    speed = getattr(termios, f"B{baud}", None)
    if speed is not None and {attributes[_IN_SPEED], attributes[_OUT_SPEED]} != {speed}:
        found.append(f"the speed is not {baud} baud")
    return found
