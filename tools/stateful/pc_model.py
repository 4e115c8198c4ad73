"""What the PC's line and the modem's must carry: packets, AT texts, captured identity writes."""

from __future__ import annotations

from dataclasses import dataclass, field
from typing import Callable, Mapping

from amt_station import wire
from tools.stateful import at_model, device_model
from tools.stateful import phone as handset
from tools.stateful.phone import (NONE, NOT_HANDLED, REFUSED, Phone, Reply, answer, content,
                                  integer, number, text)

NO_PACKET = 255
HEAD, TAIL = 12, 4
PROBE, PROBE_COMMAND = b"AT\r", b"AT;^DLKS=1\r"
MODE_PACKETS, MODE_TEXT = 1, 4
FIXED_VERSION = b"\rAndroid4.2,2013-01-21" + b"\n" * 42
# Ids whose handlers acknowledge by themselves, or never.
UNACKNOWLEDGED = (45, 91)
# The kinds of an identity write: what writes it as text, and its file on either channel.
IMEI, SERIAL = 1, 2
PREFIXES = {IMEI: "AT^DCGSNW=", SERIAL: "AT^DMSN="}
CHANNEL_PREFIX = "AT^DMPCHN="
FILES = {IMEI: ("/amt/imei.txt", "/amt/imei-2.txt"), SERIAL: ("/amt/sn.txt", "/amt/sn-2.txt")}


@dataclass
class Expected:
    """What the other ends of the lines must see, in order."""

    pc: bytes = b""
    modem: bytes = b""


def version(phone: Phone, packet: wire.Packet) -> Reply:
    """The modem's own versions are the modem's business."""
    module = number(packet, 19)
    if module in (17, 18):
        return Reply(NOT_HANDLED)
    if module not in (1, 16, 19, 20, 32, 64):
        return REFUSED
    shown = phone.software().encode() if module == 16 else FIXED_VERSION
    return answer(46, integer(19, module), wire.Atom.raw(18, shown))


def station_result(phone: Phone, packet: wire.Packet) -> Reply:
    """Mirrored, and then the modem's business."""
    phone.store_result(handset.AMT_RESULTS, number(packet, 39), number(packet, 36))
    return Reply(NOT_HANDLED)


def pcba(phone: Phone, packet: wire.Packet) -> Reply:
    """Read or write the board's number."""
    operation = (content(packet, 190) or b"\0")[0]
    if operation == 1:
        line = phone.line(handset.PCBA_FILE, 98)
        return REFUSED if line is None else answer(194, wire.Atom.string(191, line[:29]))
    serial = text(packet, 191, 29)
    if operation != 2 or not serial:
        return REFUSED
    phone.save(handset.PCBA_FILE, serial)
    return answer(194)


def adb_serial(phone: Phone, packet: wire.Packet) -> Reply:
    """Read or write the cable's number."""
    operation, length = number(packet, 160), number(packet, 162)
    if operation == 0:
        word = phone.word((handset.ADB_FILE,))
        return REFUSED if word is None else answer(192, wire.Atom.string(161, word))
    if operation != 1 or not 1 <= length <= 99:
        return REFUSED
    phone.save(handset.ADB_FILE, text(packet, 161, length + 1)[:length])
    return answer(192)


def permit_nothing(phone: Phone, _: wire.Packet) -> Reply:
    """Starts by cable are not permitted any more."""
    phone.permission(0)
    return answer(220)


def battery_adc(phone: Phone, _: wire.Packet) -> Reply:
    """Measured by the driver."""
    phone.calls.append("fopen(sarvo_battery) = 0 [3700]")
    return answer(225, integer(151, 3700))


def calibrate(phone: Phone, packet: wire.Packet) -> Reply:
    """Four numbers, kept in a file."""
    shown = " ".join(f"[{number(packet, atom)}]" for atom in (146, 147, 148, 149))
    phone.save(handset.VBATT_FILE, f"amt_set_vbatt{shown}")
    return answer(227)


def boot_download(phone: Phone, _: wire.Packet) -> Reply:
    """The library's verdict, whatever it is."""
    return answer(245, integer(204, phone.call("amt_check_system_sanity")))


def emmc(phone: Phone, _: wire.Packet) -> Reply:
    """The memory's own words."""
    told = phone.emmc()
    return REFUSED if told is None else answer(247, wire.Atom.string(205, told))


PC: Mapping[int, Callable[[Phone, wire.Packet], Reply]] = {
    **device_model.BOTH, 45: version, 91: station_result, 191: adb_serial, 193: pcba,
    219: permit_nothing, 224: battery_adc, 226: calibrate, 244: boot_download, 246: emmc,
}


