"""URLs of databases: which are taken, and how they are shown without their passwords."""

from __future__ import annotations

import os
import re
from pathlib import Path
from urllib.parse import unquote

from amt_station.errors import UsageProblem
from amt_station.state import state_directory
from amt_station.text import printable

VARIABLE = "AMT_STATION_STORE"
WANTED = "sqlite:///FILE or postgresql+psycopg2://USER@HOST/DATABASE"

_SQLITE = "sqlite:///"
_POSTGRESQL = re.compile(r"postgresql(\+psycopg2)?://")
# Up to the last "@": a password that should have been quoted is hidden as well.
_USER = re.compile(r"^([^:/]*://[^:@]*:)(.*)(@)", re.DOTALL)
_QUERY = re.compile(r"([?&;](?:[a-z_]*pass[a-z_]*)=)([^&;#]*)", re.IGNORECASE)


def default_store_url() -> str:
    """The database of a station of its own: a SQLite file beside the records."""
    return sqlite_url(state_directory() / "line.sqlite")


def sqlite_url(path: Path) -> str:
    """The URL of a SQLite file, whose path stands in it as it is."""
    return f"{_SQLITE}{path}"


def checked_url(said: str | None) -> str:
    """What was said, else what the environment says, else the default, in one form.

    Raises ``UsageProblem`` for what is no database of a store.
    """
    url = said or os.environ.get(VARIABLE)
    if not url:
        return default_store_url()
    where = "--store" if said else VARIABLE
    if url.startswith(_SQLITE):
        path = url.removeprefix(_SQLITE)
        if path in ("", ":memory:") or "?" in path or "\0" in path:
            raise UsageProblem(f"{where}: {shown_url(url)!r}: a file is needed, {_SQLITE}FILE")
        return sqlite_url(Path(os.path.abspath(os.path.expanduser(path))))
    match = _POSTGRESQL.match(url)
    if match is None:
        raise UsageProblem(f"{where}: {shown_url(url)!r} is no database that can be used; give "
                           f"{WANTED}")
    return "postgresql+psycopg2://" + url[match.end():]


def sqlite_path(url: str) -> Path | None:
    """The file of a SQLite database; None for others."""
    return Path(url.removeprefix(_SQLITE)) if url.startswith(_SQLITE) else None


def shown_url(url: str) -> str:
    """The URL for people: without passwords, and without what acts on a terminal."""
    return printable(_QUERY.sub(r"\1***", _USER.sub(r"\1***\3", url)))


def secrets_of(url: str) -> set[str]:
    """The passwords in the URL, as they stand there and as they are meant."""
    found = {match.group(2) for match in (*_USER.finditer(url), *_QUERY.finditer(url))}
    return {form for text in found for form in (text, unquote(text)) if form}


def without_secrets(text: str, url: str) -> str:
    """A message on one line without the URL's passwords."""
    for secret in sorted(secrets_of(url), key=len, reverse=True):
        text = text.replace(secret, "***")
    return printable(" ".join(text.split()))
