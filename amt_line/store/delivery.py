"""Hands records on to the store in the background; nothing that goes wrong there ends a run.

A record is on the disk before it is handed on, so whatever happens to this process or to the
database, nothing is lost: when the database answers, the directory is compared with it, and what it
has missed is delivered, in the order in which the runs began.
"""

from __future__ import annotations

import logging
import threading
import time
from dataclasses import dataclass
from pathlib import Path
from typing import TYPE_CHECKING

from amt_line.run.clock import utc_now
from amt_line.store.files import file_names, in_order
from amt_line.store.gap import deliver, find_gap
from amt_line.store.mark import Mark
from amt_line.store.problems import BadRecord, StoreAway, StoreProblem
from amt_line.store.url import shown_url, sqlite_path

if TYPE_CHECKING:
    from amt_line.store.store import Store

_LOG = logging.getLogger("amt_line")

PATIENCE = 8.0
_FIRST_PAUSE = 0.5
_LONGEST_PAUSE = 15.0
_NOTE_SECONDS = 60.0


@dataclass(frozen=True)
class Standing:
    """How the delivery stands. ``since`` and ``because`` are empty while the database answers."""

    behind: int
    since: str = ""
    because: str = ""

    def __str__(self) -> str:
        if not self.behind and not self.because:
            return "ok"
        records = "1 record" if self.behind == 1 else f"{self.behind} records"
        since = f", since {self.since}" if self.since else ""
        because = f", because {self.because}" if self.because else ""
        return f"behind: {records}{since}{because}"


