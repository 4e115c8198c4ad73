"""Verdicts of the test stations: in the modem, in its mirror, and in the file of the items."""

import re
from typing import Iterator

import pytest

from conftest import HandsetFactory
from amt_station import wire
from support.channels import AppChannel, PcChannel, integer, packet, string
from support.modem_desk import ERRORS, MODEM_FAILED, OK, ModemDesk, refusal
from support.trace import Trace, Wanted, error_line
from support.traffic import APP_OUT, PC_OUT, PcTrace, dump

AMT, PRODUCT = "/amt/amt_result.txt", "/amt/product.txt"
AMT_COUNT, PRODUCT_COUNT = 20, 36
STATION, VERDICT, TEXT = 39, 36, 37
WRITTEN = packet(92, integer(1, 0))
ITEM_WRITTEN = packet(231, integer(1, 0))


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks, on a handset without result files."""
    handset = share_handset("packet")
    for path in (AMT, PRODUCT):
        handset.place(path, None)
    return ModemDesk(handset)


@pytest.fixture
def no_folder(desk: ModemDesk) -> Iterator[None]:
    """The folder of the factory files is away."""
    folder = desk.handset.path("/amt")
    away = folder.rename(folder.with_name("away"))
    yield
    away.rename(folder)


@pytest.fixture
def read_only_folder(desk: ModemDesk, no_folder: None) -> Iterator[None]:
    """The folder of the factory files cannot be written to."""
    folder = desk.handset.path("/amt")
    folder.symlink_to("/usr")
    yield
    folder.unlink()


def file_of(count: int, **items: int) -> bytes:
    """A file of verdicts: untested, but for the items given as i3=2."""
    digits = {int(name[1:]): digit for name, digit in items.items()}
    return b"".join(b"%d\n" % digits.get(i, 0) for i in range(count))


def failing(station: int, verdict: int, tail: str = "") -> Wanted:
    """The log line of a mirror that failed."""
    return re.compile(rf"\[vx-kel-amt:L\d+\] write fail amt station_num: {station}, "
                      rf"station_result: {verdict}{tail}\\n")


# written to the modem


def write_result(desk: ModemDesk, command: bytes, station: int, verdict: int,
                 *others: wire.Atom) -> Trace:
    """Report a verdict; the modem takes it."""
    trace = Trace(desk.handset)
    desk.exchange(packet(91, integer(STATION, station), integer(VERDICT, verdict), *others),
                  command, [OK], [WRITTEN])
    return trace


def test_verdict_goes_to_the_file_and_the_modem(desk: ModemDesk) -> None:
    printed = len(desk.handset.stdout())
    trace = write_result(desk, b"AT^DATOMW=3,1,good\r", 3, 1, string(TEXT, "good"))
    assert desk.handset.read(AMT) == file_of(AMT_COUNT, i3=1)
    name = "amt_modem_write_test_result"
    trace.expect(
        "receive command id: 91(0x5B) - AMT_WRITE_TEST_RESULT_CMD", f"{name}()",
        "saveAmtResult()", "initTestFile()", f"initTestFile . path:{AMT}; count: 20\\n",
        "updateTestItem()",
        "write item [3], result= 1\\n",
        "write amt_result success amt station_num: 3, station_result: 1.\\n",
        f"{name} m_buf_a[AT^DATOMW=3,1,good\\r] m_buf_len[19]", "write_at()",
        f"{name}  ret_val[0] m_buf_a[\\r\\nOK\\r\\n]", f"{name}\tret_val[0]",
        dump(APP_OUT, WRITTEN.encode()))
    assert b"[TEST_RESULT]" not in desk.handset.stdout()[printed:]


@pytest.mark.parametrize("verdict, digit, printed", [
    (1, 1, b""), (2, 2, b"[TEST_RESULT] update item for TEST_FAIL"),
    (3, 0, b"[TEST_RESULT] update item for TEST_UNKNOWN"),
    (0, 0, b"[TEST_RESULT] update item for TEST_UNKNOWN"),
    (-1, 0, b"[TEST_RESULT] update item for TEST_UNKNOWN"),
    (258, 0, b"[TEST_RESULT] update item for TEST_UNKNOWN")])
def test_verdicts(desk: ModemDesk, verdict: int, digit: int, printed: bytes) -> None:
    desk.handset.place(AMT, file_of(AMT_COUNT, i4=2, i5=1, i6=2))
    before = len(desk.handset.stdout())
    # The modem gets it as it is.
    write_result(desk, b"AT^DATOMW=5,%d\r" % verdict, 5, verdict)
    assert desk.handset.read(AMT) == file_of(AMT_COUNT, i4=2, i5=digit, i6=2)
    assert desk.handset.stdout()[before:].startswith(printed + b"[vx-kel-amt:L912]write_at: ")


def test_absent_atoms_are_zero(desk: ModemDesk) -> None:
    desk.exchange(packet(91), b"AT^DATOMW=0,0\r", [OK], [WRITTEN])
    assert desk.handset.read(AMT) == file_of(AMT_COUNT)


@pytest.mark.parametrize("station", [0, 19, 20, 21, 99, 0x7fffffff])
def test_stations_beyond_19_have_no_item(desk: ModemDesk, station: int) -> None:
    trace = write_result(desk, b"AT^DATOMW=%d,2\r" % station, station, 2)
    if station < AMT_COUNT:
        assert desk.handset.read(AMT) == file_of(AMT_COUNT, **{f"i{station}": 2})
        return
    # The modem has it all the same; not even the file is made.
    assert not desk.handset.path(AMT).exists()
    trace.expect(error_line("saveAmtResult", -3), f"item index error: {station}\\n",
                 failing(station, 2), "amt_modem_write_test_result\tret_val[0]")


@pytest.mark.parametrize("station", [-1, -2, -0x80000000])
def test_negative_stations_write_the_first_byte(desk: ModemDesk, station: int) -> None:
    trace = write_result(desk, b"AT^DATOMW=%d,2\r" % station, station, 2)
    assert desk.handset.read(AMT) == file_of(AMT_COUNT, i0=2)
    trace.expect(f"write item [{station}], result= 2\\n",
                 f"write amt_result success amt station_num: {station}, station_result: 2.\\n")


@pytest.mark.parametrize("given, sent", [
    ("", b""), ("x", b",x"), ("d" * 126, b"," + b"d" * 126), ("d" * 127, b"," + b"d" * 126),
    ("d" * 128, b"," + b"d" * 126), ("d" * 900, b"," + b"d" * 126), ("a, b,\"c\"", b",a, b,\"c\""),
    ("\0x", b""), ("a\0b", b",a"), ("\u00fc%d%s", b",\xc3\xbc%d%s"), ("a\rb", b",a\rb")])
def test_descriptions(desk: ModemDesk, given: str, sent: bytes) -> None:
    write_result(desk, b"AT^DATOMW=7,1" + sent + b"\r", 7, 1, string(TEXT, given))


def test_result_of_a_write(desk: ModemDesk) -> None:
    for error in ERRORS:
        trace = Trace(desk.handset)
        desk.exchange(packet(91, integer(STATION, 2), integer(VERDICT, 1)),
                      b"AT^DATOMW=2,1\r", [error], [refusal(91, MODEM_FAILED)])
        trace.expect("amt_modem_write_test_result\tret_val[-100]",
                     dump(APP_OUT, refusal(91, MODEM_FAILED).encode()))
        # The mirror was written before the modem was asked.
        assert desk.handset.read(AMT) == file_of(AMT_COUNT, i2=1)
    # A final OK counts for more than an error beside it.
    desk.exchange(packet(91), b"AT^DATOMW=0,0\r", [ERRORS[0] + OK], [WRITTEN])


def test_mirror_without_its_folder(desk: ModemDesk, no_folder: None) -> None:
    trace = write_result(desk, b"AT^DATOMW=2,1\r", 2, 1)
    trace.expect(error_line("saveAmtResult", -1, 2), "Save fail: Directory access deny\\n",
                 failing(2, 1))


def test_mirror_that_is_no_file(desk: ModemDesk) -> None:
    desk.handset.path(AMT).mkdir()
    trace = write_result(desk, b"AT^DATOMW=2,1\r", 2, 1)
    trace.expect(error_line("updateTestItem", -1, 21),
                 f"open file({AMT}) failure. errorr: 21 - Is a directory",
                 error_line("saveAmtResult", -3), "Save fail: update result error\\n",
                 failing(2, 1))


def test_mirror_that_cannot_be_made(desk: ModemDesk) -> None:
    desk.handset.path(AMT).symlink_to("/nowhere/results")
    trace = write_result(desk, b"AT^DATOMW=2,1\r", 2, 1)
    trace.expect(f"open file({AMT}) failure. errorr: 2 - No such file or directory",
                 error_line("saveAmtResult", -2), "Save fail: init result file error\\n",
                 failing(2, 1))


def test_mirror_on_a_full_file_system(desk: ModemDesk) -> None:
    desk.handset.path(AMT).symlink_to("/dev/full")
    trace = write_result(desk, b"AT^DATOMW=2,1\r", 2, 1)
    trace.expect(error_line("updateTestItem", -2, 28), error_line("saveAmtResult", -3),
                 "Save fail: update result error\\n", failing(2, 1))


def test_mirror_that_is_shorter_or_longer(desk: ModemDesk) -> None:
    desk.handset.place(AMT, "1\n")
    write_result(desk, b"AT^DATOMW=2,2\r", 2, 2)
    assert desk.handset.read(AMT) == b"1\n\0\x002"
    desk.handset.place(AMT, "x" * 50)
    write_result(desk, b"AT^DATOMW=2,2\r", 2, 2)
    assert desk.handset.read(AMT) == b"xxxx2" + b"x" * 45


# read from the modem


def verdict_of(station: int, verdict: int, text: str = "") -> wire.Packet:
    """The answer that tells a verdict."""
    return packet(90, integer(STATION, station), integer(VERDICT, verdict), string(TEXT, text),
                  integer(1, 0))


def read_result(desk: ModemDesk, station: int, said: bytes, *packets: wire.Packet) -> Trace:
    """Ask for a verdict; the modem says this before its final result."""
    trace = Trace(desk.handset)
    desk.exchange(packet(89, integer(STATION, station)), b"AT^DATOMR=1,%d\r" % station,
                  [said + OK], packets)
    return trace


def test_verdict_of_the_modem_and_its_mirror(desk: ModemDesk) -> None:
    trace = read_result(desk, 3, b"\r\n^DATOMR: 4,2,bad, really\r\n",
                        verdict_of(4, 2, "bad, really"))
    # The mirror has what the modem names, not what was asked for.
    assert desk.handset.read(AMT) == file_of(AMT_COUNT, i4=2)
    name = "amt_modem_read_test_result"
    said = "\\r\\n^DATOMR: 4,2,bad, really\\r\\n\\r\\nOK\\r\\n"
    trace.expect(
        f"{name}()", f"{name} m_buf_a[AT^DATOMR=1,3\\r] m_buf_len[14]", "write_at()",
        f"{name}  ret_val[0] m_buf_a[{said}]", f"{name} head_ptr[{said}]",
        f"{name} station_num[4]", f"{name} station_result[2]",
        f"{name} test_description_a[bad, really]",
        f"{name} ret_val[0] station_num[4] station_result[2]", "saveAmtResult()",
        "write amt_result success amt station_num: 4, station_result: 2.\\n",
        dump(APP_OUT, verdict_of(4, 2, "bad, really").encode()))


@pytest.mark.parametrize("line, answer", [
    (b"5,1", verdict_of(5, 1)), (b"5,1,", verdict_of(5, 1)), (b"12,2,x", verdict_of(12, 2, "x")),
    (b"05,1,x", verdict_of(5, 1, "x")), (b"0,0,x", verdict_of(0, 0, "x")),
    # of three digits, two are the station and the third is the verdict
    (b"123,4,x", verdict_of(12, 3, "4,x")), (b"123", verdict_of(12, 3)),
    (b"1234,x", verdict_of(12, 3)), (b"121,x", verdict_of(12, 1, "x")),
    # without a digit the asked station stays, and the verdict is 0
    (b"x,1", verdict_of(3, 0)), (b",1,x", verdict_of(3, 1, "x")), (b"-1,1", verdict_of(3, 0)),
    (b",,x", verdict_of(3, 0, "x")), (b"5,x", verdict_of(5, 0)), (b"5", verdict_of(5, 0)),
    (b"", verdict_of(3, 0)), (b" 5,1", verdict_of(3, 0)), (b"5 ,1", verdict_of(5, 0)),
    (b"5,12,x", verdict_of(5, 1)), (b"5,9,x", verdict_of(5, 9, "x")),
    (b"5,,x", verdict_of(5, 0, "x")), (b"5,1 ,x", verdict_of(5, 1)),
    # the description, to the line's end
    (b"5,1,,", verdict_of(5, 1, ",")), (b"5,1,a\rb\nc", verdict_of(5, 1, "a\rb\nc")),
    (b"5,1," + b"d" * 126, verdict_of(5, 1, "d" * 126)),
    (b"5,1," + b"d" * 127, verdict_of(5, 1, "d" * 127)),
    (b"5,1," + b"d" * 128, verdict_of(5, 1, "d" * 127)),
    (b"5,1," + b"d" * 900, verdict_of(5, 1, "d" * 127)),
])
def test_answer_lines(desk: ModemDesk, line: bytes, answer: wire.Packet) -> None:
    read_result(desk, 3, b"\r\n^DATOMR: " + line + b"\r\n", answer)
    station, verdict = answer.get_int(STATION), answer.get_int(VERDICT)
    assert desk.handset.read(AMT) == file_of(
        AMT_COUNT, **{f"i{station}": verdict if verdict in (1, 2) else 0})


@pytest.mark.parametrize("said", [b"", b"\r\n^DATOMR:5,1\r\n", b"\r\n^datomr: 5,1\r\n",
                                  b"^DATOMR: 5,1\r\n", b"\r\n^DATOMR; 5,1\r\n"])
def test_final_ok_alone_keeps_the_station(desk: ModemDesk, said: bytes) -> None:
    desk.handset.place(AMT, file_of(AMT_COUNT, i3=1))
    trace = read_result(desk, 3, said, verdict_of(3, 0))
    trace.expect("amt_modem_read_test_result head_ptr[(null)]")
    assert desk.handset.read(AMT) == file_of(AMT_COUNT)


@pytest.mark.parametrize("before", [b"x", b"\r\n", b"\r\n^DATOMW: 9,2,z\r\n", b"9,2,z\r"])
def test_text_in_front_of_the_line_says_nothing(desk: ModemDesk, before: bytes) -> None:
    trace = read_result(desk, 3, before + b"\r\n^DATOMR: 4,1,a\r\n", verdict_of(4, 1, "a"))
    trace.expect("amt_modem_read_test_result head_ptr[\\r\\n^DATOMR: 4,1,a\\r\\n\\r\\nOK\\r\\n]")
    assert desk.handset.read(AMT) == file_of(AMT_COUNT, i4=1)


def test_first_line_counts(desk: ModemDesk) -> None:
    read_result(desk, 3, b"\r\n^DATOMR: 4,1,a\r\n\r\n^DATOMR: 5,2,b\r\n", verdict_of(4, 1, "a"))
    # The line ends where the final result begins.
    desk.exchange(packet(89, integer(STATION, 3)), b"AT^DATOMR=1,3\r",
                  [b"\r\n^DATOMR: 4,1,a\r\nOK\r\n"], [verdict_of(4, 1, "a")])


@pytest.mark.parametrize("station", [19, 20, 99])
def test_read_station_beyond_19_has_no_item(desk: ModemDesk, station: int) -> None:
    trace = read_result(desk, station, b"\r\n^DATOMR: %d,1,x\r\n" % station,
                        verdict_of(station, 1, "x"))
    if station < AMT_COUNT:
        assert desk.handset.read(AMT) == file_of(AMT_COUNT, i19=1)
        return
    assert not desk.handset.path(AMT).exists()
    trace.expect(f"item index error: {station}\\n", failing(station, 1, r"\. rtn:-3\."))


def test_read_mirror_that_fails(desk: ModemDesk, no_folder: None) -> None:
    read_result(desk, 3, b"\r\n^DATOMR: 3,1,x\r\n", verdict_of(3, 1, "x")).expect(
        "Save fail: Directory access deny\\n", failing(3, 1, r"\. rtn:-1\."))


def test_result_of_a_read(desk: ModemDesk) -> None:
    ask, command = packet(89, integer(STATION, 3)), b"AT^DATOMR=1,3\r"
    for error in ERRORS:
        # Looked for before the answer, and before the final OK.
        for said in ([error], [b"\r\n^DATOMR: 4,2,x\r\n", error],
                     [b"\r\n^DATOMR: 4,2,x\r\n" + error + OK]):
            trace = Trace(desk.handset)
            desk.exchange(ask, command, said, [refusal(89, MODEM_FAILED)])
            station, verdict = (4, 2) if len(said) == 2 else (3, 0)
            trace.expect(f"amt_modem_read_test_result ret_val[-100] station_num[{station}] "
                         f"station_result[{verdict}]")
            assert not desk.handset.path(AMT).exists()


def test_what_was_written_is_read(make_handset: HandsetFactory) -> None:
    app = AppChannel(make_handset("packet"))
    assert app.request(91, integer(STATION, 7), integer(VERDICT, 2),
                       string(TEXT, "it, failed")) == WRITTEN
    assert app.request(89, integer(STATION, 7)) == verdict_of(7, 2, "it, failed")
    assert app.request(89, integer(STATION, 8)) == verdict_of(8, 0)
    assert app.handset.read(AMT) == file_of(AMT_COUNT, i7=2)


# from the PC


@pytest.mark.parametrize("station, verdict, stored", [
    (3, 1, {"i3": 1}), (19, 2, {"i19": 2}), (0, 7, {}), (-1, 2, {"i0": 2}), (20, 1, None)])
def test_verdict_of_the_pc(share_handset: HandsetFactory, station: int, verdict: int,
                           stored: dict[str, int] | None) -> None:
    pc = PcChannel(share_handset("pc"))
    pc.handset.place(AMT, None)
    modem = pc.handset.modem.open()
    trace = PcTrace(pc.handset)
    request = wire.encode_envelope(packet(91, integer(STATION, station), integer(VERDICT, verdict),
                                          string(TEXT, "text")))
    pc.send(request)
    # It reaches the modem unchanged, whose answer reaches the PC unchanged, and nothing else does.
    assert modem.read_exactly(len(request)) == request
    answer = wire.encode_envelope(WRITTEN)
    modem.write(answer)
    assert pc.read_frame() == answer
    trace.wait_served()
    trace.expect("amt_modem_write_pc_test_result()", f"amt_modem_write_pc_test_result "
                 f"station_num={station},station_result={verdict}", "saveAmtResult()")
    trace.expect_none(dump(PC_OUT, wire.ACKNOWLEDGEMENT))
    if stored is None:
        trace.expect(f"item index error: {station}\\n", failing(station, verdict))
        assert not pc.handset.path(AMT).exists()
        return
    trace.expect(f"write amt_result success amt station_num: {station}, "
                 f"station_result: {verdict}.\\n")
    assert pc.handset.read(AMT) == file_of(AMT_COUNT, **stored)


# the items on the device


def write_item(desk: ModemDesk, station: int, verdict: int, *packets: wire.Packet) -> Trace:
    """Store an item's verdict."""
    trace = Trace(desk.handset)
    desk.app.send_packet(230, integer(STATION, station), integer(VERDICT, verdict))
    desk.expect(*packets)
    return trace


