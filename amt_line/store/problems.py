"""What can go wrong with the store; each text is one clear line, and no password stands in it."""

from __future__ import annotations

from amt_station.errors import EXIT_DEFECT, StationError


class StoreProblem(StationError):
    """The database cannot be used: it is of a newer version, or it is something else."""

    exit_status = EXIT_DEFECT
    kind = "store"


class StoreAway(StoreProblem):
    """The database cannot be reached, is locked or full: later it may be back."""

    kind = "store-away"


class BadRecord(StationError):
    """What should be a record is none."""

    kind = "record"
