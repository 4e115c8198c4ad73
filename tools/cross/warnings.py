"""Whether the Arm builds are held to the warnings of the others, file by file."""

import json
import shlex
from pathlib import Path
from typing import Iterator, Mapping

# What only the Arm builds say, and why.
ONLY_ARM: Mapping[str, str] = {
    "-Wno-psabi": "GCC's notes on what it passes otherwise than before version 7: no warnings",
}
FATAL = "-Werror"

Flags = Mapping[str, frozenset[str]]


def flags(build: Path) -> Flags:
    """The warning flags of each source of a build, as its compile commands have them."""
    commands = json.loads((build / "compile_commands.json").read_text("utf-8"))
    found = {}
    for entry in commands:
        # What a build has made itself lies in a folder of its own.
        found[entry["file"].removeprefix(f"{build}/")] = frozenset(
            word for word in shlex.split(entry["command"])
            if word.startswith("-W") and not word.startswith("-Wl,"))
    return found


def differences(own: Flags, arm: Flags) -> Iterator[str]:
    """Where the warnings of the Arm build are not those of this machine's OWN build."""
    missing = sorted(set(arm) - set(own))
    if missing:
        yield f"{missing[0]}: compiled for Arm only ({len(missing)} such files)"
    for name in sorted(set(arm) & set(own)):
        changed = (arm[name] ^ own[name]) - set(ONLY_ARM)
        if changed:
            yield f"{name}: {' '.join(sorted(changed))} in one of the builds only"
        if FATAL not in arm[name]:
            yield f"{name}: a warning is no error there"
    if not set(arm) & set(own):
        yield "no file is compiled by both"
