"""Identity writes: captured on their way to the modem, saved when the modem has answered."""

import pytest

from amt_simulator import Handset
from amt_station import wire
from support.channels import PcChannel, integer, packet, string
from support.modem_desk import ERROR, OK
from support.trace import Trace, error_line

IMEI = "350000000000017"
SN = "KEL0000000000042"
IMEI_FILES = ("/amt/imei.txt", "/amt/imei-2.txt")
SN_FILES = ("/amt/sn.txt", "/amt/sn-2.txt")
FILES = IMEI_FILES + SN_FILES

WRITE_IMEI = packet(5, string(21, IMEI))
WRITE_BOARD = packet(87, string(38, SN))


def answer_packet(command: int, result: int) -> bytes:
    """What a modem answers that speaks packets."""
    return wire.encode_envelope(packet(command, integer(1, result)))


class Desk:
    """A station on the PC line, and the test in the modem's place."""

    def __init__(self, handset: Handset) -> None:
        self.handset = handset
        self.pc = PcChannel(handset)
        handset.modem.open()

    def pass_on(self, data: bytes) -> None:
        """The station says something that the modem gets unchanged."""
        self.pc.send(data)
        assert self.handset.modem.read_exactly(len(data)) == data

    def answer(self, data: bytes) -> None:
        """The modem says something that the station gets unchanged, after it has been acted on."""
        self.handset.modem.write(data)
        assert self.pc.line.read_exactly(len(data)) == data

    def exchange(self, text: str, answer: bytes = OK) -> None:
        """An AT command of the station and the modem's answer."""
        self.pass_on(text.encode() + b"\r")
        self.answer(answer)

    def files(self) -> dict[str, str]:
        """The identity files that are there."""
        return {name: self.handset.text(name) for name in FILES
                if self.handset.path(name).is_file()}

    def trace(self) -> Trace:
        """A trace from here on."""
        return Trace(self.handset)


@pytest.fixture
def desk(pc_handset: Handset) -> Desk:
    """A running handset whose modem is the test."""
    return Desk(pc_handset)


@pytest.mark.parametrize("command, kind, name, text, path", [
    ("AT^DCGSNW=", 1, "imei", IMEI, "/amt/imei.txt"), ("AT^DMSN=", 2, "sn", SN, "/amt/sn.txt")])
def test_at_text_is_saved_on_ok(desk: Desk, command: str, kind: int, name: str, text: str,
                                path: str) -> None:
    trace = desk.trace()
    desk.pass_on(f"{command}{text}\r".encode())
    assert desk.files() == {}
    desk.answer(OK)
    # The station has its answer only when the value is safe.
    assert desk.files() == {path: text}
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    trace.expect("handle_amt_imei_and_sn--->req_id_en:255.",
                 f"received at command in amt4:{command}{text}\\r",
                 f"getted parameter:{text}. prefix:{command}; rtn:0.")
    trace.expect(f"g_cur_treat_cmd_type:{kind};", "handle_amt_imei_and_sn_save_file()",
                 f"write pcba-sn: {text}", f"save {name} to file. channel:0; content:{text};",
                 f"Writed {name} to file success.")

    desk.handset.place(path, None)
    later = desk.trace()
    desk.answer(OK)
    assert desk.files() == {}, "a write is saved once"
    later.expect("g_cur_treat_cmd_type:0;")


@pytest.mark.parametrize("request_packet, name, text, path, captured", [
    (WRITE_IMEI, "imei", IMEI, "/amt/imei.txt",
     f"getted write-imei command in amt1: imei:{IMEI};"),
    (WRITE_BOARD, "sn", SN, "/amt/sn.txt",
     f"getted write-board command in amt1: board:{SN};")])
def test_packet_is_saved_on_result_0(desk: Desk, request_packet: wire.Packet, name: str,
                                     text: str, path: str, captured: str) -> None:
    trace = desk.trace()
    desk.pass_on(wire.encode_envelope(request_packet))
    assert desk.files() == {}
    desk.answer(answer_packet(request_packet.command + 1, 0))
    assert desk.files() == {path: text}
    assert trace.syncs == 2
    trace.expect(f"handle_amt_imei_and_sn--->req_id_en:{request_packet.command}.", captured)
    trace.expect("getted error-code from modem: err-code:0;",
                 f"save {name} to file. channel:0; content:{text};",
                 f"Writed {name} to file success.")


