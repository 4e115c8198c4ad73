"""Services that open every serial port that appears, and say things to it that upset a handset."""

from __future__ import annotations

from dataclasses import dataclass
from typing import Sequence

from amt_station.doctor.computer import Computer, NotKnown
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, ok, unchecked, warning
from amt_station.text import shortened

# What systemd says of a unit that is started, by itself or by something that is plugged in; of one
# that is not; and of one that is not installed.
_STARTS = ("enabled", "enabled-runtime", "static", "indirect", "alias", "generated")
_STAYS_AWAY = ("disabled", "masked", "masked-runtime", "linked", "linked-runtime")
_NOT_INSTALLED = ("not-found", "No such file or directory")


@dataclass(frozen=True)
class Prober:
    """One of them: its processes, its units, and the property of a port that keeps it away."""

    name: str
    does: str
    commands: tuple[str, ...]
    units: tuple[str, ...]
    way_out: str
    kept_away_by: tuple[str, ...] = ()


_RULE = "`amt-station doctor --udev-rule` prints the rule file that keeps it away from handsets"

PROBERS: tuple[Prober, ...] = (
    Prober("ModemManager", "sends AT commands to new ports", ("ModemManager",),
           ("ModemManager.service",),
           f"{_RULE}; or, on a PC without a modem of its own, `sudo systemctl mask --now "
           "ModemManager.service`", ("ID_MM_PORT_IGNORE", "ID_MM_DEVICE_IGNORE")),
    Prober("brltty", "takes USB serial adapters for braille displays", ("brltty",),
           ("brltty.service", "brltty-udev.service"),
           "where nobody needs a braille display at this PC, `sudo systemctl mask --now "
           "brltty.service brltty-udev.service`, or remove the package brltty"),
)


def probing(visit: Examination) -> Sequence[Finding]:
    """Whether one of them is there, and not kept away from the port that is meant."""
    kept_away = _properties(visit)
    findings = [finding for prober in PROBERS
                for finding in _look(prober, visit.computer, kept_away)]
    begins = " or begins by itself" if visit.computer.has("systemctl") else ""
    return findings or [ok(f"none of {', '.join(prober.name for prober in PROBERS)} runs here"
                           f"{begins}")]


def _look(prober: Prober, computer: Computer, kept_away: frozenset[str]) -> list[Finding]:
    problems = []
    for is_there in (_runs, _begins):
        try:
            said = is_there(prober, computer)
        except NotKnown as problem:
            problems.append(unchecked(f"{prober.name}: {problem}"))
            continue
        if said and kept_away.intersection(prober.kept_away_by):
            return [ok(f"{said}, but is kept away from this port")]
        if said:
            return [warning(f"{said}, and {prober.does}", prober.way_out)]
    return problems


def _runs(prober: Prober, computer: Computer) -> str:
    found = computer.running(*prober.commands)
    return f"{prober.name} ({found[0].pid}) runs" if found else ""


def _begins(prober: Prober, computer: Computer) -> str:
    # Where there is no systemd, nothing begins by it.
    if not computer.has("systemctl"):
        return ""
    starts = [_is_started(unit, computer) for unit in prober.units]
    return f"{prober.name} begins by itself" if any(starts) else ""


def _is_started(unit: str, computer: Computer) -> bool:
    said = computer.output("systemctl", "is-enabled", unit).strip()
    if said in _STARTS:
        return True
    if said in _STAYS_AWAY or said.endswith(_NOT_INSTALLED):
        return False
    raise NotKnown(f"systemctl does not tell of {unit}: {shortened(said) or 'it says nothing'}")


def _properties(visit: Examination) -> frozenset[str]:
    """The properties of the port that are set to 1 for whoever looks at new ports."""
    if not visit.device or "port" in visit.failed:
        return frozenset()
    try:
        said = visit.computer.output("udevadm", "info", "--query=property",
                                     f"--name={visit.device}")
    except NotKnown:
        return frozenset()
    return frozenset(line.removesuffix("=1") for line in said.splitlines() if line.endswith("=1"))
