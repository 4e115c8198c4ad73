"""What went over the port, as the record keeps it: bytes in hexadecimal and what they mean."""

from __future__ import annotations

from typing import Any

from amt_station import judge
from amt_station.exchange import Purpose, Transcript
from amt_station.render import item_json
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name
from amt_station.wire.decoder import (Acknowledgement, BareDecoder, Decoder, EnvelopeDecoder, Frame,
                                      Item, Text)

Document = dict[str, Any]


def exchange_document(transcript: Transcript) -> Document:
    """One exchange for the record. ``late`` marks what was the answer to something before."""
    channel = transcript.channel
    sent = _decode(transcript.sent, channel)
    request = sent[0] if sent else None
    document: Document = {
        "purpose": transcript.purpose.value, "what": transcript.what,
        "began": transcript.start.isoformat(timespec="milliseconds").replace("+00:00", "Z"),
        "seconds": round(transcript.seconds, 6), "sent": transcript.sent.hex(),
        "sent_decoded": [item_json(item) for item in sent],
        "received": [*(_received(0.0, item, True) for item in transcript.late),
                     *(_received(timed.seconds, timed.item,
                                 is_late(timed.item, request, transcript))
                       for timed in transcript.items)],
        "error": transcript.error}
    if transcript.unkept:
        document["bytes_not_kept"] = transcript.unkept
    return document


def _received(seconds: float, item: Item, late: bool) -> Document:
    document: Document = {"seconds": round(seconds, 6), "bytes": item.raw.hex(),
                          "decoded": item_json(item)}
    if late:
        document["late"] = late_name(item)
    return document


def _decode(data: bytes, channel: Channel) -> list[Item]:
    decoder: Decoder = EnvelopeDecoder() if channel is Channel.PC else BareDecoder()
    return [*decoder.feed(data), *decoder.give_up()] if data else []


def is_late(item: Item, request: Item | None, transcript: Transcript) -> bool:
    """Whether this belongs to something that was sent before."""
    channel = transcript.channel
    if isinstance(request, Frame):
        return isinstance(item, Frame) and not judge.is_answer(request.packet, item.packet, channel)
    if transcript.purpose is Purpose.REQUEST:
        return False
    if isinstance(item, Acknowledgement):
        return True
    return isinstance(item, Frame) and not judge.is_refusal(item.packet, channel)


def late_name(item: Item) -> str:
    """What a late answer is called."""
    if isinstance(item, Frame):
        return display_name(item.packet.command)
    if isinstance(item, Text):
        return "text"
    return "acknowledgement" if isinstance(item, Acknowledgement) else "bytes that are no frame"


def late_remarks(documents: list[Document]) -> list[str]:
    """A line for each late answer of these exchanges."""
    return [f"came late and passes nothing: {item['late']}" for document in documents
            for item in document["received"] if "late" in item]
