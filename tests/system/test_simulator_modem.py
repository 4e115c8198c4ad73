"""The simulated modem: its table, its memory, its packets, and how a test replaces it."""

import pytest

from amt_simulator import Handset
from amt_station.wire.escapes import unescape
from amt_simulator.inside import modem_table
from amt_simulator.inside.modem import Modem, Conversation
from amt_station import wire
from amt_station.requests.model import Channel
from amt_station.requests.table import REQUESTS
from support.channels import PcChannel, integer, packet, raw, string
from support.modem_desk import ERROR, OK


@pytest.fixture
def tty() -> Conversation:
    """A tty of a fresh modem."""
    return Conversation(Modem())


def info(text: str) -> bytes:
    """An information line and the final result."""
    return f"\r\n{text}\r\n".encode() + OK


@pytest.mark.parametrize("command, answer", [
    ("AT", OK), ("at", OK), ("ATE0", OK), ("AT;^DLKS=1", OK), ("AT^DLKS=0", OK),
    ("ATI", info("Handset Works KEL-1")), ("AT+CGMI", info("Handset Works")),
    ("AT+CGSN", info("860000000000017")), ("AT^DMSN", info("^DMSN: KEL0000000000001")),
    ("AT^DMFD??", info("^DMFD: 20130121")), ("AT^DMCC?", info("^DMCC: 2,2,1,3")),
    ("AT^DTOC", info("^DTOC: 1")), ("AT^DSWAMT=1", OK), ("AT^DMPCHN=1", OK),
    ("AT^DCMR=17", info("^DCMR: 17,0D4B454C2D31204C3120312E31372E300A0A")),
    ("AT^DCMR=3", b"\r\n+CME ERROR: 50\r\n"), ("AT^DMSN=?", OK),
    ("AT+CGSN;^DLKS?", b"\r\n860000000000017\r\n\r\n^DLKS: 0\r\n" + OK),
    ("AT^DATOMR=1,5", info("^DATOMR: 5,0")), ("AT^DCGSNW=", b"\r\n+CME ERROR: 50\r\n"),
    ("AT^NOSUCH", ERROR), ("ATQ9", ERROR), ("hello", b""), ("", b""),
    ("AT^DMSN;^NOSUCH", b"\r\n^DMSN: KEL0000000000001\r\n" + ERROR),
])
def test_commands(tty: Conversation, command: str, answer: bytes) -> None:
    """Each command has its answer; text that is no command has none."""
    assert tty.feed(command.encode() + b"\r") == answer


def test_every_row_answers(tty: Conversation) -> None:
    """No row of the table is dead: each gives a final result, none plain ERROR."""
    operands = {"^DATOMR=": "1,2", "^DATOMW=": "1,2", "^DCMR=": "18", "^DTTEST=": "07"}
    for row in modem_table.COMMANDS:
        operand = operands.get(row.command, "1") if row.command.endswith("=") else ""
        answer = tty.feed(f"AT{row.command}{operand}\r".encode())
        assert answer.endswith(OK), (row, answer)


def test_what_is_written_is_remembered(tty: Conversation) -> None:
    """Identities by channel, results by station."""
    for line in ("AT^DCGSNW=111", 'AT^DMSN="S0"', "AT^DMPCHN=1", "AT^DCGSNW=222",
                 "AT^DATOMW=7,2,it, failed"):
        assert tty.feed(line.encode() + b"\r") == OK
    assert tty.feed(b"AT+CGSN\r") == info("222")
    assert tty.feed(b"AT^DATOMR=1,7\r") == info("^DATOMR: 7,2,it, failed")
    tty.feed(b"AT^DMPCHN=0\r")
    assert tty.feed(b"AT+CGSN;^DMSN\r") == b"\r\n111\r\n\r\n^DMSN: S0\r\n" + OK


def test_ttys_share_one_modem() -> None:
    """What is written on one tty is read on the other; a line may come in pieces."""
    modem = Modem()
    one, other = Conversation(modem), Conversation(modem)
    assert one.feed(b"AT^DM") == b""
    assert other.feed(b"AT^DMSN=XY\r") == OK
    assert one.feed(b"SN\rAT\r\n") == info("^DMSN: XY") + OK


