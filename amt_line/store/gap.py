"""What a directory of records has and its database has not: found, and delivered."""

from __future__ import annotations

import hashlib
import json
from dataclasses import dataclass, field
from pathlib import Path
from typing import TYPE_CHECKING

from amt_line.store.files import file_names, in_order, origin_of, read_text
from amt_line.store.problems import BadRecord
from amt_line.store.rows import rows_of

if TYPE_CHECKING:
    from amt_line.store.store import Store


@dataclass
class Gap:
    """What is still to be delivered, in order, and how many files there are in all."""

    names: list[str]
    files: int


def find_gap(store: Store, directory: Path) -> Gap:
    """Compare names; a file is read only where the database has its run as not ended."""
    names = file_names(directory)
    missing, unfinished = store.missing_of(origin_of(directory), names)
    missing += [name for name, sha256 in unfinished.items()
                if digest(directory / name) != sha256]
    return Gap(in_order(directory, missing), len(names))


def digest(path: Path) -> str:
    """The SHA-256 of a file; empty when it cannot be read."""
    try:
        return hashlib.sha256(path.read_bytes()).hexdigest()
    except OSError:
        return ""


def deliver(store: Store, directory: Path, name: str) -> bool:
    """Deliver one file; False when it was there already, or is not here any more."""
    try:
        text = read_text(directory / name)
    except FileNotFoundError:
        return False
    return store.put_text(text, origin_of(directory), name)


@dataclass
class Synchronised:
    """What came of ``synchronise``."""

    files: int = 0
    delivered: int = 0
    bad: dict[str, str] = field(default_factory=dict)


def synchronise(store: Store, directory: Path) -> Synchronised:
    """Deliver whatever is missing; files that are no records are named and left alone."""
    gap = find_gap(store, directory)
    result = Synchronised(gap.files)
    for name in gap.names:
        try:
            result.delivered += deliver(store, directory, name)
        except BadRecord as error:
            result.bad[name] = str(error)
    return result


@dataclass
class Comparison:
    """A directory against its database; lists of names of files, with the reason for each."""

    files: int = 0
    stored: int = 0
    missing: list[str] = field(default_factory=list)
    differing: dict[str, str] = field(default_factory=dict)
    unknown: list[str] = field(default_factory=list)
    bad: dict[str, str] = field(default_factory=dict)

    @property
    def agree(self) -> bool:
        """Whether there is nothing to say."""
        return not (self.missing or self.differing or self.unknown or self.bad)


def compare(store: Store, directory: Path) -> Comparison:
    """Compare directory and database both ways, every file by its SHA-256."""
    names = file_names(directory)
    origin = origin_of(directory)
    known = store.files_of(origin, names)
    result = Comparison(files=len(names))
    for name in in_order(directory, names):
        entry = known.get(name)
        if entry is not None and digest(directory / name) == entry.sha256:
            result.stored += 1
        else:
            _look_closer(store, directory, name, entry is not None, result)
    there = set(names)
    result.unknown = sorted(name for name, entry in known.items()
                            if entry.origin == origin and name not in there)
    return result


def _look_closer(store: Store, directory: Path, name: str, known: bool,
                 result: Comparison) -> None:
    """A file that is not in the database as it is, at least not under its name."""
    try:
        run, sha256 = identity(read_text(directory / name))
    except FileNotFoundError:
        result.files -= 1
        return
    except BadRecord as error:
        (result.differing if known else result.bad)[name] = str(error)
        return
    stored = store.stored(run)
    if stored is None:
        result.missing.append(name)
    elif stored.sha256 == sha256:
        result.stored += 1
    elif stored.state == "running":
        result.differing[name] = "the database has an earlier state of this run"
    else:
        result.differing[name] = "the database has another record of this run"


def identity(text: str) -> tuple[str, str]:
    """The run of a record's text, and the text's SHA-256; raises ``BadRecord``."""
    try:
        document = json.loads(text)
    except (ValueError, RecursionError) as error:
        raise BadRecord(f"no record of a run: {error}") from error
    return str(rows_of(document).run["run"]), hashlib.sha256(text.encode("utf-8")).hexdigest()
