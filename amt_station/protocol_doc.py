"""Makes the protocol reference: ``python3 -m amt_station.protocol_doc > docs/protocol.md``."""

from __future__ import annotations

import re
from pathlib import Path
from typing import Callable, Iterable, Mapping, Sequence

from amt_station.requests.at_commands import AT_COMMANDS, WATCHED
from amt_station.requests.catalogue import command_names
from amt_station.requests.formats import FORMATS
from amt_station.requests.model import Field, Operation, Request, Service
from amt_station.requests.operations import operation_packet
from amt_station.requests.table import FAMILIES, REQUESTS, find_operation, requests_by_id, tunnel
from amt_station.wire.atoms import RESULT_ATOM, Atom
from amt_station.wire.checksum import TABLE, checksum
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

_PROSE = Path(__file__).with_name("protocol-prose.md")
_MARK = re.compile(r"^<!-- ([a-z-]+) -->$", re.MULTILINE)


def _hex(data: bytes) -> str:
    return data.hex(" ").upper()


def _table(header: Sequence[str], rows: Iterable[Sequence[str]]) -> str:
    lines = ["| " + " | ".join(header) + " |", "|" + "---|" * len(header)]
    lines += ["| " + " | ".join(cell.replace("|", "\\|") for cell in row) + " |" for row in rows]
    return "\n".join(lines)


def _code(*lines: str) -> str:
    return "\n".join(("```", *lines, "```"))


def _packet_example() -> str:
    return _code(_hex(Packet(10).encode()),
                 _hex(Packet(10, (Atom.integer(5, 0x01020304),)).encode()))


def _envelope_example() -> str:
    frame = encode_envelope(Packet(10))
    return _code(f"{_hex(frame[:8])}  magic, length {len(frame) - 8}",
                 f"{_hex(frame[8:12])}              flags, reserved",
                 f"{_hex(frame[12:-4])}        packet",
                 f"{_hex(frame[-4:])}              checksum 0x{checksum(frame[:-4]):08X}")


def _checksum_example() -> str:
    lines, crc = [], 0
    for byte in (1, 0, 0, 0, 0):
        index = crc >> 24
        shifted = (crc << 8 | byte) & 0xFFFFFFFF
        crc = shifted ^ TABLE[index]
        lines.append(f"byte {byte:02X}   0x{shifted:08X} XOR table[0x{index:02X}] "
                     f"0x{TABLE[index]:08X} = 0x{crc:08X}")
    assert crc == checksum(b"\x01")
    return _code(*lines)


def _exchange_example() -> str:
    row, operation = find_operation(("gps", "start"))
    return _code(_hex(encode_envelope(operation_packet(row, operation))),
                 _hex(ACKNOWLEDGEMENT),
                 _hex(encode_envelope(Packet(row.answer_id, (Atom.integer(RESULT_ATOM, 0),)))))


def _refused_text_example() -> str:
    return _code(_hex(encode_envelope(Packet(0, (Atom.integer(RESULT_ATOM, 1),)))))


def _limits(field: Field) -> str:
    limits = ""
    if field.low is not None and field.high is not None:
        limits = f"{field.low} to {field.high}"
    elif field.low is not None:
        limits = f"{field.low} or more"
    elif field.longest is not None:
        limits = f"at most {field.longest} bytes"
    form = FORMATS[field.format].meaning if field.format else ""
    return ", ".join(part for part in (limits, form) if part)


def _unit(field: Field) -> str:
    return f"1/{field.scale} {field.unit}" if field.scale != 1 else field.unit


def _type(field: Field) -> str:
    if not field.width:
        return field.type.label
    return f"{field.type.label}, {field.width} byte{'s' * (field.width > 1)} as a number"


def _meaning(field: Field) -> str:
    words = ", ".join(f"{value} {word}" for word, value in field.choices.items())
    missing = [f"{value} {word}" for word, value in field.choices.items()
               if str(value) not in field.meaning]
    return f"{field.meaning}: {words}" if missing else field.meaning


def _field_table(fields: Sequence[Field], request: bool) -> str:
    header = ["atom", "type", "name", "meaning", "unit"]
    rows = [[str(field.atom), _type(field), field.name, _meaning(field), _unit(field)]
            for field in fields]
    if request:
        header += ["sent by a station", "when absent"]
        rows = [[*row, _limits(field), field.absent] for row, field in zip(rows, fields)]
    return _table(header, rows)


def _served(label: str, service: Service | None) -> list[str]:
    if service is None:
        return [f"- **{label}**: refused with code 1."]
    acknowledged = " Acknowledged." if service.acknowledged else ""
    lines = [f"- **{label}**, served by the {service.by}: {service.how}.{acknowledged}"]
    lines += [f"  - refused with code {refusal.code}{_holds(label, refusal.code, refusal.held)}: "
              f"{refusal.when}" for refusal in service.refusals]
    return lines


def _holds(label: str, code: int, held: bool) -> str:
    return ", and held" if label == "PC line" and code == 1 and held else ""


