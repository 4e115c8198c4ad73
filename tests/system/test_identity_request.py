"""The packet requests of the PCBA number (193) and the adb serial number (191)."""

import pytest

from amt_station import wire
from support.channels import AppChannel, PcChannel, flag, integer, packet, raw, string
from support.trace import Trace, error_line

PCBA = 193
PCBA_FILE = "/amt/sn-2.txt"
READ, WRITE = flag(190, 1), flag(190, 2)
PCBA_HANDLER = "amt_handle_board_pcba_ctrl"

ADB = 191
ADB_FILE = "/amt/usb_serial"
ADB_HANDLER = "amt_handle_adb_serial_no"

NO_ENTRY, IS_DIRECTORY, NO_SPACE = 2, 21, 28


def refused(pc: PcChannel, command: int, *atoms: wire.Atom) -> None:
    """The request is acknowledged, then answered with the dispatcher's error packet."""
    assert pc.request(command, *atoms) == packet(command + 1, integer(1, 1))
    pc.expect_silence(0.1)


# PCBA number


def test_pcba_write_and_read(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    assert pc.request(PCBA, WRITE, string(191, "PCBA-0001")) == packet(194, integer(1, 0))
    assert pc.handset.text(PCBA_FILE) == "PCBA-0001"
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect(f"{PCBA_HANDLER}()", "pcba op-type: 2.", "getted pcba-sn: PCBA-0001.",
                 "write pcba-sn: PCBA-0001", "Writed to file success.pcba-sn: PCBA-0001.")

    trace = Trace(pc.handset)
    assert pc.request(PCBA, READ) == packet(194, string(191, "PCBA-0001"), integer(1, 0))
    assert trace.calls() == []
    trace.expect(f"{PCBA_HANDLER}()", "pcba op-type: 1.", "amt_read_pcba_sn()",
                 "read pcba-sn: PCBA-0001",
                 "readed pcba-sn: PCBA-0001.")


def test_pcba_write_takes_29_characters(pc: PcChannel) -> None:
    for length in (29, 30, 31, 60, 2000, 1):
        text = ("0123456789" * 200)[:length]
        assert pc.request(PCBA, WRITE, string(191, text)).result == 0
        assert pc.handset.text(PCBA_FILE) == text[:29]


def test_pcba_read_takes_29_characters_of_the_first_line(pc: PcChannel) -> None:
    for content, read in (("x" * 29, "x" * 29), ("x" * 30, "x" * 29), ("x" * 500, "x" * 29),
                          ("line\nmore", "line\n"), ("short", "short")):
        pc.handset.place(PCBA_FILE, content)
        assert pc.request(PCBA, READ) == packet(194, string(191, read), integer(1, 0))


def test_pcba_operation_is_the_first_byte_of_any_type(pc: PcChannel) -> None:
    pc.handset.place(PCBA_FILE, "A")
    answer = packet(194, string(191, "A"), integer(1, 0))
    for atom in (integer(190, 0x7F000001), raw(190, b"\x01\x02"), string(190, "\x01z")):
        assert pc.request(PCBA, atom) == answer


@pytest.mark.parametrize("atoms, operation", [
    ((), 0), ((raw(190, b""),), 0), ((flag(190, 0),), 0), ((flag(190, 3),), 3),
    ((flag(190, 255),), 255), ((string(190, "1"),), 49), ((integer(190, 0x0100),), 0)])
def test_pcba_unknown_operation(pc: PcChannel, atoms: tuple[wire.Atom, ...],
                                operation: int) -> None:
    trace = Trace(pc.handset)
    refused(pc, PCBA, *atoms)
    trace.expect(f"pcba op-type: {operation}.", error_line(PCBA_HANDLER, -101),
                 f"unknown operation type: {operation}")


def test_pcba_read_without_a_file(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    refused(pc, PCBA, READ)
    trace.expect(error_line("amt_read_pcba_sn", -118, NO_ENTRY),
                 f'open("{PCBA_FILE}") fail: 2 - No such file or directory',
                 error_line(PCBA_HANDLER, -100, NO_ENTRY), "read error.")


def test_pcba_read_of_an_empty_file(pc: PcChannel) -> None:
    pc.handset.place(PCBA_FILE, "")
    trace = Trace(pc.handset)
    refused(pc, PCBA, READ)
    trace.expect(error_line("amt_read_pcba_sn", -118, 0), "read fail: 0 - Success",
                 error_line(PCBA_HANDLER, -100, 0), "read error.")


def test_pcba_read_of_what_cannot_be_read(pc: PcChannel) -> None:
    pc.handset.path(PCBA_FILE).mkdir()
    trace = Trace(pc.handset)
    refused(pc, PCBA, READ)
    trace.expect(error_line("amt_read_pcba_sn", -118, IS_DIRECTORY),
                 "read fail: 21 - Is a directory",
                 error_line(PCBA_HANDLER, -100, IS_DIRECTORY), "read error.")


@pytest.mark.parametrize("atoms", [(), (string(191, ""),)], ids=["absent", "empty"])
def test_pcba_write_of_nothing(pc: PcChannel, atoms: tuple[wire.Atom, ...]) -> None:
    pc.handset.place(PCBA_FILE, "old")
    trace = Trace(pc.handset)
    refused(pc, PCBA, WRITE, *atoms)
    assert pc.handset.text(PCBA_FILE) == "old"
    assert trace.calls() == []
    trace.expect("getted pcba-sn: .", error_line("amt_write_pcba_sn", -101), "0, 1",
                 error_line(PCBA_HANDLER, -100), "write error.")


def test_pcba_write_that_cannot_be_opened(pc: PcChannel) -> None:
    pc.handset.path(PCBA_FILE).mkdir()
    trace = Trace(pc.handset)
    refused(pc, PCBA, WRITE, string(191, "A"))
    assert trace.calls() == []
    trace.expect(error_line("amt_write_pcba_sn", -118, IS_DIRECTORY),
                 f'open("{PCBA_FILE}") fail: 21 - Is a directory',
                 error_line(PCBA_HANDLER, -100, IS_DIRECTORY), "write error.")


def test_pcba_write_to_a_full_file_system(pc: PcChannel) -> None:
    pc.handset.path(PCBA_FILE).symlink_to("/dev/full")
    trace = Trace(pc.handset)
    refused(pc, PCBA, WRITE, string(191, "A"))
    assert trace.syncs == 2
    trace.expect(error_line("amt_write_pcba_sn", -118, NO_SPACE),
                 "fputs fail: 28 - No space left on device",
                 error_line(PCBA_HANDLER, -100, NO_SPACE), "write error.")


# adb serial number


def adb_write(pc: PcChannel, length: int, text: str) -> wire.Packet:
    """Write a serial number."""
    return pc.request(ADB, integer(160, 1), integer(162, length), string(161, text))


def test_adb_write_and_read(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    assert adb_write(pc, 8, "KEL00001") == packet(192, integer(1, 0))
    assert pc.handset.text(ADB_FILE) == "KEL00001"
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect(f"{ADB_HANDLER}()", f'open file "{ADB_FILE}" ok',
                 "write adb serial no.[KEL00001] ok")

    trace = Trace(pc.handset)
    answer = packet(192, string(161, "KEL00001"), integer(1, 0))
    assert pc.request(ADB, integer(160, 0)) == answer
    assert pc.request(ADB) == answer, "an absent operation reads"
    assert trace.calls() == []
    trace.expect(f"{ADB_HANDLER}()", "read adb serial no. ok, it is : KEL00001")


def test_adb_write_is_cut_at_the_length(pc: PcChannel) -> None:
    for length, text, written in (
            (99, "x" * 99, "x" * 99), (99, "x" * 100, "x" * 99), (99, "x" * 500, "x" * 99),
            (3, "ABCDE", "ABC"), (4, "ABCDE", "ABCD"), (5, "ABCDE", "ABCDE"),
            (9, "ABCDE", "ABCDE"), (1, "ABC", "A"), (1, "B", "B"), (5, "A B", "A B")):
        assert adb_write(pc, length, text).result == 0
        assert pc.handset.text(ADB_FILE) == written


@pytest.mark.parametrize("length", [0, 100, -1, 0x7FFFFFFF, -0x80000000])
def test_adb_length_is_1_to_99(pc: PcChannel, length: int) -> None:
    pc.handset.place(ADB_FILE, "old")
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 1), integer(162, length), string(161, "A"))
    assert pc.handset.text(ADB_FILE) == "old"
    assert trace.calls() == []
    trace.expect(error_line(ADB_HANDLER, -100), "Invalid adb serial number length!")


def test_adb_write_without_a_length(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 1), string(161, "A"))
    trace.expect("Invalid adb serial number length!")


