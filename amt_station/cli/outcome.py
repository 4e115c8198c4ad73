"""How an exchange went, for the person and for ``--json``."""

from __future__ import annotations

from amt_station import judge
from amt_station.cli import console
from amt_station.errors import Refused
from amt_station.exchange import Exchange
from amt_station.render import item_line
from amt_station.requests.table import display_name


def outcome(refusal: Refused | None) -> dict[str, object]:
    """What a refusal adds to a JSON document."""
    return {"error": refusal.details()} if refusal else {}


def raise_reported(refusal: Refused | None) -> None:
    """Let a refusal end the command, after its JSON document was printed."""
    if refusal is not None:
        refusal.reported = True
        raise refusal


def judged(exchange: Exchange) -> Refused | None:
    """The refusal in an exchange, if there is one."""
    try:
        judge.judge(exchange)
    except Refused as refusal:
        return refusal
    return None


def show_exchange(exchange: Exchange) -> None:
    """Say how an exchange went, for the person."""
    how = "acknowledged, " if exchange.acknowledged else ""
    console.talk(f"{display_name(exchange.request.command)}: {how}answered after "
                 f"{exchange.seconds * 1000:.1f} ms")
    for item in exchange.stray:
        console.talk(f"also arrived: {item_line(item)}")
