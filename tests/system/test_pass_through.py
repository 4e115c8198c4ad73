"""Everything else on the PC line is the modem's: unchanged, both ways, also after it was away."""

import random
import re

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import OK, PcChannel, integer, packet, raw
from support.trace import TAG, error_line
from support.traffic import MODEM_IN, MODEM_OUT, PC_IN, PcTrace, dump

EIO, NO_ENTRY = 5, 2
REOPENED = re.compile(r"pub_util_try_to_open_device, handle_context_st\.m_fd_modem  = \d+, "
                      r"amt_cfg_st\.m_tty_modem_a = /dev/ttyMODEM0\\n")
EMPTY = "modem read empty data"


def to_modem(handset: Handset, data: bytes) -> PcTrace:
    """The station says DATA in one piece; the modem gets just that."""
    trace = PcTrace(handset)
    handset.pc.write(data)
    assert handset.modem.read_exactly(len(data)) == data
    trace.wait_served()
    trace.expect(dump(PC_IN, data), dump(MODEM_OUT, data))
    return trace


def to_pc(handset: Handset, data: bytes) -> PcTrace:
    """The modem says DATA in one piece; the station gets just that, in one piece."""
    trace = PcTrace(handset)
    handset.modem.write(data)
    handset.log.wait(f"write to pc, m_buf_len={len(data)}, write_len={len(data)}")
    assert handset.pc.read_exactly(len(data)) == data
    trace.expect(dump(MODEM_IN, data), "g_cur_treat_cmd_type:0;",
                 f"write to pc, m_buf_len={len(data)}, write_len={len(data)}")
    return trace


def test_text_and_bytes_go_to_the_modem_unchanged(pc_handset: Handset) -> None:
    pc_handset.modem.open()
    noise = random.Random(7).randbytes(700)
    for data in (b"x", b"ATD123;\r", b"AT+CGMI\r\nAT+CGMM\r\n", bytes(range(256)), b"\0" * 20,
                 b"\r", b"\x1a", b"\x03\x04\x11\x13\x7f\xff", b"\r\n" * 30, noise):
        to_modem(pc_handset, data)


def test_packets_of_unserved_ids_go_to_the_modem_unchanged(pc: PcChannel) -> None:
    pc.handset.modem.open()
    for request in (packet(7), packet(153, raw(62, bytes(range(256)))),
                    packet(49, integer(2, -1), raw(4, b"\0" * 800))):
        to_modem(pc.handset, wire.encode_envelope(request))
    # And the modem's answer to one comes back as it is.
    to_pc(pc.handset, wire.encode_envelope(packet(8, integer(1, 0), raw(21, b"8" * 15))))


def test_chunks_of_the_modem_stay_chunks(pc_handset: Handset) -> None:
    pc_handset.pc.open()
    for data in (b"\r", b"\nO", b"K\r\n", b"\0", bytes(range(256)), b"AT\r", b"RING\r\n" * 100):
        to_pc(pc_handset, data)
    # The readers do not see each other's lines: nothing of it was taken for a request.
    assert not [text for text in pc_handset.log.texts(TAG) if text.startswith(PC_IN)]


def test_much_data_passes_whole(pc_handset: Handset) -> None:
    # More than a buffer holds and more than a tty takes at once, in both directions.
    data = bytes(random.Random(11).choices(range(32, 127), k=60_000))
    pc_handset.modem.open()
    mark = pc_handset.log.mark()
    for source, target in ((pc_handset.pc, pc_handset.modem), (pc_handset.modem, pc_handset.pc)):
        got = b""
        for place in range(0, len(data), 3000):
            source.write(data[place:place + 3000])
            while len(got) < place + 3000:
                got += target.read()
        assert got == data
    sizes = [int(size) for text in pc_handset.log.texts(TAG, mark)
             for size in re.findall(r"\(data_len = (\d+)\)", text)]
    assert max(sizes) <= 4095


def test_both_directions_at_once(pc_handset: Handset) -> None:
    up, down = (bytes(random.Random(seed).choices(b"ABCDE", k=20_000)) for seed in (1, 2))
    lines = {"pc": pc_handset.pc.open(), "modem": pc_handset.modem.open()}
    got = {"pc": b"", "modem": b""}
    for place in range(0, 20_000, 1000):
        lines["pc"].write(up[place:place + 1000])
        lines["modem"].write(down[place:place + 1000])
        for name in ("pc", "modem"):
            while len(got[name]) < place + 1000:
                got[name] += lines[name].read()
    assert got == {"pc": down, "modem": up}