def _typed(operation: Operation, row: Request) -> str:
    words = [operation.name]
    for name in (*operation.takes, *operation.may_take):
        field = row.field(name)
        word = name.upper() if field.positional else f"--{name} {name.upper()}"
        if field.flags:
            word = "|".join(f"--{choice}" for choice in reversed(list(field.choices)))
        words.append(f"[{word}]" if name in operation.may_take else word)
    return f"`amt-station {' '.join(words)}`"


def _request(row: Request) -> str:
    answers = "two answers" if row.answers == 2 else "answer"
    title = f"### {row.id} (0x{row.id:02X}) {row.name}"
    head = (f"{row.summary[0].upper()}{row.summary[1:]}. Catalogue name `{row.catalogue_name}`, "
            f"{answers} {row.answer_id} (0x{row.answer_id:02X}).")
    parts = [title, head, "\n".join(_served("PC line", row.pc) + _served("app channel", row.app))]
    if row.fields:
        parts += ["Request atoms:", _field_table(row.fields, True)]
    else:
        parts.append("The request has no atoms.")
    parts += ["Answer atoms:", _field_table(row.answer_fields, False)]
    parts += list(row.notes)
    if row.at_twin:
        parts.append(f"As AT text on the PC line: `{row.at_twin}`.")
    if row.operations:
        parts.append("\n".join(f"- {_typed(operation, row)}: {operation.summary}"
                               for operation in row.operations))
    return "\n\n".join(parts)


def _requests() -> str:
    parts = []
    for title, rows in FAMILIES:
        if rows is tunnel.REQUESTS:
            continue
        parts.append(f"**{title}**: " + ", ".join(f"[{row.id}]({_anchor(row)})" for row in rows))
    sections = [_request(row) for _, rows in FAMILIES if rows is not tunnel.REQUESTS
                for row in rows]
    return "\n\n".join(["  \n".join(parts), *sections])


def _anchor(row: Request) -> str:
    return f"#{row.id}-0x{row.id:02x}-{row.name}"


def _tunnel() -> str:
    service = tunnel.REQUESTS[0].app
    assert service is not None
    lines = [f"All of these are served so on the app channel: {service.how}."]
    lines += [f"- refused with code {refusal.code}: {refusal.when}"
              for refusal in service.refusals]
    rows = [(str(row.id), row.catalogue_name, str(row.answer_id), _answer_text(row),
             " ".join(row.notes)) for row in tunnel.REQUESTS]
    return ("\n".join([lines[0], "", *lines[1:]]) + "\n\nTheir atoms are the modem's business. "
            "On the PC line they are passed on to the modem as they are.\n\n"
            + _table(("request", "name", "answer", "answer atoms", "notes"), rows))


def _answer_text(row: Request) -> str:
    return ", ".join(f"{field.atom} {field.type.label} {field.name}"
                     for field in row.answer_fields)


def _at_commands() -> str:
    rows = [(f"`{row.text}`", row.does, f"`{row.reply}`, OK" if row.reply else "OK", row.errors,
             f"when {row.why}" if row.why else "") for row in AT_COMMANDS]
    return _table(("text", "does", "reply", "errors", "refused with packet 0, and held"), rows)


def _watched() -> str:
    return _table(("text", "what the handset does"), ((f"`{row.text}`", row.does)
                                                      for row in WATCHED))


def _catalogue() -> str:
    ids = sorted({*command_names(), *(row.id for row in REQUESTS)})
    rows = [(f"{command} (0x{command:02X})", command_names().get(command, "(undefined)"),
             _role(command)) for command in ids]
    return _table(("id", "name", "what it is"), rows)


def _role(command: int) -> str:
    row = requests_by_id().get(command)
    if row is not None:
        if row in tunnel.REQUESTS:
            return "request, [tunnelled](#the-tunnel)"
        return f"request [{row.name}]({_anchor(row)})"
    answered = [request for request in REQUESTS if request.answer_id == command]
    if answered:
        return "answer to " + ", ".join(str(request.id) for request in answered)
    if command - 1 in requests_by_id():
        return f"error packet for {command - 1} only"
    return "not served: passed on to the modem on the PC line, refused on the app channel"


_SECTIONS: Mapping[str, Callable[[], str]] = {
    "packet-example": _packet_example,
    "envelope-example": _envelope_example,
    "checksum-example": _checksum_example,
    "acknowledgement": lambda: _code(_hex(ACKNOWLEDGEMENT)),
    "exchange-example": _exchange_example,
    "refused-text-example": _refused_text_example,
    "requests": _requests,
    "tunnel": _tunnel,
    "at-commands": _at_commands,
    "watched": _watched,
    "catalogue": _catalogue,
}


def protocol_document() -> str:
    """The whole document."""
    prose = _PROSE.read_text(encoding="utf-8")
    return _MARK.sub(lambda mark: _SECTIONS[mark[1]](), prose)


if __name__ == "__main__":
    print(protocol_document(), end="")
