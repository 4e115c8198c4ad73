"""Version queries: the fixed text, the modem's own versions, and the software text."""

import re
from pathlib import Path

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_station import wire
from support.channels import ACK, PcChannel, integer, packet, raw
from support.modem_desk import NOT_SERVED, OK, ModemDesk, refusal
from support.replaced_cutils import replace_cutils
from support.trace import Trace, error_line
from support.traffic import APP_OUT, PC_OUT, PcTrace, dump

FIXED = b"\rAndroid4.2,2013-01-21" + b"\n" * 42
NAMES = {1: "AMT_PRODUCT_MODULE", 16: "AMT_SOFTWARE_MODULE", 17: "AMT_L1_MODULE",
         18: "AMT_HLS_MODULE", 19: "AMT_PLATFORM_MODULE", 20: "AMT_APP_MODULE",
         32: "AMT_HARDWARE_MODULE", 64: "AMT_WHOLE_MODULE"}
UNKNOWN = (0, 2, 15, 21, 31, 33, 63, 65, 255, 0x110, -1)
CME = b"\r\n+CME ERROR: 100\r\n"


def ask(module: int) -> wire.Packet:
    """The request for a module's version."""
    return packet(45, integer(19, module))


def version(module: int, text: bytes) -> wire.Packet:
    """The answer to it."""
    return packet(46, integer(19, module), raw(18, text), integer(1, 0))


def shown(module: int) -> str:
    """The log line of a module."""
    return f"version type: 0x{module & 0xffffffff:02x} - {NAMES.get(module, '(undefined)')}"


def unknown(module: int, function: str) -> tuple["str | re.Pattern[str]", ...]:
    """What is logged about a module that there is none of."""
    return (shown(module), error_line(function, -100),
            f"unknown version type: 0x{module & 0xffffffff:02x}")


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks."""
    return ModemDesk(share_handset("packet"))


def test_fixed_text_has_64_bytes() -> None:
    assert len(FIXED) == 64


@pytest.mark.parametrize("module", [1, 16, 19, 20, 32, 64])
def test_app_gets_the_fixed_text(desk: ModemDesk, module: int) -> None:
    trace = Trace(desk.handset)
    desk.app.send(ask(module).encode())
    desk.expect(version(module, FIXED))
    trace.expect("receive command id: 45(0x2D) - AMT_VERSION_CMD", "handle_amt_req_version()",
                 shown(module), dump(APP_OUT, version(module, FIXED).encode()))
    trace.expect_none("write_at()")


@pytest.mark.parametrize("module", UNKNOWN)
def test_app_asks_for_an_unknown_module(desk: ModemDesk, module: int) -> None:
    trace = Trace(desk.handset)
    desk.app.send(ask(module).encode())
    desk.expect(refusal(45, NOT_SERVED))
    trace.expect(*unknown(module, "handle_amt_req_version"))
    trace.expect_none("write_at()")


def test_app_names_no_module(desk: ModemDesk) -> None:
    desk.app.send(packet(45).encode())
    desk.expect(refusal(45, NOT_SERVED))


# the modem's own versions


def query(desk: ModemDesk, value: bytes, *packets: wire.Packet, module: int = 17) -> Trace:
    """Ask for a modem's version; the modem gives this value."""
    trace = Trace(desk.handset)
    desk.exchange(ask(module), f"AT^DCMR={module}\r".encode(),
                  [b"\r\n^DCMR:" + value + b"\r\n" + OK], packets)
    return trace


@pytest.mark.parametrize("module, name", [(17, "0x11"), (18, "0x12")])
def test_modem_version_and_its_log(desk: ModemDesk, module: int, name: str) -> None:
    trace = query(desk, b" 1,0D414243", version(module, b"ABC"), module=module)
    trace.expect("handle_amt_req_version()", shown(module), "handle_amt_req_l1_hls_version()",
                 "get_l1_hls_version()",
                 f"will send at command:AT^DCMR={module}\\r", "write_at()",
                 f"get version success.type:{module}, version:[len:3 content:ABC]",
                 dump(APP_OUT, version(module, b"ABC").encode()))
    trace = query(desk, b" 1", refusal(45, NOT_SERVED), module=module)
    trace.expect("DCMR-query's result[1] is invalid",
                 error_line("handle_amt_req_l1_hls_version", -100),
                 f"get version failure for type: {name}",
                 dump(APP_OUT, refusal(45, NOT_SERVED).encode()))


