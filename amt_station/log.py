"""What the station writes to ``logging.getLogger("amt_station")``: exchanges, and their bytes."""

from __future__ import annotations

import sys

from amt_station.exchange import Transcript
from amt_station.wire.decoder import Item

NAME = "amt_station"


def exchange(transcript: Transcript) -> None:
    """Note one exchange: decoded at INFO, its bytes at DEBUG.

    Where nobody has imported ``logging`` nobody listens, and nobody waits for its import.
    """
    if "logging" not in sys.modules:
        return
    import logging

    logger = logging.getLogger(NAME)
    if not logger.isEnabledFor(logging.INFO):
        return
    from amt_station.render import item_line

    def note(direction: str, item: Item) -> None:
        logger.info("%s %s", direction, item_line(item))
        logger.debug("%s %s", direction, item.raw.hex(" "))

    for item in transcript.late:
        note("late", item)
    logger.info("-> %s %s", transcript.purpose.value, transcript.what)
    logger.debug("-> %s", transcript.sent.hex(" "))
    for timed in transcript.items:
        note(f"<- {timed.seconds * 1000:.1f} ms", timed.item)
    if transcript.error:
        logger.info("failed: %s", transcript.error)
