"""Mode switching, the permission to enter by handshake, power-off, the boot-download flag."""

import time
from errno import EPERM
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_station import wire
from support.channels import ACK, AppChannel, PcChannel, integer, packet
from support.modem_desk import ERRORS, MODEM_FAILED, NOT_SERVED, OK, ModemDesk, refusal
from support.moments import logged_at
from support.replaced_cutils import replace_cutils
from support.trace import Trace, error_line
from support.traffic import APP_OUT, PC_OUT, PcTrace, dump

RESULT = integer(1, 0)
USB = "sys.usb.config"
SWITCH = "amt.normal.amt.switch_status"
MODE = 201
BAND = b"AT^DMPCHN=0\r"
SWITCHED = packet(196, RESULT)
NOT_SWITCHED = refusal(195, MODEM_FAILED)


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks, for what does not end the daemon."""
    return ModemDesk(share_handset("packet"))


# from normal to the factory-test mode


def switch(desk: ModemDesk, mode: int = 1) -> None:
    """Switch the mode, until the app has its answer."""
    desk.ask(packet(195, integer(MODE, mode)), BAND)
    desk.mux.write(OK)
    command = f"AT^DSWAMT={mode}\r".encode()
    assert desk.mux.read_exactly(len(command)) == command
    desk.mux.write(OK)
    assert desk.app.read_packet() == SWITCHED


def test_switch_from_end_to_end(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", properties={USB: "adb"})
    desk = ModemDesk(handset)
    trace = Trace(handset)
    switch(desk, 2)
    assert handset.wait_exit() == 0
    # The answer has left long before the end.
    log = handset.log
    sent, ended = (log.find(dump(APP_OUT, SWITCHED.encode())), log.find("receive signal: 15"))
    assert sent and ended and logged_at(ended) - logged_at(sent) > 0.4
    name = "amt_handle_normal_to_amt"
    trace.expect(
        "receive command id: 195(0xC3) - AMT_NORMAL_TO_AMT_CMD", f"{name}()",
        f"{name} amt_mode:2", "amt_change_band()", "amt_change_band band:0",
        "send ==> AT^DMPCHN=0\\r", "amt_change_band :\\r\\nOK\\r\\n", "send ==> AT^DSWAMT=2\\r",
        f"{name} :\\r\\nOK\\r\\n", f"set property({SWITCH}) to 1.",
        dump(APP_OUT, SWITCHED.encode()), f"property-{USB} value: adb",
        f"will set property({USB}) to serial,adb.", "will exit program.",
        "stop vx-kel-mla return: 0", "receive signal: 15 - SIGTERM", "amt_handle_deinit()")
    assert trace.calls() == [f"property_set({SWITCH}, 1) = 0",
                             f"property_set({USB}, serial,adb) = 0",
                             "property_set(ctl.stop, vx-kel-mla0) = 0"]
    # It comes up again in the other mode.
    handset.mux.close()
    handset.wait_ready(path="pc")
    PcChannel(handset).at("AT^DWIFIADDR=?", OK)


@pytest.mark.parametrize("config, is_serial", [
    (None, False), ("", False), ("mtp,adb", False), ("SERIAL", False), ("serial,adb", True),
    ("mtp,serial_x", True)])
def test_usb_configuration(make_handset: HandsetFactory, config: str | None,
                           is_serial: bool) -> None:
    handset = make_handset("packet", properties={USB: config}, restart=False)
    trace = Trace(handset)
    switch(ModemDesk(handset))
    assert handset.wait_exit() == 0
    shown = config or "@#no_set_config#@"
    if is_serial:
        trace.expect(f"property-{USB} value: {shown}", "already activate serial, do not reset. ",
                     "will exit program.")
        assert handset.get_property(USB) == config
        assert [call for call in trace.calls() if USB in call] == []
    else:
        trace.expect(f"property-{USB} value: {shown}",
                     f"will set property({USB}) to serial,adb.", "will exit program.")
        assert handset.get_property(USB) == "serial,adb"
    assert handset.get_property(SWITCH) == "1"


def test_properties_that_cannot_be_set_stop_nothing(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", properties={USB: "adb"}, restart=False,
                           answers={"property_set": "-1"})
    trace = Trace(handset)
    switch(ModemDesk(handset))
    assert handset.wait_exit() == 0
    trace.expect("stop vx-kel-mla return: -1", "receive signal: 15 - SIGTERM")


def test_app_that_has_left_stops_nothing(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", restart=False)
    desk = ModemDesk(handset)
    desk.ask(packet(195, integer(MODE, 1)), BAND)
    handset.app.close()
    desk.mux.write(OK)
    assert desk.mux.read_exactly(12) == b"AT^DSWAMT=1\r"
    desk.mux.write(OK)
    assert handset.wait_exit() == 0
    assert handset.get_property(SWITCH) == "1"


def test_answers_byte_by_byte_among_other_lines(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", restart=False)
    desk = ModemDesk(handset)
    desk.ask(packet(195, integer(MODE, -1)), BAND)
    said = b"\r\n+CREG: 1\r\n" + OK
    pieces = [said[place:place + 1] for place in range(len(said))]
    desk.say(*pieces)
    assert desk.mux.read_exactly(13) == b"AT^DSWAMT=-1\r"
    desk.say(*pieces)
    assert desk.app.read_packet() == SWITCHED
    assert handset.wait_exit() == 0


def test_switch_with_the_simulated_modem(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", restart=False)
    app = AppChannel(handset)
    assert app.request(197) == packet(198, integer(202, 3), RESULT)
    assert app.request(195, integer(MODE, 1)) == SWITCHED
    assert handset.wait_exit() == 0


def unchanged(desk: ModemDesk, trace: Trace) -> None:
    """Nothing was switched, and the daemon goes on."""
    assert trace.calls() == []
    assert desk.handset.get_property(SWITCH) is None
    trace.expect_none("will exit program.")
    assert desk.handset.exits() == []


@pytest.mark.parametrize("error", ERRORS, ids=["ERROR", "CME", "CMS"])
def test_refused_channel_ends_the_request(desk: ModemDesk, error: bytes) -> None:
    trace = Trace(desk.handset)
    desk.exchange(packet(195, integer(MODE, 1)), BAND, [error], [NOT_SWITCHED])
    trace.expect(error_line("amt_change_band", -100), dump(APP_OUT, NOT_SWITCHED.encode()))
    trace.expect_none("send ==> AT^DSWAMT=1\\r")
    unchanged(desk, trace)


@pytest.mark.parametrize("error", ERRORS, ids=["ERROR", "CME", "CMS"])
def test_refused_mode_ends_the_request(desk: ModemDesk, error: bytes) -> None:
    for place in range(1, len(OK)):
        trace = Trace(desk.handset)
        desk.ask(packet(195, integer(MODE, 1)), BAND)
        # The answer to the first command may come in any two pieces.
        desk.say(OK[:place], OK[place:])
        assert desk.mux.read_exactly(12) == b"AT^DSWAMT=1\r"
        desk.mux.write(error)
        desk.expect(NOT_SWITCHED)
        trace.expect(error_line("amt_handle_normal_to_amt", -100),
                     dump(APP_OUT, NOT_SWITCHED.encode()))
        unchanged(desk, trace)


@pytest.mark.parametrize("mode", [0, -1, 0x7fffffff, -0x80000000])
def test_wanted_modes(desk: ModemDesk, mode: int) -> None:
    atoms = (integer(MODE, mode),) if mode else ()
    desk.ask(packet(195, *atoms), BAND)
    desk.mux.write(OK)
    command = f"AT^DSWAMT={mode}\r".encode()
    assert desk.mux.read_exactly(len(command)) == command
    desk.mux.write(ERRORS[0])
    desk.expect(NOT_SWITCHED)


def test_switch_whose_answers_never_end(desk: ModemDesk) -> None:
    trace = Trace(desk.handset)
    desk.ask(packet(195, integer(MODE, 1)), BAND)
    desk.mux.write(b"x" * 4096)
    desk.expect(NOT_SWITCHED)
    desk.ask(packet(195, integer(MODE, 1)), BAND)
    desk.mux.write(OK)
    assert desk.mux.read_exactly(12) == b"AT^DSWAMT=1\r"
    desk.mux.write(b"x" * 4096)
    desk.expect(NOT_SWITCHED)
    unchanged(desk, trace)


# the permission to enter by handshake

PERMISSION = "/amt/power_usb_amt.txt"
OPERATION = 192


def permission(desk: ModemDesk, *packets: wire.Packet, operation: int | None = None) -> Trace:
    """An operation of the app."""
    trace = Trace(desk.handset)
    atoms = () if operation is None else (integer(OPERATION, operation),)
    desk.app.send_packet(219, *atoms)
    desk.expect(*packets)
    trace.expect("receive command id: 219(0xDB) - AMT_DAMT1_CMD", "amt_handle_damt1_cmd()",
                 f"amt_handle_damt1_cmd op_type:{operation or 0}")
    trace.expect_none("write_at()")
    return trace


def granted(value: int) -> wire.Packet:
    """The answer to an operation."""
    return packet(220, integer(OPERATION, value), RESULT)


@pytest.mark.parametrize("operation, content", [(0, "0"), (1, "1"), (None, "0")])
def test_app_writes_the_permission(desk: ModemDesk, operation: int | None, content: str) -> None:
    desk.handset.place(PERMISSION, "old and longer")
    trace = permission(desk, granted(int(content)), operation=operation)
    assert desk.handset.text(PERMISSION) == content
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect(f"Writed to file({PERMISSION}) success.flag: {content}.",
                 f"amt_handle_damt1_cmd op_type:{operation or 0}; flag:{content}; ret_val:0.")


@pytest.mark.parametrize("content, value", [
    ("0", 0), ("1", 1), ("0\n", 0), (" 7", 7), ("x", 0), ("-3", -3), (None, 1)])
def test_app_reads_the_permission(desk: ModemDesk, content: str | None, value: int) -> None:
    desk.handset.place(PERMISSION, content)
    trace = permission(desk, granted(value), operation=2)
    trace.expect(f"amt_handle_damt1_cmd op_type:2; flag:{value}; ret_val:0.",
                 dump(APP_OUT, granted(value).encode()))
    assert trace.calls() == []
    desk.handset.place(PERMISSION, None)


@pytest.mark.parametrize("operation", [3, -1, 255, 0x7fffffff, -0x80000000])
def test_unknown_operations_on_the_permission(desk: ModemDesk, operation: int) -> None:
    desk.handset.place(PERMISSION, "1")
    trace = permission(desk, refusal(219, MODEM_FAILED), operation=operation)
    trace.expect(error_line("handle_amt_damt1_operation", -101),
                 f"unknown operation type: {operation & 0xffffffff}",
                 f"amt_handle_damt1_cmd op_type:{operation}; flag:0; ret_val:-101.")
    assert desk.handset.text(PERMISSION) == "1"


@pytest.mark.parametrize("operation", [0, 1])
def test_permission_that_cannot_be_written(desk: ModemDesk, operation: int) -> None:
    desk.handset.place(PERMISSION, None)
    desk.handset.path(PERMISSION).mkdir()
    permission(desk, refusal(219, MODEM_FAILED), operation=operation).expect(
        f'open("{PERMISSION}") fail: 21 - Is a directory',
        "write error to do-not-permit-handshake file.",
        f"amt_handle_damt1_cmd op_type:{operation}; flag:0; ret_val:-100.")
    desk.handset.place(PERMISSION, None)


@pytest.mark.parametrize("atoms", [(), (integer(OPERATION, 1),), (integer(OPERATION, 9),)])
def test_pc_withdraws_the_permission(share_handset: HandsetFactory,
                                     atoms: tuple[wire.Atom, ...]) -> None:
    pc = PcChannel(share_handset("pc"))
    pc.handset.place(PERMISSION, "1")
    trace = PcTrace(pc.handset)
    pc.send_packet(219, *atoms)
    assert pc.read_frame() == ACK
    assert pc.read_frame() == wire.encode_envelope(packet(220, RESULT))
    trace.wait_served()
    # Whatever is asked for.
    assert pc.handset.text(PERMISSION) == "0"
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect("amt_handle_not_permit_handshake()",
                 f"Writed to file({PERMISSION}) success.flag: 0.",
                 dump(PC_OUT, wire.encode_envelope(packet(220, RESULT))))


def test_pc_cannot_withdraw_the_permission(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc_handset.path(PERMISSION).mkdir()
    trace = PcTrace(pc_handset)
    pc.send_packet(219)
    assert pc.read_frame() == ACK
    # The dispatcher's packet, as the handler leaves it alone.
    assert pc.read_frame() == wire.encode_envelope(refusal(219, NOT_SERVED))
    trace.wait_served()
    trace.expect("amt_handle_not_permit_handshake()",
                 "write error to do-not-permit-handshake file.")


# power-off


@pytest.mark.parametrize("atoms", [(), (integer(1, 7),)])
def test_power_off(make_handset: HandsetFactory, atoms: tuple[wire.Atom, ...]) -> None:
    handset = make_handset("pc")
    pc = PcChannel(handset)
    trace = Trace(handset)
    pc.send_packet(236, *atoms)
    assert pc.read_frame() == ACK
    assert pc.read_frame() == wire.encode_envelope(packet(237, RESULT))
    # It has its answer while the handset is still up, for two seconds.
    assert handset.is_up
    answered = handset.log.find(PC_OUT)
    handset.wait_power_off()
    assert answered and 1.8 < time.time() - logged_at(answered)
    trace.expect("receive command id: 236(0xEC) - (undefined)", "amt_handle_power_off()",
                 dump(PC_OUT, wire.encode_envelope(packet(237, RESULT))))
    trace.expect_none("amt_handle_deinit()")


def test_power_off_that_the_kernel_refuses(make_handset: HandsetFactory, tmp_path: Path) -> None:
    handset = make_handset("pc", ready=False, start=False)
    replace_cutils(handset, tmp_path, "no_power_off")
    handset.start()
    handset.wait_ready()
    pc = PcChannel(handset)
    trace = Trace(handset)
    assert pc.request(236) == packet(237, RESULT)
    pc.at("AT^DAMTOFF", OK.decode())
    # Both are logged, and the daemon serves on.
    pc.at("AT^DBTADDR=?", OK.decode())
    failed = [f"sys call: reboot() failed! errno = {EPERM}",
              error_line("amt_power_off_handset", -1, EPERM)]
    trace.expect("amt_handle_power_off()", dump(PC_OUT, wire.encode_envelope(packet(237, RESULT))),
                 *failed, *failed)
    assert handset.exits() == []


# boot download


@pytest.mark.parametrize("verdict", [0, 1, 2, 7, -1, -2147483648])
def test_boot_download_flag(share_handset: HandsetFactory, verdict: int) -> None:
    pc = PcChannel(share_handset("pc"))
    pc.handset.answer("amt_check_system_sanity", str(verdict))
    trace = PcTrace(pc.handset)
    answer = wire.encode_envelope(packet(245, integer(204, verdict), RESULT))
    pc.send_packet(244)
    assert pc.read_frame() == ACK
    assert pc.read_frame() == answer
    trace.wait_served()
    trace.expect(
        "receive command id: 244(0xF4) - (undefined)", "amt_modem_boot_dl_fin_read()",
        "amt_modem_boot_dl_fin_read.",
        "amt_boot_dl_fin_read start.", "will call amt_check_system_sanity.",
        f"stop call amt_check_system_sanity. return value:{verdict}.",
        f"amt_modem_boot_dl_fin_read finished. flag:{verdict}; ret_val:0.", dump(PC_OUT, answer))
    assert trace.calls() == [f"amt_check_system_sanity() = {verdict}"]


@pytest.mark.parametrize("library", [None, b"no library"])
def test_boot_download_flag_without_the_library(make_handset: HandsetFactory,
                                                library: bytes | None) -> None:
    pc = PcChannel(make_handset("pc"))
    pc.handset.place("/system/lib/hw/amt.tq5530.misc.so", library)
    trace = PcTrace(pc.handset)
    pc.send_packet(244)
    assert pc.read_frame() == ACK
    assert pc.read_frame() == wire.encode_envelope(refusal(244, NOT_SERVED))
    trace.wait_served()
    trace.expect("amt_modem_boot_dl_fin_read.", "amt_boot_dl_fin_read start.",
                 "amt_modem_boot_dl_fin_read finished. flag:0; ret_val:-118.", "read error")


def test_boot_download_flag_without_the_entry(make_handset: HandsetFactory) -> None:
    pc = PcChannel(make_handset("pc"))
    other = pc.handset.path("/system/lib/liblog.so").read_bytes()
    pc.handset.place("/system/lib/hw/amt.tq5530.misc.so", other)
    trace = PcTrace(pc.handset)
    pc.send_packet(244)
    assert pc.read_frame() == ACK
    assert pc.read_frame() == wire.encode_envelope(refusal(244, NOT_SERVED))
    trace.wait_served()
    trace.expect("amt_modem_boot_dl_fin_read finished. flag:0; ret_val:-118.", "read error")
