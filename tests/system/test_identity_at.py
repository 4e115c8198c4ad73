"""AT commands of the PC line on the identity files: radio addresses and PCBA number."""

import pytest

from amt_simulator import Handset
from amt_station import wire
from support.channels import ERROR, OK, PcChannel, integer, packet, string
from support.trace import Trace, error_line

BT_FILE = "/amt/BT/BT_Address.txt"
BT_FILE_2 = "/mnt/opl/nvm/BT_Address.txt"
WIFI_FILE = "/amt/WIFI/WIFI_nvram.txt"
PCBA_FILE = "/amt/sn-2.txt"
CME = "\r\n+CME ERROR: 100\r\n"
MAC = "00:11:22:33:44:55"

IS_DIRECTORY, NO_SPACE, NO_ENTRY = 21, 28, 2


def value(name: str, text: str, quoted: bool = True) -> str:
    """The reply that shows a value."""
    shown = f'"{text}"' if quoted else text
    return f"\r\n^{name}: {shown}\r\n{OK}"


def expect_error_packet(pc: PcChannel) -> None:
    """The dispatcher's error packet for what was no packet: the id after 255, and no AT text."""
    assert pc.read_packet() == packet(0, integer(1, 1))
    pc.expect_silence(0.1)


# Bluetooth address