@pytest.mark.parametrize("request_block, answer", [
    ("1A", "1B" "00000000"), ("19", "1A" "00000000" "FFFFFFD1"),
    ("07", "08" "00000000" + b"860000000000017".hex().upper()),
    ("2F", "30" "00000000" "20000000" + bytes(range(32)).hex().upper()),
    ("97", "98" "00000000" "0400" "05060708"), ("63", "64" "00000000" "01"),
    ("DD", "DD" "00000000" "0200" "090A"),
])
def test_the_tunnel(tty: Conversation, request_block: str, answer: str) -> None:
    """A block is answered by a block: numbers with their high byte first, lengths with the low."""
    assert tty.feed(f"AT^DTTEST={request_block}\r".encode()) == info(f"^DTTEST: {answer}")


@pytest.mark.parametrize("operand", ["", "1", "XY", "1A0"])
def test_a_block_that_is_none(tty: Conversation, operand: str) -> None:
    """Something that is not whole hexadecimal bytes is refused."""
    assert tty.feed(f"AT^DTTEST={operand}\r".encode()) == b"\r\n+CME ERROR: 50\r\n"


def test_the_tunnel_knows_every_response_with_fields() -> None:
    """Each response that has more than a result is in the table."""
    assert set(modem_table.RESPONSES) == {0x08, 0x18, 0x1A, 0x2E, 0x30, 0x3C, 0x3E, 0x4E, 0x64,
                                          0x6A, 0x6E, 0x72, 0x98, 0xDD}


def answered(tty: Conversation, data: bytes) -> wire.Packet:
    """The packet that answers DATA."""
    return wire.decode_envelope(tty.feed(data))


def test_packets(tty: Conversation) -> None:
    """A request packet is answered with a packet in its envelope, and identities are kept."""
    request = wire.Packet(5, (wire.Atom.string(21, "868686868686868"),))
    assert answered(tty, wire.encode_envelope(request)) == wire.Packet(
        6, (wire.Atom.integer(1, 0),))
    assert tty.feed(b"AT+CGSN\r") == info("868686868686868")
    assert answered(tty, wire.encode_envelope(wire.Packet(7))).find(21) == wire.Atom.raw(
        21, b"868686868686868")
    board = wire.Packet(87, (wire.Atom.string(38, "B1"),))
    assert answered(tty, wire.encode_envelope(board)).command == 88
    assert tty.feed(b"AT^DMSN\r") == info("^DMSN: B1")
    assert answered(tty, wire.encode_envelope(wire.Packet(200))) == wire.Packet(
        201, (wire.Atom.integer(1, 0),))


def test_each_read_of_the_pc_line_brings_its_values(tty: Conversation) -> None:
    """What a station can read of the modem by a packet: every value that its answer must hold."""
    asked = {"module": wire.Atom.integer(19, 17), "station": wire.Atom.integer(39, 25)}
    reads = [(request, operation) for request in REQUESTS for operation in request.operations
             if Channel.PC in operation.channels and operation.brings
             and request.pc and (request.pc.by == "modem" or request.pc.passes_on)]
    assert {request.id for request, _ in reads} >= {7, 45, 65, 85, 89, 99, 234}
    for request, operation in reads:
        atoms = tuple(asked[field.name] for field in request.fields)
        answer = answered(tty, wire.encode_envelope(wire.Packet(request.id, atoms)))
        assert answer.command == request.answer_id
        assert answer.get_int(1) == 0
        for field in request.answer_fields:
            if field.name in operation.brings:
                found = answer.find(field.atom)
                assert found is not None and found.type is field.type, (operation.name, field)
                assert found.content, (operation.name, field)


@pytest.mark.parametrize("request_packet, atoms", [
    (wire.Packet(65), (wire.Atom.string(27, "20130121"),)),
    (wire.Packet(85), (wire.Atom.string(38, "KEL0000000000001"),)),
    (wire.Packet(234), (wire.Atom.raw(163, b"KEL0000000000001"),)),
    (wire.Packet(197), (wire.Atom.integer(202, 3),)),
    (wire.Packet(45, (wire.Atom.integer(19, 18),)),
     (wire.Atom.integer(19, 18), wire.Atom.raw(18, b"KEL-1 HLS 2.18.0"))),
    (wire.Packet(89, (wire.Atom.integer(39, 7),)),
     (wire.Atom.integer(39, 7), wire.Atom.integer(36, 2), wire.Atom.string(37, "it, failed"))),
    (wire.Packet(228, (wire.Atom.integer(39, 7),)),
     (wire.Atom.integer(39, 7), wire.Atom.integer(36, 2))),
    (wire.Packet(89, (wire.Atom.integer(39, 8),)),
     (wire.Atom.integer(39, 8), wire.Atom.integer(36, 0), wire.Atom.string(37, ""))),
])
def test_reads_by_packet(tty: Conversation, request_packet: wire.Packet,
                         atoms: tuple[wire.Atom, ...]) -> None:
    """They find the same memory as the AT commands."""
    tty.feed(b"AT^DATOMW=7,2,it, failed\r")
    answer = answered(tty, wire.encode_envelope(request_packet))
    assert answer == wire.Packet(request_packet.command + 1, (wire.Atom.integer(1, 0), *atoms))


