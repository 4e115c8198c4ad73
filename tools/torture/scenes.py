"""The scenes in which calls fail: dialogues with a daemon that serves, its starts and its ends."""

import signal
import time
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Callable, Mapping

from amt_simulator.waiting import scaled
from amt_station.trace.dialogue import Dialogue, parse
from tools.project import PROJECT
from tools.torture.stage import HANG_SECONDS, STEP_SECONDS, Stage

DIALOGUES = PROJECT / "tests" / "system" / "dialogues"
PATHS = {"app": "packet", "pc": "pc"}
AC = "/sys/class/power_supply/ac/online"
PERMISSION = "/amt/power_usb_amt.txt"
PROBE = b"AT\r"

Action = Callable[[Stage], None]


@dataclass(frozen=True)
class Scene:
    """Something that a daemon lives through, on a handset of a kind.

    With a dialogue or an action, calls fail from its beginning on, and the daemon serves before it;
    else they fail from the daemon's start on.
    """

    name: str
    path: str
    dialogue: Dialogue | None = None
    action: Action | None = None
    # The signal by which the action ends the daemon, when it is one that a crash would bring too.
    fault: int = 0
    # It takes so long that only a run of all the cases plays it.
    slow: bool = False
    options: Mapping[str, Any] = field(default_factory=dict)

    @property
    def key(self) -> str:
        """Scenes of one key share a handset."""
        return f"{self.path} {sorted(self.options.items())}"


def _terminate(stage: Stage) -> None:
    stage.handset.signal(signal.SIGTERM)
    stage.wait_end()


def _fault(stage: Stage) -> None:
    stage.handset.signal(signal.SIGSEGV)
    stage.wait_end()


def _unplug(stage: Stage) -> None:
    stage.handset.usb.unplug()
    stage.wait_end()


def _lose_line(stage: Stage) -> None:
    stage.handset.pc.hang_up()
    stage.wait_end()


def _app_leaves(stage: Stage) -> None:
    stage.handset.app.open()
    stage.handset.app.close()
    stage.settle()


def _probe(stage: Stage) -> None:
    """The station probes, and the modem answers."""
    stage.say(stage.station, PROBE)
    end = time.monotonic() + scaled(1.0)
    while b"OK" not in stage.take(stage.station) and stage.runs and time.monotonic() < end:
        time.sleep(STEP_SECONDS)
    stage.settle()


def _shake_hands(stage: Stage) -> None:
    """The first probe arms the timer, the second ends it; then a picture is made for a while."""
    threads = len(stage.look().threads)
    _probe(stage)
    _probe(stage)
    end = time.monotonic() + scaled(HANG_SECONDS)
    while stage.runs and len(stage.look().threads) > threads and time.monotonic() < end:
        time.sleep(STEP_SECONDS * 10)


def _begin_handshake(stage: Stage) -> None:
    """The station says nothing more in time."""
    _probe(stage)
    stage.wait_end()


def _dialogue(path: Path) -> Scene:
    dialogue = parse(path, path.read_text("utf-8"))
    return Scene(path.stem, PATHS[dialogue.channel], dialogue)


def all_scenes() -> list[Scene]:
    """Every scene."""
    return [
        *(_dialogue(path) for path in sorted(DIALOGUES.glob("*.txt"))),
        *(Scene(f"start-{path}", path) for path in ("packet", "pc", "simplified", "usb-inserted")),
        Scene("start-on-ac-power", "usb-inserted", options={"files": {AC: "1"}}),
        Scene("start-not-permitted", "usb-inserted", options={"files": {PERMISSION: "0"}}),
        Scene("app-comes-and-goes", "packet", action=_app_leaves),
        Scene("handshake", "usb-inserted", action=_shake_hands, slow=True),
        Scene("handshake-too-late", "usb-inserted", action=_begin_handshake, slow=True),
        Scene("end-packet-terminated", "packet", action=_terminate),
        Scene("end-packet-by-fault", "packet", action=_fault, fault=signal.SIGSEGV),
        Scene("end-pc-terminated", "pc", action=_terminate),
        Scene("end-pc-unplugged", "pc", action=_unplug),
        Scene("end-pc-line-lost", "pc", action=_lose_line),
        Scene("end-usb-inserted-terminated", "usb-inserted", action=_terminate),
    ]
