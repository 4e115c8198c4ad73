"""Modes of the handset: entering the test mode, the handshake permission, power-off."""

from __future__ import annotations

from amt_station.requests.model import RESULT, Channel, Field, Operation, Refusal, Request, Service
from amt_station.requests.table.common import (INT, MODEM_ERROR, NO_MODEM, TEST_HAL, asks_modem,
                                               on_pc)


PERMISSIONS = {"deny": 0, "allow": 1}
_OPERATIONS = {**PERMISSIONS, "query": 2}
_PC, _APP = (Channel.PC,), (Channel.APP,)

REQUESTS: tuple[Request, ...] = (
    Request(
        195, "mode-enter", "leave normal mode for the factory-test mode",
        fields=(Field(201, INT, "mode", "mode value handed to the modem", absent="0"),),
        app=asks_modem("sets modem channel 0 (AT^DMPCHN), then the mode (AT^DSWAMT), answers, "
                       "sets the USB port to serial and ends the service, which starts again on "
                       "the PC line", MODEM_ERROR),
        operations=(Operation(("mode", "enter"), "enter the factory-test mode", takes=("mode",),
                              channels=_APP),)),
    Request(
        197, "mode-support", "whether the modem supports the factory-test mode",
        answer_fields=(Field(202, INT, "standby0-rat", "the modem's standby0_rat value"), RESULT),
        app=asks_modem("asks the modem (AT^DMCC?)", MODEM_ERROR,
                       Refusal("the answer has fewer than four fields", 10)),
        operations=(Operation(("mode", "support"), "ask the modem for its support",
                              channels=_APP, brings=("standby0-rat",)),)),
    Request(
        219, "damt1", "whether a USB-inserted start may enter the test mode",
        fields=(Field(192, INT, "operation", "0 deny, 1 allow, 2 query; app channel only",
                      choices=_OPERATIONS, low=0, high=2, absent="0 (deny)"),),
        answer_fields=(Field(192, INT, "permission", "0 denied, 1 allowed; meant for the query, "
                             "app channel only", choices=PERMISSIONS), RESULT),
        pc=on_pc("always denies, whatever the atoms say",
                 Refusal("/amt/power_usb_amt.txt cannot be written")),
        app=Service("handset", False, "writes or reads /amt/power_usb_amt.txt; a missing file "
                    "counts as allowed",
                    (NO_MODEM,
                     Refusal("the operation is above 2 or the file cannot be written", 10))),
        at_twin="AT^DAMT1=",
        operations=(
            Operation(("damt1", "deny"), "deny entry by USB insertion", {"operation": 0}),
            Operation(("damt1", "allow"), "allow entry by USB insertion", {"operation": 1},
                      channels=_APP),
            Operation(("damt1", "query"), "ask for the permission", {"operation": 2},
                      channels=_APP, brings=("permission",)))),
    Request(
        236, "power-off", "power the handset off",
        pc=on_pc("answers, waits 2 s and powers off"),
        at_twin="AT^DAMTOFF",
        operations=(Operation(("power-off",), "power the handset off", channels=_PC),)),
    Request(
        240, "idle", "put the handset into idle",
        pc=on_pc("calls the platform's test library", TEST_HAL),
        app=Service("handset", False, "calls the platform's test library", (TEST_HAL,)),
        notes=("A library that reports -104 makes the PC line pass the request on to the modem.",),
        at_twin="AT^DENTERIDLE",
        operations=(Operation(("idle",), "put the handset into idle"),)),
    Request(
        244, "boot-download", "the boot-download-finished flag",
        answer_fields=(Field(204, INT, "flag", "verdict of the platform's sanity check, passed "
                             "through"), RESULT),
        pc=on_pc("calls the platform's test library",
                 Refusal("the platform's test library or its entry is missing")),
        at_twin="AT^DBOOTDLFIN",
        operations=(Operation(("boot-download",), "read the boot-download-finished flag",
                              channels=_PC, brings=("flag",)),)),
)
