"""The USB monitor, told by the kernel's own events."""

import re

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from support.channels import PcChannel
from support.trace import Trace

LOOP = "amt_handle_monitor_usb_loop"
DISCONNECTED = f"{LOOP} get usb disconnect event"
CONFIGURED = f"{LOOP} get usb CONFIGURED event"
OTHER = f"{LOOP} get usb other status event"


def event_line(text: str, *strings: str) -> "re.Pattern[str]":
    """The log line of a string of an event; the kernel adds a sequence number to the event."""
    own = sum(len(part) + 1 for part in strings)
    sizes = "|".join(str(own + len("SEQNUM=") + digits + 1) for digits in range(1, 12))
    return re.compile(rf"{LOOP} uevent:\[{re.escape(text)}\] nLen:({sizes})")


def test_event_is_logged_up_to_the_state(pc_handset: Handset) -> None:
    trace = Trace(pc_handset)
    event = ("change@/devices/virtual/android_usb/android0", "ACTION=change",
             "USB_STATE=CONFIGURED", "BEHIND=it")
    pc_handset.usb.send(*event)
    pc_handset.log.wait(CONFIGURED)
    trace.expect(*(event_line(text, *event) for text in event[:3]),
                 f"{LOOP} usb_status:[USB_STATE=CONFIGURED]", CONFIGURED,
                 "deleteTimer success, timerId[-1]")
    assert not pc_handset.log.find("BEHIND=it")


@pytest.mark.parametrize("state, text", [
    ("USB_STATE=CONNECTED", OTHER), ("USB_STATE=", OTHER), ("USB_STATE=CONFIGURED", CONFIGURED),
    ("OLD_USB_STATE=CONFIGURED now", CONFIGURED)])
def test_states_that_keep_it_running(pc_handset: Handset, state: str, text: str) -> None:
    pc_handset.usb.send("ACTION=change", state)
    pc_handset.log.wait(text)
    PcChannel(pc_handset).at("AT^DBTADDR=?", "\r\nOK\r\n")


@pytest.mark.parametrize("state", ["USB_STATE=DISCONNECTED",
                                   "USB_STATE=CONFIGURED then DISCONNECTED"])
def test_disconnected_wins(make_handset: HandsetFactory, state: str) -> None:
    handset = make_handset("pc", restart=False)
    trace = Trace(handset)
    handset.usb.send("ACTION=change", state)
    assert handset.wait_exit() == 0
    trace.expect(f"{LOOP} usb_status:[{state}]", DISCONNECTED,
                 f"{DISCONNECTED}, will exit amt service")


def test_events_without_a_state_change_nothing(pc_handset: Handset) -> None:
    event = ("add@/devices/x", "ACTION=add", "STATE=DISCONNECTED")
    pc_handset.usb.send(*event)
    pc_handset.log.wait(event_line("STATE=DISCONNECTED", *event))
    assert not pc_handset.log.find(f"{LOOP} usb_status")
    PcChannel(pc_handset).at("AT^DBTADDR=?", "\r\nOK\r\n")


def test_usb_inserted_start_survives_a_disconnect(make_handset: HandsetFactory) -> None:
    handset = make_handset("usb-inserted", restart=False)
    PcChannel(handset).at("AT", "\r\nOK\r\n")
    handset.usb.send("USB_STATE=DISCONNECTED")
    handset.log.wait(DISCONNECTED)
    handset.usb.send("USB_STATE=CONFIGURED")
    handset.log.wait(CONFIGURED)
    PcChannel(handset).at("AT", "\r\nOK\r\n")
    assert handset.exits() == []


def test_cable_cycle(pc_handset: Handset) -> None:
    trace = Trace(pc_handset)
    pc_handset.usb.plug()
    pc_handset.log.wait(OTHER)
    pc_handset.usb.configure()
    pc_handset.log.wait(CONFIGURED)
    trace.expect(OTHER, CONFIGURED)
    pc_handset.usb.unplug()
    assert pc_handset.wait_exit() == 0
