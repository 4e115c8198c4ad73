"""What the start does to the identity files: the factory folders and the Wi-Fi calibration."""

import stat
from typing import Callable, Mapping

import pytest

from amt_simulator import Handset
from amt_simulator.tree import Content
from support.trace import Trace, error_line

BT_FOLDER = "/amt/BT"
WIFI_FOLDER = "/amt/WIFI"
ADDRESS_FILE = "/amt/WIFI/WIFI_nvram.txt"
STOCK = "/system/etc/wifi/nvram.txt"
STOCK_2 = "/system/etc/wifi/bcmdhd.cal"
DRIVER = "/data/misc/wifi/nvram.txt"
SYNC = "/system/bin/sync"
REWRITE = "amt_write_wifi_to_nvram_file"
MAC = "00:11:22:33:44:55\n"
MAC_LINE = f"macaddr={MAC}"

NO_ENTRY, IS_DIRECTORY, READ_ONLY = 2, 21, 30

Start = Callable[..., tuple[Handset, Trace]]


@pytest.fixture
def start(make_handset: Callable[..., Handset]) -> Start:
    """Start the daemon over given files, as far as it comes to serve its line."""
    def start_over(files: Mapping[str, Content] | None = None) -> tuple[Handset, Trace]:
        handset = make_handset("packet", ready=False, start=False, restart=False,
                               files=files or {})
        trace = Trace(handset)
        handset.start()
        handset.wait_ready()
        return handset, trace

    return start_over


def mode(handset: Handset, name: str) -> int:
    """The permissions of a file."""
    return stat.S_IMODE(handset.path(name).stat().st_mode)


def lines(count: int) -> str:
    """Ordinary lines of a calibration."""
    return "".join(f"key{number}={number}\n" for number in range(1, count + 1))


# folders


def recorder(name: str) -> Content:
    """A program that notes its call among those of the stand-ins and then does its work.

    In the handset's own PATH it comes before the system's program of that name.
    """
    return (f'#!/bin/sh\necho "{name} $*" >> /handset/calls.txt\nexec /usr/bin/{name} "$@"\n',
            0o755)


RECORDERS = {f"/system/bin/{name}": recorder(name) for name in ("chgrp", "chmod")}


def test_the_folders_are_made(start: Start) -> None:
    handset, trace = start(RECORDERS)
    for folder in (BT_FOLDER, WIFI_FOLDER):
        assert handset.path(folder).is_dir()
        assert mode(handset, folder) == 0o766
    assert trace.calls() == [
        f"chgrp -R radio {BT_FOLDER}", f"chmod 766 {BT_FOLDER}",
        f"chgrp -R radio {WIFI_FOLDER}", f"chmod 766 {WIFI_FOLDER}", "sync() = 0", "sync() = 0"]
    trace.expect("amt_make_folder()", f"amt_make_folder: {BT_FOLDER} does not exist.\\r\\n",
                 f"amt_make_folder mkdir({BT_FOLDER}) successfully", "amt_make_folder()",
                 f"amt_make_folder: {WIFI_FOLDER} does not exist.\\r\\n",
                 f"amt_make_folder mkdir({WIFI_FOLDER}) successfully", f"{REWRITE}()")


def test_folders_that_exist_are_left_alone(start: Start) -> None:
    handset, trace = start({**RECORDERS, "/amt/BT/BT_Address.txt": "1\n", ADDRESS_FILE: MAC})
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    for folder in (BT_FOLDER, WIFI_FOLDER):
        assert mode(handset, folder) != 0o766
        trace.expect(f"amt_make_folder: {folder} exist.\\r\\n")


def test_without_the_first_folder_the_second_is_not_made(start: Start) -> None:
    handset, trace = start({"/amt": "a file in the folder's place"})
    trace.expect(f"amt_make_folder: {BT_FOLDER} does not exist.\\r\\n",
                 error_line("amt_make_folder", -118, 20),
                 f"amt_make_folder mkdir({BT_FOLDER}) faild errno[20] strerror[Not a directory]",
                 f"{REWRITE}()")
    trace.expect_none(f"amt_make_folder: {WIFI_FOLDER} does not exist.\\r\\n")


# calibration


def test_the_stored_address_replaces_the_stock_one(start: Start) -> None:
    stock = "a=1\n  macaddr=aa:bb\n#macaddr=cc\nz=1\n"
    handset, trace = start({ADDRESS_FILE: MAC + "more\n", STOCK: stock})
    assert handset.text(DRIVER) == f"a=1\n{MAC_LINE}#macaddr=cc\nz=1\n"
    assert mode(handset, DRIVER) == 0o666
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    shown = MAC.replace("\n", "\\n")
    trace.expect(f"{REWRITE}()", f"wifi_addr_amt: {shown}", "wifi_addr_nvram: aa:bb\\n",
                 f"fchmod  {DRIVER} successfully")
    trace.expect_none(f"new wifi_addr_nvram: {shown}")
    assert handset.text(STOCK) == stock


def test_the_stored_address_is_appended_to_a_stock_without_one(start: Start) -> None:
    handset, trace = start({ADDRESS_FILE: MAC, STOCK: "a=1\n#macaddr=aa:bb\n"})
    assert handset.text(DRIVER) == f"a=1\n#macaddr=aa:bb\n{MAC_LINE}"
    trace.expect("new wifi_addr_nvram: 00:11:22:33:44:55\\n", f"fchmod  {DRIVER} successfully")