@pytest.mark.parametrize("value, text", [
    # the leading 0D, the end at 0A
    (b" 1,0D414243", b"ABC"), (b" 1,4142430A", b"ABC"), (b" 1,0d4142430a44", b"ABC"),
    (b" 1,0D0D41", b"\rA"), (b" 1,41420D", b"AB\r"), (b" 1,0D", b""), (b" 1,", b""),
    (b" 1,0A", b""), (b" 1,0D0A", b""), (b" 1,D41", b"\xd4"),
    # the small marker counts before the capital one, wherever they stand
    (b" 1,410A420a43", b"A\x0aB"), (b" 1,410a420A43", b"A"), (b" 1,5030A1", b"\x50"),
    (b" 1,4140a141", b"A"), (b" 10a,414243", b""), (b" 10A,414243", b""), (b" 0a,0D41", b""),
    # anything before the first comma, blanks, characters that are no digits, odd digits
    (b",41", b"A"), (b" x y,41", b"A"), (b" 1,2,3", b"\x23"), (b" 1,   0D41", b"A"),
    (b" 1,41 42-43", b"ABC"), (b" 1,4 1", b"A"), (b" 1,414", b"A"), (b"     1,41", b"A"),
    (b"1,4a4B", b"JK"), (b" 1,xyz", b""), (b" 1,00FF80", b"\0\xff\x80"),
    # what stands before the final result belongs to the value, line ends at its end do not
    (b" 1,4142\r\n\r\n", b"AB"), (b" 1,41\r\n\r\n+CSQ: 42", b"A\xc4"),
])
def test_modem_versions(desk: ModemDesk, value: bytes, text: bytes) -> None:
    query(desk, value, version(17, text))


@pytest.mark.parametrize("said", [
    OK, b"\r\n^DCMR: 1\r\n" + OK, b"\r\n^dcmr: 1,41\r\n" + OK, b"^DCMR: 1,41\r\n" + OK,
    b"\r\n^DCMR 1,41\r\n" + OK, OK + b"\r\n^DCMR: 1,41\r\n", b"\r\n^DCMR:\r\n" + OK,
    b"\r\n^DCMR:   " + OK, b"\r\n^DCMR:" + OK])
def test_answers_without_a_version(desk: ModemDesk, said: bytes) -> None:
    desk.exchange(ask(17), b"AT^DCMR=17\r", [said], [refusal(45, NOT_SERVED)])


def test_empty_value_is_an_error_of_its_own(desk: ModemDesk) -> None:
    query(desk, b" ", refusal(45, NOT_SERVED)).expect(
        error_line("get_l1_hls_version", -101),
        error_line("handle_amt_req_l1_hls_version", -100))


def test_value_of_408_characters_is_the_longest(desk: ModemDesk) -> None:
    text = bytes(b"KEL-1 release"[i % 13] for i in range(203))
    value = b"1," + text.hex().upper().encode()
    assert len(value) == 408
    # Blanks before it and line ends behind it do not count.
    query(desk, b"    " + value + b"\r\n\r\n", version(17, text))
    query(desk, b"," + b"4" * 407, version(17, b"D" * 203))
    for longer in (value + b"4", value + b" ", b"1" + value):
        query(desk, b" " + longer, refusal(45, NOT_SERVED))


# the PC


@pytest.fixture
def pc(share_handset: HandsetFactory) -> PcChannel:
    """The PC's line, shared by what changes nothing."""
    return PcChannel(share_handset("pc"))


@pytest.mark.parametrize("module", [1, 19, 20, 32, 64])
def test_pc_gets_the_fixed_text(pc: PcChannel, module: int) -> None:
    trace = PcTrace(pc.handset)
    pc.send_packet(45, integer(19, module))
    assert pc.read_frame() == ACK
    assert pc.read_frame() == wire.encode_envelope(version(module, FIXED))
    trace.wait_served()
    trace.expect("handle_amt_pc_req_version()", shown(module), dump(PC_OUT, ACK),
                 dump(PC_OUT, wire.encode_envelope(version(module, FIXED))))


