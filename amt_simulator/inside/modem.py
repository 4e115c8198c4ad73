"""The simulated modem: AT commands and packets in, answers out. What it says is in the table."""

from __future__ import annotations

import re
import time
from typing import Callable

from amt_simulator.inside import modem_table as table

MAGIC_START = b"\xaa"
STALE_SECONDS = 1.0
CME_NO_SIM = "+CME ERROR: 10"
CME_PARAMETER = "+CME ERROR: 50"
# Of a station that has written none: its verdict and its description.
NO_RESULT = ("0", "")

# A semicolon ends a command of the line only when another command follows it.
COMMAND_END = re.compile(r";(?=[+^&]|$)")


class Refused(Exception):
    """The modem does not do it; the text is its final result."""


class Modem:
    """The memory that all ttys of the modem share, and what each command does to it."""

    def __init__(self, answers: dict[str, str] | None = None) -> None:
        self.answers = {self._plain(key): text for key, text in (answers or {}).items()}
        self._memory = dict(table.MEMORY)
        self._identities = {key: dict(value) for key, value in table.IDENTITIES.items()}
        self._results: dict[str, tuple[str, str]] = {}

    def set_answer(self, line: str, answer: str | None) -> None:
        """Answer the whole command line LINE with ANSWER from now on; None: as the table says."""
        if answer is None:
            self.answers.pop(self._plain(line), None)
        else:
            self.answers[self._plain(line)] = answer

    def answer_line(self, line: str) -> bytes:
        """Answer one command line without its line end; text without AT gets no answer."""
        line = line.strip()
        scripted = self.answers.get(self._plain(line))
        if scripted is not None:
            return scripted.encode("utf-8", "surrogateescape")
        start = line.upper().find("AT")
        if start < 0:
            return b""
        said = []
        try:
            for command in COMMAND_END.split(line[start + 2:]):
                said.append(self._run(command.strip()))
            said.append("OK")
        except Refused as refusal:
            said.append(str(refusal))
        return "".join(f"\r\n{text}\r\n" for text in said if text).encode(
            "utf-8", "surrogateescape")

    def answer_block(self, command: int, content: str) -> tuple[int, list[table.Field]]:
        """Answer a tunnelled request with a response id and the fields after its result."""
        if command in table.WRITES:
            self._identity()[table.WRITES[command][1]] = content
        response = table.RESPONSE_IDS.get(command, command + 1 & 0xFF)
        fields = []
        for field in table.RESPONSES.get(response, ()):
            if isinstance(field, table.Blob) and field.value == b"{imei}":
                imei = self._identity()["imei"].encode()[:15].ljust(15, b"0")
                field = table.Blob(field.atom, imei, field.length_size)
            fields.append(field)
        return response, fields

    def answer_packet(self, command: int, values: dict[int, "int | str"]) -> tuple[
            int, list[table.Field]]:
        """Answer a request packet, whose atoms have these VALUES, likewise."""
        if command == table.CHANNEL_SWITCH and table.CHANNEL_ATOM in values:
            self._memory["channel"] = str(values[table.CHANNEL_ATOM])
        row = table.PACKETS.get(command)
        if row is None:
            atom = table.WRITES[command][0] if command in table.WRITES else 0
            if command in table.WRITES and atom not in values:
                return command + 1, []
            return self.answer_block(command, str(values.get(atom, "")))
        if isinstance(row, str):
            special: Callable[[int, dict[int, "int | str"]], list[table.Field]] = getattr(
                self, f"_{row}")
            return command + 1, special(command, values)
        return command + 1, [field._replace(value=self._filled(field.value))
                             if isinstance(field, table.Text) else field for field in row]

    def _filled(self, text: str) -> str:
        return text.format_map({**self._memory, **self._identity()})

    @staticmethod
    def _packet_version(_command: int, values: dict[int, "int | str"]) -> list[table.Field]:
        module = values.get(19, 0)
        version = table.MODULE_VERSIONS.get(str(module), "")
        return [table.Int(19, int(module)), table.Blob(18, version.encode())]

    def _packet_result(self, command: int, values: dict[int, "int | str"]) -> list[table.Field]:
        station = values.get(39, 0)
        verdict, description = self._results.get(str(station), NO_RESULT)
        fields: list[table.Field] = [table.Int(39, int(station)), table.Int(36, int(verdict))]
        return fields + ([table.Text(37, description)] if command == 89 else [])

    def _packet_capability(self, _command: int,
                           _values: dict[int, "int | str"]) -> list[table.Field]:
        return [table.Int(202, int(self._memory["capability"].rpartition(",")[2]))]

    def _packet_serial_number(self, _command: int,
                              _values: dict[int, "int | str"]) -> list[table.Field]:
        return [table.Blob(163, self._identity()["sn"].encode())]

    @staticmethod
    def _plain(line: str) -> str:
        return line.strip().upper()

    def _identity(self) -> dict[str, str]:
        return self._identities.setdefault(self._memory["channel"], dict(table.DEFAULT_IDENTITY))

    def _run(self, command: str) -> str:
        name, equals, parameter = command.partition("=")
        wanted = (name + equals).upper()
        if parameter == "?" and any(row.command == wanted for row in table.COMMANDS):
            return ""
        for row in table.COMMANDS:
            if row.command != (wanted if row.command.endswith("=") else command.upper()):
                continue
            if row.special:
                special: Callable[[str], str] = getattr(self, f"_{row.special}")
                return special(parameter)
            if row.store:
                self._store(row.store, parameter)
            return self._filled(row.info)
        raise Refused("ERROR")

    def _store(self, name: str, value: str) -> None:
        value = value.strip().strip('"')
        if not value:
            raise Refused(CME_PARAMETER)
        holder = self._identity() if name in self._identity() else self._memory
        holder[name] = value

    def _sim_type(self, _parameter: str) -> str:
        if self._memory["sim"] == "0":
            raise Refused(CME_NO_SIM)
        return f"^DTOC: {self._memory['sim']}"

    def _module_version(self, parameter: str) -> str:
        version = table.MODULE_VERSIONS.get(parameter.strip())
        if version is None:
            raise Refused(CME_PARAMETER)
        return f"^DCMR: {parameter.strip()},0D{version.encode().hex().upper()}0A0A"

    def _write_result(self, parameter: str) -> str:
        station, _, rest = parameter.partition(",")
        result, _, description = rest.partition(",")
        if not (station.strip().lstrip("-").isdigit() and result.strip().lstrip("-").isdigit()):
            raise Refused(CME_PARAMETER)
        self._results[station.strip()] = (result.strip(), description)
        return ""

    def _read_result(self, parameter: str) -> str:
        station = parameter.partition(",")[2].strip()
        if not station:
            raise Refused(CME_PARAMETER)
        result, description = self._results.get(station, NO_RESULT)
        return f"^DATOMR: {station},{result}" + (f",{description}" if description else "")

    def _tunnel(self, parameter: str) -> str:
        try:
            block = bytes.fromhex(parameter.strip())
        except ValueError:
            raise Refused(CME_PARAMETER) from None
        if not block:
            raise Refused(CME_PARAMETER)
        response, fields = self.answer_block(block[0], block[1:].decode("latin-1"))
        return f"^DTTEST: {encode_block(response, fields).hex().upper()}"


