"""The handshake of a start by USB cable, in all its outcomes, and its two time limits."""

import re
import time

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import scaled
from support.channels import OK, PcChannel
from support.moments import Patience, logged_at
from support.trace import TAG, Trace

PROPERTY = "sys.vx.amt.failure.handshake"
PERMISSION = "/amt/power_usb_amt.txt"
AC = "/sys/class/power_supply/ac/online"
STATE = "/sys/class/android_usb/android0/state"


def skip_under_tsan(handset: Handset) -> None:
    """ThreadSanitizer crashes on the threads that the C library makes for timers by itself."""
    if handset.program.sanitizer == "tsan":
        pytest.skip("the sanitizer does not know the C library's timer threads")


def start(make_handset: HandsetFactory, ready: bool = True, **options: object) -> Handset:
    """A handset that a cable has started; its init does not start the daemon again."""
    return make_handset("usb-inserted", ready=ready, restart=False, **options)


def shake_hands(handset: Handset) -> None:
    """Probe twice: the first data bring the modem's answer and the timer, the second end it."""
    pc = PcChannel(handset)
    pc.at("AT", OK)
    handset.log.wait("will create timer.")
    handset.log.wait(re.compile(r"setTimer success, timerId\[-?\d+\], timeMSec:5000\. "))
    pc.at("AT", OK)
    handset.log.wait("handshake success.")


# permission


@pytest.mark.parametrize("text", ["1", "1\n", "1\r\n"])
def test_ac_power_refuses(make_handset: HandsetFactory, text: str) -> None:
    handset = start(make_handset, ready=False, files={AC: text})
    assert handset.wait_exit() == 0
    texts = handset.log.texts(TAG)
    begin = texts.index("will treat handshake.")
    shown = text.replace("\r", "\\r").replace("\n", "\\n")
    assert f"readed success from file({AC}). value: {shown}." in texts[begin:]
    assert "power-supply is ac, do not enter amt by handshake. will exit" in texts[begin:]
    assert "do not permit to enter amt by handshake. " in texts[begin:]
    assert f"set property({PROPERTY}) to 1." in texts[begin:]
    assert "receive signal: 15 - SIGTERM" in texts[begin:]
    assert handset.get_property(PROPERTY) == "1"
    assert texts.count(f"set property({PROPERTY}) to 1.") == 1
    # It is refused at once: no limit of time has to end it.
    assert not handset.log.find("usb enum timeout")
    assert not handset.log.find("amt_write_wifi_to_nvram_file()")
    assert b"init over" not in handset.stdout()


@pytest.mark.parametrize("text", ["0", "0\n", "2", "", "11", "1 "])
def test_other_power_does_not(make_handset: HandsetFactory, text: str) -> None:
    handset = start(make_handset, files={AC: text})
    assert "permit to enter amt by handshake." in handset.log.texts(TAG)


@pytest.mark.parametrize("text", ["0", "0\n", "no number\n"])
def test_permission_file_refuses(make_handset: HandsetFactory, text: str) -> None:
    handset = start(make_handset, ready=False, files={PERMISSION: text})
    assert handset.wait_exit() == 0
    texts = handset.log.texts(TAG)
    shown = text.replace("\n", "\\n")
    assert f"readed success from file({PERMISSION}). flag: {shown}." in texts
    assert "do not permit to enter amt by handshake. will exit" in texts
    assert handset.get_property(PROPERTY) == "1"
    assert not handset.log.find("usb enum timeout")
    assert not handset.log.find("amt_write_wifi_to_nvram_file()")
    assert b"init over" not in handset.stdout()


@pytest.mark.parametrize("text", ["1\n", "7", None, ""])
def test_permission_file_permits(make_handset: HandsetFactory, text: str | None) -> None:
    handset = start(make_handset, files={PERMISSION: text})
    assert "permit to enter amt by handshake." in handset.log.texts(TAG)
    assert handset.get_property(PROPERTY) is None
    assert bool(handset.log.find(f"readed success from file({PERMISSION})")) == bool(text)


