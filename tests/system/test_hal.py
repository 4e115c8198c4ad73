"""What the platform's test HAL serves: device information, idle, charging, the sanity check; and
the eMMC's information."""

from pathlib import Path
from typing import Callable, Union

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_station import wire
from support.channels import ERROR, OK, AppChannel, PcChannel, integer, packet, string
from support.handler import NO_ENTRY, HandlerTrace, device_error, done, refusal, refused
from support.trace import Wanted, error_line

LIBRARY = "/system/lib/hw/amt.tq5530.misc.so"
INFO, INFO_HANDLER = 238, "amt_read_dev_info"
IDLE, IDLE_HANDLER, IDLE_STEP = 240, "amt_enter_idle", "amt_make_ue_enter_idle"
SANITY, SANITY_HANDLER = 244, "amt_modem_boot_dl_fin_read"
EMMC, EMMC_HANDLER, EMMC_FILE = 246, "amt_device_emmc_info", "/sys/devinfo/emmc_info"

Channel = Union[AppChannel, PcChannel]
PATHS: dict[str, Callable[[Handset], Channel]] = {"packet": AppChannel, "pc": PcChannel}
both_lines = pytest.mark.parametrize("path", PATHS)


def call_lines(entry: str, status: int) -> list[str]:
    """The lines of a call of the HAL."""
    return [f"will call {entry}.", f"stop call {entry}. return value:{status}."]


def loader_failure(handler: str, reason: str) -> list[Wanted]:
    """The lines of a HAL that cannot be loaded or lacks the entry."""
    return [device_error(handler, -118), f"call dlopen fail: - {LIBRARY}: {reason}"]


MISSING = "cannot open shared object file: No such file or directory"


def other_library(handset: Handset) -> Path:
    """A library that has none of the HAL's entries."""
    return handset.path("/system/lib/hw/audio.primary.tq5530.amt.so")


def is_loaded(handset: Handset) -> bool:
    """Whether the daemon has the HAL loaded."""
    maps = handset.run(["/usr/bin/cat", f"/proc/{handset.pid}/maps"]).stdout.decode()
    return LIBRARY in maps


# device information


def test_device_information(app: AppChannel) -> None:
    for text in ("board: tq5530", "two\nlines\n", "x", "x" * 4054, "x" * 4055):
        shown = text.replace("\n", "\\n")
        app.handset.answer("create_devinfo", f"0 {shown}")
        trace = HandlerTrace(app.handset)
        assert app.request(INFO) == done(INFO, string(200, text))
        trace.expect_handler(INFO_HANDLER, *call_lines("create_devinfo", 0),
                             f"create_devinfo return OK. {shown}")
        assert trace.calls() == [f"create_devinfo(out, 4055) = 0 [{len(text)} characters]"]
    # The HAL cuts what is longer to the capacity that it is given.
    app.handset.answer("create_devinfo", "0 " + "y" * 5000)
    assert app.request(INFO) == done(INFO, string(200, "y" * 4055))
    assert not is_loaded(app.handset)


def test_device_information_fails(app: AppChannel) -> None:
    for status in (1, -118, -104):
        app.handset.answer("create_devinfo", f"{status} half a text")
        trace = HandlerTrace(app.handset)
        refused(app, INFO)
        trace.expect_handler(INFO_HANDLER, *call_lines("create_devinfo", status))
    assert not is_loaded(app.handset)


def test_the_pc_line_does_not_serve_device_information(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", modem="held")
    request = wire.encode_envelope(packet(INFO))
    PcChannel(handset).send(request)
    assert handset.modem.read_exactly(len(request)) == request
    assert "create_devinfo" not in "".join(handset.calls())


# without the library, without the entry


def test_without_the_library(app: AppChannel) -> None:
    app.handset.place(LIBRARY, None)
    trace = HandlerTrace(app.handset)
    refused(app, INFO)
    trace.expect_handler(INFO_HANDLER, *loader_failure(INFO_HANDLER, MISSING))
    refused(app, IDLE)
    trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()", *loader_failure(IDLE_STEP, MISSING))
    app.handset.place(LIBRARY, "none")
    trace = HandlerTrace(app.handset)
    refused(app, IDLE)
    trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()",
                         *loader_failure(IDLE_STEP, "file too short"))
    assert trace.calls() == []


