"""Requests that travel through the modem: block out, block back, packet by packet."""

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.inside.modem import Modem
from amt_simulator.inside.modem_table import RESPONSES
from amt_station import wire
from support.channels import AppChannel, flag, integer, packet, raw, string
from support.modem_desk import NOT_SERVED, OK, ModemDesk, refusal, standing_still
from support.registrations import APP_ROWS
from support.trace import Trace, error_line
from support.traffic import APP_OUT, dump

ANSWER = b"\r\n^DTTEST: "
ERROR = b"\r\n+CME ERROR: 100\r\n"
# A request whose packet is not looked into, and what its bare block is on the way.
PLAIN, PLAIN_COMMAND = packet(3), b"AT^DTTEST=03\r"
PACKET_SIZE = 4096

# What the daemon serves in some other way, of the ids that the app may ask for.
OTHERS = {9, 29, 31, 33, 35, 37, 45, 55, 57, 65, 85, 89, 91, 99, 137, 139, 147, 170, 172, 174,
          176, 178, 180, 185, 187, 195, 197, 219, 228, 230, 232, 234, 238, 240}
TUNNELLED = sorted(set(APP_ROWS) - OTHERS)


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks."""
    return ModemDesk(share_handset("packet"))


def line(block: "bytes | str") -> bytes:
    """The answer line of a block, given as bytes or as its text."""
    return ANSWER + (block if isinstance(block, str) else block.hex().upper()).encode() + b"\r\n"


def command_of(block: bytes) -> bytes:
    """The command that a request's block becomes."""
    return b"AT^DTTEST=" + block.hex().upper().encode() + b"\r"


def answered(desk: ModemDesk, said: bytes, *packets: wire.Packet) -> Trace:
    """A plain request, all that the modem says to it at once, and all that the app gets."""
    trace = Trace(desk.handset)
    desk.ask(PLAIN, PLAIN_COMMAND)
    desk.mux.write(said)
    desk.expect(*packets)
    return trace


def ask_behind(desk: ModemDesk, rest: bytes) -> None:
    """A plain request; before the modem speaks, the daemon has read the REST of its last answer."""
    mark = desk.handset.log.mark()
    desk.ask(PLAIN, PLAIN_COMMAND)
    desk.handset.log.wait(f"read_at read_len_ptr[{len(rest)}]", after=mark)


def say_at_once(desk: ModemDesk, said: bytes) -> None:
    """All of a long answer is there when the daemon reads."""
    with standing_still(desk.handset, len(said)):
        desk.mux.write(said)


# the way out


def test_every_tunnelled_request(desk: ModemDesk) -> None:
    assert len(TUNNELLED) == 67
    for command in TUNNELLED:
        block = bytes((command,)) + (b"\1\0\7" if command == 0x97 else b"\7")
        # OK alone: served, and nothing to send.
        desk.exchange(packet(command, flag(1, 7)), command_of(block), [OK], [])


def test_values_in_the_order_of_their_atoms(desk: ModemDesk) -> None:
    atoms = (integer(9, -2), string(3, "Text"), raw(7, b"\0\xff"), flag(1, 0x80), string(3, ""),
             integer(9, 0x7fffffff))
    values = (b"\xfe\xff\xff\xff", b"Text", b"\0\xff", b"\x80", b"", b"\xff\xff\xff\x7f")
    desk.exchange(packet(0x1B, *atoms), command_of(b"\x1b" + b"".join(values)), [OK], [])
    lengths = b"".join(len(value).to_bytes(2, "little") + value for value in values)
    desk.exchange(packet(0x97, *atoms), command_of(b"\x97" + lengths), [OK], [])


