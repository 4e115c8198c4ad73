"""The Bluetooth (172) and Wi-Fi (185) addresses and the checks of both radios."""

import stat
from typing import Callable, Union

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_station import wire
from support.channels import AppChannel, PcChannel, integer, raw, string
from support.handler import (IS_DIRECTORY, NO_ENTRY, NO_SPACE, HandlerTrace, device_error, done,
                             refused)
from support.trace import Wanted, error_line

BT, BT_HANDLER, BT_FILE = 172, "amt_device_bt_address", "/amt/BT/BT_Address.txt"
WIFI, WIFI_HANDLER, WIFI_FILE = 185, "amt_device_wifi_address", "/amt/WIFI/WIFI_nvram.txt"
MAC = "00:11:22:33:44:55"
SYNCS = ["sync() = 0", "sync() = 0"]

BT_READ, BT_WRITE, BT_CHECK = integer(110, 1), integer(110, 2), integer(110, 3)
WIFI_READ, WIFI_WRITE, WIFI_CHECK = integer(152, 0), integer(152, 1), integer(152, 2)

Channel = Union[AppChannel, PcChannel]
PATHS: dict[str, Callable[[Handset], Channel]] = {"packet": AppChannel, "pc": PcChannel}


def mode(handset: Handset, inside: str) -> int:
    """The permissions of a file or folder."""
    return stat.S_IMODE(handset.path(inside).stat().st_mode)


def bt_lines(operation: int, *wanted: Wanted) -> list[Wanted]:
    """The lines of a Bluetooth address request."""
    return [f"{BT_HANDLER} op_type:{operation}", *wanted]


def wifi_lines(operation: int, *wanted: Wanted) -> list[Wanted]:
    """The lines of a Wi-Fi address request."""
    return [f"{WIFI_HANDLER} op_type:{operation}", *wanted]


def exposed(folder: str) -> str:
    """The line of a folder whose content is for everybody to read."""
    return f"path = {folder} change to chmod -R 555"


# Bluetooth address