@pytest.mark.parametrize("module", [0, 33, -1])
def test_pc_asks_for_an_unknown_module(make_handset: HandsetFactory, module: int) -> None:
    # Refused requests of the PC are kept: the next test must not get them.
    pc = PcChannel(make_handset("pc"))
    trace = PcTrace(pc.handset)
    pc.send_packet(45, integer(19, module))
    assert pc.read_frame() == wire.encode_envelope(refusal(45, NOT_SERVED))
    trace.wait_served()
    trace.expect(*unknown(module, "handle_amt_pc_req_version"))
    trace.expect_none(dump(PC_OUT, ACK))


@pytest.mark.parametrize("module", [17, 18])
def test_modem_answers_the_pc_itself(pc: PcChannel, module: int) -> None:
    modem = pc.handset.modem.open()
    trace = PcTrace(pc.handset)
    request = wire.encode_envelope(ask(module))
    pc.send(request)
    assert modem.read_exactly(len(request)) == request
    answer = wire.encode_envelope(version(module, b"KEL"))
    modem.write(answer)
    # Nothing else: no acknowledgement before it, no refusal behind it.
    assert pc.read_frame() == answer
    pc.at("AT^DWIFIADDR=?", OK)
    trace.expect(shown(module))
    trace.expect_none(dump(PC_OUT, ACK))


# the software text


class Software:
    """The two ways in which the PC gets the software text."""

    def __init__(self, handset: Handset) -> None:
        self.handset = handset
        self.pc = PcChannel(handset)

    def expect(self, text: str) -> Trace:
        """Both ways give this text; returns what was logged of them."""
        trace = Trace(self.handset)
        content = text.encode()
        assert self.pc.request(45, integer(19, 16)) == version(16, content)
        self.pc.at("AT^DSVER", b"\r\n^DSVER: " + content + b"\r\n\r\nOK\r\n")
        assert trace.texts().count("get_ap_sw_version()") == 2
        return trace

    def expect_failure(self, code: int, *texts: "str | re.Pattern[str]",
                       built: bool = False) -> None:
        """Neither way gives a text: the request is refused behind its acknowledgement."""
        trace = Trace(self.handset)
        self.pc.at("AT^DSVER", CME)
        self.pc.send_packet(45, integer(19, 16))
        assert self.pc.read_frame() == ACK
        assert self.pc.read_frame() == wire.encode_envelope(refusal(45, NOT_SERVED))
        trace.expect("set_ap_sw_version_rsp()", "get_ap_sw_version()", *texts,
                     error_line("set_ap_sw_version_rsp", code), "failed to get ap's sw version")
        if not built:
            trace.expect_none(re.compile("getted sw-module: .*"))
        self._serve_refused()

    def _serve_refused(self) -> None:
        """Have the refused request, which is kept, served with the next byte."""
        path = self.handset.path(BOARD)
        board = path.read_bytes() if path.exists() else None
        self.handset.place(BOARD, "board")
        self.handset.place(UNREADABLE, None)
        self.pc.send(b"\0")
        assert self.pc.read_frame() == ACK
        assert self.pc.read_packet().result == 0
        self.handset.place(BOARD, board)

    def set(self, **values: "str | None") -> None:
        """Set build properties, named without their prefix and with _ for a dot."""
        for name, value in values.items():
            self.handset.set_property(f"ro.build.{name.replace('_', '.')}", value)

    def unreadable(self, *names: str) -> None:
        """These properties give neither a value nor the default."""
        self.handset.place(UNREADABLE, "".join(f"{name}\n" for name in names))


UNREADABLE = "/handset/unreadable.txt"
BOARD = "/sys/sarvo/board_info"
EMMC = "/sys/devinfo/emmc_info"
CARRIER = "/data/orla/current/cust.prop"
FACTORY_TAIL = "(F01)(KEL board rev C\n)(HW8G-0031 7456 MiB rev 5)(Freenet)"
TAIL = "(HW8G-0031 7456 MiB rev 5)(Freenet)"


@pytest.fixture
def software(make_handset: HandsetFactory) -> Software:
    """A station that asks for the software text."""
    return Software(make_handset("pc"))


def test_five_fields_in_a_row(software: Software) -> None:
    trace = software.expect("(KEL-1_4.2.1)" + FACTORY_TAIL)
    trace.expect("set_ap_sw_version_rsp()", "get_ap_sw_version()", "amt_read_data_from_file()",
                 "read content: KEL board rev C\\n",
                 f"readed success from file({BOARD}). flag: KEL board rev C\\n.",
                 "amt_read_emmc_info()", "emmc_info_len: 25",
                 f"emmc_info({EMMC}). flag: HW8G-0031 7456 MiB rev 5.", "amt_read_cm_info()",
                 # The path in it is another file's, as ever.
                 f"line_a({BOARD}). flag: ro.carrier.name=Freenet\\n.",
                 f"cm_info({CARRIER}). flag: Freenet.",
                 "getted sw-module: (KEL-1_4.2.1)" + FACTORY_TAIL.replace("\n", "\\n"))