def read_item(desk: ModemDesk, station: int, *packets: wire.Packet) -> Trace:
    """Read an item's verdict."""
    trace = Trace(desk.handset)
    desk.app.send_packet(228, integer(STATION, station))
    desk.expect(*packets)
    return trace


def item(station: int, verdict: int) -> wire.Packet:
    """The answer that tells an item's verdict."""
    return packet(229, integer(STATION, station), integer(VERDICT, verdict), integer(1, 0))


ITEM_WRITE_FAILED, ITEM_READ_FAILED = refusal(230, MODEM_FAILED), refusal(228, MODEM_FAILED)


def test_reading_an_item_makes_the_file(desk: ModemDesk) -> None:
    trace = read_item(desk, 5, item(5, 0))
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT)
    trace.expect("amt_item_read_test_result()", "readProductResult()",
                 f"access file({PRODUCT}) failure. errorr: 2 - No such file or directory",
                 f"initTestFile . path:{PRODUCT}; count: 36\\n", "itemIndex = 5, buf= 0\\n",
                 "amt_item_read_test_result station_num[5] station_result[0]",
                 "amt_item_read_test_result read_item ret_val[0]",
                 dump(APP_OUT, item(5, 0).encode()))
    trace.expect_none("write_at()")
    assert not [text for text in trace.texts() if "FUNC-amt_item_read_test_result" in text]


