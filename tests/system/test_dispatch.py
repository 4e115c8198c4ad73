"""How a packet of the PC line finds its handler: acknowledgement, answer, refusal, hand-over."""

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_station import wire
from support.channels import ACK, OK, PcChannel, flag, integer, packet, string
from support.trace import error_line
from support.traffic import MODEM_OUT, PC_IN, PC_OUT, PcTrace, dump

GPS_TEST, GPS_TEST_ANSWER = 176, packet(175, integer(1, 0))

# One request an id that its handler serves without a long test, and the id of the answer.
SERVED = {
    174: ((integer(140, 0),), 175), 176: ((), 175), 178: ((integer(141, 3),), 179),
    172: ((integer(110, 1),), 173), 185: ((integer(152, 0),), 186),
    187: ((flag(154, 1),), 188), 191: ((integer(160, 0),), 192), 193: ((flag(190, 1),), 194),
    219: ((integer(194, 0),), 220), 224: ((), 225), 226: ((), 227), 240: ((), 241),
    244: ((), 245), 246: ((), 247),
}
FILES = {"/amt/BT/BT_Address.txt": "00:11:22:33:44:55\n", "/amt/sn-2.txt": "PCBA-1",
         "/amt/WIFI/WIFI_nvram.txt": "00:11:22:33:44:66\n", "/amt/usb_serial": "ADB1"}


def hand_over(handset: Handset, request: wire.Packet) -> PcTrace:
    """Send a packet that no handler claims; the modem must get it unchanged, the PC nothing."""
    trace = PcTrace(handset)
    frame = wire.encode_envelope(request)
    handset.pc.write(frame)
    assert handset.modem.read_exactly(len(frame)) == frame
    trace.wait_served()
    trace.expect_none(dump(PC_OUT, ACK))
    return trace


def test_acknowledgement_answer_and_their_log(pc: PcChannel) -> None:
    trace = PcTrace(pc.handset)
    pc.send_packet(GPS_TEST)
    assert pc.read_frame() == ACK
    frame = pc.read_frame()
    assert wire.decode_envelope(frame) == GPS_TEST_ANSWER
    trace.wait_served()
    trace.expect(
        dump(PC_IN, wire.encode_envelope(packet(GPS_TEST))), "amt_convert_pc_2_app()",
        "receive command id: 176(0xB0) - AMT_GPS_TEST_CMD", dump(PC_OUT, ACK),
        "amt_convert_app_2_pc()", dump(PC_OUT, frame), "handle_amt_imei_and_sn--->req_id_en:176.")
    # It was in mode 1 before, and no modem was asked.
    trace.expect_none("mark to enter amt1")
    assert not [text for text in trace.texts() if text.startswith(MODEM_OUT)]


def test_a_long_request_is_shown_in_part(pc: PcChannel) -> None:
    for size, shown in ((250, False), (251, True), (900, True)):
        filler = "x" * (size - len(wire.encode_envelope(packet(GPS_TEST, string(99, "")))))
        frame = wire.encode_envelope(packet(GPS_TEST, string(99, filler)))
        trace = PcTrace(pc.handset)
        pc.send(frame)
        pc.expect_acknowledgement()
        assert pc.read_packet() == GPS_TEST_ANSWER
        trace.wait_served()
        trace.expect(dump(PC_IN, frame))
        assert dump(PC_IN, frame).endswith("...") == shown


def test_packets_lead_back_to_mode_1(pc: PcChannel) -> None:
    trace = PcTrace(pc.handset)
    pc.at("AT", OK)
    pc.request(GPS_TEST)
    pc.request(GPS_TEST)
    pc.handset.log.wait("handle_amt_imei_and_sn--->req_id_en:176.")
    trace.expect("mark to enter amt4", "receive command id: 176(0xB0) - AMT_GPS_TEST_CMD",
                 "mark to enter amt1", dump(PC_OUT, ACK))
    assert trace.texts().count("mark to enter amt1") == 1


def test_every_served_id_is_acknowledged_first(make_handset: HandsetFactory) -> None:
    pc = PcChannel(make_handset("pc", files=FILES))
    for command, (atoms, answer) in SERVED.items():
        pc.send_packet(command, *atoms)
        assert pc.read_frame() == ACK, command
        assert pc.read_packet().command == answer, command


def test_bluetooth_is_acknowledged_once_and_answered_twice(pc: PcChannel) -> None:
    pc.send_packet(170)
    assert pc.read_frame() == ACK
    for _ in range(2):
        assert pc.read_packet() == packet(171, integer(1, 0))


