"""What a handset holds besides its lines, as the model keeps it: files, scripted calls, results."""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from typing import Iterable

from amt_station import wire

BT_FILES = ("/amt/BT/BT_Address.txt", "/mnt/opl/nvm/BT_Address.txt")
WIFI_FILE = "/amt/WIFI/WIFI_nvram.txt"
WIFI_DEBUG = "/data/local/wifi/wifi_dbg_file.txt"
PCBA_FILE = "/amt/sn-2.txt"
ADB_FILE = "/amt/usb_serial"
PERMISSION_FILE = "/amt/power_usb_amt.txt"
AMT_RESULTS, PRODUCT_RESULTS = "/amt/amt_result.txt", "/amt/product.txt"
EMMC_FILE = "/sys/devinfo/emmc_info"
VBATT_FILE = "/amt/vbatt"
LCD_FILE = "/sys/class/leds/lcd-backlight/brightness"
BUTTON_FILE = "/sys/class/leds/button-backlight/brightness"
VIBRATOR_FILE = "/sys/class/timed_output/vibrator/enable"
VOLTAGE_FILE = "/sys/class/power_supply/battery/voltage_now"
TEMPERATURE_FILE = "/sys/class/power_supply/battery/temp"

# The statuses that decide what a request is answered with.
NONE, FAILED, NOT_HANDLED = 0, -100, -104

RESULT_ITEMS = {AMT_RESULTS: 20, PRODUCT_RESULTS: 36}


def signed(value: int) -> int:
    """The low 32 bits as the handset's C code sees them."""
    return (value + (1 << 31)) % (1 << 32) - (1 << 31)


def number_in(text: str) -> int:
    """The number that a text begins with, 0 when there is none."""
    match = re.match(r"[ \t\n\v\f\r]*([+-]?\d+)", text)
    return signed(int(match[1])) if match else 0


@dataclass(frozen=True)
class Reply:
    """How a handler has ended, and the packets that it has sent."""

    status: int = NONE
    packets: tuple[wire.Packet, ...] = ()


REFUSED = Reply(FAILED)


def integer(atom: int, value: int) -> wire.Atom:
    """An integer atom of 32 bits."""
    return wire.Atom.integer(atom, signed(value))


def answer(command: int, *atoms: wire.Atom, result: int = 0) -> Reply:
    """A handler that has sent one packet, the result in its last atom."""
    return Reply(NONE, (wire.Packet(command, (*atoms, integer(wire.RESULT_ATOM, result))),))


def content(packet: wire.Packet, atom: int) -> bytes | None:
    """The bytes of the first atom with this id."""
    found = packet.find(atom)
    return found.content if found is not None else None


def number(packet: wire.Packet, atom: int, absent: int = 0) -> int:
    """An integer or flag, at most its first four bytes."""
    data = content(packet, atom)
    return absent if data is None else signed(int.from_bytes(data[:4], "little"))


def text(packet: wire.Packet, atom: int, most: int) -> str:
    """The text of an atom up to its first zero byte, cut at MOST characters."""
    data = content(packet, atom) or b""
    return data[:most].split(b"\0")[0].decode("latin-1")


@dataclass
class Phone:
    """One handset. Files that are not listed are not there."""

    files: dict[str, str] = field(default_factory=dict)
    scripts: dict[str, list[str]] = field(default_factory=dict)
    calls: list[str] = field(default_factory=list)
    is_radio_on: bool = False
    rx_channel: int = 0
    at_rx_channel: int = 0
    first_lcd_level: int = -1

    def restart(self) -> None:
        """What a daemon that is started anew has forgotten."""
        self.is_radio_on = False
        self.rx_channel = self.at_rx_channel = 0
        self.first_lcd_level = -1

    # stand-ins

    def take(self, function: str) -> tuple[int, list[int]]:
        """The next scripted answer of a function: its status and what it gives back."""
        script = self.scripts.get(function) or ["0"]
        line = script[0]
        if len(script) > 1:
            del script[0]
        status, *outs = (int(word) for word in line.split())
        return status, outs

    def call(self, function: str, *arguments: object) -> int:
        """A call without anything to give back."""
        status, _ = self.take(function)
        self.calls.append(f"{function}({', '.join(map(str, arguments))}) = {status}")
        return status

    def stop_reception(self, channel: int) -> tuple[int, int]:
        """The end of a reception test: its status and how many packets were counted."""
        status, outs = self.take("ldt_RxTest")
        count = outs[0] if outs else 1000
        self.calls.append(f"ldt_RxTest(0, {channel}, 0, out) = {status} [{count}]")
        return status, count

    def read_satellite(self, index: int) -> tuple[int, int, int]:
        """The status, satellite and signal of a satellite's index."""
        status, outs = self.take("ldt_gpsCtrl")
        svid, cnr = outs if len(outs) == 2 else (signed(index + 1), 41)
        self.calls.append(f"ldt_gpsCtrl(2, {index}, out, out) = {status} [{svid} {cnr}]")
        return status, svid, cnr

    # files

    def flush(self) -> None:
        """What follows every write of a factory file."""
        self.calls += ["sync() = 0"] * 2

    def save(self, path: str, value: str) -> None:
        """Write a factory file."""
        self.files[path] = value
        self.flush()

    def line(self, path: str, most: int) -> str | None:
        """The first line of a file, its end kept; None when there is nothing to read."""
        found = self.files.get(path, "")
        return found.split("\n")[0][:most] + ("\n" if "\n" in found[:most] else "") or None

    def word(self, paths: Iterable[str]) -> str | None:
        """The first word of the first of the files that is there."""
        for path in paths:
            if path in self.files:
                words = self.files[path].split()
                return words[0] if words else None
        return None

    def store_result(self, path: str, index: int, verdict: int) -> bool:
        """Put a verdict into a result file; an index beyond its end is refused."""
        items = RESULT_ITEMS[path]
        if index >= items:
            return False
        found = self.files.setdefault(path, "0\n" * items)
        # An index below the first leaves the place where it is: at the beginning.
        place = max(index, 0) * 2
        digit = str(verdict) if verdict in (1, 2) else "0"
        self.files[path] = found[:place] + digit + found[place + 1:]
        return True

    # texts that more than one request asks for

    def emmc(self) -> str | None:
        """The memory's own words, without their last character."""
        line = self.line(EMMC_FILE, 48)
        return line[:-1] if line is not None else None

    def software(self) -> str:
        """The software version of a handset of another brand, with the usual properties."""
        emmc = self.emmc()
        told = "" if emmc is None else f"({emmc})"
        return f"(KEL-1_4.2.1)(F01)(KEL board rev C\n){told}(Freenet)"[:254]

    def wifi_address(self) -> str | None:
        """The stored Wi-Fi address, without its last character."""
        line = self.line(WIFI_FILE, 98)
        return line[:-1] if line is not None else None

    def write_wifi_address(self, address: str) -> bool:
        """Store a Wi-Fi address, unless it is empty."""
        if not address:
            return False
        self.save(WIFI_FILE, f"{address}\n")
        return True

    def permission(self, operation: int) -> int | None:
        """Write (0, 1) or read (2) the permission to start by cable; None for anything else."""
        if operation in (0, 1):
            self.save(PERMISSION_FILE, str(operation))
            return operation
        if operation != 2:
            return None
        line = self.line(PERMISSION_FILE, 98)
        return 1 if line is None else number_in(line)
