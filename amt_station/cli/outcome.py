"""How an exchange went, for the person and for ``--json``."""

from __future__ import annotations

from amt_station import judge
from amt_station.cli import console
from amt_station.errors import Refused, StationError
from amt_station.exchange import AtReply, Exchange
from amt_station.perform import Outcome
from amt_station.render import at_json, exchange_json, item_line, values_json
from amt_station.requests.table import display_name


def refusal_json(refusal: StationError | None) -> dict[str, object]:
    """What a refusal adds to a JSON document."""
    return {"error": refusal.details()} if refusal else {}


def raise_reported(refusal: StationError | None) -> None:
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


def show_exchange(exchange: Exchange | AtReply) -> None:
    """Say how an exchange went, for the person."""
    if isinstance(exchange, AtReply):
        name, how = exchange.sent, ""
    else:
        name = display_name(exchange.request.command)
        how = "acknowledged, " if exchange.acknowledged else ""
    console.talk(f"{name}: {how}answered after {exchange.seconds * 1000:.1f} ms")
    for item in exchange.stray:
        console.talk(f"also arrived: {item_line(item)}")


def outcome_json(outcome: Outcome) -> dict[str, object]:
    """A typed command that passed: its values, their units, and its exchanges."""
    *before, own = (exchange_json(exchange) if isinstance(exchange, Exchange)
                    else at_json(exchange) for exchange in outcome.exchanges)
    units = {value.name: value.unit for value in outcome.values if value.unit}
    return {**own, "values": values_json(outcome.values), "units": units, "before": before,
            "forced": list(outcome.prepared.forced)}
