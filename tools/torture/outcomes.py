"""What may become of a case, and what became of it."""

import re
from dataclasses import dataclass, field
from enum import Enum
from typing import Mapping

from amt_station import wire
from tools.torture.cases import Case
from tools.torture.play import STATION, Heard, Wrong


class Kind(Enum):
    """What the station, or init, saw of a failure."""

    AS_USUAL = "as usual"
    REFUSED = "refused"
    OTHERWISE = "otherwise"
    SILENT = "silent"
    UNHEARD = "unheard"
    ENDED = "ended"
    LIVES_ON = "lives on"
    GIVEN_UP = "line given up"
    START_FAILED = "start failed"
    NOT_REACHED = "not reached"
    WRONG = "not allowed"


@dataclass
class Outcome:
    """How a case has gone; `problems` say what is not allowed about it."""

    case: Case
    kind: Kind
    problems: list[str] = field(default_factory=list)

    @property
    def verdict(self) -> Kind:
        """In which column it counts."""
        return Kind.WRONG if self.problems else self.kind


@dataclass(frozen=True)
class Rule:
    """An outcome that is right where a function is called, and why. An empty word fits any."""

    kind: Kind
    function: str
    symbol: str
    why: str
    failure: str = ""
    # The beginning of the scene's name.
    scene: str = ""

    def fits(self, kind: Kind, case: Case) -> bool:
        """Whether it speaks of this case."""
        return (kind is self.kind and self.function in ("", case.place.function)
                and self.symbol in ("", case.place.symbol)
                and self.failure in ("", case.failure.name)
                and case.scene.startswith(self.scene))


READ, SEND = "amt_wait_read", "amt_handle_send_rsp"
RULES: tuple[Rule, ...] = (
    Rule(Kind.START_FAILED, "", "", "init sees it, and starts the daemon again"),
    Rule(Kind.OTHERWISE, "read", READ, "what one read gives is one request", "short"),
    Rule(Kind.OTHERWISE, "write", SEND, "an answer that was cut, and an error packet", "short"),
    Rule(Kind.SILENT, "read", READ, "an app's line that is lost is opened again", "EIO"),
    Rule(Kind.GIVEN_UP, "read", READ, "an app's line that cannot be read is given up", "ENOMEM"),
    *(Rule(Kind.GIVEN_UP, "", symbol, "an app's line that cannot be opened again is given up")
      for symbol in ("pub_pty_open", "create_pts_mapping", "set_ptm_attr")),
    Rule(Kind.ENDED, "read", READ, "whose line cannot be read, the process ends", "EIO"),
    Rule(Kind.ENDED, "read", READ, "whose line cannot be read, the process ends", "ENOMEM"),
    Rule(Kind.UNHEARD, "write", SEND, "a refusal that is lost is told when the next request comes"),
    Rule(Kind.OTHERWISE, "write", SEND, "a refusal behind an answer is lost as any other",
         scene="app-tunnel-packet-then-error"),
    Rule(Kind.OTHERWISE, "read", READ, "what a modem says behind a loss is the rest of its answer",
         "EIO", "app-modem-dies"),
    Rule(Kind.SILENT, "write", "amt_modem_write_request",
         "a modem's line that is lost is opened again", "EIO"),
    Rule(Kind.OTHERWISE, "write", "amt_modem_write_request",
         "a modem that was not asked says nothing", "EIO", "pc-modem-silent"),
    *(Rule(Kind.LIVES_ON, function, "", "what cannot be read forbids nothing", scene=scene)
      for function in ("fopen", "getc") for scene in ("start-on-ac-power", "start-not-permitted")),
    Rule(Kind.OTHERWISE, "read", READ, "an answer of two pieces that has become one is understood",
         "nothing", "app-channel-switch-split"),
    *(Rule(Kind.LIVES_ON, function, "", "without a timer nobody is too late")
      for function in ("timer_create", "timer_settime")),
    Rule(Kind.LIVES_ON, "write", "amt_modem_write_request",
         "a modem that was not asked says nothing, and its word starts the timer",
         scene="handshake-too-late"),
    Rule(Kind.LIVES_ON, "reboot", "", "a handset that may not be switched off goes on"),
    Rule(Kind.LIVES_ON, "read", READ, "a read of nothing never ends a reader", "nothing"),
    Rule(Kind.ENDED, "write", "amt_handle_read_modem_loop", "a PC that takes not all is gone"),
    Rule(Kind.ENDED, "write", SEND, "a PC that takes no error packet either is gone"),
    *(Rule(Kind.OTHERWISE, function, "", "what cannot be read is left out of the text",
           scene="pc-version-software") for function in ("fopen", "getc")),
    *(Rule(Kind.OTHERWISE, function, "", "a card that cannot be looked at has no capacity",
           scene="app-battery-and-card") for function in ("fopen", "getc", "statfs64")),
    Rule(Kind.OTHERWISE, "ioctl", "amt_device_camera_control", "the verdict says that it is absent",
         "ENODEV"),
    Rule(Kind.OTHERWISE, "write", SEND, "no answer waits for its acknowledgement", scene="pc-"),
    Rule(Kind.SILENT, "read", READ, "a piece of a text is the modem's", "short", "pc-"),
    Rule(Kind.SILENT, "write", SEND, "a brightness is set, whoever is told", scene="app-lights"),
    *(Rule(Kind.SILENT, function, "", "a brightness that cannot be set is told nobody",
           scene="app-lights") for function in ("fopen", "fprintf", "fflush")),
    Rule(Kind.SILENT, "write", SEND, "the handset is switched off, whoever is told",
         scene="pc-power-off"),
    Rule(Kind.SILENT, "write", SEND, "nobody looks whether the satellite was told",
         scene="app-gps"),
    Rule(Kind.OTHERWISE, "getc", "", "a file that ends early says what it holds", "end"),
)