def test_without_the_entry(app: AppChannel) -> None:
    app.handset.place(LIBRARY, other_library(app.handset))
    trace = HandlerTrace(app.handset)
    refused(app, INFO)
    trace.expect_handler(INFO_HANDLER,
                         *loader_failure(INFO_HANDLER, "undefined symbol: create_devinfo"))
    refused(app, IDLE)
    trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()",
                         *loader_failure(IDLE_STEP, "undefined symbol: enter_idle"))
    assert trace.calls() == []
    # What the look-up failed in stays loaded.
    assert is_loaded(app.handset)


# idle


@both_lines
def test_idle(make_handset: HandsetFactory, path: str) -> None:
    channel = PATHS[path](make_handset(path))
    for _ in range(2):
        trace = HandlerTrace(channel.handset)
        assert channel.request(IDLE) == done(IDLE)
        trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()", *call_lines("enter_idle", 0),
                             "enter_idle return OK.", "enter_idle return OK.")
        assert trace.calls() == ["enter_idle() = 0"]
    assert not is_loaded(channel.handset)


@pytest.mark.parametrize("path, status", [("packet", 1), ("packet", -118), ("pc", -1)])
def test_idle_fails(make_handset: HandsetFactory, path: str, status: int) -> None:
    channel = PATHS[path](make_handset(path, answers={"enter_idle": str(status)}))
    trace = HandlerTrace(channel.handset)
    assert channel.request(IDLE) == refusal(IDLE)
    trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()", *call_lines("enter_idle", status))
    channel.expect_silence(0.1)


def test_idle_that_the_hal_does_not_find_is_the_modems(make_handset: HandsetFactory) -> None:
    # A handler's -104, wherever it comes from, means that the request is not served here.
    handset = make_handset("pc", modem="held", answers={"enter_idle": "-104"})
    pc = PcChannel(handset)
    request = wire.encode_envelope(packet(IDLE))
    trace = HandlerTrace(handset)
    pc.send(request)
    pc.expect_acknowledgement()
    assert handset.modem.read_exactly(len(request)) == request
    pc.expect_silence(0.1)
    trace.expect_handler(IDLE_HANDLER, f"{IDLE_STEP}()", *call_lines("enter_idle", -104))
    # It is done: the next request is not appended to it.
    assert pc.request(176) == packet(175, integer(1, 0))


def test_idle_that_the_hal_does_not_find_is_an_error_for_the_app(app: AppChannel) -> None:
    app.handset.answer("enter_idle", "-104")
    refused(app, IDLE)


def test_idle_by_at_command(pc: PcChannel) -> None:
    pc.at("AT^DENTERIDLE", OK)
    pc.handset.answer("enter_idle", "7")
    pc.at("AT^DENTERIDLE", ERROR)
    pc.handset.place(LIBRARY, None)
    pc.at("AT^DENTERIDLE", ERROR)
    assert [call for call in pc.handset.calls() if "idle" in call] == [
        "enter_idle() = 0", "enter_idle() = 7"]


# sanity check, charging


def test_sanity_check(pc: PcChannel) -> None:
    for verdict in (0, 1, -5):
        pc.handset.answer("amt_check_system_sanity", str(verdict))
        trace = HandlerTrace(pc.handset)
        pc.at("AT^DBOOTDLFIN", f"\r\n^DBOOTDLFIN: {verdict}\r\n{OK}")
        trace.expect("amt_boot_dl_fin_read start.",
                     *call_lines("amt_check_system_sanity", verdict))
        assert trace.calls() == [f"amt_check_system_sanity() = {verdict}"]
        assert pc.request(SANITY).result == 0
        assert trace.calls() == [f"amt_check_system_sanity() = {verdict}"] * 2
    assert not is_loaded(pc.handset)
    pc.handset.place(LIBRARY, other_library(pc.handset))
    trace = HandlerTrace(pc.handset)
    pc.at("AT^DBOOTDLFIN", ERROR)
    trace.expect("amt_boot_dl_fin_read start.", *loader_failure(
        "amt_boot_dl_fin_read", "undefined symbol: amt_check_system_sanity"))


