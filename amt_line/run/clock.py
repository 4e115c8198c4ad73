"""The time of day for records; durations come from the monotonic clock."""

from __future__ import annotations

from datetime import datetime, timezone


def utc_now() -> str:
    """Now, in UTC, to the millisecond."""
    return datetime.now(timezone.utc).isoformat(timespec="milliseconds").replace("+00:00", "Z")