def test_unset_properties_show_as_a_blank(software: Software) -> None:
    software.set(display_id=None, factory_id=None)
    software.expect("( )( )(KEL board rev C\n)" + TAIL)
    software.set(display_id="", factory_id="F 01")
    software.expect("( )(F 01)(KEL board rev C\n)" + TAIL)


@pytest.mark.parametrize("customer, maker", [
    ("BRENTA", None), ("brenta", "Kelco"), ("KELCO", "Brenta"), (None, "BRENTA"),
    ("BrEnTa", "bReNtA")])
def test_own_brand(software: Software, customer: str | None, maker: str | None) -> None:
    software.set(customer=customer, display_vx_id="VX-17")
    software.handset.set_property("ro.product.manufacturer", maker)
    software.expect("ORLA 1.0.17(VX-17)" + FACTORY_TAIL)


def test_own_brand_without_properties(software: Software) -> None:
    software.set(customer="BRENTA", version_incremental=None, factory_id=None)
    software.expect("ORLA  ( )( )(KEL board rev C\n)" + TAIL)


@pytest.mark.parametrize("customer, maker", [
    ("BRENTA ", "Brenta2"), ("", ""), ("null", "null"), (None, None), ("Brent", "xBRENTA")])
def test_any_other_brand(software: Software, customer: str | None, maker: str | None) -> None:
    software.set(customer=customer)
    software.handset.set_property("ro.product.manufacturer", maker)
    software.expect("(KEL-1_4.2.1)" + FACTORY_TAIL)


# Properties that cannot be read, by a library in the place of the usual one.


@pytest.fixture
def limited(make_handset: HandsetFactory, tmp_path: Path) -> Software:
    """As `software`, on a handset some of whose properties cannot be read."""
    handset = make_handset("pc", ready=False, start=False)
    replace_cutils(handset, tmp_path, "unreadable_properties")
    handset.start()
    handset.wait_ready()
    return Software(handset)


def test_display_id_that_cannot_be_read(limited: Software) -> None:
    limited.unreadable("ro.build.display.id")
    limited.expect_failure(-100, error_line("get_ap_sw_version", -100),
                           "read ro.build.display.id error")


def test_brand_that_cannot_be_read_is_another_one(limited: Software) -> None:
    limited.set(customer="BRENTA")
    limited.unreadable("ro.build.customer")
    assert limited.pc.request(45, integer(19, 16)) == version(
        16, ("(KEL-1_4.2.1)" + FACTORY_TAIL).encode())
    limited.handset.set_property("ro.product.manufacturer", "Brenta")
    limited.set(customer=None)
    limited.unreadable("ro.product.manufacturer")
    assert limited.pc.request(45, integer(19, 16)) == version(
        16, ("(KEL-1_4.2.1)" + FACTORY_TAIL).encode())


def test_factory_id_that_cannot_be_read(limited: Software) -> None:
    # Then the board's file is not looked for, and is not missed.
    limited.handset.place(BOARD, None)
    limited.unreadable("ro.build.factory.id")
    trace = limited.expect("(KEL-1_4.2.1)" + TAIL)
    trace.expect_none("amt_read_data_from_file()")


def test_incremental_version_that_cannot_be_read(limited: Software) -> None:
    limited.set(customer="BRENTA")
    limited.unreadable("ro.build.version.incremental")
    limited.expect_failure(-100, error_line("get_ap_sw_version", -100),
                           "read ro.build.version.incremental error")


def test_own_display_id_that_cannot_be_read(limited: Software) -> None:
    # Then nothing follows, and no file is missed.
    limited.handset.place(BOARD, None)
    limited.set(customer="BRENTA")
    limited.unreadable("ro.build.display.vx.id")
    trace = limited.expect("ORLA 1.0.17")
    trace.expect_none("amt_read_data_from_file()", "amt_read_emmc_info()", "amt_read_cm_info()")