def encode_block(response: int, fields: list[table.Field]) -> bytes:
    """The answer to a tunnelled request: id, result 0, fields; numbers have their high byte first,
    lengths their low byte."""
    parts = [bytes((response,)), (0).to_bytes(4, "big")]
    for field in fields:
        if isinstance(field, table.Int):
            parts.append(field.value.to_bytes(4, "big", signed=True))
        elif isinstance(field, table.Flag):
            parts.append(bytes((field.value,)))
        elif isinstance(field, table.Blob):
            parts.append(len(field.value).to_bytes(field.length_size, "little")
                         if field.length_size else b"")
            parts.append(field.value)
    return b"".join(parts)


class Conversation:
    """One tty of the modem: finds command lines and packets in what arrives."""

    def __init__(self, modem: Modem, refuses: bool = False) -> None:
        self._modem = modem
        self._refuses = refuses
        self._text = ""
        self._decoder: object = None
        self._heard = 0.0

    def feed(self, data: bytes) -> bytes:
        """Take what the handset says; returns what the modem answers."""
        if self._decoder is None and MAGIC_START not in data:
            return self._feed_text(data.decode("latin-1"))
        return self._feed_wire(data)

    def _feed_text(self, text: str) -> bytes:
        self._text += text
        *lines, self._text = self._text.split("\r")
        self._text = self._text[-8192:]
        if self._refuses:
            return table.REFUSAL.encode() * sum("AT" in line.upper() for line in lines)
        return b"".join(self._modem.answer_line(line) for line in lines)

    def _feed_wire(self, data: bytes) -> bytes:
        # Only a handset that speaks packets pays for their codec.
        from amt_station import wire
        if self._decoder is None:
            self._decoder = wire.EnvelopeDecoder()
        assert isinstance(self._decoder, wire.EnvelopeDecoder)
        items: list[wire.Item] = []
        if self._decoder.pending and time.monotonic() - self._heard > STALE_SECONDS:
            items += self._decoder.give_up()
        self._heard = time.monotonic()
        items += self._decoder.feed(data)
        said = b""
        for item in items:
            if isinstance(item, wire.Frame):
                said += self._answer_frame(item.packet)
            elif isinstance(item, wire.Text):
                said += self._feed_text(item.raw.decode("latin-1"))
        return said

    def _answer_frame(self, packet: object) -> bytes:
        from amt_station import wire
        assert isinstance(packet, wire.Packet)
        if self._refuses:
            code = wire.Atom.integer(wire.RESULT_ATOM, table.REFUSAL_CODE)
            return wire.encode_envelope(wire.Packet(packet.command + 1 & 0xFF, (code,)))
        values: dict[int, int | str] = {
            atom.id: atom.value if isinstance(atom.value, int) else atom.content.decode("latin-1")
            for atom in packet.atoms}
        response, fields = self._modem.answer_packet(packet.command, values)
        atoms = [wire.Atom.integer(wire.RESULT_ATOM, 0)]
        for field in fields:
            if isinstance(field, table.Int):
                atoms.append(wire.Atom.integer(field.atom, field.value))
            elif isinstance(field, table.Flag):
                atoms.append(wire.Atom.boolean(field.atom, field.value))
            elif isinstance(field, table.Text):
                atoms.append(wire.Atom.string(field.atom, field.value))
            else:
                atoms.append(wire.Atom.raw(field.atom, field.value))
        return wire.encode_envelope(wire.Packet(response, tuple(atoms)))
