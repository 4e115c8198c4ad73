"""AT commands of the PC line that drive the radio test library: each reply, each call."""

from support.channels import ERROR, OK, PcChannel
from support.trace import Trace, error_line


def gps_value(satellite: int, cnr: int) -> str:
    """The reply that shows a satellite's signal."""
    return f"\r\n^DGPSCTRL: {satellite},{cnr}\r\n{OK}"


# connectivity, Bluetooth


def test_connectivity_check(pc: PcChannel) -> None:
    for number, function in ((0, "ldt_wifiCheck"), (1, "ldt_gpsCheck"), (3, "ldt_btCheck")):
        pc.handset.answer(function, "0", "-3", "1")
        trace = Trace(pc.handset)
        for answer in (OK, ERROR, ERROR):
            pc.at(f"AT^DDEVCONNCHK={number}", answer)
        assert trace.calls() == [f"{function}() = {code}" for code in (0, -3, 1)]


def test_connectivity_check_of_nothing(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    for operand in ("2", "4", "-1", "255", "", " ", "7,0"):
        pc.at(f"AT^DDEVCONNCHK={operand}", ERROR)
    assert trace.calls() == []


def test_operand_forms(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    for operand in ("   3", "3x", "03", "+3", "3,9"):
        pc.at(f"AT^DDEVCONNCHK={operand}", OK)
    assert trace.calls() == ["ldt_btCheck() = 0"] * 5
    # Not at the line's start, in the middle of other text.
    pc.at("xyzAT^DDEVCONNCHK=3", OK)
    # The parameter ends at the request's first line end, which stands before the command here.
    pc.send(b"\rAT^DDEVCONNCHK=3\r")
    assert pc.line.read_exactly(len(ERROR)) == ERROR.encode()


def test_bluetooth_control(pc: PcChannel) -> None:
    pc.handset.answer("ldt_btCtrl", "0", "0", "-1", "5")
    trace = Trace(pc.handset)
    for operand, answer in (("1", OK), ("0", OK), ("1", ERROR), ("0", ERROR)):
        pc.at(f"AT^DBTCTRL={operand}", answer)
    assert trace.calls() == ["ldt_btCtrl(1) = 0", "ldt_btCtrl(0) = 0", "ldt_btCtrl(1) = -1",
                             "ldt_btCtrl(0) = 5"]
    trace = Trace(pc.handset)
    for operand in ("2", "-1", "", "10"):
        pc.at(f"AT^DBTCTRL={operand}", ERROR)
    assert trace.calls() == []


# GPS


def test_gps_stop(pc: PcChannel) -> None:
    pc.handset.answer("ldt_gpsCtrl", "0", "-7")
    trace = Trace(pc.handset)
    pc.at("AT^DGPSCTRL=0", OK)
    pc.at("AT^DGPSCTRL=0,4", ERROR)
    assert trace.calls() == ["ldt_gpsCtrl(0, 0, null, null) = 0",
                             "ldt_gpsCtrl(0, 0, null, null) = -7"]


def test_gps_signal(pc: PcChannel) -> None:
    pc.handset.answer("ldt_gpsCtrl", "0", "0 17 -23")
    trace = Trace(pc.handset)
    pc.at("AT^DGPSCTRL=2,5", gps_value(17, -23))
    assert trace.calls() == ["ldt_gpsCtrl(1, 0, null, null) = 0",
                             "ldt_gpsCtrl(2, 5, out, out) = 0 [17 -23]"]


def test_gps_failures(pc: PcChannel) -> None:
    pc.handset.answer("ldt_gpsCtrl", "-1")
    trace = Trace(pc.handset)
    pc.at("AT^DGPSCTRL=2,5", ERROR)
    assert trace.calls() == ["ldt_gpsCtrl(1, 0, null, null) = -1"]

    pc.handset.answer("ldt_gpsCtrl", "0", "-1 3 4")
    trace = Trace(pc.handset)
    pc.at("AT^DGPSCTRL=2,5", ERROR)
    assert trace.calls()[1:] == ["ldt_gpsCtrl(2, 5, out, out) = -1 [3 4]"]

    trace = Trace(pc.handset)
    pc.handset.answer("ldt_gpsCtrl")
    pc.at("AT^DGPSCTRL=2", ERROR)
    trace.expect(error_line("amt_at_control_gps", -101), "index is null!!!")
    assert trace.calls() == ["ldt_gpsCtrl(1, 0, null, null) = 0"]

    trace = Trace(pc.handset)
    for operands in ("1", "3", "-2", "1,2"):
        pc.at(f"AT^DGPSCTRL={operands}", ERROR)
    assert trace.calls() == []


# Wi-Fi transmission and reception


def test_wifi_transmission(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DWLTSD=1,6,540,15", OK)
    pc.at("AT^DWLTSD=0", OK)
    assert trace.calls() == ["ldt_wifiCtrl(1) = 0", "ldt_TxTest(1, 15, 540, 6) = 0",
                             "ldt_TxTest(0, 0, 0, 0) = 0", "ldt_wifiCtrl(0) = 0"]
    trace.expect("WIFI-TX-start start. channel:6; power:15; rate:540(will multi 100)")


def test_wifi_tests_log_their_starts_and_ends(pc: PcChannel) -> None:
    pc.handset.answer("ldt_TxTest", "0", "3", "-4", "0")
    pc.handset.answer("ldt_RxTest", "0", "6 70", "-7", "0 90")
    trace = Trace(pc.handset)
    for operands, answer in (("1,6,540,15", OK), ("0", ERROR), ("1,7,20,2", ERROR), ("0", OK)):
        pc.at(f"AT^DWLTSD={operands}", answer)
    for operands, answer in (("1,11,20", OK), ("0", ERROR), ("1,3,540", ERROR), ("0", OK)):
        pc.at(f"AT^DWLTRD={operands}", answer)
    assert [text for text in trace.texts() if text.startswith("WIFI-")] == [
        "WIFI-TX-start start. channel:6; power:15; rate:540(will multi 100)",
        "WIFI-TX-start end. return:0.",
        "WIFI-TX-stop start. ", "WIFI-TX-stop end. return:3.",
        "WIFI-TX-start start. channel:7; power:2; rate:20(will multi 100)",
        "WIFI-TX-start end. return:-4.",
        "WIFI-TX-stop start. ", "WIFI-TX-stop end. return:0.",
        "WIFI-RX-start start. channel:11; rate:20(will multi 100)",
        "WIFI-RX-start end. return:0.",
        "WIFI-RX-stop start. channel:11", "WIFI-RX-stop end. return:6; cnt:70.",
        "WIFI-RX-start start. channel:3; rate:540(will multi 100)",
        "WIFI-RX-start end. return:-7.",
        "WIFI-RX-stop start. channel:11", "WIFI-RX-stop end. return:0; cnt:90."]


def test_wifi_transmission_takes_the_low_bits(pc: PcChannel) -> None:
    trace = Trace(pc.handset)
    pc.at("AT^DWLTSD=1,262,65537,40000", OK)
    pc.at("AT^DWLTSD=1,-1,-1,-1", OK)
    assert trace.calls() == ["ldt_wifiCtrl(1) = 0", "ldt_TxTest(1, -25536, 1, 6) = 0",
                             "ldt_wifiCtrl(1) = 0", "ldt_TxTest(1, -1, 65535, 255) = 0"]
    trace.expect("WIFI-TX-start start. channel:6; power:-25536; rate:1(will multi 100)",
                 "WIFI-TX-start start. channel:255; power:-1; rate:65535(will multi 100)")


def test_wifi_transmission_failures(pc: PcChannel) -> None:
    for switch, test, operands, calls in (
            ("-1", "0", "1,6,540,15", ["ldt_wifiCtrl(1) = -1"]),
            ("0", "-2", "1,6,540,15", ["ldt_wifiCtrl(1) = 0", "ldt_TxTest(1, 15, 540, 6) = -2"]),
            ("0", "4", "0", ["ldt_TxTest(0, 0, 0, 0) = 4", "ldt_wifiCtrl(0) = 0"]),
            ("6", "0", "0", ["ldt_TxTest(0, 0, 0, 0) = 0", "ldt_wifiCtrl(0) = 6"]),
            ("0", "0", "2", []), ("0", "0", "-1,6,540,15", []), ("0", "0", "10", [])):
        pc.handset.answer("ldt_wifiCtrl", switch)
        pc.handset.answer("ldt_TxTest", test)
        trace = Trace(pc.handset)
        pc.at(f"AT^DWLTSD={operands}", ERROR)
        assert trace.calls() == calls


def test_wifi_transmission_without_an_operand(pc: PcChannel) -> None:
    for operands, name in (("1", "channel"), ("1,6", "rate"), ("1,6,540", "power"),
                           ("1,,6,540", "power")):
        trace = Trace(pc.handset)
        pc.at(f"AT^DWLTSD={operands}", ERROR)
        trace.expect(error_line("handle_amt_device_wifi_tx_ctrl", -101), f"{name} is null!!!")
        assert trace.calls() == ["ldt_wifiCtrl(1) = 0"]


def test_wifi_reception(pc: PcChannel) -> None:
    pc.handset.answer("ldt_RxTest", "0", "0 0", "-1", "0 12", "0", "0 4711", "0 5")
    trace = Trace(pc.handset)
    pc.at("AT^DWLTRD=0", OK)             # nothing was started: channel 0
    pc.at("AT^DWLTRD=1,11,20", OK)
    pc.at("AT^DWLTRD=1,3,20", ERROR)     # what is not started is not remembered
    pc.at("AT^DWLTRD=0", OK)
    pc.at("AT^DWLTRD=1,267,65556", OK)   # 11 and 20 in their low bits
    pc.at("AT^DWLTRD=0", OK)
    pc.at("AT^DWLTRD=0", OK)
    start, stop = "ldt_wifiCtrl(1) = 0", "ldt_wifiCtrl(0) = 0"
    assert trace.calls() == [
        "ldt_RxTest(0, 0, 0, out) = 0 [1000]", stop,
        start, "ldt_RxTest(1, 11, 20, null) = 0",
        start, "ldt_RxTest(1, 3, 20, null) = -1",
        "ldt_RxTest(0, 11, 0, out) = 0 [12]", stop,
        start, "ldt_RxTest(1, 11, 20, null) = 0",
        "ldt_RxTest(0, 11, 0, out) = 0 [4711]", stop,
        "ldt_RxTest(0, 11, 0, out) = 0 [5]", stop]
    trace.expect("WIFI-RX-stop end. return:0; cnt:1000.", "WIFI-RX-stop end. return:0; cnt:12.",
                 "WIFI-RX-stop end. return:0; cnt:4711.")


def test_wifi_reception_failures(pc: PcChannel) -> None:
    pc.handset.answer("ldt_wifiCtrl", "-1", "0", "-9")
    pc.handset.answer("ldt_RxTest", "-2", "0")
    trace = Trace(pc.handset)
    pc.at("AT^DWLTRD=1,6,20", ERROR)
    pc.at("AT^DWLTRD=0", ERROR)
    pc.at("AT^DWLTRD=0", ERROR)
    pc.at("AT^DWLTRD=7", ERROR)
    assert trace.calls() == [
        "ldt_wifiCtrl(1) = -1",
        "ldt_RxTest(0, 0, 0, out) = -2 [0]", "ldt_wifiCtrl(0) = 0",
        "ldt_RxTest(0, 0, 0, out) = 0 [1000]", "ldt_wifiCtrl(0) = -9"]
    pc.handset.answer("ldt_wifiCtrl")
    for operands, name in (("1", "channel"), ("1,6", "rate")):
        trace = Trace(pc.handset)
        pc.at(f"AT^DWLTRD={operands}", ERROR)
        trace.expect(error_line("handle_amt_device_wifi_rx_ctrl", -101), f"{name} is null!!!")
        assert trace.calls() == ["ldt_wifiCtrl(1) = 0"]
