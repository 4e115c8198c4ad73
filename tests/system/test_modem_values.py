"""Single values: board number, out-date, serial number, SIM, support, temperature, channel."""

import re

import pytest

from conftest import HandsetFactory
from amt_station import wire
from support.channels import AppChannel, flag, integer, packet, raw, string
from support.modem_desk import ERRORS, MODEM_FAILED, NOT_SERVED, OK, ModemDesk, refusal
from support.trace import Trace, error_line
from support.traffic import APP_OUT, dump

RESULT = integer(1, 0)
TEMPERATURE = "/sys/class/power_supply/battery/temp"
LONGEST = b"1234567890" * 3 + b"12345678"


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks."""
    return ModemDesk(share_handset("packet"))


def query(desk: ModemDesk, command: int, text: bytes, said: bytes, *packets: wire.Packet) -> Trace:
    """A request without atoms, the command it becomes, and what the modem says at once."""
    trace = Trace(desk.handset)
    desk.exchange(packet(command), text, [said], packets)
    return trace


def value(prefix: bytes, text: bytes) -> bytes:
    """An answer with a value."""
    return b"\r\n" + prefix + text + b"\r\n" + OK


# What holds for every value that is cut out of the answer.

BOARD = (85, b"AT^DMSN\r", b"^DMSN:", lambda text: packet(86, raw_string(38, text), RESULT))
SERIAL = (234, b"AT^DMSN\r", b"^DMSN:", lambda text: packet(235, raw(163, text), RESULT))
OUT_DATE = (65, b"AT^DMFD??\r", b"^DMFD:", lambda text: packet(66, raw_string(27, text), RESULT))
TEXTS = {"board": (BOARD, 38), "serial": (SERIAL, 38), "out-date": (OUT_DATE, 14)}


def raw_string(atom: int, content: bytes) -> wire.Atom:
    """A string atom of any bytes."""
    return wire.Atom(atom, wire.AtomType.STRING, content)


@pytest.mark.parametrize("name", TEXTS)
def test_longest_text(desk: ModemDesk, name: str) -> None:
    (command, text, prefix, answer), limit = TEXTS[name]
    for size in (0, 1, limit - 1, limit):
        query(desk, command, text, value(prefix + b" ", LONGEST[:size]), answer(LONGEST[:size]))
    for size in (limit + 1, limit + 2, 100, 4000):
        said = value(prefix + b" ", (LONGEST * 110)[:size])
        desk.ask(packet(command), text)
        desk.mux.write(said)
        desk.expect(refusal(command, MODEM_FAILED))


@pytest.mark.parametrize("name", TEXTS)
@pytest.mark.parametrize("said, text", [
    (b"\r\n%sX1\r\n\r\nOK\r\n", b"X1"), (b"\r\n%s    X1\r\n\r\nOK\r\n", b"X1"),
    (b"\r\n%s X1\r\nOK\r\n", b"X1"), (b"\r\n%s X1\r\n\r\n\r\n\r\n\r\nOK\r\n", b"X1"),
    (b"\r\n%s X1 \r\n\r\nOK\r\n", b"X1 "), (b"\r\n%s \tX1\r\n\r\nOK\r\n", b"\tX1"),
    (b"\r\n%s \"X1\"\r\n\r\nOK\r\n", b"\"X1\""), (b"\r\n%s X1\n\r\nOK\r\n", b"X1\n"),
    (b"\r\n%s X\r\n%s 1\r\n\r\nOK\r\n", b"X\r\n%s 1"), (b"\r\n%s\r\nOK\r\n", b""),
    (b"\r\n%s X1\r\n\r\nOK\r\n\r\n%s Y2\r\n\r\nOK\r\n", b"X1"),
    (b"\r\n%s X\xe4\x80\x01\r\n\r\nOK\r\n", b"X\xe4\x80\x01"),
])
def test_where_a_text_begins_and_ends(desk: ModemDesk, name: str, said: bytes,
                                      text: bytes) -> None:
    (command, sent, prefix, answer), _ = TEXTS[name]
    query(desk, command, sent, said.replace(b"%s", prefix),
          answer(text.replace(b"%s", prefix)))


@pytest.mark.parametrize("name", TEXTS)
@pytest.mark.parametrize("said", [
    b"\r\nOK\r\n", b"%s X1\r\n\r\nOK\r\n", b"\r\n ^%s X1\r\n\r\nOK\r\n",
    b"\r\n^DXXX: X1\r\n\r\nOK\r\n", b"\r\nX1\r\n\r\nOK\r\n",
    # the value stands behind the final result
    b"\r\nOK\r\n\r\n%s X1\r\n"])
def test_answers_without_the_value(desk: ModemDesk, name: str, said: bytes) -> None:
    (command, sent, prefix, _), _ = TEXTS[name]
    query(desk, command, sent, said.replace(b"%s", prefix), refusal(command, MODEM_FAILED))


@pytest.mark.parametrize("name", TEXTS)
def test_a_refused_text_is_refused_once(desk: ModemDesk, name: str) -> None:
    (command, sent, prefix, answer), _ = TEXTS[name]
    for error in ERRORS:
        query(desk, command, sent, value(prefix, b"X1").replace(OK, error),
              refusal(command, MODEM_FAILED))
    # A final OK counts for more than an error in the same text, whose line becomes the value's.
    query(desk, command, sent, ERRORS[0] + value(prefix, b"X1"), answer(b"X1"))


def test_log_of_a_board_number(desk: ModemDesk) -> None:
    answer = packet(86, string(38, "B-7"), RESULT)
    query(desk, 85, b"AT^DMSN\r", value(b"^DMSN: ", b"B-7"), answer).expect(
        "receive command id: 85(0x55) - AMT_READ_BOARD_CMD", "amt_modem_handle_read_board()",
        "write_at()", "send ==> AT^DMSN\\r",
        "receive <== \\r\\n^DMSN: B-7\\r\\n\\r\\nOK\\r\\n", dump(APP_OUT, answer.encode()))


def test_log_of_an_out_date(desk: ModemDesk) -> None:
    query(desk, 65, b"AT^DMFD??\r", OK, refusal(65, MODEM_FAILED)).expect(
        "receive command id: 65(0x41) - AMT_READ_OUTDATE_CMD",
        "amt_modem_handle_read_outdate()", "send ==> AT^DMFD??\\r",
        error_line("amt_modem_handle_read_outdate", -100),
        dump(APP_OUT, refusal(65, MODEM_FAILED).encode()))


def test_log_of_a_serial_number(desk: ModemDesk) -> None:
    name = "amt_read_serial_number"
    said = "\\r\\n^DMSN: S-7\\r\\n\\r\\nOK\\r\\n"
    query(desk, 234, b"AT^DMSN\r", value(b"^DMSN: ", b"S-7"),
          packet(235, raw(163, b"S-7"), RESULT)).expect(
        "receive command id: 234(0xEA) - (undefined)", f"{name}()", f"{name} :{said}",
        f"{name} head_ptr={said}", f"{name} serial_number=S-7",
        "get serial-number success. serial-number:[len:3 content:S-7]")


@pytest.mark.parametrize("text", [b"\xff", b"\xff" * 8, b"\xff20130121", b"\xff" * 14])
def test_erased_out_date(desk: ModemDesk, text: bytes) -> None:
    query(desk, 65, b"AT^DMFD??\r", value(b"^DMFD: ", text), refusal(65, MODEM_FAILED)).expect(
        error_line("amt_modem_handle_read_outdate", -100))


def test_out_date_with_the_mark_elsewhere(desk: ModemDesk) -> None:
    query(desk, 65, b"AT^DMFD??\r", value(b"^DMFD: ", b"2\xff13"),
          packet(66, raw_string(27, b"2\xff13"), RESULT))
    # A board number may begin with it.
    query(desk, 85, b"AT^DMSN\r", value(b"^DMSN: ", b"\xff13"),
          packet(86, raw_string(38, b"\xff13"), RESULT))


# SIM


@pytest.mark.parametrize("text, present", [
    (b"1", 1), (b"2", 1), (b"0", 0), (b"3", 0), (b"12", 0), (b"-1", 0), (b"x", 0), (b"", 0),
    (b"02", 1), (b"+1", 1), (b"1,2", 1), (b"2 ", 1),
    (b"1" + b" " * 37, 1)])
def test_sim(desk: ModemDesk, text: bytes, present: int) -> None:
    # No result goes with it.
    query(desk, 99, b"AT^DTOC\r", value(b"^DTOC: ", text), packet(100, flag(41, present)))


def test_sim_refused(desk: ModemDesk) -> None:
    # What is too long, or is not there, is read all the same.
    query(desk, 99, b"AT^DTOC\r", value(b"^DTOC: ", b"1" + b" " * 38),
          refusal(99, MODEM_FAILED)).expect("amt_dtoc_checkSIM simtype=1")
    query(desk, 99, b"AT^DTOC\r", b"\r\n^DTOC\r\n" + OK,
          refusal(99, MODEM_FAILED)).expect("amt_dtoc_checkSIM simtype=0")


def test_log_of_a_sim(desk: ModemDesk) -> None:
    name, said = "amt_dtoc_checkSIM", "\\r\\n^DTOC: 3\\r\\n\\r\\nOK\\r\\n"
    query(desk, 99, b"AT^DTOC\r", value(b"^DTOC: ", b"3"), packet(100, flag(41, 0))).expect(
        "receive command id: 99(0x63) - AMT_USIMCHECK_CMD", f"{name}()", f"{name} :{said}",
        f"{name} head_ptr={said}", f"{name} board_a=3", f"{name} simtype=3")


# support of the factory-test mode


@pytest.mark.parametrize("text, rat", [
    (b"2,1,4,7", 7), (b"2,1,4,0", 0), (b"2,1,4,-3", -3), (b"2,1,4,x", 0), (b"2,1,4,12,5", 12),
    (b"a,b,c,9z", 9), (b"2,1,4, 8", 8), (b",,2,1,,4,7", 7),
    (b"1,1,1," + b"0" * 31 + b"7", 7)])
def test_support(desk: ModemDesk, text: bytes, rat: int) -> None:
    trace = query(desk, 197, b"AT^DMCC?\r", value(b"^DMCC: ", text),
                  packet(198, integer(202, rat), RESULT))
    trace.expect("amt_query_amt_support()", f"amt_query_amt_support parameter={text.decode()}",
                 f"getted nstandby0_rat:{rat}.")


@pytest.mark.parametrize("text, missing", [
    (b"", "sim_num"), (b",,,", "sim_num"), (b"2", "standby_num"), (b"2,", "standby_num"),
    (b"2,1", "rf_set_num"), (b"2,1,4", "standby0_rat"), (b"2,1,4,", "standby0_rat")])
def test_support_with_a_field_missing(desk: ModemDesk, text: bytes, missing: str) -> None:
    trace = query(desk, 197, b"AT^DMCC?\r", value(b"^DMCC: ", text), refusal(197, MODEM_FAILED))
    trace.expect(f"{missing} is null!!!", dump(APP_OUT, refusal(197, MODEM_FAILED).encode()))
    trace.expect_none(re.compile("getted nstandby0_rat.*"))


def test_support_of_38_characters_is_the_longest(desk: ModemDesk) -> None:
    fits = b"1,1,1," + b"0" * 31 + b"7"
    assert len(fits) == 38
    query(desk, 197, b"AT^DMCC?\r", value(b"^DMCC: ", fits),
          packet(198, integer(202, 7), RESULT))
    # Read as far as it was kept, and refused.
    query(desk, 197, b"AT^DMCC?\r", value(b"^DMCC: ", fits + b"5"),
          refusal(197, MODEM_FAILED)).expect("getted nstandby0_rat:7.")


def test_support_without_its_line(desk: ModemDesk) -> None:
    query(desk, 197, b"AT^DMCC?\r", OK, refusal(197, MODEM_FAILED)).expect(
        "amt_query_amt_support head_ptr=(null)", "amt_query_amt_support parameter=",
        "sim_num is null!!!")


def test_log_of_support(desk: ModemDesk) -> None:
    name, said = "amt_query_amt_support", "\\r\\n^DMCC: 2,1,4,7\\r\\n\\r\\nOK\\r\\n"
    query(desk, 197, b"AT^DMCC?\r", value(b"^DMCC: ", b"2,1,4,7"),
          packet(198, integer(202, 7), RESULT)).expect(
        "receive command id: 197(0xC5) - AMT_NORMAL_TO_AMT_SUPPORT_CMD", f"{name}()",
        f"{name} :{said}", f"{name} head_ptr={said}", f"{name} parameter=2,1,4,7",
        "getted nstandby0_rat:7.")


# temperature


@pytest.mark.parametrize("content, temperature, shown", [
    ("315\n", 315, "315"), ("315", 315, "315"), ("0\n", 0, "0"), ("  42 C\n", 42, "42"),
    ("\n\n7\n8\n", 7, "7"), ("-5\n", -5, "4294967291"), ("31.5\n", 31, "31"),
    ("4294967295\n", -1, "4294967295"), ("2147483648", -0x80000000, "2147483648")])
def test_temperature(desk: ModemDesk, content: str, temperature: int, shown: str) -> None:
    desk.handset.place(TEMPERATURE, content)
    trace = Trace(desk.handset)
    desk.app.send_packet(55)
    desk.expect(packet(56, integer(22, temperature), RESULT))
    trace.expect("receive command id: 55(0x37) - AMT_TEMPERATURE_CMD",
                 "amt_modem_handle_temperature()", f"Battery temperature: {shown}")


@pytest.mark.parametrize("content", ["", "\n", "x\n", "-\n", "C 315\n"])
def test_temperature_without_a_number(desk: ModemDesk, content: str) -> None:
    desk.handset.place(TEMPERATURE, content)
    trace = Trace(desk.handset)
    desk.app.send_packet(55)
    desk.expect(refusal(55, MODEM_FAILED))
    trace.expect("amt_modem_handle_temperature()",
                 error_line("amt_modem_handle_temperature", -118, 0), "fscanf error: errno=0")


def test_temperature_without_a_file(desk: ModemDesk) -> None:
    desk.handset.place(TEMPERATURE, None)
    trace = Trace(desk.handset)
    desk.app.send_packet(55)
    desk.expect(refusal(55, MODEM_FAILED))
    trace.expect("amt_modem_handle_temperature()",
                 error_line("amt_modem_handle_temperature", -118, 2), "fopen error: errno=2")


def test_temperature_keeps_no_descriptor(desk: ModemDesk) -> None:
    desk.handset.place(TEMPERATURE, "315\n")
    before = len(desk.handset.inspect().descriptors)
    for _ in range(20):
        assert desk.app.request(55).get_int(22) == 315
    assert len(desk.handset.inspect().descriptors) == before


# modem channel

SWITCHED, NOT_SWITCHED = packet(233, RESULT), refusal(232, NOT_SERVED)


def switch(desk: ModemDesk, channel: int, command: bytes, said: bytes,
           *packets: wire.Packet) -> Trace:
    """Switch the channel; the modem says something at once."""
    trace = Trace(desk.handset)
    desk.exchange(packet(232, integer(159, channel)), command, [said], packets)
    return trace


@pytest.mark.parametrize("channel, command", [
    (0, b"AT^DMPCHN=0\r"), (1, b"AT^DMPCHN=1\r"), (9, b"AT^DMPCHN=9\r"),
    # twelve bytes, whatever the number
    (10, b"AT^DMPCHN=10"), (99, b"AT^DMPCHN=99"), (100, b"AT^DMPCHN=10"), (-1, b"AT^DMPCHN=-1"),
    (-12, b"AT^DMPCHN=-1"), (0x7fffffff, b"AT^DMPCHN=21")])
def test_channel_switch_sends_12_bytes(desk: ModemDesk, channel: int, command: bytes) -> None:
    assert len(command) == 12
    trace = switch(desk, channel, command, OK, SWITCHED)
    trace.expect("receive command id: 232(0xE8) - (undefined)", "amt_channel_switch()",
                 "write_at()", "write_at write_len[12]", dump(APP_OUT, SWITCHED.encode()))


def test_channel_switch_without_a_channel(desk: ModemDesk) -> None:
    desk.exchange(packet(232), b"AT^DMPCHN=0\r", [OK], [SWITCHED])


@pytest.mark.parametrize("said", [b"OK", b"\r\n^LOOK: 1\r\n", b"\0\0OK", b"x" * 98 + b"OK",
                                  b"\r\nERROR\r\n\r\nOK\r\n"])
def test_channel_switch_is_content_with_ok_anywhere(desk: ModemDesk, said: bytes) -> None:
    switch(desk, 1, b"AT^DMPCHN=1\r", said, SWITCHED)


@pytest.mark.parametrize("said", [*ERRORS, b"\r\n+CREG: 1\r\n", b"ok", b"O\r\nK", b"\0"])
def test_channel_switch_reads_one_answer(desk: ModemDesk, said: bytes) -> None:
    text = said.split(b"\0")[0].decode().replace("\r", "\\r").replace("\n", "\\n")
    trace = switch(desk, 1, b"AT^DMPCHN=1\r", said, NOT_SWITCHED)
    trace.expect(error_line("amt_channel_switch", -100), text,
                 dump(APP_OUT, NOT_SWITCHED.encode()))


def test_channel_switch_with_its_answer_split(desk: ModemDesk) -> None:
    for place in range(1, len(OK)):
        # Only what comes first counts; the rest is heard before the next answer.
        is_whole = place >= 4
        switch(desk, 1, b"AT^DMPCHN=1\r", OK[:place], SWITCHED if is_whole else NOT_SWITCHED)
        desk.mux.write(OK[place:])
        desk.ask(packet(85), b"AT^DMSN\r")
        desk.mux.write(value(b"^DMSN: ", b"7"))
        desk.expect(packet(86, string(38, "7"), RESULT))


def test_channel_switch_reads_100_bytes(desk: ModemDesk) -> None:
    request, command = packet(232, integer(159, 1)), b"AT^DMPCHN=1\r"
    desk.ask(request, command)
    desk.mux.write(b"x" * 99 + b"OK")
    desk.handset.log.wait("read_at read_len_ptr[100]")
    desk.expect(NOT_SWITCHED)
    # The rest is the next one's answer.
    desk.ask(request, command)
    desk.expect(NOT_SWITCHED)
    switch(desk, 1, command, OK, SWITCHED)


def test_channel_switch_when_the_modem_dies(desk: ModemDesk) -> None:
    desk.ask(packet(232, integer(159, 1)), b"AT^DMPCHN=1\r")
    desk.mux.hang_up()
    desk.mux.come_back(held=True)
    assert desk.mux.read_exactly(10) == b"AT^DLKS=0\r"
    desk.mux.write(OK.rjust(18, b"."))
    desk.mux.write(OK)
    desk.expect(SWITCHED)


def test_channel_that_was_switched(make_handset: HandsetFactory) -> None:
    app = AppChannel(make_handset("packet"))
    numbers = []
    for channel in (0, 1, 0):
        assert app.request(232, integer(159, channel)) == SWITCHED
        numbers.append(app.request(234).find(163))
    assert numbers == [raw(163, b"KEL0000000000001"), raw(163, b"KEL0000000000002"),
                       raw(163, b"KEL0000000000001")]


def test_values_of_the_simulated_modem(app: AppChannel) -> None:
    for request, answer in (
            (packet(85), packet(86, string(38, "KEL0000000000001"), RESULT)),
            (packet(234), packet(235, raw(163, b"KEL0000000000001"), RESULT)),
            (packet(65), packet(66, string(27, "20130121"), RESULT)),
            (packet(99), packet(100, flag(41, 1))),
            (packet(197), packet(198, integer(202, 3), RESULT)),
            (packet(45, integer(19, 17)),
             packet(46, integer(19, 17), raw(18, b"KEL-1 L1 1.17.0"), RESULT)),
            (packet(45, integer(19, 18)),
             packet(46, integer(19, 18), raw(18, b"KEL-1 HLS 2.18.0"), RESULT))):
        assert app.request(request.command, *request.atoms) == answer