def unwrapped(request: bytes) -> wire.Packet | None:
    """The packet of a request that is one: whatever follows its end is not looked at."""
    if len(request) <= HEAD + TAIL or not request.startswith(wire.MAGIC):
        return None
    bare = request[HEAD:-TAIL]
    return wire.Packet.decode(bare[:int.from_bytes(bare[:2], "little")])


def is_probe(request: bytes) -> bool:
    """Whether a station asks whether anybody is there, once or again."""
    def at(place: int) -> bool:
        return request[place:place + len(PROBE)].upper() == PROBE

    return at(0) and (len(request) <= len(PROBE) + 2 or at(len(PROBE)) or at(len(PROBE) + 1))


@dataclass
class PcModel:
    """The daemon of the PC's path between two requests."""

    phone: Phone = field(default_factory=Phone)
    held: bytes = b""
    mode: int = MODE_PACKETS
    pending: int = 0
    captured: str = ""
    channel: int = 0

    def restart(self) -> None:
        """A daemon that is started anew."""
        self.phone.restart()
        self.held, self.mode, self.pending, self.captured, self.channel = b"", 1, 0, "", 0

    def hear_pc(self, data: bytes) -> Expected:
        """The station has said something: what is held is a part of it."""
        request = self.held + data
        if is_probe(request):
            request = PROBE_COMMAND
            if self.mode != MODE_TEXT:
                self.mode = MODE_TEXT
                self.phone.call("amt_usb_charger_enable", 1)
        expected = Expected()
        packet = unwrapped(request)
        command = NO_PACKET if packet is None else packet.command
        status = self._dispatch(packet, expected)
        self._capture(command, packet, request.decode("latin-1"))
        if status == NOT_HANDLED:
            status = self._serve_text(request, expected)
        self.held = b"" if status == NONE else request
        if status != NONE:
            refusal = wire.Packet((command + 1) % 256, (integer(wire.RESULT_ATOM, 1),))
            expected.pc += wire.encode_envelope(refusal)
        return expected

    def _dispatch(self, packet: wire.Packet | None, expected: Expected) -> int:
        if packet is None:
            return NOT_HANDLED
        self.mode = MODE_PACKETS
        handler = PC.get(packet.command)
        if handler is None:
            return NOT_HANDLED
        if packet.command not in UNACKNOWLEDGED:
            expected.pc += wire.ACKNOWLEDGEMENT
        reply = handler(self.phone, packet)
        if packet.command == 45 and reply.status == NONE:
            expected.pc += wire.ACKNOWLEDGEMENT
        expected.pc += b"".join(map(wire.encode_envelope, reply.packets))
        return reply.status

    def _capture(self, command: int, packet: wire.Packet | None, request: str) -> None:
        if command not in (0, 5, 87, 232, NO_PACKET):
            return
        for kind, prefix in PREFIXES.items():
            if prefix in request:
                self.pending, self.captured = kind, at_model.parameter(request, prefix)
                return
        if CHANNEL_PREFIX in request:
            given = at_model.parameter(request, CHANNEL_PREFIX)
            self.channel = handset.number_in(given) % 256
        elif packet is not None and command == 87:
            self.pending, self.captured = SERIAL, text(packet, 38, 21)[:20]
        elif packet is not None and command == 232:
            self.channel = number(packet, 159) % 256
        elif packet is not None and command == 5:
            self.pending, self.captured = IMEI, text(packet, 21, 21)[:20]

    def _serve_text(self, request: bytes, expected: Expected) -> int:
        shown = request.decode("latin-1")
        found = at_model.find(shown)
        if found is None:
            expected.modem += request
            return NONE
        handler, behind = found
        reply = handler(self.phone, behind, shown)
        if reply is None:
            return handset.FAILED
        expected.pc += reply.encode("latin-1")
        return NONE

    def hear_modem(self, data: bytes) -> Expected:
        """The modem has said something: it may be what an identity write waits for."""
        if self.pending and self._is_accepted(data):
            if self.captured:
                self.phone.save(FILES[self.pending][self.channel == 1], self.captured)
            self.pending = 0
        return Expected(pc=data)

    @staticmethod
    def _is_accepted(data: bytes) -> bool:
        packet = unwrapped(data)
        return b"\r\nOK\r\n" in data or (packet is not None and packet.command in (6, 88)
                                         and number(packet, wire.RESULT_ATOM) == 0)
