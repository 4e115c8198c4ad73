"""AT commands of the PC line that the daemon answers itself, the identity files' apart."""

import re
import time

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import scaled
from support.channels import ERROR, OK, PcChannel, integer, packet
from support.moments import Patience
from support.trace import Trace, error_line

CME = "\r\n+CME ERROR: 100\r\n"
PERMISSION = "/amt/power_usb_amt.txt"
EMMC = "/sys/devinfo/emmc_info"
BOARD = "/sys/sarvo/board_info"


def value(name: str, text: str) -> str:
    """The reply that shows a value."""
    return f"\r\n^{name}: {text}\r\n{OK}"


def refused(pc: PcChannel, command: str) -> None:
    """A command without its operands: an error packet, and no AT text. Nothing stays held."""
    pc.send(command.encode() + b"\r")
    assert pc.read_packet() == packet(0, integer(1, 1)), command
    pc.at("AT^DBTADDR=?", OK)


# software version and eMMC


def test_software_version(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    text = "(KEL-1_4.2.1)(F01)(KEL board rev C\n)(HW8G-0031 7456 MiB rev 5)(Freenet)"
    pc.at("AT^DSVER", value("DSVER", text))
    trace.expect("get_ap_sw_version()", "getted sw-module: " + text.replace("\n", "\\n"))

    pc.handset.set_property("ro.build.display.id", None)
    pc.handset.set_property("ro.build.factory.id", None)
    pc.at("AT^DSVER", value("DSVER", "( )( )(KEL board rev C\n)(HW8G-0031 7456 MiB rev 5)"
                            "(Freenet)"))


def test_software_version_of_254_characters(pc: PcChannel) -> None:
    # Two fields as long as a property may be, and the board's: more than fits.
    pc.handset.set_property("ro.build.display.id", "d" * 91)
    pc.handset.set_property("ro.build.factory.id", "f" * 91)
    pc.handset.place(BOARD, "b" * 91 + "\n")
    text = f"({'d' * 91})({'f' * 91})({'b' * 91}"[:254]
    pc.at("AT^DSVER", value("DSVER", text))


def test_software_version_needs_the_board(pc: PcChannel) -> None:
    pc.handset.place(BOARD, None)
    trace = Trace(pc.handset)
    pc.at("AT^DSVER", CME)
    trace.expect("get_ap_sw_version()", error_line("amt_read_data_from_file", -118, 2))


def test_emmc_information(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DEMMCINFO?", value("DEMMCINFO", '"HW8G-0031 7456 MiB rev 5"'))
    trace.expect("amt_read_emmc_info()", "emmc_info_len: 25")
    pc.handset.place(EMMC, "x" * 80 + "\n")
    pc.at("AT^DEMMCINFO?", value("DEMMCINFO", f'"{"x" * 47}"'))
    pc.handset.place(EMMC, "")
    trace = Trace(pc.handset)
    pc.at("AT^DEMMCINFO?", CME)
    trace.expect(error_line("amt_read_emmc_info", -100), "read fail")
    pc.handset.place(EMMC, None)
    trace = Trace(pc.handset)
    pc.at("AT^DEMMCINFO?", CME)
    trace.expect(error_line("amt_read_emmc_info", -100, 2), f"open {EMMC} fail")


# commands without their first operand


def test_missing_operands_are_refused_with_a_packet(pc: PcChannel) -> None:
    for command, func, text in (
            ("AT^DGPSCTRL=", "amt_at_control_gps", "flag is null!!!"),
            ("AT^DWLTSD=", "handle_amt_device_wifi_tx_ctrl", "control is null!!!"),
            ("AT^DWLTRD=", "handle_amt_device_wifi_rx_ctrl", "control is null!!!"),
            ("AT^DAMT1=", "amt_at_control_permission", "type is null!!!"),
            ("AT^DPCBACTRL=,", "amt_at_control_pcba", "type is null!!!")):
        trace = Trace(pc.handset)
        refused(pc, command)
        trace.expect(error_line(func, -101), text, "handle_amt_imei_and_sn--->req_id_en:255.")
        assert trace.calls() == []


# the switch for starts by cable


def test_start_permission(pc: PcChannel) -> None:
    for digit in ("0", "1"):
        trace = Trace(pc.handset)
        pc.at(f"AT^DAMT1={digit}", OK)
        assert pc.handset.text(PERMISSION) == digit
        assert trace.calls() == ["sync() = 0", "sync() = 0"]
        trace.expect(f"Writed to file({PERMISSION}) success.flag: {digit}.")
        trace = Trace(pc.handset)
        pc.at("AT^DAMT1=2", value("DAMT1", digit))
        assert trace.calls() == []


def test_start_permission_reads_any_number(pc: PcChannel) -> None:
    for content, shown in ((None, "1"), ("7\n", "7"), ("-3", "-3"), ("text\n", "0"), ("", "1")):
        pc.handset.place(PERMISSION, content)
        pc.at("AT^DAMT1=2", value("DAMT1", shown))


def test_start_permission_failures(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    for operation, shown in (("3", "3"), ("-1", "4294967295"), ("10", "10")):
        pc.at(f"AT^DAMT1={operation}", ERROR)
        trace.expect(error_line("handle_amt_damt1_operation", -101),
                     f"unknown operation type: {shown}")
    assert trace.calls() == []

    pc.handset.path(PERMISSION).mkdir()
    trace = Trace(pc.handset)
    pc.at("AT^DAMT1=1", ERROR)
    trace.expect(error_line("amt_write_content_to_file_sync", -118, 21),
                 f'open("{PERMISSION}") fail: 21 - Is a directory',
                 error_line("handle_amt_damt1_operation", -100, 21),
                 "write error to do-not-permit-handshake file.")
    pc.handset.path(PERMISSION).rmdir()
    pc.handset.path(PERMISSION).symlink_to("/dev/full")
    trace = Trace(pc.handset)
    pc.at("AT^DAMT1=0", ERROR)
    trace.expect(error_line("amt_write_content_to_file_sync", -118, 28),
                 "fputs fail: 28 - No space left on device",
                 "write error to do-not-permit-handshake file.")


# test HAL


def test_idle_and_boot_download(pc: PcChannel) -> None:
    pc.handset.answer("enter_idle", "0", "-4", "3")
    pc.handset.answer("amt_check_system_sanity", "0", "1", "-5")
    trace = Trace(pc.handset)
    for answer in (OK, ERROR, ERROR):
        pc.at("AT^DENTERIDLE", answer)
    for verdict in ("0", "1", "-5"):
        pc.at("AT^DBOOTDLFIN", value("DBOOTDLFIN", verdict))
    # Neither needs its line end to be recognised.
    pc.send(b"AT^DBOOTDLFIN")
    wanted = value("DBOOTDLFIN", "-5").encode()
    assert pc.line.read_exactly(len(wanted)) == wanted
    assert trace.calls() == [
        "enter_idle() = 0", "enter_idle() = -4", "enter_idle() = 3",
        "amt_check_system_sanity() = 0", "amt_check_system_sanity() = 1",
        *["amt_check_system_sanity() = -5"] * 2]


def test_without_the_test_hal(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", files={"/system/lib/hw/amt.tq5530.misc.so": "no library\n"})
    pc = PcChannel(handset)
    pc.at("AT^DENTERIDLE", ERROR)
    pc.at("AT^DBOOTDLFIN", ERROR)
    trace = Trace(handset)
    pc.at("AT", OK)
    handset.log.wait("call amt_usb_charge_ctrl for amt4.")
    trace.expect("call amt_usb_charge_ctrl for amt4. return:-118, current amt mode:4.")


# power


def test_power_off_ends_the_handset(pc: PcChannel) -> None:
    with Patience() as patience:
        begun = time.monotonic()
        pc.at("AT^DAMTOFF", OK)
        pc.handset.wait_power_off()
        # The answer has two seconds to arrive.
        assert 1.9 <= time.monotonic() - begun
        assert patience.seconds < scaled(4.0)


# which command is meant


def test_commands_are_found_in_their_order(pc: PcChannel) -> None:
    # Two in one request: the one that is looked for first, wherever it stands, and only that.
    trace = Trace(pc.handset)
    pc.send(b"AT^DBTCTRL=1\rAT^DDEVCONNCHK=3\r")
    assert pc.line.read_exactly(len(ERROR)) == ERROR.encode()  # its operand is cut at the first CR
    pc.send(b"AT^DAMT1=2\rAT^DWLTSD=0\r")
    assert pc.line.read_exactly(len(OK)) == OK.encode()
    assert trace.calls() == ["ldt_TxTest(0, 0, 0, 0) = 0", "ldt_wifiCtrl(0) = 0"]
    pc.expect_silence(0.1)


def test_texts_that_are_not_quite_commands(pc: PcChannel) -> None:
    pc.handset.modem.open()
    trace = Trace(pc.handset)
    for text in (b"AT^DSVER?\r", b"AT^DSVER", b"AT^DSVER\n", b"at^dsver\r", b"AT^DEMMCINFO?\n",
                 b"AT^DBTADDR?", b"AT^DBTADDR=12\r", b"AT^DBTCTRL\r", b"AT^DAMTOFF",
                 b"AT^DAMTOFF?\r", b"AT ^DSVER\r", b"AT^dENTERIDLE\r", b"ATI\r", b"\r\nOK\r\n"):
        pc.send(text)
        assert pc.handset.modem.read_exactly(len(text)) == text
    pc.expect_silence(0.1)
    assert trace.calls() == []


def test_command_behind_zero_bytes_is_found(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.send(b"\0\0AT^DENTERIDLE\r")
    assert pc.line.read_exactly(len(OK)) == OK.encode()
    assert len(trace.calls()) == 1


def test_replies_are_logged(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    trace = Trace(pc_handset)
    pc.at("AT^DENTERIDLE", OK)
    pc_handset.log.wait(re.compile(r"send PC rsp data: : \(data_len = 6\) -- 0D0A4F4B0D0A$"))
    trace.expect("handle_amt_imei_and_sn--->req_id_en:255.",
                 "send PC rsp data: : (data_len = 6) -- 0D0A4F4B0D0A")