def test_log_of_a_request(desk: ModemDesk) -> None:
    reply = packet(0x3C, integer(1, 0), integer(24, 512))
    trace = Trace(desk.handset)
    desk.exchange(packet(59), b"AT^DTTEST=3B\r", [line("3C0000000000000200") + OK], [reply])
    trace.expect("receive command id: 59(0x3B) - AMT_READ_RFADC_CMD", "amt_modem_handle_req()",
                 "amt_convert_req_amt_data_2_at_data()", "write_at()", "write_at write_len[13]",
                 "write_at ret_val[0]", "send ==> AT^DTTEST=3B\\r",
                 "receive <== \\r\\n^DTTEST: 3C0000000000000200\\r\\n\\r\\nOK\\r\\n",
                 "amt_convert_rsp_at_data_2_amt_data()", dump(APP_OUT, reply.encode()))


@pytest.mark.parametrize("spoiled, texts", [
    (b"\xee\x05\x01\x02\x00\x01\x02", ("atom length mismatch: 02 != 04",)),
    (b"\xee\x05\x01\x05\x00\x01\x02\x03\x04\x05", ("atom length mismatch: 05 != 04",)),
    (b"\xee\x05\x04\x02\x00\x01\x02", ("atom length mismatch: 02 != 01",)),
    (b"\xed\x05\x01\x04\x00\0\0\0\0", ("atom head mismatch: ED != EE",)),
    (b"\xee\x05\x05\x01\x00\x01", ("unknown atom value type: 05",)),
    (b"\xee\x05\x00\x01\x00\x01", ("unknown atom value type: 00",)),
])
def test_malformed_requests_do_not_reach_the_modem(desk: ModemDesk, spoiled: bytes,
                                                   texts: tuple[str, ...]) -> None:
    good = flag(1, 1).encode()
    for atoms in (spoiled, good + spoiled, good * 100 + spoiled):
        size = len(atoms) + 6
        request = (size.to_bytes(2, "little") + b"\xbb\x03" + len(atoms).to_bytes(2, "little")
                   + atoms)
        trace = Trace(desk.handset)
        desk.app.send(request)
        desk.expect(refusal(3, NOT_SERVED))
        convert = "amt_convert_req_amt_data_2_at_data"
        trace.expect(error_line(convert, -100, source="amt/amt-convert"), *texts,
                     error_line("amt_modem_handle_req", -100))
        trace.expect_none("write_at()")


def test_another_head_does_not_reach_the_modem(desk: ModemDesk) -> None:
    trace = Trace(desk.handset)
    desk.app.send(b"\x06\0\xba\x03\0\0")
    desk.expect(refusal(3, NOT_SERVED))
    trace.expect("command head mismatch: BA != BB")
    trace.expect_none("write_at()")


def test_atoms_that_lead_outside(desk: ModemDesk) -> None:
    for request in (b"\x06\0\xbb\x03\xff\xff", b"\xff\xff\xbb\x03\x0b\0\xee\1\2\xff\xff",
                    b"\x06\0\xbb\x03\x05\0\xee\1\3\xff\x0f"):
        desk.app.send(request)
        desk.expect(refusal(3, NOT_SERVED))


def test_2041_bytes_pass_and_2042_are_refused(desk: ModemDesk) -> None:
    data = bytes(i * 7 & 0xFF for i in range(2041))
    for size in (2039, 2040):
        # With the id before it: 2040 and 2041 bytes.
        desk.ask(packet(3, raw(4, data[:size])), command_of(b"\3" + data[:size]))
        desk.mux.write(line("0400000000") + OK)
        desk.expect(packet(4, integer(1, 0)))
    trace = Trace(desk.handset)
    refused = packet(3, raw(4, data)).encode()
    with standing_still(desk.handset, len(refused)):
        desk.app.send(refused)
    desk.expect(refusal(3, NOT_SERVED))
    trace.expect("amt_modem_handle_req()", error_line("amt_modem_handle_req", -100),
                 "(10 + 2042 * 2 + 2) < 4096")
    trace.expect_none("write_at()")


# the way back


