"""The two channels of the daemon as a test speaks on them: packets and AT text, byte-exact."""

from amt_simulator import Handset, Line
from amt_station import wire

RESULT = wire.RESULT_ATOM
ACK = wire.ACKNOWLEDGEMENT
# Final results as a station reads them.
OK, ERROR = "\r\nOK\r\n", "\r\nERROR\r\n"
ENVELOPE_HEAD = 12
PACKET_HEAD = 6


def integer(atom: int, value: int) -> wire.Atom:
    """An integer atom."""
    return wire.Atom.integer(atom, value)


def string(atom: int, text: str) -> wire.Atom:
    """A string atom."""
    return wire.Atom.string(atom, text)


def raw(atom: int, content: bytes) -> wire.Atom:
    """A bytes atom."""
    return wire.Atom.raw(atom, content)


def flag(atom: int, value: int) -> wire.Atom:
    """A one-byte atom."""
    return wire.Atom.boolean(atom, value)


def packet(command: int, *atoms: wire.Atom) -> wire.Packet:
    """A packet."""
    return wire.Packet(command, atoms)


class Channel:
    """What both channels share: the handset, its line, sending and expecting bytes."""

    def __init__(self, handset: Handset, line: Line) -> None:
        self.handset = handset
        self.line = line

    def send(self, data: bytes) -> None:
        """Write bytes as they are."""
        self.line.write(data)

    def expect_silence(self, seconds: float = 0.3) -> None:
        """Nothing arrives within SECONDS."""
        self.line.expect_silence(seconds)


class PcChannel(Channel):
    """The test station at the PC line."""

    def __init__(self, handset: Handset) -> None:
        super().__init__(handset, handset.pc)

    def send_packet(self, command: int, *atoms: wire.Atom) -> None:
        """Send a request in its envelope."""
        self.send(wire.encode_envelope(packet(command, *atoms)))

    def read_frame(self, timeout: float | None = None) -> bytes:
        """The next frame's bytes, an acknowledgement included."""
        head = self.line.read_exactly(8, timeout)
        assert head[:4] == wire.MAGIC, f"no frame begins with {head!r}"
        return head + self.line.read_exactly(int.from_bytes(head[4:8], "little"), timeout)

    def read_packet(self, timeout: float | None = None) -> wire.Packet:
        """The next frame, which must hold a packet; checksum and lengths are verified."""
        return wire.decode_envelope(self.read_frame(timeout))

    def expect_acknowledgement(self, timeout: float | None = None) -> None:
        """The next frame is the acknowledgement."""
        frame = self.read_frame(timeout)
        assert frame == wire.ACKNOWLEDGEMENT, f"no acknowledgement: {frame.hex(' ')}"

    def request(self, command: int, *atoms: wire.Atom, acknowledged: bool = True,
                timeout: float | None = None) -> wire.Packet:
        """Send a request; returns its answer, which follows the acknowledgement."""
        self.send_packet(command, *atoms)
        if acknowledged:
            self.expect_acknowledgement(timeout)
        return self.read_packet(timeout)

    def at(self, command: str, answer: "str | bytes", timeout: float | None = None) -> None:
        """Send AT text with its carriage return; expect exactly ANSWER."""
        self.send(command.encode() + b"\r")
        wanted = answer.encode() if isinstance(answer, str) else answer
        got = self.line.read_exactly(len(wanted), timeout)
        assert got == wanted, f"{command}: {got!r} instead of {wanted!r}"


class AppChannel(Channel):
    """The test app at the app line."""

    def __init__(self, handset: Handset) -> None:
        super().__init__(handset, handset.app)
        # The daemon hears of an app by its presence, before anything is said.
        handset.app.open()

    def send_packet(self, command: int, *atoms: wire.Atom) -> None:
        """Send a bare request."""
        self.send(packet(command, *atoms).encode())

    def read_packet(self, timeout: float | None = None) -> wire.Packet:
        """The next bare packet."""
        head = self.line.read_exactly(PACKET_HEAD, timeout)
        rest = int.from_bytes(head[:2], "little") - PACKET_HEAD
        return wire.Packet.decode(head + (self.line.read_exactly(rest, timeout) if rest else b""))

    def request(self, command: int, *atoms: wire.Atom,
                timeout: float | None = None) -> wire.Packet:
        """Send a request; returns its answer."""
        self.send_packet(command, *atoms)
        return self.read_packet(timeout)
