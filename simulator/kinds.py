"""The ways in which a handset starts the daemon, and the configuration that it finds there."""

from dataclasses import dataclass, field
from typing import Mapping

CONFIG_PC = "vx.tty.pc"
CONFIG_APP = "vx.tty.app"
CONFIG_MODEM = "vx.tty.modem"
CONFIG_MUX = "vx.tty.at.mux"
AUDIO_FILE = "/system/media/audio/amt/sweep.wav"

# Line name to configuration key.
LINE_KEYS = {"pc": CONFIG_PC, "app": CONFIG_APP, "modem": CONFIG_MODEM, "mux": CONFIG_MUX}

DEFAULT_CONFIG: dict[str, str] = {
    CONFIG_PC: "/dev/ttyGS0",
    CONFIG_APP: "/dev/ttyAPP0",
    CONFIG_MODEM: "/dev/ttyMODEM0",
    CONFIG_MUX: "/dev/ttyMUX0",
    "vx.audio.file": AUDIO_FILE,
    "vx.audio.sample.rate": "44100",
    "vx.audio.format": "1",
    "vx.audio.frame.count": "1024",
    "vx.mode.file": "/amt/mode.txt",
    "vx.modem.uart.amt.default.baudrate": "115200",
    "vx.modem.uart.at.default.baudrate": "115200",
}


@dataclass(frozen=True)
class Kind:
    """One way to start: where the program lies, what it is told, what the handset is like."""

    name: str
    summary: str
    program: str = "/system/bin/vx-kel-amt"
    config: str = "/system/etc/vx-kel-amt.cfg"
    args: tuple[str, ...] = ()
    properties: Mapping[str, str] = field(default_factory=dict)
    usb_state: str = "CONFIGURED"
    # The texts in the log that say that the daemon serves.
    ready: tuple[str, ...] = ()


PC_READY = ("read_pc_loop, read ready", "read_modem_loop, read ready")

KINDS = {kind.name: kind for kind in (
    Kind("pc", "started at boot, normal mode switched to the PC and modem lines",
         properties={"amt.normal.amt.switch_status": "1"}, ready=PC_READY),
    Kind("packet", "started at boot, normal mode: the app line and the AT multiplexer",
         usb_state="DISCONNECTED", ready=("amt_handle_read_app_loop()",)),
    Kind("simplified", "started beside its configuration with only the kernel: PC and modem lines",
         program="/data/local/vx-kel-amt", config="/data/local/vx-kel-amt.cfg", ready=PC_READY),
    Kind("usb-inserted", "started with -u when a cable is inserted: the handshake is awaited",
         args=("-u",), usb_state="CONNECTED", ready=PC_READY),
)}


def config_text(settings: Mapping[str, str | None]) -> str:
    """The configuration file: the usual settings, changed as SETTINGS say (None takes one out)."""
    merged: dict[str, str | None] = {**DEFAULT_CONFIG, **settings}
    return "".join(f"{key} = {value}\n" for key, value in merged.items() if value is not None)
