"""What the app's line and the multiplexer's must carry: local requests and exchanges."""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from typing import Callable, Mapping

from amt_station import wire
from tools.stateful import modem_block
from tools.stateful import phone as handset
from tools.stateful.device_model import APP
from tools.stateful.pc_model import FIXED_VERSION
from tools.stateful.phone import NONE, REFUSED, Phone, Reply, answer, integer, number, text

FINAL_OK = "\r\nOK\r\n"
FINAL_ERRORS = ("\r\n+CME ERROR", "\r\n+CMS ERROR", "\r\nERROR\r\n")
TUNNEL_LINE, STATION_LINE = "\r\n^DTTEST: ", "\r\n^DATOMR: "
# A station's number, its verdict, what it says; any of them may be missing.
RESULT = re.compile(r"(\d{0,2}),?(\d?)(?:,(.*))?", re.DOTALL)
TUNNELLED = (
    1, 3, 5, 7, *range(11, 29, 2), 39, 41, 42, 43, 47, 49, 51, 53, 59, 61, 63, *range(67, 85, 2),
    87, 93, 95, 97, 101, 103, 105, *range(107, 137, 2), 149, 151, 153, 155, 201, 204, 205, 207,
    209, 211, 213, 221,
)
# The kinds whose answer is a value: command, prefix, most characters.
VALUES: Mapping[int, tuple[str, str, int]] = {
    65: ("AT^DMFD??\r", "\r\n^DMFD:", 14), 85: ("AT^DMSN\r", "\r\n^DMSN:", 38),
    99: ("AT^DTOC\r", "\r\n^DTOC:", 38), 197: ("AT^DMCC?\r", "\r\n^DMCC:", 38),
    234: ("AT^DMSN\r", "\r\n^DMSN:", 38),
}
ASKED_VERSIONS = (17, 18)
MODEM_FAILED = 10


def command_for(packet: wire.Packet) -> str | None:
    """What the modem is asked for a request; None: it is not asked."""
    command = packet.command
    if command in VALUES:
        return VALUES[command][0]
    if command in TUNNELLED:
        return f"AT^DTTEST={modem_block.from_request(packet).hex().upper()}\r"
    if command == 45 and number(packet, 19) in ASKED_VERSIONS:
        return f"AT^DCMR={number(packet, 19)}\r"
    if command == 89:
        return f"AT^DATOMR=1,{number(packet, 39)}\r"
    if command == 91:
        description = text(packet, 37, 126)
        shown = f"{number(packet, 39)},{number(packet, 36)}"
        return f"AT^DATOMW={shown},{description}\r" if description else f"AT^DATOMW={shown}\r"
    if command == 232:
        return f"AT^DMPCHN={number(packet, 159)}\r"[:12]
    return None


def value_in(heard: str, prefix: str, most: int) -> str | None:
    """The value between a prefix and the final OK; None when there is none, or it is too long."""
    place = heard.find(prefix)
    if place < 0:
        return None
    found = heard[place + len(prefix):].lstrip(" ")
    found = found[:found.find(FINAL_OK)] if FINAL_OK in found else ""
    while found.endswith("\r\n"):
        found = found[:-2]
    return found if len(found) <= most else None


