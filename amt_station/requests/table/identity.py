"""The handset's identity data that is kept in files: numbers and radio addresses."""

from __future__ import annotations

from amt_station.requests.model import (RESULT, AtRead, Channel, Field, Operation, Refusal, Request,
                                        Service)
from amt_station.requests.table.common import BOOL, INT, STRING, on_pc


_PC = (Channel.PC,)
_UNKNOWN = Refusal("the operation is none of the listed")

_BT_REFUSALS = (
    Refusal("read: /amt/BT/BT_Address.txt is missing or empty"),
    Refusal("write: the address is empty, holds a zero byte, or cannot be written"),
    Refusal("check: the Bluetooth hardware check fails"), _UNKNOWN)
_WIFI_REFUSALS = (
    Refusal("read: /amt/WIFI/WIFI_nvram.txt is missing or empty"),
    Refusal("write: the address is empty or cannot be written"),
    Refusal("check: the Wi-Fi connectivity check fails"), _UNKNOWN)

REQUESTS: tuple[Request, ...] = (
    Request(
        193, "pcba", "PCBA serial number in /amt/sn-2.txt",
        fields=(Field(190, BOOL, "operation", "1 read, 2 write; the first byte of the atom "
                      "counts, whatever its type", choices={"read": 1, "write": 2},
                      absent="0 (refused)"),
                Field(191, STRING, "serial", "number to write, at most 29 characters",
                      longest=29, positional=True, absent="empty (refused)", format="serial")),
        answer_fields=(Field(191, STRING, "serial", "the number read; not in the answer to a "
                             "write"), RESULT),
        pc=on_pc("reads or writes the file",
                 Refusal("read: the file is missing or empty"),
                 Refusal("write: the number is empty or cannot be written"), _UNKNOWN),
        notes=("The file is also that of the serial number of modem channel 1.",),
        at_twin="AT^DPCBACTRL=1",
        operations=(
            Operation(("pcba", "read"), "read the PCBA serial number", {"operation": 1},
                      channels=_PC, brings=("serial",),
                      at=AtRead("AT^DPCBACTRL=1", "^DPCBACTRL:", "serial")),
            Operation(("pcba", "write"), "write the PCBA serial number", {"operation": 2},
                      ("serial",), channels=_PC))),
    Request(
        191, "adb-serial", "USB (adb) serial number in /amt/usb_serial",
        fields=(Field(160, INT, "operation", "0 read, 1 write",
                      choices={"read": 0, "write": 1}, absent="0 (read)"),
                Field(162, INT, "length", "bytes of the number to write", unit="bytes", low=1,
                      high=99, absent="0 (refused)", length_of="serial"),
                Field(161, STRING, "serial", "number to write, cut at the length", longest=99,
                      positional=True, absent="empty", format="serial")),
        answer_fields=(Field(161, STRING, "serial", "the first word of the file; not in the "
                             "answer to a write"), RESULT),
        pc=on_pc("reads or writes the file",
                 Refusal("read: the file is missing or holds no word"),
                 Refusal("write: the length is not 1 to 99, or the file cannot be written"),
                 _UNKNOWN),
        operations=(
            Operation(("adb-serial", "read"), "read the adb serial number", {"operation": 0},
                      channels=_PC, brings=("serial",)),
            Operation(("adb-serial", "write"), "write the adb serial number", {"operation": 1},
                      ("serial",), channels=_PC))),
    Request(
        172, "bt-address", "Bluetooth address, and the Bluetooth hardware check",
        fields=(Field(110, INT, "operation", "1 read, 2 write, 3 hardware check",
                      choices={"read": 1, "write": 2, "check": 3}, absent="0 (refused)"),
                Field(111, STRING, "address", "address to write, at most 59 characters",
                      longest=59, positional=True, absent="empty (refused)", format="mac")),
        answer_fields=(Field(111, STRING, "address", "the address read"), RESULT),
        pc=on_pc("reads or writes /amt/BT/BT_Address.txt, or asks the test library",
                 *_BT_REFUSALS),
        app=Service("handset", False, "as on the PC line", _BT_REFUSALS),
        timeout=30.0, at_twin="AT^DBTADDR?",
        operations=(
            Operation(("bt-address", "read"), "read the Bluetooth address", {"operation": 1},
                      brings=("address",), at=AtRead("AT^DBTADDR?", "^DBTADDR:", "address")),
            Operation(("bt-address", "write"), "write the Bluetooth address", {"operation": 2},
                      ("address",)),
            Operation(("bluetooth", "check"), "check the Bluetooth hardware",
                      {"operation": 3}))),
    Request(
        185, "wifi-address", "Wi-Fi address, and the Wi-Fi connectivity check",
        fields=(Field(152, INT, "operation", "0 read, 1 write, 2 connectivity check",
                      choices={"read": 0, "write": 1, "check": 2}, absent="0 (read)"),
                Field(153, STRING, "address", "address to write, at most 59 characters",
                      longest=59, positional=True, absent="empty (refused)", format="mac")),
        answer_fields=(Field(153, STRING, "address", "the address read"), RESULT),
        pc=on_pc("reads or writes /amt/WIFI/WIFI_nvram.txt, or asks the test library",
                 *_WIFI_REFUSALS),
        app=Service("handset", False, "as on the PC line", _WIFI_REFUSALS),
        timeout=30.0, at_twin="AT^DWIFIADDR?",
        operations=(
            Operation(("wifi-address", "read"), "read the Wi-Fi address", {"operation": 0},
                      brings=("address",),
                      at=AtRead("AT^DWIFIADDR?", "^DWIFIADDR:", "address")),
            Operation(("wifi-address", "write"), "write the Wi-Fi address", {"operation": 1},
                      ("address",)),
            Operation(("wifi", "check"), "check the Wi-Fi chip", {"operation": 2}))),
)