def test_text_of_four_digits(desk: ModemDesk) -> None:
    # Four bytes: 01, 02, and two out of what follows the text, here nothing but line ends and OK.
    answered(desk, line("0102") + OK, packet(1, integer(1, 0x02000000)))
    # Here the second of them is made of digits.
    answered(desk, line("0102") + b"3C\r\n" + OK, packet(1, integer(1, 0x02003C00)))
    # Half a pair of digits counts as the digit's half of a byte.
    answered(desk, line("0102") + b"x5\r\n" + OK, packet(1, integer(1, 0x02000500)))
    answered(desk, line("0102") + b"5x\r\n" + OK, packet(1, integer(1, 0x02005000)))


def test_number_of_characters_is_the_number_of_bytes(desk: ModemDesk) -> None:
    # An IMEI without a digit: twice five characters are more than the five bytes of its head.
    answered(desk, line("0800000000") + OK, packet(8, integer(1, 0), raw(21, b"\0" * 15)))
    # Two characters are two bytes, so nothing follows the result.
    answered(desk, line("08") + OK, packet(8, integer(1, 0)))
    answered(desk, line("0802") + b"AA\r\n" + OK, packet(8, integer(1, 0x0200AA00)))
    # Five characters are no more than the head's bytes, six are.
    answered(desk, line("64000") + OK, packet(0x64, integer(1, 0)))
    answered(desk, line("640000") + OK, packet(0x64, integer(1, 0), flag(41, 0)))


def test_either_case_and_characters_that_are_no_digits(desk: ModemDesk) -> None:
    answered(desk, line("1a00000000000000fF") + OK,
             packet(0x1A, integer(1, 0), integer(13, 255)))
    answered(desk, line("1Axx g0z0-_0:@`GX5") + OK,
             packet(0x1A, integer(1, 0), integer(13, 5)))


def test_empty_text_is_refused(desk: ModemDesk) -> None:
    trace = answered(desk, line("") + OK, refusal(3, NOT_SERVED))
    trace.expect(error_line("amt_convert_rsp_at_data_2_amt_data", -101, source="amt/amt-convert"),
                 "0, 1, 0, 0")


def test_negative_and_large_results(desk: ModemDesk) -> None:
    for text, result in (("FFFFFFFF", -1), ("80000000", -0x80000000), ("7FFFFFFF", 0x7FFFFFFF),
                         ("00000003", 3)):
        answered(desk, line("04" + text) + OK, packet(4, integer(1, result)))


def test_lines_that_are_not_the_answer(desk: ModemDesk) -> None:
    reply = packet(4, integer(1, 0))
    # No blank, two blanks (the second is no digit), another case, the middle of a line.
    answered(desk, b"\r\n^DTTEST:0400000000\r\n" + OK)
    answered(desk, b"\r\n^dttest: 0400000000\r\n" + OK)
    answered(desk, b"x^DTTEST: 0400000000\r\n" + OK)
    answered(desk, b"\r\n^DTTEST: 0400000000\n\r" + b"\r\n" + OK, reply)
    # An answer that has not ended when the final result comes.
    answered(desk, ANSWER + b"0400000000OK")


def test_ok_anywhere_ends_it(desk: ModemDesk) -> None:
    answered(desk, b"\r\n^DBOOK: 1\r\n")
    answered(desk, b"OK")
    answered(desk, line("0400000000") + b"O\r\nK\r\n^LOOK\r\n", packet(4, integer(1, 0)))


def test_line_is_taken_out_of_the_middle(desk: ModemDesk) -> None:
    reply = packet(4, integer(1, 0))
    # What stood around it meets: here it makes the final result.
    desk.exchange(PLAIN, PLAIN_COMMAND, [b"\r\n+NOTE: O" + line("0400000000"), b"K\r\n"], [reply])
    desk.exchange(PLAIN, PLAIN_COMMAND, [b"\r\nERR" + line("0400000000") + b"OR\r\n"],
                  [reply, refusal(3, NOT_SERVED)])