def version_in(value: str) -> bytes | None:
    """The version behind the comma, in digits that end at a line feed's."""
    _, comma, behind = value.partition(",")
    if not comma:
        return None
    start = len(value) - len(behind.lstrip(" "))
    if value[start:start + 2] in ("0D", "0d"):
        start += 2
    end = next((value.find(mark) for mark in ("0a", "0A") if mark in value), len(value))
    digits = re.sub(r"[^0-9A-Fa-f]", "", value[start:end])
    return bytes.fromhex(digits[:len(digits) // 2 * 2])


def value_answer(packet: wire.Packet, value: str) -> Reply | None:
    """The reply that shows a value; None when it is not one that can be shown."""
    command = packet.command
    if command == 99:
        is_there = handset.number_in(value) in (1, 2)
        return Reply(NONE, (wire.Packet(100, (wire.Atom.boolean(41, int(is_there)),)),))
    if command == 197:
        fields = [part for part in value.split(",") if part]
        return answer(198, integer(202, handset.number_in(fields[3]))) if len(fields) > 3 else None
    if command == 234:
        return answer(235, wire.Atom.raw(163, value.encode("latin-1")))
    return answer(command + 1, wire.Atom.string({65: 27, 85: 38}[command], value))


@dataclass
class Exchange:
    """A request that waits for the modem."""

    packet: wire.Packet
    heard: str = ""
    sent: list[wire.Packet] = field(default_factory=list)

    def hear(self, phone: Phone, data: str) -> Reply | None:
        """What the modem says in one piece; the reply when the exchange has ended with it.

        What has been answered before its end is in `sent`.
        """
        self.heard += data
        command = self.packet.command
        if command == 232:
            return answer(233) if "OK" in self.heard else REFUSED
        if command in TUNNELLED:
            return self._hear_tunnel()
        is_failed = any(mark in self.heard for mark in FINAL_ERRORS)
        if not is_failed and FINAL_OK not in self.heard:
            return None
        if command == 45:
            return REFUSED if is_failed else self._version()
        reply = None if is_failed else self._reply(phone)
        return reply or answer(command + 1, result=MODEM_FAILED)

    def _hear_tunnel(self) -> Reply | None:
        place = self.heard.find(TUNNEL_LINE)
        end = self.heard.find("\r\n", place + len(TUNNEL_LINE)) if place >= 0 else -1
        is_good = True
        if end >= 0:
            start = place + len(TUNNEL_LINE)
            block = modem_block.from_hex(self.heard[start:], end - start)
            self.heard = self.heard[:place] + self.heard[end + 2:]
            found = modem_block.to_answer(block)
            is_good = found is not None
            self.sent += [found] if found is not None else []
        if "OK" in self.heard or not is_good:
            return Reply() if is_good else REFUSED
        return REFUSED if any(mark in self.heard for mark in FINAL_ERRORS) else None

    def _version(self) -> Reply:
        value = value_in(self.heard, "\r\n^DCMR:", 408)
        shown = version_in(value) if value else None
        if shown is None:
            return REFUSED
        return answer(46, integer(19, number(self.packet, 19)), wire.Atom.raw(18, shown))

    def _reply(self, phone: Phone) -> Reply | None:
        command = self.packet.command
        if command == 91:
            return answer(92)
        if command == 89:
            return self._station_result(phone)
        value = value_in(self.heard, *VALUES[command][1:])
        if value is None or command == 65 and value.startswith("\xff"):
            return None
        return value_answer(self.packet, value)

    def _station_result(self, phone: Phone) -> Reply:
        station, verdict, description = number(self.packet, 39), 0, ""
        _, _, behind = self.heard.partition(STATION_LINE)
        line, end, _ = behind.partition("\r\n")
        match = RESULT.match(line)
        if end and match:
            station = int(match[1]) if match[1] else station
            verdict = int(match[2] or "0")
            description = (match[3] or "")[:127]
        phone.store_result(handset.AMT_RESULTS, station, verdict)
        return answer(90, integer(39, station), integer(36, verdict),
                      wire.Atom.string(37, description))


@dataclass
class AppModel:
    """The daemon of the packet path between two requests, or in the middle of one."""

    phone: Phone = field(default_factory=Phone)
    exchange: Exchange | None = None
    unread: str = ""

    def hear_app(self, packet: wire.Packet) -> tuple[bytes, bytes]:
        """The app asks: what it gets, and what the modem gets."""
        command = command_for(packet)
        if command is None:
            return self._local(packet), b""
        if packet.command == 91:
            self.phone.store_result(handset.AMT_RESULTS, number(packet, 39), number(packet, 36))
        self.exchange = Exchange(packet)
        # What the modem has said before is what is read first.
        said, self.unread = self.unread, ""
        return self._advance(said) if said else b"", command.encode("latin-1")

    def _local(self, packet: wire.Packet) -> bytes:
        handler: Callable[[Phone, wire.Packet], Reply] | None = APP.get(packet.command)
        if packet.command == 45:
            return self._tell(packet, self._own_version(packet))
        return self._tell(packet, handler(self.phone, packet) if handler else REFUSED)

    @staticmethod
    def _own_version(packet: wire.Packet) -> Reply:
        module = number(packet, 19)
        if module not in (1, 16, 19, 20, 32, 64):
            return REFUSED
        return answer(46, integer(19, module), wire.Atom.raw(18, FIXED_VERSION))

    @staticmethod
    def _tell(packet: wire.Packet, reply: Reply) -> bytes:
        told = b"".join(sent.encode() for sent in reply.packets)
        if reply.status != NONE:
            told += wire.Packet((packet.command + 1) % 256,
                                (integer(wire.RESULT_ATOM, 1),)).encode()
        return told

    def hear_mux(self, data: str) -> bytes:
        """The modem says something in one piece: what the app gets."""
        if self.exchange is None:
            self.unread += data
            return b""
        return self._advance(data)

    def _advance(self, data: str) -> bytes:
        assert self.exchange is not None
        exchange = self.exchange
        reply = exchange.hear(self.phone, data)
        told = b"".join(sent.encode() for sent in exchange.sent)
        exchange.sent.clear()
        if reply is not None:
            told += self._tell(exchange.packet, reply)
            self.exchange = None
        return told
