"""The battery's voltage (9), and its ADC as the PC reads (224) and calibrates (226) it."""

import pytest

from conftest import HandsetFactory
from amt_station import wire
from support.channels import AppChannel, PcChannel, integer
from support.handler import (IS_DIRECTORY, NO_DEVICE, NO_ENTRY, NO_SPACE, HandlerTrace,
                             device_error, done, refusal, refused)
from support.moments import logged_at
from support.shell import break_shell

VOLTAGE = 9
VOLTAGE_FILE = "/sys/class/power_supply/battery/voltage_now"
VOLTAGE_HANDLER = "amt_device_battery_voltage"

READ_ADC, CALIBRATE = 224, 226
DRIVER = "/proc/driver/sarvo_battery"
MEASURE = f'echo "amt_get_vbatt" > {DRIVER}'
VALUES = "/amt/vbatt"
ADC_HANDLER = "amt_device_battery_voltage_check"
LOWEST = -0x80000000


def calibration(*values: int) -> list[wire.Atom]:
    """The four values of a calibration."""
    return [integer(146 + index, value) for index, value in enumerate(values)]


# voltage


def test_voltage(app: AppChannel) -> None:
    # Numbers out of range are what the C library of the handset makes of them: the low 32 bits.
    for content, value in (("3987\n", 3987), ("0", 0), ("-5\n", -5), (" \n 3650 mV\n", 3650),
                           ("12x", 12), ("+7", 7), ("4294967301\n", 5),
                           ("99999999999999999999\n", -1), ("2147483648\n", LOWEST)):
        app.handset.place(VOLTAGE_FILE, content)
        trace = HandlerTrace(app.handset)
        assert app.request(VOLTAGE) == done(VOLTAGE, integer(5, value))
        trace.expect_handler(VOLTAGE_HANDLER, f"battery_voltage: {value}")


def test_voltage_on_the_wire(app: AppChannel) -> None:
    app.handset.place(VOLTAGE_FILE, "3987\n")
    app.send(bytes.fromhex("0600bb090000"))
    assert app.line.read_exactly(24) == bytes.fromhex(
        "1800bb0a1200" "ee05010400" "930f0000" "ee01010400" "00000000")
    app.expect_silence(0.1)


def test_voltage_that_cannot_be_read(app: AppChannel) -> None:
    for content, count in (("", -1), (" \n", -1), ("none\n", 0), ("-", 0), ("mV 12", 0)):
        app.handset.place(VOLTAGE_FILE, content)
        trace = HandlerTrace(app.handset)
        refused(app, VOLTAGE)
        trace.expect_handler(VOLTAGE_HANDLER, device_error(VOLTAGE_HANDLER, -118, 0),
                             f"fscanf() return: {count}; 0 - Success")

    app.handset.place(VOLTAGE_FILE, None)
    trace = HandlerTrace(app.handset)
    refused(app, VOLTAGE)
    trace.expect_handler(VOLTAGE_HANDLER, device_error(VOLTAGE_HANDLER, -118, NO_ENTRY),
                         f'Open file "{VOLTAGE_FILE}" fail: 2 - No such file or directory')

    app.handset.path(VOLTAGE_FILE).mkdir()
    trace = HandlerTrace(app.handset)
    refused(app, VOLTAGE)
    trace.expect_handler(VOLTAGE_HANDLER, device_error(VOLTAGE_HANDLER, -118, IS_DIRECTORY),
                         "fscanf() return: -1; 21 - Is a directory")


# ADC: reading


def test_adc(pc: PcChannel) -> None:
    trace = HandlerTrace(pc.handset)
    pc.send(bytes.fromhex("aabbccdd" "0e000000" "02000000" "0600bbe00000") +
            wire.checksum(bytes.fromhex("aabbccdd0e00000002000000" "0600bbe00000"))
            .to_bytes(4, "little"))
    pc.expect_acknowledgement()
    frame = pc.read_frame()
    assert frame[:-4] == bytes.fromhex("aabbccdd" "20000000" "02000000" "1800bbe11200"
                                       "ee97010400" "740e0000" "ee01010400" "00000000")
    assert trace.calls() == ["fopen(sarvo_battery) = 0 [3700]"]

    for text, value in (("0", 0), ("4095 counts", 4095), ("4294967295", -1), ("-1", -1),
                        ("99999999999999999999", -1), ("4294967301", 5)):
        pc.handset.answer("sarvo_battery", f"0 {text}")
        trace = HandlerTrace(pc.handset)
        assert pc.request(READ_ADC) == done(READ_ADC, integer(151, value))
        trace.expect_handler(ADC_HANDLER, f"system({MEASURE}) OK",
                             f"ADC value: {value & 0xFFFFFFFF}")
        assert trace.calls() == [f"fopen(sarvo_battery) = 0 [{text}]"]


def test_driver_has_its_time_to_measure(pc: PcChannel) -> None:
    for _ in range(3):
        mark = pc.handset.log.mark()
        assert pc.request(READ_ADC).result == 0
        asked = pc.handset.log.wait(f"system({MEASURE}) OK", after=mark)
        read = pc.handset.log.wait("ADC value: ", after=mark)
        assert logged_at(read) - logged_at(asked) >= 0.019


