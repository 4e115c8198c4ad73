"""The port that is meant: whether it is there, may be used, and is nobody else's."""

from __future__ import annotations

import os
import stat
from typing import Sequence

from amt_station.doctor.computer import User, group_of
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, error, ok, unchecked, warning
from amt_station.doctor.services import PROBERS
from amt_station.errors import EXIT_BUSY, EXIT_NO_PORT, NoPort, PortBusy, UsageProblem
from amt_station.found_ports import FoundPort, Holder, found_ports, is_pseudo_terminal

RULE_ADVICE = ("install the rule file: `amt-station doctor --udev-rule | sudo tee "
               "/etc/udev/rules.d/70-amt-station.rules`, then plug the handset in again")
# Where pySerial's URLs lead that open no device.
_ELSEWHERE = ("loop", "rfc2217", "socket")


def presence(visit: Examination) -> Sequence[Finding]:
    """Whether the port is there, and which one it is when none was named."""
    try:
        visit.url = visit.find_port()
    except NoPort as problem:
        return [error(str(problem), f"plug the handset in and switch it on, or name its port with "
                      f"-p; {_there()}", EXIT_NO_PORT)]
    except UsageProblem as problem:
        return [unchecked(str(problem))]
    if not visit.device:
        return [_url(visit.url)]
    try:
        mode = os.stat(visit.device).st_mode
    except OSError as problem:
        return [error(f"{visit.device}: {problem.strerror}", "plug the handset in and switch it "
                      f"on, or name another port; {_there()}", EXIT_NO_PORT)]
    if not stat.S_ISCHR(mode):
        return [error(f"{visit.device} is no serial port", f"name one; {_there()}", EXIT_NO_PORT)]
    return [ok(f"{visit.device} is there{_description(visit.device)}")]


def _url(url: str) -> Finding:
    if url.partition("://")[0].lower() in _ELSEWHERE:
        return ok(f"{url} leads to no port of this PC")
    return warning(f"the port behind {url} is not looked at", "name the port itself with -p")


def _there() -> str:
    names = ", ".join(port.device for port in found_ports())
    return f"there are {names}" if names else "no serial port is there at all"


def _description(device: str) -> str:
    path = os.path.realpath(device)
    return next((_ids(port) for port in found_ports() if port.usb
                 and os.path.realpath(port.device) == path), "")


def _ids(port: FoundPort) -> str:
    words = [port.vid_pid, f"serial number {port.serial}" if port.serial else "",
             f"socket {port.location}" if port.location else ""]
    return f" ({', '.join(word for word in words if word)})"


def permission(visit: Examination) -> Sequence[Finding]:
    """Whether this user may read and write it."""
    if not visit.device:
        return [ok("whatever the URL opens is its own matter")]
    user = visit.computer.user()
    if visit.computer.may_use(visit.device):
        return [ok(f"{user.name} may read and write it")]
    mode, group = os.stat(visit.device).st_mode, group_of(visit.device)
    return [error(f"{user.name} may not read and write {visit.device}, which is for group {group} "
                  f"with mode {stat.S_IMODE(mode):04o}", _way_in(mode, group, user),
                  EXIT_NO_PORT)]


def _way_in(mode: int, group: str, user: User) -> str:
    if mode & stat.S_IRGRP == 0 or mode & stat.S_IWGRP == 0 or group == "root":
        return RULE_ADVICE
    if group in user.groups:
        return f"somebody has taken the right away from the file: {RULE_ADVICE}"
    if group in user.noted:
        return f"{user.name} is in the group {group} only since this login: log out and in again"
    return f"`sudo usermod -aG {group} {user.name}`, then log out and in again"


def holder(visit: Examination) -> Sequence[Finding]:
    """Whether it can be opened for this process alone, and nobody else reads along."""
    others = _others(visit)
    try:
        visit.open()
    except PortBusy as problem:
        return [error(str(problem), _way_out(others), EXIT_BUSY)]
    except NoPort as problem:
        return [error(str(problem), "plug the handset in again; if that is no help, name another "
                      f"port: {_there()}", EXIT_NO_PORT)]
    if others:
        return [error(f"{', '.join(map(str, others))} has {visit.url} open too, and takes a part "
                      "of what the handset says", _way_out(others), EXIT_BUSY)]
    return [ok(f"it can be opened for this process alone{_seen(visit)}")]


def _seen(visit: Examination) -> str:
    """What else is known: whoever reads along without a lock is seen among the processes only."""
    if not visit.device or is_pseudo_terminal(visit.device):
        return ""
    whom = "nobody else" if os.geteuid() == 0 else "no process that this user may look at"
    return f", and {whom} has it open"


def _others(visit: Examination) -> list[Holder]:
    if not visit.device or is_pseudo_terminal(visit.device):
        return []
    return visit.computer.holders(visit.device)


def _way_out(others: Sequence[Holder]) -> str:
    known = [prober.way_out for prober in PROBERS
             if any(one.command in prober.commands for one in others)]
    if known:
        return "; ".join(known)
    return ("end that program or give it another port" if others else
            "end that program; where it is not named above, `sudo amt-station ports` names it")
