"""USB events, by way of the kernel."""

import pytest

from amt_simulator import Handset

STATE = "/sys/class/android_usb/android0/state"


@pytest.mark.parametrize("action, state", [
    ("plug", "CONNECTED"), ("configure", "CONFIGURED"), ("unplug", "DISCONNECTED"),
])
def test_events_reach_the_daemon(fake: Handset, action: str, state: str) -> None:
    """The driver's file tells the state, and the kernel's event reaches its listener."""
    getattr(fake.usb, action)()
    assert fake.text(STATE) == state + "\n"
    text = fake.log.wait("event ").text
    assert text.startswith("event change@/devices/virtual/android_usb/android0|ACTION=change|"
                           "DEVPATH=/devices/virtual/android_usb/android0|"
                           f"SUBSYSTEM=android_usb|USB_STATE={state}|SEQNUM=")


def test_any_event(fake: Handset) -> None:
    """A test can have the kernel send whatever strings it likes."""
    fake.usb.send("a@/b", "USB_STATE=", "x")
    assert fake.log.wait("event ").text.startswith("event a@/b|USB_STATE=|x|SEQNUM=")


def test_listeners_are_counted(fake: Handset) -> None:
    """So that a test can wait for the daemon to listen, and see it stop."""
    fake.usb.wait_listener()
    assert fake.usb.listeners() == 1
    fake.stop()
    assert fake.usb.listeners() == 0


@pytest.mark.parametrize("path, state", [
    ("pc", "CONFIGURED"), ("packet", "DISCONNECTED"), ("usb-inserted", "CONNECTED"),
])
def test_the_state_at_the_beginning(make_fake, path: str, state: str) -> None:
    """It is what the way of starting makes plausible, unless a test says otherwise."""
    assert make_fake(path, ready=False).text(STATE) == state + "\n"
    assert make_fake(path, ready=False, usb_state="ODD").text(STATE) == "ODD\n"
