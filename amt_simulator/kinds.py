"""The ways in which a handset starts the daemon, and the configuration that it finds there."""

from dataclasses import dataclass, field
from typing import Mapping

from amt_simulator.android import sample_config

# Line name to configuration key.
LINE_KEYS = {"pc": "vx.tty.pc", "app": "vx.tty.app", "modem": "vx.tty.modem",
             "mux": "vx.tty.at.mux"}
AUDIO_KEY = "vx.audio.file"


@dataclass(frozen=True)
class Kind:
    """One way to start: which service of the init file, where the program lies, and so on."""

    name: str
    summary: str
    service: str = "vx-kel-amt"
    program: str = "/system/bin/vx-kel-amt"
    config: str = "/system/etc/vx-kel-amt.cfg"
    properties: Mapping[str, str] = field(default_factory=dict)
    usb_state: str = "CONFIGURED"
    # The texts in the log that say that the daemon serves.
    ready: tuple[str, ...] = ()


PC_READY = ("read_pc_loop, read ready", "read_modem_loop, read ready")
APP_READY = ("amt_handle_read_app_loop()",)

KINDS = {kind.name: kind for kind in (
    Kind("pc", "started at boot, normal mode switched to the PC and modem lines",
         properties={"amt.normal.amt.switch_status": "1"}, ready=PC_READY),
    Kind("packet", "started at boot, normal mode: the app line and the AT multiplexer",
         usb_state="DISCONNECTED", ready=APP_READY),
    Kind("simplified", "started beside its configuration with only the kernel: PC and modem lines",
         program="/data/local/vx-kel-amt", config="/data/local/vx-kel-amt.cfg", ready=PC_READY),
    Kind("usb-inserted", "started with -u when a cable is inserted: the handshake is awaited",
         service="vx-kel-amt-usb", usb_state="CONNECTED", ready=PC_READY),
)}


def settings(changes: Mapping[str, str | None]) -> dict[str, str]:
    """The usual settings, changed as CHANGES say (None takes one out)."""
    merged: dict[str, str | None] = {**sample_config(), **changes}
    return {key: value for key, value in merged.items() if value is not None}


def config_text(changes: Mapping[str, str | None]) -> str:
    """The configuration file with these settings."""
    return "".join(f"{key} = {value}\n" for key, value in settings(changes).items())
