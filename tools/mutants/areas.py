"""Which system tests look at a source besides those that its name or a document tells."""

from typing import Mapping

# A source, or the beginning of several: the tests that found most of its mutants, `test_NAME.py`
# of the system tests. They only come first: what they pass over, all others may still find.
AREAS: Mapping[str, tuple[str, ...]] = {
    "amt/amt-device/": ("dialogues",),
    "amt/amt-device/framebuffer": ("screen", "failing_libraries"),
    "amt/amt-device/hal-library": ("hal", "audio"),
    "amt/amt-device/handshake-picture": ("failing_libraries",),
    "amt/amt-device/test-hal": ("mode_switch",),
    "amt/amt-device/wifi-radio-test": ("wifi_radio",),
    "amt/amt-handle/at/": ("dialogues", "identity_at"),
    "amt/amt-handle/channel/at-io": ("at_mux",),
    "amt/amt-handle/channel/timer": ("handshake", "failing_libraries"),
    "amt/amt-handle/handshake": ("failing_libraries", "screen"),
    "amt/amt-handle/reader/": ("dialogues", "failing_libraries"),
    "amt/amt-handle/reader/app-reader": ("station_handset",),
    "amt/amt-handle/reader/identity-write": ("identity_capture",),
    "amt/amt-handle/reader/pc-reader": ("dispatch", "ends"),
    "amt/amt-handle/reader/usb-": ("usb", "ends", "handshake"),
    "amt/amt-handle/request/": ("dialogues",),
    "amt/amt-handle/request/ap-version": ("version",),
    "amt/amt-handle/request/handshake-permission": ("mode_switch",),
    "amt/amt-handle/request/identity-store": ("identity_at", "identity_request"),
    "amt/amt-handle/request/nvram-file": ("identity_startup",),
    "amt/amt-handle/request/result-file": ("test_results",),
    "amt/amt-handle/request/station-result": ("test_results",),
    "amt/amt-handle/startup": ("ends", "failing_libraries", "signals"),
    "amt/main": ("handshake", "failing_libraries", "signals"),
    "amt/signal-treatment": ("signals", "faults", "entry", "failing_libraries", "handshake"),
    "pub/pty/": ("app_channel", "failing_libraries"),
}


def further(path: str) -> list[str]:
    """The tests of the table for a source, those of its own row first."""
    rows = sorted((row for row in AREAS if path.startswith(row)), key=len, reverse=True)
    return [f"tests/system/test_{name}.py" for row in rows for name in AREAS[row]]