def test_own_commands_do_not_reach_the_modem(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc_handset.modem.open()
    pc.at("AT^DBTADDR=?", OK)
    pc.request(176)
    pc_handset.modem.expect_silence(0.1)


# the modem goes and comes back


def test_modem_tty_vanishes_and_comes_back(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    mark = pc_handset.log.mark()
    pc_handset.modem.hang_up()
    # The reader goes on: a read that brings nothing is no reason to end.
    wait_until(lambda: pc_handset.log.texts(TAG, mark).count(EMPTY) >= 3, "three empty reads")
    texts = pc_handset.log.texts(TAG, mark)
    place = texts.index(EMPTY, texts.index(EMPTY) + 1)
    assert re.fullmatch(r"read_modem_loop, read ready, m_fd_modem=\d+", texts[place - 2])
    assert texts[place - 1] == "WARNING !"
    assert not [text for text in texts if text.startswith("write to pc")], "of nothing"
    # What needs no modem is served meanwhile.
    pc.at("AT^DBTADDR=?", OK)
    assert pc.request(176).result == 0

    # The next text for the modem finds out, is lost, and brings the line back.
    pc_handset.modem.come_back(held=True)
    trace = PcTrace(pc_handset)
    pc.send(b"ATI\r")
    trace.wait_served()
    trace.expect(f"write error 1, errno[{EIO}]", REOPENED, dump(MODEM_OUT, b""))
    pc.expect_silence(0.1)
    to_modem(pc_handset, b"AT+CGMR\r")
    to_pc(pc_handset, b"\r\nKEL\r\n\r\nOK\r\n")
    assert pc_handset.exits() == []


def test_absent_modem_is_waited_for(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc_handset.modem.hang_up()
    mark = pc_handset.log.mark()
    trace = PcTrace(pc_handset)
    pc.send(b"ATI\r")
    pc_handset.log.wait('(1/60)try to open device "/dev/ttyMODEM0"', after=mark)
    pc_handset.modem.come_back(held=True)
    trace.wait_served()
    trace.expect(f"write error 1, errno[{EIO}]", REOPENED, dump(MODEM_OUT, b""))
    assert pc_handset.log.find(error_line("pub_util_try_to_open_device", -118, NO_ENTRY,
                                          "util/util"), mark)
    to_modem(pc_handset, b"ATI\r")


def test_serial_modem_line_is_set_again(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", modem="held", config={
        "vx.tty.modem": "/dev/ttyS1", "vx.modem.uart.amt.default.baudrate": "230400",
        "vx.modem.uart.at.default.baudrate": "921600"})
    handset.modem.hang_up()
    handset.modem.come_back(held=True)
    mark = handset.log.mark()
    trace = PcTrace(handset)
    handset.pc.write(b"ATI\r")
    trace.wait_served()
    assert handset.log.find("convert speed 230400 -> B230400", mark)
    shown = handset.run(["/usr/bin/stty", "-a", "-F", "/dev/ttyS1"]).stdout.decode()
    assert "speed 230400 baud" in shown
    assert {"-echo", "-icanon"} <= set(re.split(r"[;\s]+", shown))


def test_identity_write_survives_the_loss_of_the_modem(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc_handset.modem.hang_up()
    pc_handset.modem.come_back(held=True)
    trace = PcTrace(pc_handset)
    pc.send(b"AT^DCGSNW=350000000000017\r")
    trace.wait_served()
    trace.expect("getted parameter:350000000000017. prefix:AT^DCGSNW=; rtn:0.",
                 f"write error 1, errno[{EIO}]", REOPENED)
    # The write is pending still: the repeated command is what the modem answers.
    to_modem(pc_handset, b"AT^DCGSNW=350000000000017\r")
    pc_handset.modem.write(OK.encode())
    assert pc_handset.pc.read_exactly(6) == OK.encode()
    assert pc_handset.text("/amt/imei.txt") == "350000000000017"