def test_an_item_is_written_before_and_read_at_its_number(desk: ModemDesk) -> None:
    printed = len(desk.handset.stdout())
    trace = write_item(desk, 1, 2, ITEM_WRITTEN)
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i0=2)
    trace.expect("amt_item_write_test_result()",
                 "amt_item_write_test_result station_num[1] station_result[2]",
                 "saveProductResult()", f"initTestFile . path:{PRODUCT}; count: 36\\n",
                 "write item [0], result= 2\\n", "amt_item_write_test_result write_item ret_val[0]",
                 dump(APP_OUT, ITEM_WRITTEN.encode()))
    assert desk.handset.stdout()[printed:] == b"[TEST_RESULT] update item for TEST_FAIL"
    read_item(desk, 1, item(1, 0))
    read_item(desk, 0, item(0, 2))
    write_item(desk, 2, 1, ITEM_WRITTEN)
    read_item(desk, 1, item(1, 1))
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i0=2, i1=1)
    # The stations' file has nothing to do with it.
    assert not desk.handset.path(AMT).exists()


def test_item_limits_of_a_write(desk: ModemDesk) -> None:
    write_item(desk, 35, 1, ITEM_WRITTEN)
    write_item(desk, 36, 2, ITEM_WRITTEN)
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i34=1, i35=2)
    for station in (37, 38, 0x7fffffff, -0x80000000):
        index = station - 1 if station > 0 else 0x7fffffff
        printed = len(desk.handset.stdout())
        trace = write_item(desk, station, 1, ITEM_WRITE_FAILED)
        trace.expect(error_line("saveProductResult", -3), f"item index error: {index}\\n",
                     error_line("amt_item_write_test_result", -119),
                     "amt_item_write_test_result write_item ret_val[-119]")
        said = desk.handset.stdout()[printed:].decode()
        assert said.startswith("[vx-kel-amt:L") and said.endswith(
            f"] write fail station_num: {station}, station_result: 1\n")
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i34=1, i35=2)