def test_packet_is_saved_on_ok_too(desk: Desk) -> None:
    desk.pass_on(wire.encode_envelope(WRITE_IMEI))
    desk.answer(b"\r\n^DNOTE: 1\r\n" + OK)
    assert desk.files() == {"/amt/imei.txt": IMEI}


@pytest.mark.parametrize("refusal", [
    pytest.param(answer_packet(6, 3), id="result 3"),
    pytest.param(answer_packet(10, 0), id="another response"),
    pytest.param(ERROR, id="ERROR"),
    pytest.param(b"\r\n+CME ERROR: 50\r\n", id="CME ERROR"),
    pytest.param(b"\r\n^DNOTE: OK\r\n", id="a report"),
])
def test_any_other_answer_keeps_the_write_pending(desk: Desk, refusal: bytes) -> None:
    trace = desk.trace()
    desk.pass_on(wire.encode_envelope(WRITE_IMEI))
    desk.answer(refusal)
    assert desk.files() == {}
    assert trace.syncs == 0
    desk.answer(answer_packet(6, 0))
    assert desk.files() == {"/amt/imei.txt": IMEI}
    trace.expect("g_cur_treat_cmd_type:1;", "g_cur_treat_cmd_type:1;",
                 "getted error-code from modem: err-code:0;", "Writed imei to file success.")


def test_result_3_is_logged_and_saves_nothing(desk: Desk) -> None:
    trace = desk.trace()
    desk.pass_on(wire.encode_envelope(WRITE_BOARD))
    desk.answer(answer_packet(88, 3))
    trace.expect("g_cur_treat_cmd_type:2;", "getted error-code from modem: err-code:3;")
    assert desk.files() == {}


def test_ok_in_two_pieces_saves_nothing(desk: Desk) -> None:
    desk.pass_on(f"AT^DCGSNW={IMEI}\r".encode())
    desk.answer(b"\r\nO")
    desk.answer(b"K\r\n")
    assert desk.files() == {}
    desk.answer(OK)
    assert desk.files() == {"/amt/imei.txt": IMEI}


def test_channel_by_text_selects_the_files(desk: Desk) -> None:
    for channel, is_second in (("1", True), ("0", False), (" 1", True), ("2", False),
                               ("257", True), ("255", False), ("1", True), ("x", False)):
        for name in FILES:
            desk.handset.place(name, None)
        desk.exchange(f"AT^DMPCHN={channel}")
        desk.exchange(f"AT^DCGSNW={IMEI}")
        desk.exchange(f"AT^DMSN={SN}")
        assert desk.files() == {IMEI_FILES[is_second]: IMEI, SN_FILES[is_second]: SN}, channel


def test_channel_by_packet_selects_the_files(desk: Desk) -> None:
    trace = desk.trace()
    for channel in (1, 0, 2):
        switch = packet(232, integer(159, channel))
        desk.pass_on(wire.encode_envelope(switch))
        desk.answer(answer_packet(233, 0))
        desk.pass_on(wire.encode_envelope(packet(5, string(21, f"{IMEI}{channel}"))))
        desk.answer(answer_packet(6, 0))
    assert desk.files() == {"/amt/imei-2.txt": f"{IMEI}1", "/amt/imei.txt": f"{IMEI}2"}
    trace.expect("handle_amt_imei_and_sn--->req_id_en:232.",
                 "getted switch-channel command in amt1: channel:1;",
                 f"save imei to file. channel:1; content:{IMEI}1;",
                 "getted switch-channel command in amt1: channel:0;",
                 f"save imei to file. channel:0; content:{IMEI}0;",
                 "getted switch-channel command in amt1: channel:2;",
                 f"save imei to file. channel:2; content:{IMEI}2;")


@pytest.mark.parametrize("command, path", [("AT^DCGSNW=", "/amt/imei.txt"),
                                           ("AT^DMSN=", "/amt/sn.txt")])