def test_bt_address_write_and_read(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at(f'AT^DBTADDR="{MAC}"', OK)
    assert pc.handset.text(BT_FILE) == f"{MAC}\n"
    assert not pc.handset.path(BT_FILE_2).exists()
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect(error_line("get_bt_addr_file", -118, NO_ENTRY),
                 f'can not access file "{BT_FILE}" or "{BT_FILE_2}"', f"write BT address: {MAC}")
    pc.at("AT^DBTADDR?", value("DBTADDR", MAC))
    pc.at("AT^DBTADDR=?", OK)
    # The new address is shorter than the old one.
    pc.at('AT^DBTADDR="7"', OK)
    assert pc.handset.text(BT_FILE) == "7\n"


def test_bt_address_comes_from_the_first_file_that_exists(pc: PcChannel) -> None:
    pc.at("AT^DBTADDR?", CME)
    pc.handset.place(BT_FILE_2, "second word\n")
    pc.at("AT^DBTADDR?", value("DBTADDR", "second"))
    pc.handset.place(BT_FILE, " \n\tfirst\nmore\n")
    pc.at("AT^DBTADDR?", value("DBTADDR", "first"))
    pc.handset.place(BT_FILE, "")
    trace = Trace(pc.handset)
    pc.at("AT^DBTADDR?", CME)
    trace.expect("get_bt_addr_file()", error_line("read_bt_address", -100), "read not completed")


def test_bt_address_is_a_word_of_at_most_99_characters(pc: PcChannel) -> None:
    for text in ("y" * 99, "y" * 100, "y" * 300):
        pc.handset.place(BT_FILE, f"{text} z\n")
        pc.at("AT^DBTADDR?", value("DBTADDR", "y" * 99))


def test_bt_address_is_written_where_one_is(pc: PcChannel) -> None:
    pc.handset.place(BT_FILE_2, "old\n")
    pc.at(f'AT^DBTADDR="{MAC}"', OK)
    assert pc.handset.text(BT_FILE_2) == f"{MAC}\n"
    assert not pc.handset.path(BT_FILE).exists()


def test_bt_address_limits_and_open_ends(pc: PcChannel) -> None:
    for said, written in (('"1234567890123456789"', "1234567890123456789"),
                          ('"12345678901234567890"', "1234567890123456789"),
                          ('"' + "x" * 300 + '"', "x" * 19), ('"12"34"', "12"),
                          ('"open', "open"), ('" a b "', " a b ")):
        pc.at(f"AT^DBTADDR={said}", OK)
        assert pc.handset.text(BT_FILE) == f"{written}\n"


def test_an_empty_bt_address_is_refused_with_a_packet(pc: PcChannel) -> None:
    pc.handset.place(BT_FILE, "old\n")
    trace = Trace(pc.handset)
    pc.send(b'AT^DBTADDR=""\r')
    expect_error_packet(pc)
    assert pc.handset.text(BT_FILE) == "old\n"
    assert trace.calls() == []


def test_bt_address_write_failures(pc: PcChannel) -> None:
    pc.handset.path(BT_FILE).mkdir()
    trace = Trace(pc.handset)
    pc.at('AT^DBTADDR="1"', CME)
    assert trace.calls() == []
    trace.expect(error_line("write_bt_address", -118, IS_DIRECTORY),
                 f'open("{BT_FILE}") fail: 21 - Is a directory')
    pc.handset.path(BT_FILE).rmdir()
    pc.handset.path(BT_FILE).symlink_to("/dev/full")
    trace = Trace(pc.handset)
    pc.at('AT^DBTADDR="1"', CME)
    assert trace.syncs == 2
    trace.expect(error_line("write_bt_address", -118, NO_SPACE), "fputs() fail")
    trace.expect_none("write BT address: 1")


# Wi-Fi address


def test_wifi_address_write_and_read(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at(f'AT^DWIFIADDR="{MAC}"', OK)
    assert pc.handset.text(WIFI_FILE) == f"{MAC}\n"
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect("amt_write_wifi_address()", f"write BT address: {MAC}")

    trace = Trace(pc.handset)
    pc.at("AT^DWIFIADDR?", value("DWIFIADDR", MAC))
    trace.expect("amt_read_wifi_address()", f"wifi_addr_len: {len(MAC) + 1}")
    pc.at("AT^DWIFIADDR=?", OK)
    assert trace.calls() == []


def test_wifi_address_limits_and_open_ends(pc: PcChannel) -> None:
    for said, written in (('"1234567890123456789"', "1234567890123456789"),
                          ('"12345678901234567890"', "1234567890123456789"),
                          ('"12"34"', "12"), ('"open', "open")):
        pc.at(f"AT^DWIFIADDR={said}", OK)
        assert pc.handset.text(WIFI_FILE) == f"{written}\n"


def test_an_empty_wifi_address_is_refused(pc: PcChannel) -> None:
    pc.handset.place(WIFI_FILE, "old\n")
    trace = Trace(pc.handset)
    pc.at('AT^DWIFIADDR=""', CME)
    assert pc.handset.text(WIFI_FILE) == "old\n"
    assert trace.calls() == []
    trace.expect(error_line("amt_write_wifi_address", -101), "0, 1")


def test_wifi_address_line_loses_its_last_character(pc: PcChannel) -> None:
    for content, shown in (("12:34\nmore\n", "12:34"), ("12:34", "12:3"), ("\n", ""), ("1", ""),
                           ("x" * 59 + "\n", "x" * 59), ("x" * 58 + "\n", "x" * 58)):
        pc.handset.place(WIFI_FILE, content)
        pc.at("AT^DWIFIADDR?", value("DWIFIADDR", shown))


def test_wifi_address_read_failures(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DWIFIADDR?", CME)
    trace.expect(error_line("amt_read_wifi_address", -100, NO_ENTRY), f"open {WIFI_FILE} fail")

    pc.handset.place(WIFI_FILE, "")
    trace = Trace(pc.handset)
    pc.at("AT^DWIFIADDR?", CME)
    trace.expect(error_line("amt_read_wifi_address", -100, 0), "read fail")


def test_wifi_address_write_failures(pc: PcChannel) -> None:
    pc.handset.path(WIFI_FILE).mkdir()
    trace = Trace(pc.handset)
    pc.at('AT^DWIFIADDR="1"', CME)
    assert trace.calls() == []
    trace.expect(error_line("amt_write_wifi_address", -100, IS_DIRECTORY),
                 f"open {WIFI_FILE} fail")

    pc.handset.path(WIFI_FILE).rmdir()
    pc.handset.path(WIFI_FILE).symlink_to("/dev/full")
    pc.at('AT^DWIFIADDR="1"', CME)
    assert trace.syncs == 2
    trace.expect(error_line("amt_write_wifi_address", -118, NO_SPACE),
                 "sys call: fputs() failed! errno = 28")


# the same files by packet


def test_text_and_packets_share_the_address_files(pc: PcChannel) -> None:
    assert pc.request(185, integer(152, 1), string(153, MAC)).result == 0
    pc.at("AT^DWIFIADDR?", value("DWIFIADDR", MAC))
    long_mac = "x" * 59
    assert pc.request(185, integer(152, 1), string(153, long_mac + "yz")).result == 0
    assert pc.handset.text(WIFI_FILE) == long_mac + "\n"
    assert pc.request(185, integer(152, 0)) == packet(186, string(153, long_mac), integer(1, 0))
    pc.handset.place(WIFI_FILE, "x" * 98)
    assert pc.request(185, integer(152, 0)) == packet(186, string(153, long_mac), integer(1, 0))


# PCBA number


def test_pcba_write_and_read(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DPCBACTRL=2,PCBA-7", OK)
    assert pc.handset.text(PCBA_FILE) == "PCBA-7"
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    pc.at("AT^DPCBACTRL=1", value("DPCBACTRL", "PCBA-7", quoted=False))
    answer = packet(194, string(191, "PCBA-7"), integer(1, 0))
    assert pc.request(193, wire.Atom.boolean(190, 1)) == answer


def test_pcba_takes_29_characters(pc: PcChannel) -> None:
    for length in (29, 30, 300, 1):
        text = ("0123456789" * 30)[:length]
        pc.at(f"AT^DPCBACTRL=2,{text}", OK)
        assert pc.handset.text(PCBA_FILE) == text[:29]


def test_pcba_failures_are_answered(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DPCBACTRL=1", ERROR)
    trace.expect(error_line("amt_read_pcba_sn", -118, NO_ENTRY),
                 error_line("reply_pcba_sn", -100, NO_ENTRY), "read error.")
    for operation in (0, 3, 77):
        pc.at(f"AT^DPCBACTRL={operation}", ERROR)
        trace.expect(error_line("amt_at_control_pcba", -101),
                     f"unknown operation type: {operation}")
    pc.handset.path(PCBA_FILE).mkdir()
    pc.at("AT^DPCBACTRL=2,A", ERROR)
    trace.expect(error_line("amt_write_pcba_sn", -118, IS_DIRECTORY),
                 error_line("write_pcba_sn", -100, IS_DIRECTORY), "write error.")
    assert trace.calls() == []


@pytest.mark.parametrize("operands, text", [("", "type is null!!!"), ("2", "pcba-sn is null!!!"),
                                            ("2,", "pcba-sn is null!!!")])
def test_pcba_without_an_operand_is_refused_with_a_packet(pc: PcChannel, operands: str,
                                                          text: str) -> None:
    trace = Trace(pc.handset)
    pc.send(f"AT^DPCBACTRL={operands}\r".encode())
    expect_error_packet(pc)
    trace.expect(text)
    assert trace.calls() == []


def test_text_is_answered_without_the_modem(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc_handset.modem.open()
    pc.at("AT^DBTADDR=?", OK)
    pc.at("AT^DWIFIADDR?", CME)
    pc.at("AT^DPCBACTRL=1", ERROR)
    pc_handset.modem.expect_silence()