def test_adb_write_without_a_text_empties_the_file(pc: PcChannel) -> None:
    pc.handset.place(ADB_FILE, "old")
    assert pc.request(ADB, integer(160, 1), integer(162, 4)).result == 0
    assert pc.handset.text(ADB_FILE) == ""


def test_adb_read_takes_the_first_word(pc: PcChannel) -> None:
    for content, read in (("x" * 99, "x" * 99), ("x" * 100, "x" * 99), ("x" * 300, "x" * 99),
                          (" \n\tKEL1 rest\n", "KEL1"), ("KEL1\n", "KEL1")):
        pc.handset.place(ADB_FILE, content)
        assert pc.request(ADB, integer(160, 0)) == packet(192, string(161, read), integer(1, 0))


@pytest.mark.parametrize("operation", [2, 3, -1, 0x7FFFFFFF])
def test_adb_unknown_operation(pc: PcChannel, operation: int) -> None:
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, operation))
    trace.expect(error_line(ADB_HANDLER, -101), f"unknown operation: {operation}")


def test_adb_read_without_a_file(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 0))
    trace.expect(error_line(ADB_HANDLER, -100, NO_ENTRY), "fopen error")


@pytest.mark.parametrize("content", ["", " \n\t\n"], ids=["empty", "blank"])
def test_adb_read_of_no_word(pc: PcChannel, content: str) -> None:
    pc.handset.place(ADB_FILE, content)
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 0))
    trace.expect(error_line(ADB_HANDLER, -100, 0), "fscanf error")


def test_adb_write_that_cannot_be_opened(pc: PcChannel) -> None:
    pc.handset.path(ADB_FILE).mkdir()
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 1), integer(162, 1), string(161, "A"))
    assert trace.calls() == []
    trace.expect(error_line(ADB_HANDLER, -100, IS_DIRECTORY), "fopen error")


def test_adb_write_to_a_full_file_system(pc: PcChannel) -> None:
    pc.handset.path(ADB_FILE).symlink_to("/dev/full")
    trace = Trace(pc.handset)
    refused(pc, ADB, integer(160, 1), integer(162, 1), string(161, "A"))
    assert trace.syncs == 2
    trace.expect(f'open file "{ADB_FILE}" ok', error_line(ADB_HANDLER, -100, NO_SPACE),
                 "fprintf error")


# both


def test_the_app_line_does_not_serve_them(app: AppChannel) -> None:
    for command in (PCBA, ADB):
        assert app.request(command, READ) == packet(command + 1, integer(1, 1))
