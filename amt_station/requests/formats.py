"""Formats that values have in the world outside the handset: what a factory must never write."""

from __future__ import annotations

import re
from dataclasses import dataclass
from typing import Callable, Mapping

_IMEI = re.compile(r"[0-9]{15}")
_MAC = re.compile(r"[0-9A-Fa-f]{2}(?::[0-9A-Fa-f]{2}){5}")
_GRAPHIC = re.compile(r"[\x21-\x7e]+")


@dataclass(frozen=True)
class Format:
    """A format: what it is called for people, and what is wrong with a text that has it not."""

    name: str
    meaning: str
    problem: Callable[[str], str]


def check_digit(digits: str) -> int:
    """The digit that makes ``digits`` and itself pass the check of an IMEI."""
    total = 0
    for place, digit in enumerate(reversed(digits)):
        number = int(digit) * (2 if place % 2 == 0 else 1)
        total += number - 9 if number > 9 else number
    return -total % 10


def _imei_problem(text: str) -> str:
    if not _IMEI.fullmatch(text):
        return "an IMEI has 15 digits"
    wanted = check_digit(text[:14])
    if text == "0" * 15:
        return "an IMEI is not all zeros"
    return "" if int(text[14]) == wanted else f"the check digit is {text[14]} instead of {wanted}"


def _mac_problem(text: str) -> str:
    if not _MAC.fullmatch(text):
        return "an address is six pairs of hexadecimal digits with colons between"
    octets = bytes.fromhex(text.replace(":", ""))
    if not any(octets):
        return "an address is not all zeros"
    if octets == b"\xff" * 6:
        return "the broadcast address is nobody's"
    return "a multicast address is nobody's" if octets[0] & 1 else ""


def _serial_problem(text: str) -> str:
    return "" if _GRAPHIC.fullmatch(text) else "a serial number has printable ASCII only, no blanks"


def _description_problem(text: str) -> str:
    # It travels inside an AT command whose parts are told apart by commas and quotes.
    if not all(" " <= character <= "~" for character in text):
        return "a description has printable ASCII only"
    return ""


FORMATS: Mapping[str, Format] = {row.name: row for row in (
    Format("imei", "15 digits, the last one a check digit", _imei_problem),
    Format("mac", "six pairs of hexadecimal digits, neither zero nor broadcast nor multicast",
           _mac_problem),
    Format("serial", "printable ASCII without blanks", _serial_problem),
    Format("description", "printable ASCII", _description_problem),
)}


def problem(name: str, text: str) -> str:
    """What is wrong with ``text`` in the format ``name``; empty when nothing is."""
    return FORMATS[name].problem(text)
