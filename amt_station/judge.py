"""What the packets that come back mean: whose answer they are, and whether it is a yes.

On the PC line an error packet of the handset itself holds only result code 1, and its request
stays in the handset's request buffer. Code 10 and what the modem answers leave nothing behind.
"""

from __future__ import annotations

from amt_station.errors import Held, Refused
from amt_station.exchange import Exchange
from amt_station.requests.model import Channel
from amt_station.requests.table import display_name, requests_by_id
from amt_station.text import printable
from amt_station.wire.packet import Packet

_REFUSED_CODE = 1

# Text that is refused is answered as if it were a packet of id 255: with id 255 + 1 in one byte.
_TEXT_ANSWER = 0


def answer_ids(command: int) -> set[int]:
    """The ids that an answer to ``command`` may have; an error packet always has the first."""
    row = requests_by_id().get(command)
    following = (command + 1) & 0xFF
    return {following, row.answer_id} if row else {following}


def is_refusal(packet: Packet, channel: Channel) -> bool:
    """Whether this is an error packet of the handset itself, for whatever request it holds."""
    return (channel is Channel.PC and len(packet.atoms) == 1
            and packet.result == _REFUSED_CODE)


def is_answer(request: Packet, packet: Packet, channel: Channel) -> bool:
    """Whether ``packet`` ends the wait for an answer to ``request``.

    The request itself, sent back by an echo, never does, even where both have the same id.
    """
    if packet == request:
        return False
    return packet.command in answer_ids(request.command) or is_refusal(packet, channel)


def is_own_answer(exchange: Exchange) -> bool:
    """Whether the exchange was ended by an answer to its own request, be it a yes or a no."""
    if not exchange.answers:
        return bool(exchange.final)
    return exchange.answers[-1].command in answer_ids(exchange.request.command)


def is_of_text(refusal: Packet) -> bool:
    """Whether it is a text that was refused, not a packet that the handset still holds."""
    return refusal.command == _TEXT_ANSWER


def passed_on(request: Packet, channel: Channel) -> bool:
    """Whether the handset hands the packet to its modem, whose own words then come back.

    A modem that does not know the packet may answer with an AT error.
    """
    if channel is not Channel.PC:
        return False
    row = requests_by_id().get(request.command)
    service = row.pc if row else None
    if service is None or service.by == "modem":
        return True
    return any(request.get_int(atom, 0) in values for atom, values in service.passes_on.items())


def is_overtaken(request: Packet, channel: Channel) -> bool:
    """Whether other answers of the handset may come before one to this request.

    The modem takes its time, and so does the process that reports the outcome of a request with two
    answers.
    """
    row = requests_by_id().get(request.command)
    return passed_on(request, channel) or bool(row and row.answers > 1)


def judge(exchange: Exchange) -> None:
    """Raise ``Refused`` unless every answer of the exchange says yes."""
    command = exchange.request.command
    name = display_name(command)
    if not exchange.answers:
        raise Refused(f"the modem answered {name} with {printable(exchange.final)}")
    refusal = next((answer for answer in exchange.answers if answer.result), None)
    if refusal is None:
        return
    held = _held(exchange, refusal)
    if refusal.command in answer_ids(command):
        raise Refused(f"{name} was refused with code {refusal.result}", code=refusal.result,
                      response=refusal.command, held=held, causes=_causes(exchange, refusal))
    raise Refused(f"{name} was not looked at: {_still_holds(refusal)}", code=refusal.result,
                  response=refusal.command, held=held)


def refusal_of_text(text: str, refusal: Packet) -> Refused:
    """The error for an AT text that was met with an error packet."""
    text = printable(text)
    if is_of_text(refusal):
        return Refused(f"{text} was refused with code {refusal.result}", code=refusal.result,
                       response=refusal.command, held=Held.TEXT)
    return Refused(f"{text} was not looked at: {_still_holds(refusal)}", code=refusal.result,
                   response=refusal.command, held=Held.PACKET)


def _causes(exchange: Exchange, refusal: Packet) -> tuple[str, ...]:
    """The table's reasons for a refusal, when it is the handset's or its service's own."""
    row = requests_by_id().get(exchange.request.command)
    service = row.service(exchange.channel) if row else None
    if row is None or service is None:
        return ()
    asked = {field.name: field.read(atom) for field in row.fields
             if (atom := exchange.request.find(field.atom)) is not None}
    return service.causes(refusal.result, row.use(asked))


def _held(exchange: Exchange, refusal: Packet) -> Held:
    completed = any(answer.result == 0 for answer in exchange.answers)
    if completed or not is_refusal(refusal, exchange.channel):
        return Held.NOTHING
    if is_of_text(refusal):
        return Held.TEXT
    own = refusal.command in answer_ids(exchange.request.command)
    if own and passed_on(exchange.request, exchange.channel):
        return Held.UNKNOWN
    return Held.PACKET


def _still_holds(refusal: Packet) -> str:
    what = ("an AT text" if is_of_text(refusal)
            else f"the request {display_name(refusal.command - 1)}")
    return f"the handset still holds {what} and refused it again with code {refusal.result}"