# What may be left when a call from a place fails: a child is waited for at the chip's next start.
LEFT: Mapping[tuple[str, str], tuple[str, ...]] = {
    ("pthread_create", "amt_child_reap"): ("children",),
}

# Files that are kept beside what is asked: that one could not be written shows in the log only.
# Where it is there, it is whole, or was cut by its failed write as the others are.
UNTOLD: Mapping[str, "re.Pattern[bytes]"] = {
    "/amt/amt_result.txt": re.compile(rb"([012]\n){20}"),
    "/amt/imei.txt": re.compile(rb"[0-9]*"),
}

# With these init sees a start fail: a system call, an operation, a parameter, a device.
START_STATUSES = frozenset(code & 0xFF for code in (-1, -100, -101, -118))


def is_allowed(kind: Kind, case: Case) -> bool:
    """Whether this outcome is right for this case."""
    if kind in (Kind.AS_USUAL, Kind.REFUSED, Kind.NOT_REACHED):
        return True
    kinds = (kind, Kind.SILENT) if kind is Kind.UNHEARD else (kind,)
    return any(rule.fits(one, case) for rule in RULES for one in kinds)


def told(heard: Heard) -> list[str]:
    """The files that are not what the station must take them for."""
    return [str(wrong) for wrong in heard.wrong
            if wrong.name != STATION and not _is_untold(wrong)]


def _is_untold(wrong: Wrong) -> bool:
    whole = UNTOLD.get(wrong.name)
    return whole is not None and (wrong.there is None or isinstance(wrong.there, bytes)
                                  and whole.fullmatch(wrong.there) is not None)


def refuses(answer: bytes, is_app: bool) -> bool:
    """Whether an answer ends in a refusal: an error packet, or an AT result that is no OK."""
    if b"ERROR" in answer:
        return True
    for packet in packets_of(answer, is_app):
        if packet.result not in (0, None):
            return True
    return False


def packets_of(answer: bytes, is_app: bool) -> list[wire.Packet]:
    """The packets in what was heard, up to what is none."""
    found = []
    rest = answer.replace(wire.ACKNOWLEDGEMENT, b"") if not is_app else answer
    while rest:
        size = int.from_bytes(rest[:2], "little") if is_app else \
            8 + int.from_bytes(rest[4:8], "little")
        try:
            found.append(wire.Packet.decode(rest[:size]) if is_app
                         else wire.decode_envelope(rest[:size]))
        except wire.WireError:
            break
        rest = rest[size:]
    return found


def _first(good: Heard, heard: Heard) -> tuple[bytes, bytes] | None:
    """The first answer that is another one: what follows it may be its consequence."""
    for number, wanted in enumerate(good.answers[1:-1], start=1):
        got = heard.answers[number] if number < len(heard.answers) - 1 else b""
        if got != wanted:
            return wanted, got
    return None


def first_difference(good: Heard, heard: Heard) -> str:
    """The first answer that is another one, for people."""
    found = _first(good, heard)
    return f"heard {found[1]!r} instead of {found[0]!r}" if found else "heard the usual"


def compare(good: Heard, heard: Heard, is_app: bool) -> Kind:
    """What the station heard, beside what it hears when nothing fails."""
    found = _first(good, heard)
    if found is None:
        return Kind.AS_USUAL
    got = found[1]
    if got in (b"", wire.ACKNOWLEDGEMENT):
        return Kind.UNHEARD if refuses(found[0], is_app) else Kind.SILENT
    return Kind.REFUSED if refuses(got, is_app) else Kind.OTHERWISE
