"""Libraries in the place of the one of properties: they can replace any call of the daemon."""

import subprocess
from pathlib import Path

from amt_simulator import Handset

SOURCES = Path(__file__).with_name("libraries")
CUTILS, OTHER = "/system/lib/libcutils.so", "/system/lib/libcutils-other.so"


def replace_cutils(handset: Handset, folder: Path, name: str) -> None:
    """Build the library NAME in FOLDER, and put it in the place of the ordinary one.

    The handset must not have been started yet; the ordinary library stays beside the new one.
    """
    library = folder / "libcutils.so"
    subprocess.run(["cc", "-shared", "-fPIC", "-O1", "-o", library, SOURCES / f"{name}.c",
                    SOURCES / "other_cutils.c"], check=True)
    handset.place(OTHER, handset.read(CUTILS))
    handset.place(CUTILS, library)