def test_missing_board_file_fails_when_all_is_built(software: Software) -> None:
    software.handset.place(BOARD, None)
    text = "getted sw-module: (KEL-1_4.2.1)(F01)" + TAIL
    software.expect_failure(-118, error_line("amt_read_data_from_file", -118, 2), text,
                            built=True)
    software.handset.place(BOARD, "")
    software.expect_failure(-118, error_line("amt_read_data_from_file", -118), text,
                            built=True)
    software.set(customer="BRENTA", display_vx_id="VX")
    software.expect_failure(-118, "getted sw-module: ORLA 1.0.17(VX)(F01)" + TAIL,
                            built=True)


def test_missing_emmc_and_carrier_are_left_out(software: Software) -> None:
    start = "(KEL-1_4.2.1)(F01)(KEL board rev C\n)"
    software.handset.place(EMMC, None)
    software.expect(start + "(Freenet)").expect(
        error_line("amt_read_emmc_info", -100, 2), f"open {EMMC} fail")
    software.handset.place(EMMC, "")
    software.expect(start + "(Freenet)").expect(
        error_line("amt_read_emmc_info", -100, 0), "read fail")
    software.handset.place(CARRIER, "ro.carrier.code=001\nro.carrier.nam=X\n")
    software.expect(start).expect("amt_read_cm_info()", error_line("amt_read_cm_info", -100, 0))
    software.handset.place(CARRIER, None)
    software.expect(start).expect(
        error_line("amt_read_cm_info", -100, 2), f"open cm file {CARRIER} fail")


@pytest.mark.parametrize("content, name", [
    ("ro.carrier.name=Free net\n", "Free"), ("ro.carrier.name= \tFree\n", "Free"),
    ("ro.carrier.name=A=B\n", "A=B"), ("x=ro.carrier.name=A\n", "ro.carrier.name=A"),
    ("a=1\n\nro.carrier.name=One\nro.carrier.name=Two\n", "One"), ("ro.carrier.name=End", "End"),
    ("ro.carrier.name=\nro.carrier.name=X\n", ""), ("#ro.carrier.name=X\n", "X"),
    # A line is read in pieces of 48 characters, and the name has to lie within one.
    ("ro.carrier.name=" + "n" * 60 + "\n", "n" * 32),
    ("x" * 48 + "ro.carrier.name=A\n", "A"), ("x" * 32 + "ro.carrier.name=A\n", ""),
])
def test_carrier_names(share_handset: HandsetFactory, content: str, name: str) -> None:
    software = Software(share_handset("pc", files={EMMC: None}))
    software.handset.place(CARRIER, content)
    software.expect(f"(KEL-1_4.2.1)(F01)(KEL board rev C\n)({name})")


def test_a_carrier_name_between_two_pieces_is_not_found(software: Software) -> None:
    software.handset.place(CARRIER, "x" * 40 + "ro.carrier.name=A\n")
    software.expect("(KEL-1_4.2.1)(F01)(KEL board rev C\n)(HW8G-0031 7456 MiB rev 5)")


def test_text_of_254_characters_is_the_longest(software: Software) -> None:
    software.set(display_id="d" * 91, factory_id="f" * 91)
    software.handset.place(EMMC, None)
    software.handset.place(CARRIER, None)
    start = f"({'d' * 91})({'f' * 91})("
    cut = re.compile("buf's len.*")
    for size in (65, 66):
        software.handset.place(BOARD, "b" * size)
        software.expect(start + "b" * size + ")").expect_none(cut)
    for size in (67, 68, 91):
        software.handset.place(BOARD, "b" * size)
        text = start + "b" * size + ")"
        trace = software.expect(text[:254])
        # The log has all of it.
        trace.expect(f"getted sw-module: {text}", f"buf's len(254) is smaller than sw's "
                     f"len({len(text)}). data will be discard")


def test_text_of_300_characters_is_cut(software: Software) -> None:
    software.set(display_id="d" * 91, factory_id="f" * 91)
    software.handset.place(BOARD, "b" * 98)
    software.handset.place(EMMC, "e" * 10 + "\n")
    software.handset.place(CARRIER, "ro.carrier.name=carrier\n")
    text = f"({'d' * 91})({'f' * 91})({'b' * 91})({'e' * 10})(carrier)"
    assert len(text) == 300
    software.expect(text[:254]).expect(
        "buf's len(254) is smaller than sw's len(300). data will be discard")