def test_a_packet_for_each_line(desk: ModemDesk) -> None:
    first, second = packet(4, integer(1, 1)), packet(6, integer(1, 2))
    # Read by read, each is sent as it comes.
    desk.ask(PLAIN, PLAIN_COMMAND)
    desk.say(line("0400000001"))
    assert desk.app.read_packet() == first
    desk.say(line("0600000002"))
    assert desk.app.read_packet() == second
    desk.say(b"\r\n+CREG: 1\r\n", OK)
    desk.expect()
    # One read brings one packet; the rest of it waits for the next read.
    desk.ask(PLAIN, PLAIN_COMMAND)
    desk.say(line("0400000001") + line("0600000002"))
    assert desk.app.read_packet() == first
    desk.say(OK)
    desk.expect(second)
    # The final result in the same read leaves it unsent.
    answered(desk, line("0400000001") + line("0600000002") + OK, first)


def test_what_was_sent_before_an_error_stays_sent(desk: ModemDesk) -> None:
    first = packet(4, integer(1, 0))
    trace = answered(desk, line("0400000000") + ERROR, first, refusal(3, NOT_SERVED))
    trace.expect(dump(APP_OUT, first.encode()), error_line("amt_modem_handle_req", -100),
                 dump(APP_OUT, refusal(3, NOT_SERVED).encode()))
    desk.exchange(PLAIN, PLAIN_COMMAND, [line("0400000000"), line("0400000000"), ERROR],
                  [first, first, refusal(3, NOT_SERVED)])


def test_ok_outweighs_an_error_in_the_same_text(desk: ModemDesk) -> None:
    answered(desk, ERROR + OK)
    answered(desk, ERROR + line("0400000000") + OK, packet(4, integer(1, 0)))


@pytest.mark.parametrize("text, code", [
    ("300000000000000000", -101), ("980000000000000", -101), ("3000000000FFFF0000", -100),
    ("9800000000FFFF", -100), ("DD00000000FFFF", -100), ("3000000000FFFFFFFF", -100),
    ("300000000000000080", -100), ("4E00000000ED0F0000", -100), ("9800000000ED0F", -100),
    ("180000000000000000FFFFFFFF", -100), ("180000000000000000E40F0000", -100),
    ("18000000000000000000000000", -101)])
def test_lengths_that_cannot_be_are_refused(desk: ModemDesk, text: str, code: int) -> None:
    for said in ([line(text) + OK], [line(text), OK]):
        trace = Trace(desk.handset)
        desk.ask(PLAIN, PLAIN_COMMAND)
        desk.mux.write(said[0])
        desk.expect(refusal(3, NOT_SERVED))
        trace.expect(error_line("rsp_at_data_2_amt_data_atom_byte", code,
                                source="amt/amt-convert"),
                     error_line("amt_modem_handle_req", code))


def test_after_a_refused_block_the_wait_ends_at_once(desk: ModemDesk) -> None:
    # No final result is awaited; the one that comes late is not the next request's.
    answered(desk, line("300000000000000000"), refusal(3, NOT_SERVED))
    desk.mux.write(OK)
    desk.ask(PLAIN, PLAIN_COMMAND)
    desk.expect()
    # An error result in the same read counts for more than the block, OK does not.
    answered(desk, line("300000000000000000") + ERROR, refusal(3, NOT_SERVED))


def test_length_that_only_just_fits_is_filled_with_zeros(desk: ModemDesk) -> None:
    most = PACKET_SIZE - 6 - 9 - 5
    text = "3000000000" + most.to_bytes(4, "little").hex() + "4142"
    reply = packet(0x30, integer(1, 0), raw(4, b"AB".ljust(most, b"\0")))
    assert len(reply.encode()) == PACKET_SIZE
    answered(desk, line(text) + OK, reply)


