"""The test in the modem's place on the AT channel, with every byte of both its neighbours told."""

import signal
from contextlib import contextmanager
from typing import Iterable, Iterator, Sequence

from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from amt_station import wire
from support import channels
from support.arrived import TERMINAL_SIZE, arrived
from support.channels import RESULT, AppChannel, integer, packet

# Final results as the modem says them.
OK, ERROR = channels.OK.encode(), channels.ERROR.encode()
ERRORS = (ERROR, b"\r\n+CME ERROR: 100\r\n", b"\r\n+CMS ERROR: 500\r\n")
MODEM_FAILED = 10
NOT_SERVED = 1

# No handler serves it, so it is refused without anything being touched.
FENCE = 200


def refusal(command: int, code: int) -> wire.Packet:
    """The one packet that answers a request which failed."""
    return packet(command + 1, integer(RESULT, code))


@contextmanager
def standing_still(handset: Handset, size: int) -> Iterator[None]:
    """The daemon sees the SIZE bytes that are sent meanwhile in one piece.

    The kernel carries a long text through a terminal in several, and in its own time.
    """
    def is_stopped() -> bool:
        return all(thread["state"].startswith("T") for thread in
                   handset.inspect().threads.values())

    handset.signal(signal.SIGSTOP)
    wait_until(is_stopped, "the daemon to stand still")
    try:
        yield
        there = min(size, TERMINAL_SIZE)
        wait_until(lambda: arrived(handset) >= there, f"{there} bytes on the daemon's line")
    finally:
        handset.signal(signal.SIGCONT)


class ModemDesk:
    """An app that asks, and the modem that is asked."""

    def __init__(self, handset: Handset) -> None:
        self.handset = handset
        self.app = AppChannel(handset)
        self.mux = handset.mux.open()

    def ask(self, request: "wire.Packet | bytes", command: bytes) -> None:
        """The app's request reaches the modem as COMMAND, and nothing else does."""
        data = request.encode() if isinstance(request, wire.Packet) else request
        if len(data) > 1024:
            with standing_still(self.handset, len(data)):
                self.app.send(data)
        else:
            self.app.send(data)
        assert self.mux.read_exactly(len(command)) == command

    def say(self, *pieces: bytes) -> None:
        """The modem speaks; each piece is read by itself before the next is said."""
        for piece in pieces:
            mark = self.handset.log.mark()
            self.mux.write(piece)
            self.handset.log.wait(f"read_at read_len_ptr[{len(piece)}]", after=mark)

    def expect(self, *packets: wire.Packet) -> None:
        """Exactly these packets reach the app, and the modem has heard no more than it was asked.

        A request behind them shows that nothing else was sent, without waiting for silence.
        """
        for wanted in packets:
            got = self.app.read_packet()
            assert got == wanted, f"{got} instead of {wanted}"
        assert self.app.request(FENCE) == refusal(FENCE, NOT_SERVED)
        self.mux.expect_silence(0)

    def exchange(self, request: wire.Packet, command: bytes, answer: Sequence[bytes],
                 packets: Iterable[wire.Packet]) -> None:
        """A request, what the modem hears and says, and what the app gets."""
        self.ask(request, command)
        self.say(*answer)
        self.expect(*packets)