def test_other_starts_do_not_ask(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", files={AC: "1", PERMISSION: "0"})
    assert "will treat handshake." not in handset.log.texts(TAG)


# success


def test_handshake_succeeds(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    trace = Trace(handset)
    shake_hands(handset)
    trace.expect(
        re.compile(r"delete timer\.timerId:-?\d+\."),
        "deleteTimer success, timerId[-1]",
        "mark to enter amt4",
        "call amt_usb_charge_ctrl for amt4. return:0, current amt mode:4.",
        "will create timer.",
        re.compile(r"createTimer success, timerId\[-?\d+\]"),
        re.compile(r"setTimer success, timerId\[-?\d+\], timeMSec:5000\. "),
        re.compile(r"delete timer\.timerId:-?\d+\."),
        "deleteTimer success, timerId[-1]",
        "handshake success.",
        "pthread_create() amt_handle_load_image_for_handshake success.")
    handset.log.wait("call amt_usb_charge_ctrl. return:0, current amt mode:4, usb_charge_mode:1.")
    assert [call for call in trace.calls() if "charger" in call] == [
        "amt_usb_charger_enable(1) = 0", "amt_usb_charger_enable(1) = 0"]


def test_handshake_by_packets_keeps_mode_1(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    pc = PcChannel(handset)
    assert pc.request(5, acknowledged=False).command == 6  # the modem's answer
    handset.log.wait("will create timer.")
    pc.request(176)
    handset.log.wait("call amt_usb_charge_ctrl. return:0, current amt mode:1, usb_charge_mode:0.")
    assert "amt_usb_charger_enable(0) = 0" in handset.calls()


def test_handshake_happens_once(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    shake_hands(handset)
    mark = handset.log.mark()
    pc = PcChannel(handset)
    for _ in range(3):
        pc.at("AT", OK)
    texts = handset.log.texts(TAG, mark)
    assert "handshake success." not in texts
    assert "will create timer." not in texts


def test_no_handshake_without_a_cable(pc_handset: Handset) -> None:
    pc = PcChannel(pc_handset)
    pc.at("AT", OK)
    pc.at("AT", OK)
    assert not pc_handset.log.find("will create timer.")
    assert not pc_handset.log.find("handshake success.")


def test_state_file_makes_ready(make_handset: HandsetFactory) -> None:
    # The link was configured before anybody listened: the modem's first words bring it to light.
    handset = start(make_handset, modem="held", usb_state="CONNECTED")
    handset.modem.open()
    handset.path(STATE).write_text("CONFIGURED\n")
    handset.modem.write(b"\r\nRING\r\n")
    handset.log.wait(f"readed success from file({STATE}). value: CONFIGURED\\n.")
    handset.log.wait("will create timer.")
    assert handset.pc.read_until(b"RING\r\n") == b"\r\nRING\r\n"


def test_state_file_that_says_no(make_handset: HandsetFactory) -> None:
    handset = start(make_handset, modem="held", usb_state="CONNECTED")
    handset.modem.write(b"\r\nRING\r\n")
    handset.log.wait(f"readed success from file({STATE}). value: CONNECTED\\n.")
    mark = handset.log.mark()
    handset.modem.write(b"\r\nRING\r\n")
    handset.log.wait("readed success", after=mark)
    assert not handset.log.find("will create timer.")


def test_configured_event_makes_ready(make_handset: HandsetFactory) -> None:
    handset = start(make_handset, modem="held")
    trace = Trace(handset)
    handset.usb.configure()
    handset.log.wait("amt_handle_monitor_usb_loop get usb CONFIGURED event")
    handset.log.wait("deleteTimer success, timerId[-1]")
    trace.expect("amt_handle_monitor_usb_loop get usb CONFIGURED event",
                 re.compile(r"delete timer\.timerId:-?\d+\."))
    handset.modem.write(b"x")
    handset.log.wait("will create timer.")


def test_disconnected_event_makes_it_wait_for_the_link_again(make_handset: HandsetFactory) -> None:
    handset = start(make_handset, modem="held", usb_state="CONNECTED")
    handset.usb.send("USB_STATE=CONFIGURED")
    handset.log.wait("get usb CONFIGURED event")
    handset.usb.send("USB_STATE=DISCONNECTED")
    handset.log.wait("get usb disconnect event")
    handset.modem.write(b"\r\nRING\r\n")
    handset.log.wait(f"readed success from file({STATE}). value: CONNECTED\\n.")
    handset.log.wait("write to pc, m_buf_len=8, write_len=8")
    assert not handset.log.find("will create timer.")


# the time limits


def test_silent_station_ends_it_after_5_seconds(make_handset: HandsetFactory) -> None:
    handset = start(make_handset, modem="held")
    skip_under_tsan(handset)
    handset.usb.configure()
    handset.log.wait("get usb CONFIGURED event")
    handset.modem.write(b"x")
    with Patience() as patience:
        handset.log.wait("timeMSec:5000")
        assert handset.wait_exit() == 0
        assert patience.seconds < scaled(7.0)
    created = handset.log.find("will create timer.")
    assert created and 5.0 <= time.time() - logged_at(created)
    texts = handset.log.texts(TAG)
    place = texts.index("timeout. time:5 seconds.")
    assert "permit to enter amt by handshake. " in texts[place:]
    assert f"set property({PROPERTY}) to 2." in texts[place:]
    assert "receive signal: 15 - SIGTERM" in texts[place:]
    assert texts.count(f"set property({PROPERTY}) to 2.") == 1
    assert handset.get_property(PROPERTY) == "2"


def test_unconfigured_link_ends_it_after_20_seconds(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    skip_under_tsan(handset)
    assert handset.log.find(re.compile(r"setTimer success, timerId\[-?\d+\], timeMSec:20000\. "))
    assert handset.wait_exit(timeout=30) == 0
    texts = handset.log.texts(TAG)
    assert "usb enum timeout. time:20 seconds." in texts
    assert handset.get_property(PROPERTY) == "2"


def test_end_by_signal_sets_the_property_once(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    trace = Trace(handset)
    assert handset.stop() == 0
    trace.expect("amt_handle_deinit()", re.compile(r"delete timer\.timerId:-?\d+\."),
                 "deleteTimer success, timerId[-1]", "deleteTimer success, timerId[-1]",
                 "permit to enter amt by handshake. ", f"set property({PROPERTY}) to 2.")
    assert handset.get_property(PROPERTY) == "2"


def test_end_after_the_switch_was_turned_off(make_handset: HandsetFactory) -> None:
    handset = start(make_handset)
    PcChannel(handset).at("AT^DAMT1=0", OK)
    assert handset.stop() == 0
    assert handset.get_property(PROPERTY) == "1"


def test_end_of_other_starts_sets_nothing(pc_handset: Handset) -> None:
    assert pc_handset.stop() == 0
    assert pc_handset.get_property(PROPERTY) is None
