"""What emulation cannot do: each with what is left out because of it, and measured anew."""

import subprocess
from dataclasses import dataclass
from typing import Mapping, Sequence

from tools.cross.emulated import BUILDS, EMULATED, EMULATOR, NATIVE
from tools.project import note

PROBE = "emulation-limits"
PROBE_SECONDS = 60


@dataclass(frozen=True)
class Limit:
    """Something that the emulator cannot do; `probe` is its name for the program that tries it."""

    probe: str
    text: str
    # The unit tests that can say nothing because of it, as ctest's expressions, and why.
    left_out: tuple[tuple[str, str], ...] = ()


LIMITS = (
    Limit("start", "starts no Arm program: what the daemon starts is built for this machine",
          ((r"^platform\.devices_test\.", "start a program of their own, which is Arm code again"),
           (r"^platform\.programs_test\.", "start the stand-in programs"),
           (r"_death_test\.", "start themselves again"))),
    Limit("speed", "does not know the speed B921600",
          ((r"^pub\..*serial_speed.*/(460801|3000000|2147483647)$",
            "a speed above 460800 becomes that one"),)),
    Limit("select", "does not write back the time left of an interrupted select()"),
    Limit("netlink", "has no generic netlink"),
    Limit("neighbour", "another process has the emulator's name and command line: a second start "
          "does not know the first one by it"),
)

# Left out besides, where what is emulated is sanitized; found by repeating, so no program tries it.
LEFT_OUT_SANITIZED: Mapping[str, str] = {
    r"^amt\.bluetooth\.": "fork beside a thread: 1 of some 150 children hangs (of 2000 without "
                          "the sanitizer and 3000 without the emulator none)",
}


def left_out(limits: Sequence[Limit] = LIMITS) -> dict[str, str]:
    """The unit tests that are left out, as expressions, each with its reason."""
    return dict(pair for limit in limits for pair in limit.left_out)


def judge(is_native: bool, is_emulated: bool) -> str:
    """What the two tries of a probe say of a limit."""
    if not is_native:
        return "NOT MEASURED: this machine cannot do it either"
    if is_emulated:
        return "NOT SO HERE: the emulator can do it"
    return "measured"


def can(build: str, probe: str) -> bool:
    """Whether a build's program can do what the PROBE tries."""
    command = [str(BUILDS / build / "bin" / PROBE), probe]
    if build == EMULATED:
        command[:0] = EMULATOR
    ended = subprocess.run(command, check=False, capture_output=True, text=True,
                           timeout=PROBE_SECONDS)
    if ended.returncode not in (0, 1):
        raise SystemExit(f"dev: {' '.join(command)} ended with status {ended.returncode}: "
                         f"{ended.stderr.strip()}")
    return ended.returncode == 0


def tell() -> None:
    """Say what the emulator cannot do, and whether it is so with this one on this machine."""
    for limit in LIMITS:
        note(f"{limit.text} ({judge(can(NATIVE, limit.probe), can(EMULATED, limit.probe))})")
        for pattern, reason in limit.left_out:
            note(f"    unit tests {pattern:52} {reason}")