def test_version_acknowledges_by_itself(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    trace = PcTrace(pc_handset)
    answer = pc.request(45, integer(19, 32))
    assert (answer.command, answer.get_int(19), answer.result) == (46, 32, 0)
    trace.wait_served()
    # Type known, then acknowledged: once.
    trace.expect("receive command id: 45(0x2D) - AMT_VERSION_CMD",
                 "version type: 0x20 - AMT_HARDWARE_MODULE", dump(PC_OUT, ACK))
    assert trace.texts().count(dump(PC_OUT, ACK)) == 1

    # The modem's own versions are handed over, without an acknowledgement.
    pc_handset.modem.open()
    for module in (17, 18):
        hand_over(pc_handset, packet(45, integer(19, module))).expect(
            f"version type: 0x{module:02x} - AMT_{'L1' if module == 17 else 'HLS'}_MODULE",
            "handle_amt_imei_and_sn--->req_id_en:45.")

    # An unknown module is refused, without one too.
    trace = PcTrace(pc_handset)
    pc.send_packet(45, integer(19, 2))
    assert pc.read_packet() == packet(46, integer(1, 1))
    trace.wait_served()
    trace.expect_none(dump(PC_OUT, ACK))


def test_verdict_of_the_pc_is_never_acknowledged(pc: PcChannel) -> None:
    trace = PcTrace(pc.handset)
    pc.send_packet(91, integer(36, 1), integer(37, 1))
    assert pc.read_packet().command == 92
    trace.wait_served()
    trace.expect("receive command id: 91(0x5B) - AMT_WRITE_TEST_RESULT_CMD")
    trace.expect_none(dump(PC_OUT, ACK))


def test_refusal_follows_the_acknowledgement(pc: PcChannel) -> None:
    trace = PcTrace(pc.handset)
    pc.send_packet(193, flag(190, 1))  # no number is there yet
    assert pc.read_frame() == ACK
    assert pc.read_packet() == packet(194, integer(1, 1))
    trace.wait_served()
    trace.expect(dump(PC_OUT, ACK), error_line("amt_handle_board_pcba_ctrl", -100),
                 "read error.", "handle_amt_imei_and_sn--->req_id_en:193.",
                 dump(PC_OUT, wire.encode_envelope(packet(194, integer(1, 1)))))


def test_any_failing_status_is_refused_alike(pc: PcChannel) -> None:
    pc.handset.answer("enter_idle", "-1", "-100", "7", "0")
    assert pc.request(240) == packet(241, integer(1, 1))
    # What is held is dispatched again with each byte that follows.
    for result in (1, 1, 0):
        pc.send(b"\r")
        pc.expect_acknowledgement()
        assert pc.read_packet() == packet(241, integer(1, result))


def test_not_handled_goes_on_to_the_modem(make_handset: HandsetFactory) -> None:
    # -104 means "not here", whoever says it; it has been acknowledged by then.
    handset = make_handset("pc", answers={"enter_idle": "-104"})
    handset.modem.open()
    pc = PcChannel(handset)
    pc.send_packet(240)
    assert pc.read_frame() == ACK
    frame = wire.encode_envelope(packet(240))
    assert handset.modem.read_exactly(len(frame)) == frame
    pc.expect_silence(0.1)
    assert pc.request(GPS_TEST) == GPS_TEST_ANSWER, "nothing is held"


def test_ids_without_a_handler_are_handed_over(pc_handset: Handset) -> None:
    pc_handset.modem.open()
    for command, name in ((0, "AMT_NONE_CMD"), (9, "AMT_READ_BATTERY_CMD"),
                          (46, "AMT_VERSION_RSPCMD"), (200, "(undefined)"), (254, "(undefined)"),
                          (255, "(undefined)")):
        request = packet(command, integer(5, 7))
        hand_over(pc_handset, request).expect(
            f"receive command id: {command}(0x{command:02X}) - {name}",
            f"handle_context_st.m_handle_pc_func_a[{command}] =(nil)",
            f"handle_amt_imei_and_sn--->req_id_en:{command}.",
            dump(MODEM_OUT, wire.encode_envelope(request)))


def test_what_is_no_envelope_is_text(pc_handset: Handset) -> None:
    pc_handset.modem.open()
    frame = wire.encode_envelope(packet(GPS_TEST))
    for data in (frame[:16], b"\xab" + frame[1:], frame[1:], packet(GPS_TEST).encode() * 3):
        trace = PcTrace(pc_handset)
        pc_handset.pc.write(data)
        assert pc_handset.modem.read_exactly(len(data)) == data
        trace.wait_served()
        trace.expect(dump(PC_IN, data), "amt_convert_pc_2_app()",
                     "handle_context_st.m_handle_pc_func_a[255] =(nil)",
                     "handle_amt_imei_and_sn--->req_id_en:255.", dump(MODEM_OUT, data))
        assert not [text for text in trace.texts() if text.startswith("receive command id")]


def test_envelope_is_trusted_once_its_magic_fits(pc: PcChannel) -> None:
    frame = bytearray(wire.encode_envelope(packet(GPS_TEST)))
    frame[4:12] = b"\xff" * 8  # length and flags
    frame[-4:] = b"\0" * 4     # checksum
    pc.send(bytes(frame))
    pc.expect_acknowledgement()
    assert pc.read_packet() == GPS_TEST_ANSWER