def test_the_channel_is_switched_by_packet(tty: Conversation) -> None:
    """What is read then belongs to the other channel."""
    switch = wire.Packet(232, (wire.Atom.integer(159, 1),))
    assert answered(tty, wire.encode_envelope(switch)).command == 233
    board = answered(tty, wire.encode_envelope(wire.Packet(85)))
    assert board.find(38) == wire.Atom.string(38, "KEL0000000000002")


def test_packets_in_pieces_and_between_text(tty: Conversation) -> None:
    """A packet may come byte by byte, behind garbage, and before text."""
    data = b"\x00\xff" + wire.encode_envelope(wire.Packet(87)) + b"AT\r"
    said = b"".join(tty.feed(data[i:i + 1]) for i in range(len(data)))
    assert wire.decode_envelope(said[:-len(OK)]).command == 88
    assert said.endswith(OK)


def test_an_answer_can_be_replaced() -> None:
    """A whole command line, without regard to case; None gives the table's answer back."""
    modem = Modem({"at^dmsn": "\r\n+CME ERROR: 3\r\n"})
    tty = Conversation(modem)
    assert tty.feed(b"AT^DMSN\r") == b"\r\n+CME ERROR: 3\r\n"
    modem.set_answer("AT^DMSN", None)
    assert tty.feed(b"AT^DMSN\r") == info("^DMSN: KEL0000000000001")


@pytest.mark.parametrize("text, data", [
    (r"\r\nOK\r\n", OK), (r"\x00\xff\0\t\\\"", b"\0\xff\0\t\\\""), ("é", "é".encode()),
    ("", b""),
])
def test_escapes(text: str, data: bytes) -> None:
    """What a shell passes on stands for every byte."""
    assert unescape(text) == data


@pytest.mark.parametrize("text", [r"\q", r"\x4", "end\\"])
def test_escapes_that_there_are_not(text: str) -> None:
    """They are named, not passed on."""
    with pytest.raises(ValueError, match="unknown escape"):
        unescape(text)


def test_in_the_handset(make_fake) -> None:
    """The modem serves its tty, with replaced answers from the start or later."""
    handset: Handset = make_fake(modem_answers={"AT+CSQ": "none"})
    handset.pc.write(b"AT+CSQ\r")
    assert handset.pc.read_exactly(4) == b"none"
    handset.answer_modem("AT+CSQ", "x" * 3000)
    handset.pc.write(b"AT+CSQ\r")
    assert handset.pc.read_exactly(3000) == b"x" * 3000
    handset.answer_modem("AT+CSQ", None)
    handset.pc.write(b"AT+CSQ\r")
    assert handset.pc.read_until(OK) == info("+CSQ: 24,99")
    handset.client.ask("say", line="modem", text="\r\n^RING\r\n")
    assert handset.pc.read_exactly(9) == b"\r\n^RING\r\n"


def test_reads_on_the_pc_line(pc: PcChannel) -> None:
    """What the daemon passes on to the modem brings a value to the station."""
    for request, value in (
            (packet(45, integer(19, 17)), raw(18, b"KEL-1 L1 1.17.0")),
            (packet(65), string(27, "20130121")),
            (packet(85), string(38, "KEL0000000000001")),
            (packet(89, integer(39, 4)), integer(36, 0)),
            (packet(234), raw(163, b"KEL0000000000001"))):
        answer = pc.request(request.command, *request.atoms, acknowledged=False)
        assert (answer.command, answer.get_int(1)) == (request.command + 1, 0)
        assert value in answer.atoms
