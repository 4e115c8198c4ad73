"""Text and bytes that nobody asked for, on every line: the daemon lives and serves what is next."""

import random
import re
import signal

from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import OK, AppChannel, PcChannel, integer, packet, string
from support.registrations import APP_ROWS
from support.trace import TAG
from support.traffic import PC_IN, PcTrace

PROBE, REWRITTEN = b"AT\r", b"AT;^DLKS=1\r"
GPS_TEST = wire.encode_envelope(packet(176))
GPS_ANSWER = packet(175, integer(1, 0))
WIFI_FILE = "/amt/WIFI/WIFI_nvram.txt"
READ_WIFI = wire.encode_envelope(packet(185, integer(152, 0)))
WIFI_ANSWER = packet(186, string(153, "12:34"), integer(1, 0))
UNSERVED = bytes(sorted(set(range(256)) - set(APP_ROWS)))


def expect_served(pc: PcChannel) -> None:
    """Both kinds of request are answered."""
    pc.at("AT^DBTADDR=?", OK)
    assert pc.request(176) == GPS_ANSWER


def pass_on(pc: PcChannel, data: bytes, wanted: bytes | None = None) -> None:
    """What is said reaches the modem."""
    trace = PcTrace(pc.handset)
    pc.send(data)
    wanted = data if wanted is None else wanted
    assert pc.handset.modem.read_exactly(len(wanted)) == wanted
    trace.wait_served()


# the PC line


def test_garbage_goes_to_the_modem(pc: PcChannel) -> None:
    pc.handset.modem.open()
    for seed in range(8):
        pass_on(pc, random.Random(seed).randbytes(1 + 97 * seed))
    expect_served(pc)


def test_garbage_around_a_command(pc: PcChannel) -> None:
    for before, behind in ((b"\xff\xfe\x80", b""), (b"\r\n\r\n", b"\r\n"), (b"AT+X;", b"\0\0"),
                           (b"x" * 1500, b"y" * 200), (GPS_TEST[:4], b""), (b"AT\rATI\r", b""),
                           (b"x\0", b""), (b"\0" * 16, b"\0")):
        pc.send(before + b"AT^DBTADDR=?\r" + behind)
        assert pc.line.read_exactly(6) == OK.encode()
    pc.handset.modem.open()
    expect_served(pc)


def test_probe_between_the_pieces_of_a_packet(pc: PcChannel) -> None:
    pc.handset.modem.open()
    pc.handset.place(WIFI_FILE, "12:34\n")
    # A piece that has no room for an envelope is text, and so is the rest of it.
    for cut in (1, 4, 12, 16):
        pass_on(pc, READ_WIFI[:cut])
        pass_on(pc, PROBE, REWRITTEN)
        pass_on(pc, READ_WIFI[cut:])
        assert pc.request(185, integer(152, 0)) == WIFI_ANSWER
    # A longer one is served as far as it goes: without its atom it means 0 here, too.
    for cut in (17, 18, 20, 21):
        pc.send(READ_WIFI[:cut])
        pc.expect_acknowledgement()
        assert pc.read_packet() == WIFI_ANSWER
        pass_on(pc, PROBE, REWRITTEN)
        pass_on(pc, READ_WIFI[cut:])
    expect_served(pc)


def test_probe_inside_a_packet_at_any_place(pc: PcChannel) -> None:
    pc.handset.modem.open()
    for place in range(len(GPS_TEST) + 1):
        data = GPS_TEST[:place] + PROBE + GPS_TEST[place:]
        is_served = data[:4] == wire.MAGIC and data[12 + 3] == 176
        assert is_served == (place >= 16)
        if is_served:
            pc.send(data)
            pc.expect_acknowledgement()
            assert pc.read_packet() == GPS_ANSWER
        else:
            pass_on(pc, data)
    expect_served(pc)


def wait_another_start(handset: Handset, before: int) -> None:
    wait_until(lambda: handset.pid not in (0, before) or None, "another start")


def test_probe_inside_an_atom(pc: PcChannel) -> None:
    handset = pc.handset
    handset.place(WIFI_FILE, "12:34\n")
    for place in (18, 19):
        pc.send(READ_WIFI[:place] + PROBE + READ_WIFI[place:])
        pc.expect_acknowledgement()
        assert pc.read_packet() == WIFI_ANSWER
    # Where it makes the number's length a lie, the process ends, as on any such atom; init starts
    # it again.
    for ended, place in enumerate((20, 21, 22)):
        first = handset.pid
        pc.send(READ_WIFI[:place] + PROBE + READ_WIFI[place:])
        pc.expect_acknowledgement()
        assert handset.wait_exit(ended) == -signal.SIGABRT
        wait_another_start(handset, first)
        handset.wait_ready()
        expect_served(pc)


def test_merged_requests_are_one(pc: PcChannel) -> None:
    pc.handset.place(WIFI_FILE, "12:34\n")
    pc.send(GPS_TEST + READ_WIFI)
    pc.expect_acknowledgement()
    assert pc.read_packet() == GPS_ANSWER
    pc.send(GPS_TEST + b"AT^DBTADDR=?\r")
    pc.expect_acknowledgement()
    assert pc.read_packet() == GPS_ANSWER
    pc.send(b"AT^DBTADDR=?\r" + GPS_TEST)
    assert pc.line.read_exactly(6) == OK.encode()
    pc.send(b"AT^DWIFIADDR=?\rAT^DBTADDR?\rAT^DBTADDR=?\r")
    # The one that is looked for first is the only one answered.
    assert pc.line.read_exactly(len(b"\r\n+CME ERROR: 100\r\n")) == b"\r\n+CME ERROR: 100\r\n"
    pc.expect_silence(0.1)
    expect_served(pc)