@pytest.mark.parametrize("station", [0, -1, -100, -0x7fffffff])
def test_item_before_the_first_writes_the_first_byte(desk: ModemDesk, station: int) -> None:
    trace = write_item(desk, station, 2, ITEM_WRITTEN)
    trace.expect(f"write item [{station - 1}], result= 2\\n")
    assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i0=2)


def test_item_limits_of_a_read(desk: ModemDesk) -> None:
    desk.handset.place(PRODUCT, file_of(PRODUCT_COUNT, i0=1, i35=2))
    read_item(desk, 0, item(0, 1))
    read_item(desk, 35, item(35, 2))
    for station in (36, 37, 0x7fffffff):
        trace = read_item(desk, station, ITEM_READ_FAILED)
        trace.expect(f"item index error: {station}\\n",
                     f"amt_item_read_test_result station_num[{station}] station_result[-3]",
                     error_line("amt_item_read_test_result", -104),
                     "amt_item_read_test_result read_item ret_val[-104]")
    for station in (-1, -0x80000000):
        trace = read_item(desk, station, ITEM_READ_FAILED)
        trace.expect(error_line("readProductResult", -1, 22),
                     "call fseek failure. errorr: 22 - Invalid argument",
                     f"amt_item_read_test_result station_num[{station}] station_result[-1]")


