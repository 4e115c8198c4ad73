"""The AT commands that the handset answers itself on the PC line, in the order it tests them."""

from __future__ import annotations

import re
from dataclasses import dataclass

OK = "OK"
CME = "+CME ERROR: 100 when that fails"
ERROR = "ERROR when that fails"


@dataclass(frozen=True)
class AtCommand:
    """One row: how it is typed, what it does, what comes back.

    ``refused`` matches texts that the handset refuses with an error packet and then keeps in its
    request buffer; ``why`` is the reason. ``reads`` matches texts whose OK comes with the line
    ``reply``; without that it would be a read that brought nothing.
    """

    text: str
    does: str
    reply: str = ""
    errors: str = ""
    refused: str = ""
    why: str = ""
    reads: str = ""


AT_COMMANDS: tuple[AtCommand, ...] = (
    AtCommand("AT^DBTADDR?", "read the Bluetooth address", '^DBTADDR: "ADDRESS"', CME,
              reads=r"AT\^DBTADDR\?"),
    AtCommand("AT^DBTADDR=?", "nothing", ""),
    AtCommand('AT^DBTADDR="ADDRESS"', "write the Bluetooth address (1 to 19 characters)", "", CME,
              r'AT\^DBTADDR=""', "the address is empty"),
    AtCommand("AT^DWIFIADDR?", "read the Wi-Fi address", '^DWIFIADDR: "ADDRESS"', CME,
              reads=r"AT\^DWIFIADDR\?"),
    AtCommand("AT^DWIFIADDR=?", "nothing", ""),
    AtCommand('AT^DWIFIADDR="ADDRESS"', "write the Wi-Fi address (1 to 19 characters)", "", CME),
    AtCommand("AT^DSVER", "software version text", "^DSVER: TEXT", CME,
              reads=r"AT\^DSVER"),
    AtCommand("AT^DAMTOFF", "answer, wait 2 s, power off", ""),
    AtCommand("AT^DDEVCONNCHK=N", "connectivity check: N 0 Wi-Fi, 1 GPS, 3 Bluetooth", "",
              ERROR + ", for any other N and without N"),
    AtCommand("AT^DBTCTRL=N", "Bluetooth: N 0 off, 1 on", "", ERROR + " and for any other N"),
    AtCommand("AT^DGPSCTRL=FLAG[,INDEX]",
              "GPS: FLAG 0 stop, answered with OK alone; 2 start and read the signal of "
              "satellite INDEX", "^DGPSCTRL: SATELLITE,CNR",
              ERROR + ", for any other FLAG, and for FLAG 2 without INDEX",
              r"AT\^DGPSCTRL=,*\r?$", "the flag is missing", r"AT\^DGPSCTRL=2,.+"),
    AtCommand("AT^DWLTSD=CTRL[,CHANNEL,RATE,POWER]",
              "Wi-Fi transmission: CTRL 0 stop (chip off too); 1 start (chip on too)", "",
              ERROR + ", for any other CTRL and a missing operand",
              r"AT\^DWLTSD=,*\r?$", "CTRL is missing"),
    AtCommand("AT^DWLTRD=CTRL[,CHANNEL,RATE]",
              "Wi-Fi reception: CTRL 0 stop (chip off too); 1 start (chip on too)", "",
              ERROR + ", for any other CTRL and a missing operand",
              r"AT\^DWLTRD=,*\r?$", "CTRL is missing"),
    AtCommand("AT^DPCBACTRL=1", "read the PCBA serial number", "^DPCBACTRL: NUMBER", ERROR,
              reads=r"AT\^DPCBACTRL=1"),
    AtCommand("AT^DPCBACTRL=2,NUMBER", "write the PCBA serial number (1 to 29 characters)", "",
              ERROR + "; any operation but 1 and 2 answers ERROR too",
              r"AT\^DPCBACTRL=(?:,*|2,*)\r?$", "the operation or the number is missing"),
    AtCommand("AT^DAMT1=N", "entry by USB insertion: N 0 deny and 1 allow, answered with OK "
              "alone; 2 query", "^DAMT1: PERMISSION", ERROR + " and for any other N",
              r"AT\^DAMT1=,*\r?$", "the operation is missing", r"AT\^DAMT1=2"),
    AtCommand("AT^DENTERIDLE", "put the handset into idle", "", ERROR),
    AtCommand("AT^DBOOTDLFIN", "read the boot-download-finished flag", "^DBOOTDLFIN: FLAG",
              ERROR, reads=r"AT\^DBOOTDLFIN"),
    AtCommand("AT^DEMMCINFO?", "read the eMMC information", '^DEMMCINFO: "TEXT"', CME,
              reads=r"AT\^DEMMCINFO\?"),
)


@dataclass(frozen=True)
class WatchedText:
    """Text that is passed on to the modem, but that the handset also looks at."""

    text: str
    does: str


WATCHED: tuple[WatchedText, ...] = (
    WatchedText("AT", "a bare probe, 3 to 5 bytes with its line end and in letters of any case, "
                "or AT twice in a row, is replaced by `AT;^DLKS=1`: the modem's link reports are "
                "switched on and its OK answers the probe; the handset counts as in AT mode from "
                "then on"),
    WatchedText("AT^DCGSNW=IMEI", "the IMEI (at most 20 characters) is remembered and, when the "
                "modem answers OK, written to /amt/imei.txt, or to /amt/imei-2.txt for modem "
                "channel 1"),
    WatchedText("AT^DMSN=NUMBER", "the serial number (at most 20 characters) is remembered and, "
                "when the modem answers OK, written to /amt/sn.txt, or to /amt/sn-2.txt for modem "
                "channel 1"),
    WatchedText("AT^DMPCHN=N", "the modem channel is remembered: it selects the files of later "
                "identity writes"),
)

FLUSH_COMMAND = "AT^DBTADDR=?"


def known_refusal(text: str) -> str:
    """Why the handset is known to refuse this text and keep it; empty when it is not."""
    for row in AT_COMMANDS:
        if row.refused and re.search(row.refused, text):
            return row.why
    return ""


def known_read(text: str) -> str:
    """What the line with the value begins with when this text reads one; else empty."""
    for row in AT_COMMANDS:
        if row.reads and re.fullmatch(row.reads, text):
            return row.reply.split(" ", maxsplit=1)[0]
    return ""