def test_adc_command_fails_five_times(pc: PcChannel) -> None:
    # On purpose, a driver that cannot measure gives 0.
    pc.handset.path(DRIVER).unlink()
    pc.handset.path(DRIVER).mkdir()
    trace = HandlerTrace(pc.handset)
    assert pc.request(READ_ADC) == done(READ_ADC, integer(151, 0))
    failures = [line for count in range(1, 6) for line in (
        device_error("amt_device_do_command", -118, 0),
        f"system({MEASURE}) FAIL[count = {count}]: 0 - Success")]
    trace.expect_handler(ADC_HANDLER, *failures)
    assert trace.calls() == []


def test_adc_command_succeeds_at_last(pc: PcChannel) -> None:
    for failures in (1, 2, 4):
        with break_shell(pc.handset, "amt_get_vbatt", failures):
            trace = HandlerTrace(pc.handset)
            assert pc.request(READ_ADC) == done(READ_ADC, integer(151, 3700))
        trace.expect_handler(
            ADC_HANDLER,
            *[line for count in range(1, failures + 1) for line in (
                device_error("amt_device_do_command", -118, 0),
                f"system({MEASURE}) FAIL[count = {count}]: 0 - Success")],
            f"system({MEASURE}) OK", "ADC value: 3700")


@pytest.mark.parametrize("answer, call, errno", [
    ("-1 ENODEV", "fopen", NO_DEVICE), ("0 busy", "fscanf", 0)])
def test_adc_without_a_value(make_handset: HandsetFactory, answer: str, call: str,
                             errno: int) -> None:
    pc = PcChannel(make_handset("pc", answers={"sarvo_battery": answer}))
    trace = HandlerTrace(pc.handset)
    assert pc.request(READ_ADC) == refusal(READ_ADC)
    trace.expect_handler(ADC_HANDLER, f"system({MEASURE}) OK",
                         device_error("amt_read_adc", -100, errno),
                         f"sys call: {call}() failed! errno = {errno}")


# ADC: calibrating


def calibrated(pc: PcChannel, a: int, b: int, c: int, d: int, *atoms: wire.Atom) -> str:
    """Calibrate; returns the text that the driver and the file got."""
    trace = HandlerTrace(pc.handset)
    assert pc.request(CALIBRATE, *atoms) == done(CALIBRATE)
    text = f"amt_set_vbatt[{a}] [{b}] [{c}] [{d}]"
    trace.expect_handler(ADC_HANDLER, f"SAVA ADC value: {a} {b} {c} {d}",
                         f'echo "{text}" > {DRIVER}'[:99])
    assert pc.handset.text(VALUES) == text
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    return text


def test_calibration(pc: PcChannel) -> None:
    pc.handset.place(VALUES, "x" * 500)
    text = calibrated(pc, 1, -2, 3700, 0x7FFFFFFF, *calibration(1, -2, 3700, 0x7FFFFFFF))
    assert pc.handset.text(DRIVER) == f"{text}\n"
    text = calibrated(pc, 0, 5, 0, 0, integer(147, 5))
    assert pc.handset.text(DRIVER) == f"{text}\n"
    text = calibrated(pc, 0, 0, 0, 0)
    assert pc.handset.text(DRIVER) == f"{text}\n"


def test_calibration_command_is_cut_at_99_characters(pc: PcChannel) -> None:
    before = pc.handset.text(DRIVER)
    text = calibrated(pc, LOWEST, LOWEST, LOWEST, LOWEST, *calibration(*[LOWEST] * 4))
    assert pc.handset.text(DRIVER) == before
    cut = DRIVER[:99 - len(f'echo "{text}" > ')]
    assert cut == "/proc/driver/sarvo_ba"
    assert pc.handset.text(cut) == f"{text}\n"


def test_calibration_that_the_driver_refuses(pc: PcChannel) -> None:
    pc.handset.path(DRIVER).unlink()
    pc.handset.path(DRIVER).mkdir()
    calibrated(pc, 1, 2, 3, 4, *calibration(1, 2, 3, 4))


def test_calibration_file_that_cannot_be_opened(pc: PcChannel) -> None:
    pc.handset.path(VALUES).mkdir()
    trace = HandlerTrace(pc.handset)
    assert pc.request(CALIBRATE, *calibration(1, 2, 3, 4)) == refusal(CALIBRATE)
    trace.expect_handler(ADC_HANDLER, device_error("amt_write_adc_diff_value", -100, IS_DIRECTORY),
                         "sys call: fopen() failed! errno = 21")
    assert trace.calls() == []
    assert pc.handset.text(DRIVER) == ""


def test_calibration_on_a_full_file_system(pc: PcChannel) -> None:
    pc.handset.path(VALUES).symlink_to("/dev/full")
    trace = HandlerTrace(pc.handset)
    assert pc.request(CALIBRATE, *calibration(1, 2, 3, 4)) == refusal(CALIBRATE)
    trace.expect_handler(ADC_HANDLER, "SAVA ADC value: 1 2 3 4",
                         device_error("amt_write_adc_diff_value", -100, NO_SPACE),
                         "sys call: fprintf() failed! errno = 28")
    assert trace.calls() == ["sync() = 0", "sync() = 0"]
    assert pc.handset.text(DRIVER) == ""


def test_the_app_line_does_not_serve_the_adc(app: AppChannel) -> None:
    for command in (READ_ADC, CALIBRATE):
        trace = HandlerTrace(app.handset)
        refused(app, command)
        trace.expect(f"unregistered AMT request id: {command}")