class Delivery:
    """The way of a directory's records into one database, on a thread of its own."""

    def __init__(self, url: str, directory: Path, pauses: tuple[float, float] = (
            _FIRST_PAUSE, _LONGEST_PAUSE)) -> None:
        """``url`` is one of ``checked_url``. ``pauses`` are the first and the longest one
        between two tries, in seconds. Files that lie in the directory now may be waiting."""
        self.url = url
        self.directory = directory
        self._pauses = pauses
        self._mark = Mark(url, directory)
        self._changed = threading.Condition()
        self._waiting: dict[str, None] = {}
        self._at_hand: str | None = None
        # What lies there already, until the database has said what it has of it.
        self._found = set(_files_in(directory))
        self._known = self._mark.read()
        self._bad: dict[str, str] = {}
        self._because = self._since = ""
        self._failures = 0
        self._closing = self._last_try = self._given_up = False
        self._prepared = self._ended = False
        self._stage = 0
        self._suspect: set[str] = set()
        self._next_note = 0.0
        self._store: Store | None = None
        self._compared = False
        self._thread = threading.Thread(target=self._serve, name="delivery", daemon=True)
        self._thread.start()

    def recorded(self, path: Path) -> None:
        """A record stands in the directory, whole. Returns at once."""
        with self._changed:
            self._waiting[path.name] = None
            self._changed.notify_all()

    @property
    def state(self) -> str:
        """``ok``, or ``behind`` with how many records, since when and why: for the views."""
        return str(self.standing)

    @property
    def standing(self) -> Standing:
        """How it stands."""
        with self._changed:
            missed = max(0, len(self._found) - self._known)
            new = len({*self._waiting, *filter(None, [self._at_hand])} - self._found)
            return Standing(missed + new, self._since, self._because)

    @property
    def bad_files(self) -> dict[str, str]:
        """Files in the directory that are no records, and why."""
        with self._changed:
            return dict(self._bad)

    def close(self, patience: float = PATIENCE) -> None:
        """Deliver what is left as far as the database answers, with so many seconds of patience.

        What then is left is delivered by whoever opens the directory next.
        """
        with self._changed:
            self._closing = True
            self._changed.notify_all()
            # Importing the database library is no matter of the database.
            self._changed.wait_for(lambda: self._prepared)
            self._wait_for_end(patience)
            self._given_up = True
            if (self._waiting or self._at_hand) and not self._because:
                self._because = f"{shown_url(self.url)}: the time for it was over"

    def _wait_for_end(self, patience: float) -> None:
        """Opening, comparing and delivering may take so long each."""
        stage = -1
        while not self._ended and stage != self._stage:
            stage = self._stage
            self._changed.wait_for(lambda: self._ended or self._stage != stage, patience)

    def lines(self) -> list[str]:
        """What the person is to be told at the end; nothing when all is well."""
        said = []
        standing, bad = self.standing, self.bad_files
        if standing.behind:
            records = "1 record is" if standing.behind == 1 else f"{standing.behind} records are"
            said.append(f"store: {records} still to be delivered: {standing.because}; "
                        "the next run does it, or `amt-station store sync`")
        if bad:
            name, reason = next(iter(bad.items()))
            more = f", and {len(bad) - 1} more" if len(bad) > 1 else ""
            said.append(f"store: skipped {self.directory / name}: {reason}{more}")
        return said

    def _serve(self) -> None:
        try:
            self._prepare()
            while self._wait_for_work():
                self._try()
            self._leave()
        except Exception:  # pylint: disable=broad-except
            _LOG.exception("the delivery of records to the store failed")
            with self._changed:
                self._because = self._because or "of a defect of the station itself"
        finally:
            with self._changed:
                self._prepared = self._ended = True
                self._changed.notify_all()

    def _prepare(self) -> None:
        try:
            import amt_line.store.store  # noqa: F401  pylint: disable=unused-import

            path = sqlite_path(self.url)
            if path is not None and not path.exists():
                import alembic.command  # noqa: F401  pylint: disable=unused-import
        finally:
            with self._changed:
                self._prepared = True
                self._changed.notify_all()

    def _wait_for_work(self) -> bool:
        """Wait until there is something to try; False when the thread is to end."""
        with self._changed:
            if self._failures:
                pause = min(self._pauses[0] * 2 ** min(self._failures - 1, 30), self._pauses[1])
                self._changed.wait_for(lambda: self._closing, pause)
            else:
                self._changed.wait_for(
                    lambda: self._waiting or not self._compared or self._closing)
            if self._given_up or self._last_try:
                return False
            self._last_try = self._closing
            return bool(self._waiting) or not self._compared

    def _try(self) -> None:
        was_open = self._store is not None
        try:
            if self._store is None:
                from amt_line.store.store import Store

                self._store = Store.open(self.url)
                self._get_on()
            if not self._compared:
                self._compare(self._store)
            self._deliver_waiting(self._store)
        except StoreProblem as problem:
            self._fail(problem)
            if was_open:
                # Perhaps only the connection was lost: the next try shows whether there is a
                # database.
                self._try()
            return
        with self._changed:
            self._failures = 0
            self._because = self._since = ""
            # What came meanwhile is delivered, too, by a thread that is to end.
            self._last_try = self._last_try and not self._waiting
        self._note()

    def _compare(self, store: Store) -> None:
        gap = find_gap(store, self.directory)
        with self._changed:
            names = {*gap.names, *self._waiting}.difference(self._bad)
            self._waiting = dict.fromkeys(in_order(self.directory, names))
            self._found, self._known, self._compared = set(), 0, True
        self._get_on()

    def _get_on(self) -> None:
        """Something is done that takes time, and whoever waits may wait for the next."""
        with self._changed:
            self._stage += 1
            self._changed.notify_all()

    def _deliver_waiting(self, store: Store) -> None:
        while (name := self._next()) is not None:
            begin = time.monotonic()
            try:
                self._deliver(store, name)
            except StoreProblem:
                with self._changed:
                    self._waiting = {name: None, **self._waiting}
                raise
            finally:
                with self._changed:
                    self._at_hand = None
            with self._changed:
                self._because = self._since = ""
                if self._waiting:
                    # However much there is to be made up for, the runs have the processor first.
                    self._changed.wait_for(lambda: self._closing, time.monotonic() - begin)

    def _next(self) -> str | None:
        """Take the next file. Its run may go on meanwhile: then it is handed on once more."""
        with self._changed:
            name = next(iter(self._waiting), None)
            if name is None or self._given_up:
                return None
            del self._waiting[name]
            self._at_hand = name
            return name

    def _deliver(self, store: Store, name: str) -> None:
        """Deliver a file, or find that it is no record."""
        try:
            deliver(store, self.directory, name)
        except BadRecord as error:
            self._skip(name, str(error))
        except StoreAway:
            raise
        except StoreProblem as problem:
            # It may be the record and it may be the database, which is opened anew to find out.
            if name not in self._suspect:
                self._suspect.add(name)
                raise
            self._skip(name, str(problem))

    def _skip(self, name: str, reason: str) -> None:
        _LOG.warning("%s: not delivered to the store: %s", self.directory / name, reason)
        with self._changed:
            self._bad[name] = reason

    def _fail(self, problem: StoreProblem) -> None:
        """The database is away, or of no use: it is tried again later, from the beginning."""
        if str(problem) != self._because:
            _LOG.warning("the store: %s", problem)
        if self._store is not None:
            self._store.close()
            self._store = None
        with self._changed:
            self._failures += 1
            self._compared = False
            self._since = self._since or utc_now()
            self._because = str(problem)

    def _note(self) -> None:
        """Remember how many files the database has; now and then, as it means listing them."""
        now = time.monotonic()
        with self._changed:
            if self._waiting or (now < self._next_note and not self._closing):
                return
        self._next_note = now + _NOTE_SECONDS
        self._mark.write(len(_files_in(self.directory)))

    def _leave(self) -> None:
        if self._store is not None:
            self._store.close()


def _files_in(directory: Path) -> list[str]:
    try:
        return file_names(directory)
    except OSError:
        return []