def test_charging(pc: PcChannel) -> None:
    # The first probe switches charging on.
    trace = HandlerTrace(pc.handset)
    pc.at("AT", OK)
    trace.expect("will call amt_usb_charger_enable , type:1.",
                 *call_lines("amt_usb_charger_enable", 0), "amt_usb_charger_enable return OK.",
                 "call amt_usb_charge_ctrl for amt4. return:0, current amt mode:4.")
    assert trace.calls() == ["amt_usb_charger_enable(1) = 0"]


@pytest.mark.parametrize("status", [3, -1])
def test_charging_that_fails(make_handset: HandsetFactory, status: int) -> None:
    pc = PcChannel(make_handset("pc", answers={"amt_usb_charger_enable": str(status)}))
    trace = HandlerTrace(pc.handset)
    pc.at("AT", OK)
    trace.expect(*call_lines("amt_usb_charger_enable", status),
                 f"call amt_usb_charge_ctrl for amt4. return:{status}, current amt mode:4.")
    trace.expect_none("amt_usb_charger_enable return OK.")


@pytest.mark.parametrize("has_library", [False, True])
def test_charging_without_the_hal(make_handset: HandsetFactory, has_library: bool) -> None:
    handset = make_handset("pc")
    handset.place(LIBRARY, other_library(handset) if has_library else None)
    pc = PcChannel(handset)
    trace = HandlerTrace(handset)
    pc.at("AT", OK)
    reason = "undefined symbol: amt_usb_charger_enable" if has_library else MISSING
    trace.expect("will call amt_usb_charger_enable , type:1.",
                 *loader_failure("amt_usb_charge_ctrl", reason),
                 "call amt_usb_charge_ctrl for amt4. return:-118, current amt mode:4.")
    assert trace.calls() == []


# eMMC information


def test_emmc_information(pc: PcChannel) -> None:
    # A line of at most 48 characters, whose last one goes, whatever it is.
    for content, text, length in (
            ("HW8G-0031 7456 MiB rev 5\n", "HW8G-0031 7456 MiB rev 5", 25), ("\n", "", 1),
            ("open", "ope", 4), ("x" * 47 + "\n", "x" * 47, 48), ("x" * 200, "x" * 47, 48),
            ("one\ntwo\n", "one", 4)):
        pc.handset.place(EMMC_FILE, content)
        trace = HandlerTrace(pc.handset)
        assert pc.request(EMMC) == done(EMMC, string(205, text))
        trace.expect_handler(EMMC_HANDLER, "amt_read_emmc_info()", f"emmc_info_len: {length}",
                             f"read emmc_info: {text}")
        assert trace.calls() == []


@pytest.mark.parametrize("content, errno, text", [
    (None, NO_ENTRY, f"open {EMMC_FILE} fail"), ("", 0, "read fail")])
def test_emmc_information_that_cannot_be_read(pc: PcChannel, content: str | None, errno: int,
                                              text: str) -> None:
    pc.handset.place(EMMC_FILE, content)
    trace = HandlerTrace(pc.handset)
    assert pc.request(EMMC) == refusal(EMMC)
    trace.expect_handler(EMMC_HANDLER, "amt_read_emmc_info()",
                         error_line("amt_read_emmc_info", -100, errno), text,
                         device_error(EMMC_HANDLER, -100, errno), "read error")


def test_the_app_line_does_not_serve_the_pcs(app: AppChannel) -> None:
    for command in (SANITY, EMMC):
        trace = HandlerTrace(app.handset)
        refused(app, command)
        trace.expect(f"unregistered AMT request id: {command}")
