"""Kernel events: the kernel itself multicasts what its administrator sends to this socket."""

import os
import socket
import struct

NETLINK_KOBJECT_UEVENT = 15
UEVENT_MESSAGE = 16
REQUEST_FLAG = 1
LISTENERS = "/proc/net/netlink"

USB_DEVICE = "/devices/virtual/android_usb/android0"
USB_STATE_FILE = "/sys/class/android_usb/android0/state"


def send(strings: list[str]) -> None:
    """Have the kernel send an event made of STRINGS to all its listeners."""
    payload = b"".join(text.encode() + b"\0" for text in strings)
    header = struct.pack("=IHHII", 16 + len(payload), UEVENT_MESSAGE, REQUEST_FLAG, 0, 0)
    with socket.socket(socket.AF_NETLINK, socket.SOCK_RAW, NETLINK_KOBJECT_UEVENT) as sender:
        sender.sendto(header + payload, (0, 0))


def usb_event(state: str) -> list[str]:
    """The event that the USB gadget driver sends when the link comes to STATE."""
    return [f"change@{USB_DEVICE}", "ACTION=change", f"DEVPATH={USB_DEVICE}",
            "SUBSYSTEM=android_usb", f"USB_STATE={state}"]


def set_usb_state(state: str) -> None:
    """Bring the USB link to STATE: the driver's file first, then the event, as the driver does."""
    if os.path.exists(os.path.dirname(USB_STATE_FILE)):
        with open(USB_STATE_FILE, "w", encoding="ascii") as stream:
            stream.write(state + "\n")
    send(usb_event(state))


def listeners() -> int:
    """How many sockets listen to kernel events."""
    with open(LISTENERS, encoding="ascii") as stream:
        rows = [line.split() for line in stream.readlines()[1:]]
    return sum(1 for row in rows
               if int(row[1]) == NETLINK_KOBJECT_UEVENT and int(row[3], 16) & 1)
