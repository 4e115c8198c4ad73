"""Versions, and single values that the modem or the battery driver holds."""

from __future__ import annotations

from amt_station.requests.model import RESULT, Channel, Field, Operation, Refusal, Request, Service
from amt_station.requests.table.common import (BOOL, BYTES, DEVICE_FILE, INT, MODEM_ERROR, NO_MODEM,
                                               REMEMBERED_ON_PC, STRING, asks_modem, on_app)


MODULES = {"product": 1, "software": 16, "l1": 17, "hls": 18, "platform": 19, "app": 20,
           "hardware": 32, "whole": 64}
_UNKNOWN_MODULE = Refusal("the module is none of the listed")
_APP = (Channel.APP,)

VERSION = Request(
    45, "version", "version text of a module",
    fields=(Field(19, INT, "module", "which module", choices=MODULES, absent="0 (refused)"),),
    answer_fields=(Field(19, INT, "module", "the module asked for", choices=MODULES,
                         echo=True),
                   Field(18, BYTES, "version", "version text", text=True), RESULT),
    pc=Service("handset", True,
               "modules l1 and hls are passed on to the modem without an acknowledgement; "
               "software gives the application side's software text (at most 254 bytes); every "
               "other gives a fixed text of 64 bytes. The acknowledgement comes after the module "
               "was checked",
               (_UNKNOWN_MODULE,
                Refusal("module software: a build property cannot be read, or the factory id is "
                        "set and /sys/sarvo/board_info cannot be read; the acknowledgement has "
                        "gone out by then")),
               passes_on={19: (MODULES["l1"], MODULES["hls"])}),
    app=Service("handset", False,
                "modules l1 and hls are asked of the modem (AT^DCMR); every other gives a fixed "
                "text of 64 bytes",
                (NO_MODEM, _UNKNOWN_MODULE,
                 Refusal("l1 or hls: the modem answers an error or a value without a version"))),
    notes=("Without a modem the app channel refuses every module, the local ones too.",
           "The modem's version is cut at its first `0a` of hexadecimal text, wherever that "
           "stands."),
    at_twin="AT^DSVER",
    operations=(Operation(("version",), "version text of a module", takes=("module",),
                          brings=("module", "version")),))

REQUESTS: tuple[Request, ...] = (
    VERSION,
    Request(
        85, "board-read", "board (serial) number kept by the modem",
        answer_fields=(Field(38, STRING, "board", "board number, at most 38 characters"), RESULT),
        app=asks_modem("asks the modem (AT^DMSN)", MODEM_ERROR,
                       Refusal("the number is longer than 38 characters", 10)),
        operations=(Operation(("board", "read"), "read the board number", brings=("board",)),)),
    Request(
        87, "board-write", "write the board (serial) number",
        fields=(Field(38, STRING, "board", "board number, at most 20 characters are kept",
                      longest=20, positional=True, format="serial"),),
        pc=REMEMBERED_ON_PC,
        app=asks_modem("tunnelled to the modem (AT^DTTEST)",
                       Refusal("the modem answers an error, or its answer cannot be converted")),
        notes=("On the PC line the number lands in /amt/sn-2.txt when the modem channel is 1, "
               "else in /amt/sn.txt.",),
        operations=(Operation(("board", "write"), "write the board number",
                              takes=("board",)),)),
    Request(
        65, "out-date-read", "the modem's out-date (factory date) record",
        answer_fields=(Field(27, STRING, "out-date", "out-date text, at most 14 characters"),
                       RESULT),
        app=asks_modem("asks the modem (AT^DMFD??)", MODEM_ERROR,
                       Refusal("the record is erased (first byte 0xFF) or longer than 14 "
                               "characters", 10)),
        operations=(Operation(("out-date", "read"), "read the out-date record",
                              brings=("out-date",)),)),
    Request(
        55, "temperature", "battery temperature",
        answer_fields=(Field(22, INT, "temperature", "battery temperature",
                             unit="°C", scale=10), RESULT),
        app=on_app("reads sys/class/power_supply/battery/temp",
                   Refusal("the file cannot be opened or holds no number", 10)),
        operations=(Operation(("battery", "temperature"), "read the battery temperature",
                              channels=_APP, brings=("temperature",)),)),
    Request(
        232, "channel-switch", "modem channel that later AT commands address",
        fields=(Field(159, INT, "channel", "modem channel", low=0, high=9, absent="0",
                      positional=True),),
        pc=Service("modem", False, "passed on to the modem unchanged; the handset remembers the "
                   "channel: it selects the files of later identity writes"),
        app=asks_modem("sends AT^DMPCHN to the modem and reads one answer",
                       Refusal("the answer holds no OK")),
        notes=("Only one digit fits: a longer number would lose its line end on the way to the "
               "modem.",),
        operations=(Operation(("channel-switch",), "switch the modem channel",
                              takes=("channel",)),)),
    Request(
        234, "serial-number-read", "the modem's serial number",
        answer_fields=(Field(163, BYTES, "serial-number", "serial number, at most 38 bytes",
                             text=True), RESULT),
        app=asks_modem("asks the modem (AT^DMSN)", MODEM_ERROR),
        operations=(Operation(("serial-number", "read"), "read the modem's serial number",
                              brings=("serial-number",)),)),
    Request(
        99, "sim-check", "whether a SIM is there",
        answer_fields=(Field(41, BOOL, "sim", "1 when the SIM type is 1 or 2, else 0",
                             choices={"none": 0, "present": 1}),),
        app=asks_modem("asks the modem (AT^DTOC)", MODEM_ERROR),
        notes=("The answer carries no result code.",),
        operations=(Operation(("sim", "check"), "check for a SIM", brings=("sim",)),)),
    Request(
        5, "imei-write", "write the IMEI",
        fields=(Field(21, STRING, "imei", "IMEI, at most 20 characters are kept", longest=20,
                      positional=True, format="imei"),),
        pc=REMEMBERED_ON_PC,
        app=asks_modem("tunnelled to the modem (AT^DTTEST)",
                       Refusal("the modem answers an error, or its answer cannot be converted")),
        notes=("On the PC line the IMEI lands in /amt/imei-2.txt when the modem channel is 1, "
               "else in /amt/imei.txt.",),
        operations=(Operation(("imei", "write"), "write the IMEI", takes=("imei",)),)),
    Request(
        7, "imei-read", "read the IMEI",
        answer_fields=(RESULT, Field(21, BYTES, "imei", "IMEI, 15 bytes", text=True)),
        app=asks_modem("tunnelled to the modem (AT^DTTEST)",
                       Refusal("the modem answers an error, or its answer cannot be converted")),
        operations=(Operation(("imei", "read"), "read the IMEI", brings=("imei",)),)),
    Request(
        9, "battery-voltage", "battery voltage",
        answer_fields=(Field(5, INT, "voltage", "battery voltage",
                             unit="V", scale=1000000), RESULT),
        app=on_app("reads /sys/class/power_supply/battery/voltage_now", DEVICE_FILE),
        operations=(Operation(("battery", "voltage"), "read the battery voltage",
                              channels=_APP, brings=("voltage",)),)),
)
