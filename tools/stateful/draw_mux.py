"""What the modem says when it has been asked for the app: answers, whole or in part."""

from __future__ import annotations

import random
import struct

from tools.stateful import modem_block, steps
from tools.stateful.app_model import FINAL_OK, TUNNELLED, VALUES, Exchange
from tools.stateful.steps import Step

FINALS = ("\r\nERROR\r\n", "\r\n+CME ERROR: 100\r\n", "\r\n+CMS ERROR: 500\r\n", FINAL_OK)
NOTES = ("\r\nRING\r\n", "\r\n^DLKS: 1\r\n", "\r\n")
VALUE_TEXTS = ("1", "2", "3", "20130121", "B-42", "2,1,4,7", "1,2,3", "S0123456789",
               "x" * 14, "x" * 15, "x" * 38, "x" * 39, "")
VERSIONS = ("1,0D4142430A", "1,4142430A", "1", "2, 0d41 42", "", "1,4", "0a,41")
RESULTS = ("31,1,all good", "3,2", "7", "x", "12,1,", "5,,text", "123,1,one")


def draw_mux(source: random.Random, exchange: Exchange) -> Step:
    """The next words of the modem in an exchange."""
    pick = source.random()
    if pick < 0.15:
        return Step(steps.MUX, source.choice(NOTES))
    if pick < 0.3:
        return Step(steps.MUX, source.choice(FINALS))
    told = _answer(source, exchange)
    if told and pick < 0.4:
        return Step(steps.MUX, told)
    return Step(steps.MUX, told + FINAL_OK)


def _answer(source: random.Random, exchange: Exchange) -> str:
    command = exchange.packet.command
    if command in VALUES:
        return f"{VALUES[command][1]}{source.choice(('', ' '))}{source.choice(VALUE_TEXTS)}\r\n"
    if command == 45:
        return f"\r\n^DCMR: {source.choice(VERSIONS)}\r\n"
    if command == 89:
        return f"\r\n^DATOMR: {source.choice(RESULTS)}\r\n"
    if command in TUNNELLED:
        return f"\r\n^DTTEST: {_block(source).hex().upper()}\r\n"
    return ""


def _block(source: random.Random) -> bytes:
    """A block of a command that has fields, and of one that has none."""
    command = source.choice((*modem_block.FIELDS, 0x02, 0x44))
    block = bytes([command]) + struct.pack(">i", source.choice((0, 0, 1, -5, 300)))
    for _, kind in modem_block.FIELDS.get(command, ()):
        data = source.randbytes(source.randrange(12))
        if kind == modem_block.NUMBER:
            block += source.randbytes(4)
        elif kind == modem_block.FLAG:
            block += source.randbytes(1)
        elif kind in (modem_block.LONG, modem_block.SHORT):
            block += struct.pack("<I" if kind == modem_block.LONG else "<H", len(data)) + data
        else:
            assert isinstance(kind, int)
            block += source.randbytes(kind)
    return block
