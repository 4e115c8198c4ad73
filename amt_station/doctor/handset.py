"""What is at the other end: whether it answers, on which line, and what it still holds."""

from __future__ import annotations

from typing import Sequence

from amt_station.diagnosis import first_damage
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, ok, warning
from amt_station.doctor.probe import Probe
from amt_station.errors import EXIT_BAD_FRAME, NoPort, OutOfStep, Refused, StationError
from amt_station.place import Place
from amt_station.requests.at_commands import FLUSH_COMMAND
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name
from amt_station.text import shortened
from amt_station.wire.decoder import Item, Skipped, Text
from amt_station.wire.errors import StrayBytesError

_SHOWN_BYTES = 8
_LINES = {Channel.PC: "the PC line", Channel.APP: "the app channel"}

_GONE = "look at the cable, the socket and the handset's power"
_SILENT = ("switch the handset on and wait until it is up; see that this is its port (`amt-station "
           "ports`); unplug it and plug it in again, because a full request buffer is silent too; "
           "on a line with a real speed, try another one with --baud")
_SPEED = ("say the speed of the handset's line with --baud; if it is right, look at the cable and "
          "at its ground")
_DAMAGED = ("look at the cable, and for another program at this port; on a line with a real speed, "
            "say it with --baud")
_ECHO = "take the loop or the bridge out of the cable; a converter must have its echo off"
_STRANGER = ("this is no handset in its test mode: name another port (`amt-station ports`), or "
             "start the handset in the test mode")
_ADVICE_MODE = {
    Channel.APP: "the handset is in normal mode: `amt-station --app mode enter` takes it to the "
                 "test mode; or speak to it as it is, with --app",
    Channel.PC: "the handset is in the test mode: speak to it with --pc, or start it again for "
                "normal mode",
}


def answer(visit: Examination) -> Sequence[Finding]:
    """Whether a handset answers at all."""
    found = visit.probe()
    if found.serves is not None:
        return [ok("a handset answers")]
    assert found.problem is not None
    return [_silence(visit, found, found.problem)]


def _silence(visit: Examination, found: Probe, problem: StationError) -> Finding:
    if isinstance(problem, NoPort):
        return error(str(problem), _GONE, problem.exit_status)
    damage = first_damage(found.items)
    if damage is not None and isinstance(damage.error, StrayBytesError):
        return error(f"garbage comes instead of an answer: {_sample(found.items)}", _SPEED,
                     EXIT_BAD_FRAME)
    if damage is not None:
        return error(f"what comes is damaged: {damage.error}", _DAMAGED, EXIT_BAD_FRAME)
    text = "".join(item.text for item in found.items if isinstance(item, Text))
    if text and not text.replace(FLUSH_COMMAND, "").strip():
        return error("the line sends back what is sent, and nothing else", _ECHO,
                     problem.exit_status)
    if found.items:
        came = f": {shortened(text.strip())} came" if text.strip() else ""
        return error(f"something else than a handset's test service answers{came}", _STRANGER,
                     problem.exit_status)
    said = (f"nothing comes back within {visit.timeout:g} s" if isinstance(problem, OutOfStep)
            else str(problem))
    return error(said, _SILENT, problem.exit_status)


def _sample(items: Sequence[Item]) -> str:
    data = b"".join(item.raw for item in items if isinstance(item, Skipped))
    more = " ..." if len(data) > _SHOWN_BYTES else ""
    return data[:_SHOWN_BYTES].hex(" ") + more


def mode(visit: Examination) -> Sequence[Finding]:
    """Whether it serves the line that was named."""
    found = visit.probe()
    named, serves = visit.channel, found.serves
    assert serves is not None
    if serves is named:
        return [ok(f"it serves {_LINES[serves]}, as was said")]
    assert found.problem is not None
    return [error(f"it serves {_LINES[serves]} here, not {_LINES[named]}", _ADVICE_MODE[serves],
                  found.problem.exit_status)]


def request_buffer(visit: Examination) -> Sequence[Finding]:
    """Whether it still holds what it has refused."""
    found = visit.probe()
    if visit.channel is Channel.APP:
        return [ok("the app channel holds nothing back")]
    if isinstance(found.problem, Refused):
        return [error(str(found.problem), found.problem.advice, found.problem.exit_status)]
    assert found.place is not None
    if held := _carried_out(found.place):
        return [warning(held, "nothing is left of it now; what has sent it should be told that it "
                        "was carried out late")]
    return [ok("it holds nothing now; a refused text would have gone with the question")]


def _carried_out(place: Place) -> str:
    names = ", ".join(display_name(packet.command) for packet in place.late_answers)
    return f"it has only now answered something that was asked before: {names}" if names else ""
