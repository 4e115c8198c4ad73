"""How the daemon of each build is brought up in a simulated handset, natively and emulated."""

from pathlib import Path
from typing import Any

from tools.cross.sysroot import SYSROOT
from tools.project import PROJECT

BUILDS = PROJECT / "build"
NATIVE, EMULATED = "release", "armhf"
EMULATOR = ("qemu-arm", "-L", "/usr/arm-linux-gnueabihf")
PRELOAD = "libhandset-devices.so"


def native() -> dict[str, Any]:
    """The options of a handset with the daemon that runs by itself."""
    return {"build": NATIVE}


def emulated(builds: Path = BUILDS, sysroot: Path = SYSROOT) -> dict[str, Any]:
    """The options of a handset with the Arm daemon and the Arm libraries of its platform.

    What it starts runs by itself, so those programs are the machine's own. They inherit the names
    of the libraries, and so does the emulator: as in a handset of both widths, each finds its own
    in lib or lib64.
    """
    own = builds / NATIVE
    return {
        "build": builds / EMULATED,
        "through": EMULATOR,
        "env": {"LD_PRELOAD": PRELOAD, "LD_LIBRARY_PATH": "/system/lib:/system/lib64"},
        "files": {
            "/system/lib/libz.so.1": sysroot / "lib/arm-linux-gnueabihf/libz.so.1",
            f"/system/lib64/{PRELOAD}": own / "lib" / PRELOAD,
            "/system/bin/amt-audio": own / "bin/amt-audio",
            "/system/bin/sync": own / "bin/sync",
        },
    }
