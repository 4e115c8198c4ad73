"""A scripted handset on a pseudo-terminal, and the command line of the station."""

from __future__ import annotations

import os
import queue
import select
import subprocess
import sys
import threading
import tty
from pathlib import Path
from typing import Callable, Sequence

from amt_station.wire.atoms import Atom
from amt_station.wire.decoder import Decoder, Frame, Item, Text
from amt_station.wire.envelope import ACKNOWLEDGEMENT, encode_envelope
from amt_station.wire.packet import Packet

ROOT = Path(__file__).resolve().parents[2]
PATIENCE = 60.0

Script = Callable[[Item], Sequence[bytes]]
Run = Callable[..., "subprocess.CompletedProcess[str]"]


class Peer:
    """The handset's end: every item that arrives is handed to the script, whose bytes go back."""

    def __init__(self, decoder: Decoder) -> None:
        self.master, self.slave = os.openpty()
        tty.setraw(self.slave)
        self.path = os.ttyname(self.slave)
        self.script: Script = lambda item: ()
        self.received: queue.Queue[Item] = queue.Queue()
        self.raw = b""
        self._decoder = decoder
        self._stop_read, self._stop_write = os.pipe()
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def _serve(self) -> None:
        while True:
            ready = select.select([self.master, self._stop_read], [], [])[0]
            if self._stop_read in ready:
                return
            data = os.read(self.master, 4096)
            self.raw += data
            for item in self._decoder.feed(data):
                for answer in self.script(item):
                    os.write(self.master, answer)
                self.received.put(item)

    def say(self, data: bytes) -> None:
        """Send something unasked."""
        os.write(self.master, data)

    def next(self) -> Item:
        """The next item that arrived; fails the test when none does."""
        return self.received.get(timeout=PATIENCE)

    def cease(self) -> None:
        """Read no more, from within a script."""
        os.write(self._stop_write, b"x")

    def stop(self) -> None:
        """End the thread; the terminal stays open."""
        if self._thread.is_alive():
            self.cease()
            self._thread.join(PATIENCE)

    def hang_up(self) -> None:
        """Take the master side away."""
        self.stop()
        os.close(self.master)
        self.master = -1

    def close(self) -> None:
        """Give everything back."""
        self.stop()
        for fd in (self.master, self.slave, self._stop_read, self._stop_write):
            if fd >= 0:
                os.close(fd)


def answering(*atoms: Atom, code: int = 0, answer: int | None = None,
              acknowledged: bool = True) -> Script:
    """A script that answers every packet with these atoms and a result code, as the PC line."""
    def script(item: Item) -> Sequence[bytes]:
        if not isinstance(item, Frame):
            return ()
        number = item.packet.command + 1 if answer is None else answer
        frame = encode_envelope(Packet(number, (*atoms, Atom.integer(1, code))))
        return (ACKNOWLEDGEMENT, frame) if acknowledged else (frame,)
    return script


def replying(reply: str) -> Script:
    """A script that answers every text."""
    return lambda item: (reply.encode(),) if isinstance(item, Text) else ()


def sequence(*answers: Sequence[bytes]) -> Script:
    """A script that answers the n-th item with the n-th answers."""
    left = list(answers)
    return lambda item: left.pop(0) if left else ()


def ok(command: int, *atoms: Atom) -> bytes:
    """A positive answer in its envelope."""
    return encode_envelope(Packet(command, (*atoms, Atom.integer(1, 0))))


def error_packet(command: int, code: int = 1) -> bytes:
    """An error packet in its envelope."""
    return encode_envelope(Packet(command, (Atom.integer(1, code),)))


def station_command(*arguments: str) -> list[str]:
    """The command line of ``amt-station``."""
    return [sys.executable, "-m", "amt_station", *arguments]


def station_environment(**extra: str) -> dict[str, str]:
    """The environment without any setting of the station's."""
    kept = {name: value for name, value in os.environ.items()
            if not name.startswith("AMT_STATION_") and name != "NO_COLOR"}
    return {**kept, "TERM": "xterm", **extra}
