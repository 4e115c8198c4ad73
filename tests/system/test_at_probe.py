"""The station's AT probe: rewritten for the modem, it marks the AT mode of the PC line."""

import re

from conftest import HandsetFactory
from amt_simulator import Handset
from support.channels import OK, PcChannel
from support.traffic import MODEM_OUT, PC_IN, PcTrace, dump

REWRITTEN = b"AT;^DLKS=1\r"
CHARGER = "amt_usb_charger_enable(1) = 0"
SPEEDS = {"vx.tty.modem": "/dev/ttyS1", "vx.modem.uart.amt.default.baudrate": "460800",
          "vx.modem.uart.at.default.baudrate": "230400"}


def probe(handset: Handset, text: bytes, wanted: bytes) -> PcTrace:
    """Send TEXT; the modem gets WANTED and nothing else."""
    trace = PcTrace(handset)
    handset.pc.write(text)
    assert handset.modem.read_exactly(len(wanted)) == wanted, text
    trace.wait_served()
    trace.expect(dump(PC_IN, text), dump(MODEM_OUT, wanted))
    return trace


def test_probe_enters_mode_4_once(pc: PcChannel) -> None:
    handset = pc.handset
    handset.modem.open()
    trace = probe(handset, b"AT\r", REWRITTEN)
    trace.expect(dump(PC_IN, b"AT\r"), "mark to enter amt4",
                 "will call amt_usb_charger_enable , type:1.",
                 "call amt_usb_charge_ctrl for amt4. return:0, current amt mode:4.",
                 "amt_convert_pc_2_app()", "handle_amt_imei_and_sn--->req_id_en:255.",
                 dump(MODEM_OUT, REWRITTEN))
    assert trace.calls() == [CHARGER]
    again = probe(handset, b"AT\r", REWRITTEN)
    again.expect_none("mark to enter amt4")
    assert again.calls() == []

    # A packet leads back, the next probe enters it again.
    pc.request(176)
    trace = probe(handset, b"AT\r", REWRITTEN)
    trace.expect("mark to enter amt4",
                 "call amt_usb_charge_ctrl for amt4. return:0, current amt mode:4.")
    assert trace.calls() == [CHARGER]
    # The modem's answer is the probe's.
    handset.modem.write(OK.encode())
    assert handset.pc.read_exactly(6) == OK.encode()


def test_forms_of_the_probe(pc_handset: Handset) -> None:
    pc_handset.modem.open()
    for text in (b"at\r", b"aT\r", b"At\r\n", b"AT\r\n\n", b"AT\rI\r", b"at\r\0", b"AT\r\xff\xff",
                 b"AT\rAT\r", b"at\rAt\r\n", b"AT\rAT\rAT\r", b"AT\rAT\r^DSVER\r"):
        probe(pc_handset, text, REWRITTEN)


def test_texts_that_are_no_probe(pc: PcChannel) -> None:
    pc.handset.modem.open()
    for text in (b"A", b"AT", b"AT\n", b"ATI\r", b" AT\r", b"\rAT\r", b"AT;\r", b"AT+CGMI\r",
                 b"AT\rXYZ", b"AT\r+CGMI\r", b"AT\rXYAT\r", b"XAT\r"):
        probe(pc.handset, text, text).expect_none("mark to enter amt4")
    # A command of the daemon behind a probe is the daemon's.
    pc.send(b"AT\r\rAT^DBTADDR=?\r")
    assert pc.line.read_exactly(6) == OK.encode()


def test_a_refusing_charger_hinders_nothing(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", modem="held", answers={"amt_usb_charger_enable": "-5"})
    probe(handset, b"AT\r", REWRITTEN).expect(
        "mark to enter amt4", "call amt_usb_charge_ctrl for amt4. return:-5, current amt mode:4.")


def test_probe_sets_a_serial_modem_line(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", modem="held", config=SPEEDS)

    def speeds(after: int) -> list[str]:
        return [text for text in handset.log.texts("vx-kel-pub", after)
                if text.startswith("convert speed")]

    def stty() -> str:
        shown = handset.run(["/usr/bin/stty", "-a", "-F", "/dev/ttyS1"]).stdout.decode()
        return re.findall(r"speed (\d+) baud", shown)[0]

    assert speeds(0) == ["convert speed 460800 -> B460800"]
    assert stty() == "460800"
    # A long probe and other text leave the speed alone.
    mark = handset.log.mark()
    probe(handset, b"AT\rAT\r", REWRITTEN)
    probe(handset, b"ATI\r", b"ATI\r")
    assert speeds(mark) == []
    assert stty() == "460800"
    for text in (b"AT\r", b"AT\r\n", b"AT\r\n\n"):
        mark = handset.log.mark()
        probe(handset, text, REWRITTEN)
        assert speeds(mark) == ["convert speed 230400 -> B230400"]
    assert stty() == "230400"


def test_probe_leaves_another_modem_line_alone(pc_handset: Handset) -> None:
    pc_handset.modem.open()
    probe(pc_handset, b"AT\r", REWRITTEN)
    assert not pc_handset.log.find("convert speed")