def test_longest_text_that_fits_the_area(desk: ModemDesk) -> None:
    # 4096 bytes with the line around it and the final result.
    room = PACKET_SIZE - len(line("")) - len(OK)
    size = (room - 18) // 2
    data = bytes(i * 11 & 0xFF for i in range(size))
    text = "7200000000" + size.to_bytes(4, "little").hex() + data.hex().upper()
    reply = packet(0x72, integer(1, 0), raw(4, data))
    desk.ask(PLAIN, PLAIN_COMMAND)
    say_at_once(desk, line(text.ljust(room)) + OK)
    desk.expect(reply)
    # One more, and the final result cannot be read whole any more: "OK" still can.
    ask_behind(desk, b"\n")
    say_at_once(desk, line(text.ljust(room + 1)) + OK)
    desk.expect(reply)
    ask_behind(desk, b"\r\n")
    desk.say(OK)
    desk.expect()


# with the simulated modem


@pytest.fixture
def phone(share_handset: HandsetFactory) -> Handset:
    """A handset whose modem answers by its table."""
    return share_handset("packet", modem_answers={})


BYTES = bytes(range(256))
RESULT = integer(1, 0)
# What the modem of the simulator has to tell, response by response.
ANSWERS = {
    0x07: packet(0x08, RESULT, raw(21, b"860000000000017")),
    0x17: packet(0x18, RESULT, integer(12, 64), raw(4, BYTES[:64])),
    0x19: packet(0x1A, RESULT, integer(13, -47)),
    0x2F: packet(0x30, RESULT, raw(4, BYTES[:32])),
    0x3B: packet(0x3C, RESULT, integer(24, 512)),
    0x3D: packet(0x3E, RESULT, raw(4, BYTES[32:64])),
    0x4D: packet(0x4E, RESULT, raw(34, b"IQ-0001")),
    0x69: packet(0x6A, RESULT, raw(43, b"\1\2\3\4")),
    0x6D: packet(0x6E, RESULT, flag(44, 1)),
    0x71: packet(0x72, RESULT, raw(4, BYTES[64:96])),
    0x97: packet(0x98, RESULT, raw(62, b"\5\6\7\x08")),
    0xDD: packet(0xDD, RESULT, raw(62, b"\x09\x0a")),
}


@pytest.mark.parametrize("command", ANSWERS, ids=hex)
def test_answers_of_the_simulated_modem(phone: Handset, command: int) -> None:
    phone.mux.close()
    assert AppChannel(phone).request(command, integer(5, 1)) == ANSWERS[command]


# The daemon asks for these in other ways, so they come as the answer to another request.
UNASKED = {
    0x2D: packet(0x2E, RESULT, integer(19, 17), raw(18, b"KEL-1 L1 1.17.0".ljust(64, b"\n"))),
    0x63: packet(0x64, RESULT, flag(41, 1)),
}


@pytest.mark.parametrize("command", UNASKED, ids=hex)
def test_answers_to_what_is_asked_in_other_ways(app: AppChannel, command: int) -> None:
    said = Modem().answer_line(f"AT^DTTEST={command:02X}").decode()
    app.handset.answer_modem("AT^DTTEST=03", said)
    assert app.request(3) == UNASKED[command]


def test_every_response_with_fields_is_among_them() -> None:
    answers = {answer.command for answer in (*ANSWERS.values(), *UNASKED.values())}
    assert answers == set(RESPONSES) == {0x08, 0x18, 0x1A, 0x2E, 0x30, 0x3C, 0x3E, 0x4E, 0x64,
                                         0x6A, 0x6E, 0x72, 0x98, 0xDD}


def test_requests_that_bring_a_result_alone(phone: Handset) -> None:
    phone.mux.close()
    app = AppChannel(phone)
    for command in set(TUNNELLED) - set(ANSWERS):
        assert app.request(command, flag(1, 1)) == packet(command + 1, RESULT), command


def test_identity_that_was_written_through_the_tunnel(app: AppChannel) -> None:
    assert app.request(5, string(21, "350000000000017")).result == 0
    assert app.request(7) == packet(8, RESULT, raw(21, b"350000000000017"))
    assert app.request(87, string(38, "B-1")).result == 0
    assert app.request(85) == packet(86, string(38, "B-1"), RESULT)