def test_item_verdicts(desk: ModemDesk) -> None:
    for verdict, digit in ((1, 1), (2, 2), (3, 0), (0, 0), (-2, 0)):
        desk.handset.place(PRODUCT, file_of(PRODUCT_COUNT, i4=1))
        write_item(desk, 5, verdict, ITEM_WRITTEN)
        assert desk.handset.read(PRODUCT) == file_of(PRODUCT_COUNT, i4=digit)


@pytest.mark.parametrize("content, answer", [
    (b"0\n0\n1\n", item(2, 1)), (b"0\n0\n", item(2, 0)), (b"", item(2, 0)),
    (b"0\n0\n3\n", ITEM_READ_FAILED), (b"0\n0\n9\n", ITEM_READ_FAILED),
    (b"0\n0\nx\n", item(2, 0)), (b"0\n0\n\n\n", item(2, 0)), (b"0\n0\n-1\n", item(2, 0)),
    (b"0\n0\n\0\n", item(2, 0)), (b"000012", item(2, 1)), (b"0\n0\n12\n", item(2, 1))])
def test_files_that_are_not_as_they_should_be(desk: ModemDesk, content: bytes,
                                              answer: wire.Packet) -> None:
    desk.handset.place(PRODUCT, content)
    read_item(desk, 2, answer)