def test_an_empty_text_writes_nothing_and_is_done(desk: Desk, command: str, path: str) -> None:
    desk.handset.place(path, "old")
    trace = desk.trace()
    desk.exchange(command)
    desk.answer(OK)
    assert desk.files() == {path: "old"}
    assert trace.calls() == []
    trace.expect("handle_amt_imei_and_sn_save_file()", "g_cur_treat_cmd_type:0;")


def test_at_parameter_is_kept_as_it_stands_up_to_20(desk: Desk) -> None:
    for said, kept in (("12345678901234567890", "12345678901234567890"),
                       ("123456789012345678901", "12345678901234567890"),
                       ("  42", "42"), ("4 2 ", "4 2 "), ('"42"', '"42"')):
        desk.exchange(f"AT^DMSN={said}")
        assert desk.files() == {"/amt/sn.txt": kept}


def test_board_text_is_cut_at_20(desk: Desk) -> None:
    for length in (300, 22, 21, 20, 19):
        text = ("1234567890" * 30)[:length]
        desk.pass_on(wire.encode_envelope(packet(87, string(38, text))))
        desk.answer(answer_packet(88, 0))
        assert desk.files() == {"/amt/sn.txt": text[:20]}


def test_a_later_write_replaces_the_pending_one(desk: Desk) -> None:
    desk.pass_on(f"AT^DCGSNW={IMEI}\r".encode())
    desk.pass_on(f"AT^DMSN={SN}\r".encode())
    desk.answer(OK)
    assert desk.files() == {"/amt/sn.txt": SN}


def test_a_shorter_text_leaves_nothing_of_the_longer_one(desk: Desk) -> None:
    desk.exchange(f"AT^DMSN={SN}")
    desk.exchange("AT^DMSN=7")
    assert desk.files() == {"/amt/sn.txt": "7"}


def test_pcba_number_and_second_serial_number_share_a_file(desk: Desk) -> None:
    desk.exchange("AT^DMPCHN=1")
    assert desk.pc.request(193, wire.Atom.boolean(190, 2), string(191, "PCBA-1")).result == 0
    assert desk.files() == {"/amt/sn-2.txt": "PCBA-1"}
    desk.exchange(f"AT^DMSN={SN}")
    assert desk.files() == {"/amt/sn-2.txt": SN}
    assert desk.pc.request(193, wire.Atom.boolean(190, 2), string(191, "PCBA-2")).result == 0
    assert desk.files() == {"/amt/sn-2.txt": "PCBA-2"}


@pytest.mark.parametrize("command, name", [("AT^DCGSNW=", "imei"), ("AT^DMSN=", "sn")])
def test_a_file_that_cannot_be_opened(desk: Desk, command: str, name: str) -> None:
    path = f"/amt/{name}.txt"
    desk.handset.path(path).mkdir()
    trace = desk.trace()
    desk.exchange(f"{command}42")
    assert trace.calls() == []
    trace.expect(error_line("amt_write_pcba_sn", -118, 21),
                 f'open("{path}") fail: 21 - Is a directory',
                 f"save {name} to file. channel:0; content:42;",
                 error_line("handle_amt_imei_and_sn_save_file", -100, 21), f"write {name} error.")
    desk.answer(OK)
    trace.expect("g_cur_treat_cmd_type:0;")


def test_a_full_file_system(desk: Desk) -> None:
    desk.handset.path("/amt/imei.txt").symlink_to("/dev/full")
    trace = desk.trace()
    desk.exchange("AT^DCGSNW=42")
    assert trace.syncs == 2, "a file that was truncated is flushed"
    trace.expect(error_line("amt_write_pcba_sn", -118, 28),
                 "fputs fail: 28 - No space left on device",
                 "save imei to file. channel:0; content:42;",
                 error_line("handle_amt_imei_and_sn_save_file", -100, 28), "write imei error.")
    trace.expect_none("write pcba-sn: 42", "Writed imei to file success.")


def test_ok_behind_an_envelope_is_an_acceptance(desk: Desk) -> None:
    # The zero bytes of the modem's packet do not hide what it says behind it, in the same breath.
    desk.pass_on(f"AT^DCGSNW={IMEI}\r".encode())
    desk.answer(answer_packet(90, 0) + OK)
    assert desk.files() == {"/amt/imei.txt": IMEI}