@pytest.mark.parametrize("path", PATHS)
def test_bt_address(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    handset = channel.handset
    # Also when the folder and the file cannot be written by ordinary users any more.
    for address in (MAC, "7", MAC):
        trace = HandlerTrace(handset)
        assert channel.request(BT, BT_WRITE, string(111, address)) == done(BT)
        trace.expect_handler(BT_HANDLER, *bt_lines(2, f"write BT address: {address}",
                                                   exposed("/amt/BT")))
        assert trace.calls() == SYNCS
        assert handset.text(BT_FILE) == f"{address}\n"
        assert mode(handset, "/amt/BT") == mode(handset, BT_FILE) == 0o555

    trace = HandlerTrace(handset)
    assert channel.request(BT, BT_READ) == done(BT, string(111, MAC))
    trace.expect_handler(BT_HANDLER, *bt_lines(1, f"read BT address: {MAC}"))
    assert trace.calls() == []


def test_bt_address_is_cut_at_59_characters(app: AppChannel) -> None:
    for length in (59, 60, 61, 500, 1900):
        text = ("0123456789" * 300)[:length]
        assert app.request(BT, BT_WRITE, string(111, text)) == done(BT)
        assert app.handset.text(BT_FILE) == text[:59] + "\n"
        assert app.request(BT, BT_READ) == done(BT, string(111, text[:59]))
    # What is cut off does not count, a zero byte neither.
    assert app.request(BT, BT_WRITE, raw(111, b"a" * 59 + b"\0b")) == done(BT)
    assert app.handset.text(BT_FILE) == "a" * 59 + "\n"


def test_bt_address_reads_one_word(app: AppChannel) -> None:
    for content, word in ((" \n\t first second\n", "first"), ("x" * 60, "x" * 59),
                          ("x" * 500 + "\n", "x" * 59), ("a\n", "a"), ("a", "a")):
        app.handset.place(BT_FILE, content)
        assert app.request(BT, BT_READ) == done(BT, string(111, word))


def test_bt_address_that_cannot_be_read(app: AppChannel) -> None:
    trace = HandlerTrace(app.handset)
    refused(app, BT, BT_READ)
    trace.expect_handler(BT_HANDLER, *bt_lines(
        1, device_error(BT_HANDLER, -118, NO_ENTRY),
        f'open("{BT_FILE}") fail: 2 - No such file or directory'))
    for content in ("", " \n\t\n"):
        app.handset.place(BT_FILE, content)
        trace = HandlerTrace(app.handset)
        refused(app, BT, BT_READ)
        trace.expect_handler(BT_HANDLER, *bt_lines(1, device_error(BT_HANDLER, -100, 0),
                                                   "read not completed"))
    app.handset.place(BT_FILE, None)
    app.handset.path(BT_FILE).mkdir()
    trace = HandlerTrace(app.handset)
    refused(app, BT, BT_READ)
    trace.expect_handler(BT_HANDLER, *bt_lines(1, device_error(BT_HANDLER, -100, IS_DIRECTORY),
                                               "read not completed"))
    assert trace.calls() == []


def test_no_bt_address_empties_the_file(app: AppChannel) -> None:
    for atoms in ((), (string(111, ""),), (raw(111, b"\0"),), (raw(111, b"00:11\0:22"),),
                  (raw(111, MAC.encode() + b"\0"),)):
        app.handset.place(BT_FILE, "old\n")
        trace = HandlerTrace(app.handset)
        refused(app, BT, BT_WRITE, *atoms)
        trace.expect_handler(BT_HANDLER, *bt_lines(2, device_error(BT_HANDLER, -101),
                                                   "unknown BT address"))
        assert trace.calls() == SYNCS
        assert app.handset.text(BT_FILE) == ""
        assert mode(app.handset, BT_FILE) == 0o644


def test_bt_address_that_cannot_be_written(app: AppChannel) -> None:
    handset = app.handset
    handset.path(BT_FILE).mkdir()
    write = (BT_WRITE, string(111, MAC))
    trace = HandlerTrace(handset)
    refused(app, BT, *write)
    trace.expect_handler(BT_HANDLER, *bt_lines(
        2, device_error(BT_HANDLER, -118, IS_DIRECTORY),
        f'open("{BT_FILE}") fail: 21 - Is a directory'))
    assert trace.calls() == []

    handset.place(BT_FILE, None)
    handset.path(BT_FILE).symlink_to("/dev/full")
    trace = HandlerTrace(handset)
    refused(app, BT, *write)
    trace.expect_handler(BT_HANDLER, *bt_lines(2, device_error(BT_HANDLER, -118, NO_SPACE),
                                               "fputs() fail"))
    assert trace.calls() == SYNCS

    handset.place("/amt/BT", None)
    trace = HandlerTrace(handset)
    refused(app, BT, *write)
    trace.expect_handler(BT_HANDLER, *bt_lines(
        2, device_error(BT_HANDLER, -118, NO_ENTRY),
        f'open("{BT_FILE}") fail: 2 - No such file or directory'))
    assert trace.calls() == []


def test_bt_check(app: AppChannel) -> None:
    for status in (0, 5, -1):
        app.handset.answer("ldt_btCheck", str(status))
        trace = HandlerTrace(app.handset)
        failure = [device_error(BT_HANDLER, -100),
                   f"BT hardware check error. call ldt_btCheck fail: {status}"]
        if status == 0:
            assert app.request(BT, BT_CHECK) == done(BT)
        else:
            refused(app, BT, BT_CHECK)
        trace.expect_handler(BT_HANDLER, *bt_lines(
            3, "BT hardware check start", f"BT hardware check end. return:{status}.",
            *(failure if status else [])))
        assert trace.calls() == [f"ldt_btCheck() = {status}"]


def test_other_bt_operations(app: AppChannel) -> None:
    app.handset.place(BT_FILE, "old\n")
    for atoms, operation in (((), 0), ((integer(110, 4),), 4), ((integer(110, -1),), -1),
                             ((integer(110, 0x101),), 0x101), ((raw(110, b"\5"),), 5)):
        trace = HandlerTrace(app.handset)
        refused(app, BT, *atoms)
        trace.expect_handler(BT_HANDLER, *bt_lines(operation, device_error(BT_HANDLER, -101),
                                                   f"unknown operation: {operation}"))
        assert trace.calls() == []
    assert app.handset.text(BT_FILE) == "old\n"


# Wi-Fi address


@pytest.mark.parametrize("path", PATHS)
def test_wifi_address(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    handset = channel.handset
    for address in (MAC, "7", MAC):
        trace = HandlerTrace(handset)
        assert channel.request(WIFI, WIFI_WRITE, string(153, address)) == done(WIFI)
        # What is logged of the file names the other radio; so it is known.
        trace.expect_handler(WIFI_HANDLER, *wifi_lines(
            1, "amt_write_wifi_address()", f"write BT address: {address}",
            f"Write WIFI address: {address}", exposed("/amt/WIFI")))
        assert trace.calls() == SYNCS
        assert handset.text(WIFI_FILE) == f"{address}\n"
        assert mode(handset, "/amt/WIFI") == mode(handset, WIFI_FILE) == 0o555

    trace = HandlerTrace(handset)
    assert channel.request(WIFI, WIFI_READ) == done(WIFI, string(153, MAC))
    assert channel.request(WIFI) == done(WIFI, string(153, MAC)), "an absent operation reads"
    trace.expect_handler(WIFI_HANDLER, *wifi_lines(
        0, "amt_read_wifi_address()", f"wifi_addr_len: {len(MAC) + 1}",
        f"read WIFI address: {MAC}"))
    assert trace.calls() == []


def test_wifi_address_is_cut_at_59_characters(app: AppChannel) -> None:
    for length in (59, 60, 61, 1900):
        text = ("0123456789" * 300)[:length]
        assert app.request(WIFI, WIFI_WRITE, string(153, text)) == done(WIFI)
        assert app.handset.text(WIFI_FILE) == text[:59] + "\n"
        assert app.request(WIFI, WIFI_READ) == done(WIFI, string(153, text[:59]))
    assert app.request(WIFI, WIFI_WRITE, raw(153, b"ab\0cd")) == done(WIFI)
    assert app.handset.text(WIFI_FILE) == "ab\n"


def test_wifi_address_reads_one_line(app: AppChannel) -> None:
    # The line's last character goes, whatever it is.
    for content, address in (("one two\nthree\n", "one two"), ("open", "ope"), ("\n", ""),
                             ("x" * 61 + "\n", "x" * 59), ("x" * 300, "x" * 59)):
        app.handset.place(WIFI_FILE, content)
        assert app.request(WIFI, WIFI_READ) == done(WIFI, string(153, address))


def test_wifi_address_that_cannot_be_read(app: AppChannel) -> None:
    read_failure = [device_error(WIFI_HANDLER, -100), "read error"]
    trace = HandlerTrace(app.handset)
    refused(app, WIFI, WIFI_READ)
    trace.expect_handler(WIFI_HANDLER, *wifi_lines(
        0, "amt_read_wifi_address()", error_line("amt_read_wifi_address", -100, NO_ENTRY),
        f"open {WIFI_FILE} fail", *read_failure))
    app.handset.place(WIFI_FILE, "")
    trace = HandlerTrace(app.handset)
    refused(app, WIFI, WIFI_READ)
    trace.expect_handler(WIFI_HANDLER, *wifi_lines(
        0, "amt_read_wifi_address()", error_line("amt_read_wifi_address", -100), "read fail",
        *read_failure))


def test_wifi_address_that_cannot_be_written(app: AppChannel) -> None:
    handset = app.handset
    write_failure = [device_error(WIFI_HANDLER, -100), "write error"]
    handset.place(WIFI_FILE, "old\n")
    for atoms in ((), (string(153, ""),), (raw(153, b"\0x"),)):
        trace = HandlerTrace(handset)
        refused(app, WIFI, WIFI_WRITE, *atoms)
        trace.expect_handler(WIFI_HANDLER, *wifi_lines(
            1, "amt_write_wifi_address()", error_line("amt_write_wifi_address", -101), "0, 1",
            *write_failure))
        assert trace.calls() == []
    assert handset.text(WIFI_FILE) == "old\n"

    handset.place(WIFI_FILE, None)
    handset.path(WIFI_FILE).mkdir()
    trace = HandlerTrace(handset)
    refused(app, WIFI, WIFI_WRITE, string(153, MAC))
    trace.expect_handler(WIFI_HANDLER, *wifi_lines(
        1, "amt_write_wifi_address()",
        error_line("amt_write_wifi_address", -100, IS_DIRECTORY), f"open {WIFI_FILE} fail",
        *write_failure))
    assert trace.calls() == []

    handset.place(WIFI_FILE, None)
    handset.path(WIFI_FILE).symlink_to("/dev/full")
    trace = HandlerTrace(handset)
    refused(app, WIFI, WIFI_WRITE, string(153, MAC))
    trace.expect_handler(WIFI_HANDLER, *wifi_lines(
        1, "amt_write_wifi_address()", error_line("amt_write_wifi_address", -118, NO_SPACE),
        "sys call: fputs() failed! errno = 28", *write_failure))
    assert trace.calls() == SYNCS


def test_wifi_check(app: AppChannel) -> None:
    for status in (0, 5, -1):
        app.handset.answer("ldt_wifiCheck", str(status))
        trace = HandlerTrace(app.handset)
        # The failure's text names the Bluetooth call; so it is known.
        failure = [device_error(WIFI_HANDLER, -100),
                   f"wifi connectivity check error. call ldt_btCtrl fail: {status}"]
        if status == 0:
            assert app.request(WIFI, WIFI_CHECK) == done(WIFI)
        else:
            refused(app, WIFI, WIFI_CHECK)
        trace.expect_handler(WIFI_HANDLER, *wifi_lines(
            2, "wifi connectivity check start",
            f"wifi connectivity check end. return:{status}.", *(failure if status else [])))
        assert trace.calls() == [f"ldt_wifiCheck() = {status}"]


def test_other_wifi_operations(app: AppChannel) -> None:
    for operation in (3, 4, -1, 0x7FFFFFFF, -0x80000000):
        trace = HandlerTrace(app.handset)
        refused(app, WIFI, integer(152, operation))
        trace.expect_handler(WIFI_HANDLER, *wifi_lines(operation,
                                                       device_error(WIFI_HANDLER, -101),
                                                       f"unknown operation: {operation}"))
        assert trace.calls() == []


@pytest.mark.parametrize("command, atoms", [(BT, (BT_READ,)), (WIFI, (integer(152, 3),))])
def test_refusal_on_the_pc_line(pc: PcChannel, command: int, atoms: tuple[wire.Atom, ...]) -> None:
    refused(pc, command, *atoms)
    pc.expect_silence(0.1)
