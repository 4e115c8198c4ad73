"""What the station writes to ``logging.getLogger("amt_station")``: exchanges, and their bytes."""

from __future__ import annotations

import logging

from amt_station.exchange import Transcript
from amt_station.wire.decoder import Item

LOGGER = logging.getLogger("amt_station")


def exchange(transcript: Transcript) -> None:
    """Note one exchange: decoded at INFO, its bytes at DEBUG."""
    if not LOGGER.isEnabledFor(logging.INFO):
        return
    from amt_station.render import item_line

    def note(direction: str, item: Item) -> None:
        LOGGER.info("%s %s", direction, item_line(item))
        LOGGER.debug("%s %s", direction, item.raw.hex(" "))

    for item in transcript.late:
        note("late", item)
    LOGGER.info("-> %s %s", transcript.purpose.value, transcript.what)
    LOGGER.debug("-> %s", transcript.sent.hex(" "))
    for timed in transcript.items:
        note(f"<- {timed.seconds * 1000:.1f} ms", timed.item)
    if transcript.error:
        LOGGER.info("failed: %s", transcript.error)
