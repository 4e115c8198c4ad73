"""The files of the pages, read once: a name that is not among them leads nowhere."""

from __future__ import annotations

import hashlib
from dataclasses import dataclass
from functools import lru_cache
from importlib import resources
from typing import Mapping

_TYPES = {".css": "text/css", ".js": "text/javascript", ".svg": "image/svg+xml"}


@dataclass(frozen=True)
class Asset:
    """A file as it is sent."""

    content: bytes
    content_type: str
    tag: str


@lru_cache(maxsize=1)
def assets() -> Mapping[str, Asset]:
    """All files of the pages by name."""
    folder = resources.files("amt_line.view.web") / "static"
    found = {}
    for file in folder.iterdir():
        suffix = f".{file.name.rpartition('.')[2]}"
        if suffix in _TYPES:
            content = file.read_bytes()
            found[file.name] = Asset(content, _TYPES[suffix],
                                     f'"{hashlib.sha256(content).hexdigest()[:16]}"')
    return found


@lru_cache(maxsize=1)
def version() -> str:
    """Changes when any file of the pages does: a page of another version loads itself again."""
    whole = "".join(f"{name}{asset.tag}" for name, asset in sorted(assets().items()))
    return hashlib.sha256(whole.encode()).hexdigest()[:12]
