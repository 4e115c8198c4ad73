"""Which runs statistics are made of."""

from __future__ import annotations

from dataclasses import dataclass
from datetime import date, datetime, time, timedelta, timezone, tzinfo
from zoneinfo import ZoneInfo

_DAYS = {"today": 0, "yesterday": 1}


@dataclass(frozen=True)
class Filter:
    """Runs of these; an empty text stands for all. ``since`` <= begin < ``until``, with zones.

    ``plan`` is a title. ``zone`` says where a day begins.
    """

    plan: str = ""
    plan_version: str = ""
    station: str = ""
    slot: str = ""
    since: datetime | None = None
    until: datetime | None = None
    zone: tzinfo = timezone.utc

    def day(self, moment: datetime) -> date:
        """The day that a moment belongs to."""
        return moment.astimezone(self.zone).date()


def zone_named(name: str) -> tzinfo:
    """A time zone by its name; ``ValueError`` when there is none."""
    if name.upper() == "UTC":
        return timezone.utc
    try:
        return ZoneInfo(name)
    except (OSError, KeyError, ValueError) as error:
        raise ValueError(f"{name!r} is no time zone; such as UTC or Europe/Berlin") from error


def since_from(text: str, zone: tzinfo, now: datetime) -> datetime:
    """The begin of a period: a day from its first moment on, or a time."""
    return _moment(text, zone, now, 0)


def until_from(text: str, zone: tzinfo, now: datetime) -> datetime:
    """The end of a period: a day is included whole, a time is not."""
    return _moment(text, zone, now, 1)


def _moment(text: str, zone: tzinfo, now: datetime, days_later: int) -> datetime:
    try:
        if text in _DAYS:
            day = now.astimezone(zone).date() - timedelta(days=_DAYS[text])
        elif len(text) > len("2026-01-31"):
            moment = datetime.fromisoformat(text)
            whole = moment if moment.tzinfo else moment.replace(tzinfo=zone)
            return whole.astimezone(timezone.utc)
        else:
            day = date.fromisoformat(text)
        midnight = datetime.combine(day + timedelta(days=days_later), time(), zone)
        return midnight.astimezone(timezone.utc)
    except (ValueError, OverflowError) as error:
        raise ValueError(f"{text!r} is no time; such as 2026-01-31, 2026-01-31T06:00, "
                         "2026-01-31T06:00+01:00, today or yesterday") from error
