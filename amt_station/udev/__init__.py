"""The rule file for the ports of handsets, whole or for the handsets of one maker."""

from __future__ import annotations

from importlib.resources import files

RULE_FILE = "70-amt-station.rules"
_ANY = 'ATTRS{idVendor}=="?*", ATTRS{idProduct}=="?*"'


def rule(vid_pid: str = "") -> str:
    """The text of the rule file; with ids as ``1d6b:5510`` for devices with these only."""
    text = files(__name__).joinpath(RULE_FILE).read_text("ascii")
    if not vid_pid:
        return text
    vid, _, pid = vid_pid.lower().partition(":")
    return text.replace(_ANY, f'ATTRS{{idVendor}}=="{vid}", ATTRS{{idProduct}}=="{pid}"')
