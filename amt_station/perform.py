"""Carries out typed commands on a link."""

from __future__ import annotations

from typing import Mapping

from amt_station.exchange import Exchange
from amt_station.link import Link
from amt_station.requests.operations import Value, check_channel, operation_packet
from amt_station.requests.table import find_operation


def run_operation(link: Link, path: tuple[str, ...],
                  values: Mapping[str, Value] | None = None,
                  timeout: float | None = None) -> list[Exchange]:
    """Carry out a typed command and what it needs before; the last exchange is its own."""
    row, operation = find_operation(path)
    check_channel(row, operation, link.channel)
    packet = operation_packet(row, operation, values)
    before = run_operation(link, operation.before, None, timeout) if operation.before else []
    return [*before, link.request(packet, timeout)]