def test_split_text_is_not_put_together(pc: PcChannel) -> None:
    pc.handset.modem.open()
    for piece in (b"AT^DBTA", b"DDR=?\r", b"A", b"T", b"\r"):
        pass_on(pc, piece)
    expect_served(pc)


def test_over_long_input(pc: PcChannel) -> None:
    handset = pc.handset
    handset.modem.open()
    mark = handset.log.mark()
    frame = wire.encode_envelope(packet(176, string(99, "x" * 3900)))
    data = frame[:-4] + b"y" * 6000
    pc.send(data)
    pc.expect_acknowledgement()
    assert pc.read_packet() == GPS_ANSWER

    def rest() -> int:
        first = [text for text in handset.log.texts(TAG, mark) if text.startswith(PC_IN)][0]
        size = re.search(r"data_len = (\d+)", first)
        assert size and 17 <= int(size[1]) <= 4095
        return len(data) - int(size[1])

    # What one read held was the request. The rest is text, whatever it was meant to be.
    assert handset.modem.read_exactly(rest()) == data[-rest():]
    pc.expect_silence(0.1)
    expect_served(pc)


def test_garbage_of_the_modem_reaches_the_pc(pc: PcChannel) -> None:
    garbage = random.Random(5).randbytes(9000) + wire.MAGIC * 5 + b"\r\nOK\r\n\0\0AT\r"
    pc.handset.modem.write(garbage)
    assert pc.line.read_exactly(len(garbage)) == garbage
    pc.handset.modem.close()
    expect_served(pc)
    pc.at("AT", OK)


# the app line


def test_text_on_the_app_line_is_refused(app: AppChannel) -> None:
    # The byte at the id's place is the id, of whatever it is.
    for text in (b"A", b"AT\r", b"AT\r\n", b"AT^DBTADDR=?\r", b"\0\0\0\xff"):
        number = text[3] if len(text) > 3 else 0
        app.send(text)
        assert app.read_packet() == packet(number + 1 & 0xFF, integer(1, 1)), text
    assert app.request(9).result == 0


def test_garbage_on_the_app_line(app: AppChannel) -> None:
    for seed in range(5):
        garbage = bytes(random.Random(seed).choices(UNSERVED, k=4 + 300 * seed))
        app.send(garbage)
        assert app.read_packet() == packet(garbage[3] + 1 & 0xFF, integer(1, 1))
    assert app.request(9).result == 0


def test_over_long_input_on_the_app_line(app: AppChannel) -> None:
    mark = app.handset.log.mark()
    app.send(b"\xc8" * 9000)

    def sizes() -> list[int]:
        found = [re.match(r"handle APP req data: : \(data_len = (\d+)\)", text)
                 for text in app.handset.log.texts(TAG, mark)]
        return [int(match[1]) for match in found if match]

    wait_until(lambda: sum(sizes()) == 9000 or None, "all of it to be read")
    for size in sizes():
        # Where the pieces end is the kernel's choice; one that ends before its id has the id 0.
        refused = 200 if size > 3 else 0
        assert app.read_packet() == packet(refused + 1, integer(1, 1))
    assert max(sizes()) <= 4095
    assert app.request(9).result == 0


def test_split_and_merged_packets_on_the_app_line(app: AppChannel) -> None:
    request = packet(9).encode()
    # The header is enough to be served; what is left is a request of its own.
    app.send(request[:4])
    assert app.read_packet().command == 10
    app.send(request[4:])
    assert app.read_packet() == packet(1, integer(1, 1))
    app.send(request[:3])
    assert app.read_packet() == packet(1, integer(1, 1))
    app.send(request * 3)
    assert app.read_packet().command == 10
    app.expect_silence(0.1)
    assert app.request(9).result == 0


# the AT channel of the packet path


def test_garbage_of_the_modem_on_the_at_channel(packet_handset: Handset) -> None:
    app = AppChannel(packet_handset)
    mux = packet_handset.mux.open()
    for garbage in (b"\0\xff\r\n" * 10, random.Random(3).randbytes(1500)):
        app.send_packet(85)
        assert mux.read_exactly(8) == b"AT^DMSN\r"
        mux.write(garbage + b"\r\n^DMSN: 77\r\n\r\nOK\r\n")
        assert app.read_packet() == packet(86, string(38, "77"), integer(1, 0))
    # An answer that never ends fills the area: refused, and forgotten by the next request.
    app.send_packet(85)
    assert mux.read_exactly(8) == b"AT^DMSN\r"
    mux.write(b"z" * 4096)
    assert app.read_packet() == packet(86, integer(1, 10))
    app.send_packet(85)
    assert mux.read_exactly(8) == b"AT^DMSN\r"
    mux.write(b"\r\n^DMSN: 78\r\n\r\nOK\r\n")
    assert app.read_packet() == packet(86, string(38, "78"), integer(1, 0))
