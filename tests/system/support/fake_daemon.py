#!/usr/bin/python3
"""A stand-in for the daemon, for tests of the handset around it: echoes, logs, obeys.

On the PC path what the PC says goes to the modem and back; on the packet path the app line answers
with what it hears. A text that begins with "!" is an order: "!exit 3", "!signal 6", "!off",
"!print TEXT".
"""

import ctypes
import os
import select
import socket
import sys
import termios
import time
import tty

PC, MODEM, APP = "/dev/ttyGS0", "/dev/ttyMODEM0", "/dev/ttyAPP0"
SWITCH = "/handset/properties/amt.normal.amt.switch_status"
POWER_OFF = 0x4321FEDC


def log(text: str) -> None:
    """Write a record as the log library does."""
    stamp = time.strftime("%m-%d %H:%M:%S", time.gmtime())
    with open(os.environ["VX_HOST_LOG"], "a", encoding="utf-8") as stream:
        stream.write(f"{stamp}.000 {os.getpid()} {os.getpid()} D fake: {text}\n")


def obey(order: str) -> None:
    """Do what an order says."""
    word, _, rest = order.partition(" ")
    if word == "exit":
        sys.exit(int(rest))
    elif word == "signal":
        os.kill(os.getpid(), int(rest))
    elif word == "off":
        ctypes.CDLL(None).reboot(POWER_OFF)
    elif word == "print":
        print(rest, end="", flush=True)


def serve_pc() -> None:
    """Pass on what the PC and the modem say; tell of kernel events."""
    pc, modem = (os.open(path, os.O_RDWR | os.O_NOCTTY) for path in (PC, MODEM))
    events = socket.socket(socket.AF_NETLINK, socket.SOCK_RAW, 15)
    events.bind((os.getpid(), 1))
    log("read_pc_loop, read ready")
    log("read_modem_loop, read ready")
    while True:
        ready = select.select([pc, modem, events], [], [])[0]
        if events in ready:
            log("event " + "|".join(events.recv(2048).decode().split("\0")))
        for source, target in ((pc, modem), (modem, pc)):
            if source not in ready:
                continue
            try:
                data = os.read(source, 65536)
            except OSError as error:
                log(f"error {error.errno}")
                sys.exit(5)
            if not data:
                log("end of data")
                sys.exit(6)
            if data.startswith(b"!"):
                obey(data[1:].decode())
            else:
                os.write(target, data)


def publish() -> int:
    """Open the app line and publish it."""
    master = os.open("/dev/ptmx", os.O_RDWR | os.O_NOCTTY)
    fcntl_unlock = getattr(termios, "TIOCSPTLCK", 0x40045431)
    ctypes.CDLL(None).ioctl(master, fcntl_unlock, ctypes.byref(ctypes.c_int(0)))
    number = ctypes.c_int()
    ctypes.CDLL(None).ioctl(master, ctypes.c_ulong(0x80045430), ctypes.byref(number))
    tty.setraw(master)
    if os.path.lexists(APP):
        os.unlink(APP)
    os.symlink(f"/dev/pts/{number.value}", APP)
    return master


def serve_app() -> None:
    """Answer the app with what it says; publish the line again when it has gone."""
    master = publish()
    log("amt_handle_read_app_loop()")
    while True:
        try:
            data = os.read(master, 65536)
        except OSError as error:
            log(f"app gone {error.errno}")
            os.unlink(APP)
            os.close(master)
            master = publish()
            continue
        os.write(master, data)


def main() -> None:
    """Run."""
    print(f"fake {sys.argv}", flush=True)
    if "-x" in sys.argv:
        sys.exit(9)
    if os.path.exists(SWITCH) or "-u" in sys.argv or sys.argv[0].startswith("/data"):
        serve_pc()
    serve_app()


main()