def test_items_without_their_folder(desk: ModemDesk, no_folder: None) -> None:
    write_item(desk, 2, 1, ITEM_WRITE_FAILED).expect(
        error_line("saveProductResult", -1, 2), "Save fail: Directory access deny\\n")
    read_item(desk, 2, ITEM_READ_FAILED).expect(
        error_line("readProductResult", -1, 2),
        "access folder(/amt) failure. errorr: 2 - No such file or directory",
        "amt_item_read_test_result station_num[2] station_result[-1]")


def test_items_in_a_folder_that_cannot_be_written(desk: ModemDesk, read_only_folder: None) -> None:
    write_item(desk, 2, 1, ITEM_WRITE_FAILED).expect(
        error_line("saveProductResult", -1, 30), "Save fail: Directory access deny\\n")


def test_items_that_are_no_file(desk: ModemDesk) -> None:
    desk.handset.path(PRODUCT).mkdir()
    write_item(desk, 2, 1, ITEM_WRITE_FAILED).expect(
        f"open file({PRODUCT}) failure. errorr: 21 - Is a directory",
        "Save fail: update result error\\n")
    read_item(desk, 2, ITEM_READ_FAILED).expect(
        error_line("readProductResult", -1), "call fgets error. errorr: 21 - Is a directory")


def test_items_that_cannot_be_made(desk: ModemDesk) -> None:
    desk.handset.path(PRODUCT).symlink_to("/nowhere/items")
    write_item(desk, 2, 1, ITEM_WRITE_FAILED).expect(
        error_line("saveProductResult", -2), "Save fail: init result file error\\n")
    read_item(desk, 2, ITEM_READ_FAILED).expect(
        f"access file({PRODUCT}) failure. errorr: 2 - No such file or directory",
        f"open file({PRODUCT}) failure. errorr: 2 - No such file or directory",
        error_line("readProductResult", -2), "initTestFile fail: init result file error\\n",
        "amt_item_read_test_result station_num[2] station_result[-2]")


def test_items_on_a_full_file_system(desk: ModemDesk) -> None:
    desk.handset.path(PRODUCT).symlink_to("/dev/full")
    write_item(desk, 2, 1, ITEM_WRITE_FAILED).expect(
        error_line("updateTestItem", -2, 28), "Save fail: update result error\\n")
