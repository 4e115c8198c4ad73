"""The secret that a browser on another machine has to show."""

from __future__ import annotations

import hmac
import os
import secrets
from pathlib import Path

from amt_station.errors import UsageProblem

# No letter that is taken for another when somebody types it on a tablet.
_LETTERS = "abcdefghjkmnpqrstuvwxyz23456789"
_GROUPS, _GROUP = 4, 5
_LENGTH = _GROUPS * (_GROUP + 1) - 1


def new_token() -> str:
    """A token of about 100 bits, in groups that can be read aloud."""
    return "-".join("".join(secrets.choice(_LETTERS) for _ in range(_GROUP))
                    for _ in range(_GROUPS))


def kept_token(path: Path) -> str:
    """The token of this machine, made once: tablets find back when the line is started again."""
    try:
        path.parent.mkdir(mode=0o700, parents=True, exist_ok=True)
        try:
            token = new_token()
            with open(path, "x", encoding="ascii", opener=_private) as file:
                file.write(f"{token}\n")
            return token
        except FileExistsError:
            token = path.read_text(encoding="ascii", errors="replace").strip()
    except OSError as error:
        raise UsageProblem(f"the page's token cannot be kept in {path}: "
                           f"{error.strerror}") from error
    if len(token) != _LENGTH or not set(token) <= {*_LETTERS, "-"}:
        raise UsageProblem(f"{path} holds no token; remove the file, and a new one is made")
    return token


def is_same(given: str, wanted: str) -> bool:
    """Whether the token is the right one, in a time that says nothing about it."""
    return hmac.compare_digest(given.encode("utf-8", "replace"), wanted.encode())


def _private(path: str, flags: int) -> int:
    return os.open(path, flags, 0o600)
