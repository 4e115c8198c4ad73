"""What the C++ files of the project include of each other."""

import os
import re
from functools import lru_cache
from pathlib import Path

from tools.project import PROJECT

INCLUDE = re.compile(rb'^\s*#\s*include\s+"([^"]+)"', re.MULTILINE)
PLATFORM = Path("platform/include")


@lru_cache(maxsize=None)
def included_by(name: str) -> frozenset[str]:
    """The files of the project that a file includes itself."""
    found = set()
    for match in INCLUDE.findall((PROJECT / name).read_bytes()):
        text = match.decode()
        for candidate in (Path(text), PLATFORM / text, Path(name).parent / text):
            path = os.path.normpath(candidate)
            if (PROJECT / path).is_file():
                found.add(path)
                break
    return frozenset(found)


def all_included(name: str) -> list[str]:
    """A file and whatever it includes of the project, however far away."""
    seen: set[str] = set()
    waiting = {name}
    while waiting:
        seen |= waiting
        waiting = {other for one in waiting for other in included_by(one)} - seen
    return sorted(seen)