def test_without_an_address_file_the_stock_is_copied(start: Start) -> None:
    stock = lines(50) + "macaddr=aa:bb\nlast"
    handset, trace = start({STOCK: stock})
    assert handset.text(DRIVER) == stock
    assert mode(handset, DRIVER) == 0o666
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect(error_line(REWRITE, -100, NO_ENTRY), f"open  {ADDRESS_FILE} fail",
                 f"fchmod  {DRIVER} successfully")


def test_with_an_empty_address_file_the_stock_is_copied(start: Start) -> None:
    handset, trace = start({ADDRESS_FILE: "", STOCK: "macaddr=aa:bb\n"})
    assert handset.text(DRIVER) == "macaddr=aa:bb\n"
    trace.expect(error_line(REWRITE, -100, 0), f"read  {ADDRESS_FILE} fail",
                 f"fchmod  {DRIVER} successfully")


def test_an_old_copy_is_replaced(start: Start) -> None:
    handset, _ = start({ADDRESS_FILE: MAC, STOCK: "a=1\n", DRIVER: "old\n" * 500})
    assert handset.text(DRIVER) == f"a=1\n{MAC_LINE}"


@pytest.mark.parametrize("length", [58, 59, 60, 120])
def test_59_characters_of_the_stored_address_are_taken(start: Start, length: int) -> None:
    handset, _ = start({ADDRESS_FILE: "m" * length + "\n", STOCK: "macaddr=aa\nb=1\n"})
    kept = ("m" * length + "\n")[:59]
    assert handset.text(DRIVER) == f"macaddr={kept}b=1\n"


@pytest.mark.parametrize("count, copied", [(99, 99), (100, 100), (101, 100), (3000, 100)])
def test_a_long_stock_is_cut_behind_line_100(start: Start, count: int, copied: int) -> None:
    handset, trace = start({ADDRESS_FILE: MAC, STOCK: lines(count)})
    assert handset.text(DRIVER) == lines(copied) + MAC_LINE
    assert trace.syncs == 2


def test_the_second_stock_file(start: Start) -> None:
    handset, trace = start({ADDRESS_FILE: MAC, STOCK: None, STOCK_2: "macaddr=aa\nc=1\n"})
    assert handset.text(DRIVER) == f"{MAC_LINE}c=1\n"
    trace.expect(f'File "{STOCK}" not exist, so we try to open file "{STOCK_2}"',
                 "wifi_addr_nvram: aa\\n", f"fchmod  {DRIVER} successfully")


def test_without_a_stock_file_the_copy_is_emptied(start: Start) -> None:
    handset, trace = start({ADDRESS_FILE: MAC, STOCK: None, DRIVER: "old\n"})
    assert handset.text(DRIVER) == ""
    assert trace.calls() == []
    trace.expect(f'File "{STOCK}" not exist, so we try to open file "{STOCK_2}"',
                 error_line(REWRITE, -100, NO_ENTRY), f"open  {STOCK_2} fail")
    trace.expect_none(f"fchmod  {DRIVER} successfully", f"open  {DRIVER} fail")


def test_a_copy_that_cannot_be_opened(start: Start) -> None:
    handset, trace = start({ADDRESS_FILE: MAC, f"{DRIVER}/in-the-way": ""})
    assert handset.path(DRIVER).is_dir()
    assert trace.calls() == []
    trace.expect(error_line(REWRITE, -100, IS_DIRECTORY), f"open  {DRIVER} fail")
    trace.expect_none(f"fchmod  {DRIVER} successfully")


def test_a_copy_that_cannot_be_opened_has_its_own_reason(start: Start) -> None:
    # It is opened first, and told of last: the first stock file is looked for in between.
    _, trace = start({ADDRESS_FILE: MAC, STOCK: None, STOCK_2: "a=1\n", f"{DRIVER}/in-the-way": ""})
    trace.expect(f'File "{STOCK}" not exist, so we try to open file "{STOCK_2}"',
                 error_line(REWRITE, -100, IS_DIRECTORY), f"open  {DRIVER} fail")


def test_a_copy_that_vanishes_before_its_mode_is_set(start: Start) -> None:
    handset, trace = start({STOCK: "a=1\n", SYNC: (f"#!/bin/sh\nrm -f {DRIVER}\n", 0o755)})
    assert not handset.path(DRIVER).exists()
    trace.expect(error_line(REWRITE, -118, NO_ENTRY), f"open {DRIVER} failed")


def test_a_copy_whose_mode_cannot_be_set(start: Start) -> None:
    _, trace = start({STOCK: "a=1\n", SYNC: (f"#!/bin/sh\nln -sf /usr/bin/true {DRIVER}\n", 0o755)})
    trace.expect(error_line(REWRITE, -118, READ_ONLY),
                 f"fchmod  {DRIVER} failed, Read-only file system")


def test_no_file_stays_open(start: Start) -> None:
    for files in ({ADDRESS_FILE: MAC}, {STOCK: None}, {f"{DRIVER}/in-the-way": ""}):
        handset, _ = start(files)
        opened = handset.inspect().descriptors.values()
        assert not [name for name in opened if "nvram" in name or "bcmdhd" in name]
