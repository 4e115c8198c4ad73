"""Refused requests of the PC line: they stay, and are dispatched again with what comes next."""

from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import OK, PcChannel, flag, integer, packet, string
from support.trace import TAG, error_line
from support.traffic import PC_IN, PcTrace, dump

REFUSED_TEXT = b"AT^DPCBACTRL=2\r"
NO_PACKET_REFUSED = packet(0, integer(1, 1))
READ_PCBA = packet(193, flag(190, 1))
PCBA_REFUSED = packet(194, integer(1, 1))
PCBA_FILE = "/amt/sn-2.txt"
HELD_SIZE = 4095
EMPTY = "pc read empty data"


def refuse_text(pc: PcChannel, sent: bytes, held: bytes) -> None:
    """Send bytes that make the held text refused once more."""
    trace = PcTrace(pc.handset)
    pc.send(sent)
    assert pc.read_packet() == NO_PACKET_REFUSED
    trace.wait_served()
    trace.expect(dump(PC_IN, held), error_line("amt_at_control_pcba", -101), "pcba-sn is null!!!")


def refuse_packet(pc: PcChannel, sent: bytes, held: bytes) -> None:
    """Send bytes that make the held packet refused once more."""
    trace = PcTrace(pc.handset)
    pc.send(sent)
    pc.expect_acknowledgement()
    assert pc.read_packet() == PCBA_REFUSED
    trace.wait_served()
    trace.expect(dump(PC_IN, held), "receive command id: 193(0xC1) - AMT_BOARD_PCBA_CTRL_CMD",
                 "read error.")


def test_text_is_held_until_a_command_before_it_flushes(pc: PcChannel) -> None:
    pc.handset.modem.open()
    held = REFUSED_TEXT
    refuse_text(pc, REFUSED_TEXT, held)
    # Whatever follows is appended; what would be the modem's, or a command looked for later, is
    # refused along with it.
    for more in (b"x", b"ATI\r", b"AT\r", b"AT^DAMT1=2\r", b"\0", b"AT^DENTERIDLE\r"):
        held += more
        refuse_text(pc, more, held)
    pc.expect_silence(0.1)
    pc.handset.modem.expect_silence(0.1)


def test_flush_by_a_command_that_is_looked_for_first(pc: PcChannel) -> None:
    held = b""
    for more in (REFUSED_TEXT, b"AT^DAMT1=\r", b"rest"):
        held += more
        refuse_text(pc, more, held)
    trace = PcTrace(pc.handset)
    pc.at("AT^DBTADDR=?", OK)
    trace.wait_served()
    trace.expect(dump(PC_IN, held + b"AT^DBTADDR=?\r"))
    # Clean again.
    trace = PcTrace(pc.handset)
    pc.at("AT^DAMT1=2", "\r\n^DAMT1: 1\r\n\r\nOK\r\n")
    trace.wait_served()
    trace.expect(dump(PC_IN, b"AT^DAMT1=2\r"))


def test_packet_behind_held_text_is_text(pc: PcChannel) -> None:
    frame = wire.encode_envelope(packet(176))
    refuse_text(pc, REFUSED_TEXT, REFUSED_TEXT)
    refuse_text(pc, frame, REFUSED_TEXT + frame)
    # A flush is found behind the packet with its zero bytes too, and everything held is forgotten.
    pc.at("AT^DBTADDR=?", OK)
    pc.at("AT^DBTADDR=?", OK)


def test_packet_is_dispatched_again_with_the_next_bytes(pc: PcChannel) -> None:
    held = wire.encode_envelope(READ_PCBA)
    refuse_packet(pc, held, held)
    for more in (b"\r", b"AT\r", b"AT^DBTADDR=?\r", wire.encode_envelope(packet(176))):
        held += more
        refuse_packet(pc, more, held)
    # Once its cause is gone it is served with the next byte, and everything held is forgotten.
    pc.handset.place(PCBA_FILE, "PCBA-7")
    pc.send(b"\r")
    pc.expect_acknowledgement()
    assert pc.read_packet() == packet(194, string(191, "PCBA-7"), integer(1, 0))
    pc.at("AT^DBTADDR=?", OK)


def test_refused_app_requests_are_forgotten(packet_handset: Handset) -> None:
    packet_handset.app.open()
    refused = packet(200)
    for _ in range(3):
        packet_handset.app.write(refused.encode())
        wanted = packet(201, integer(1, 1)).encode()
        assert packet_handset.app.read_exactly(len(wanted)) == wanted


def test_replug_forgets_what_is_held(pc: PcChannel) -> None:
    handset = pc.handset
    frame = wire.encode_envelope(READ_PCBA)
    refuse_packet(pc, frame, frame)
    first = handset.pid
    handset.usb.unplug()
    assert handset.wait_exit() == 0
    wait_until(lambda: handset.pid not in (0, first) or None, "another start")
    handset.wait_ready()
    pc.at("AT^DBTADDR=?", OK)
    assert pc.request(176) == packet(175, integer(1, 0))


def test_full_buffer_waits_for_a_replug(pc: PcChannel) -> None:
    handset = pc.handset
    mark = handset.log.mark()
    refuse_text(pc, REFUSED_TEXT, REFUSED_TEXT)
    left = HELD_SIZE - len(REFUSED_TEXT)
    while left:
        size = min(left, 1000)
        refuse_text(pc, b"x" * size, REFUSED_TEXT + b"x" * (HELD_SIZE - len(REFUSED_TEXT)
                                                            - left + size))
        left -= size
    # There is no room: reads give nothing, and what is sent now stays in the tty.
    wait_until(lambda: handset.log.texts(TAG, mark).count(EMPTY) >= 3, "three empty reads")
    pc.send(b"AT^DBTADDR=?\r")
    pc.expect_silence(0.3)
    texts = handset.log.texts(TAG, mark)
    place = texts.index(EMPTY)
    assert texts[place - 1] == "WARNING !"
    assert not [text for text in texts[place:] if text.startswith(PC_IN)]
    # The modem is heard all the same.
    handset.modem.write(b"\r\nRING\r\n")
    assert pc.line.read_exactly(8) == b"\r\nRING\r\n"
    handset.modem.close()
    first = handset.pid
    handset.usb.unplug()
    assert handset.wait_exit() == 0
    wait_until(lambda: handset.pid not in (0, first) or None, "another start")
    handset.wait_ready()
    pc.at("AT^DWIFIADDR=?", OK)
