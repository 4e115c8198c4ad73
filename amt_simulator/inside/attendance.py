"""Who is at the far end of each tty: the modem, a relay to a port of the PC, or nobody."""

from amt_simulator.inside.lines import Line, NoLine
from amt_simulator.inside.modem import Modem, Conversation
from amt_simulator.inside.relay import PortRelay

MODEM_LINES = ("modem", "mux")
MODES = ("table", "silent", "held", "absent")


class Answerer:
    """Hears one tty for the modem and says its answers."""

    def __init__(self, conversation: Conversation, line: Line) -> None:
        self._conversation = conversation
        self._line = line

    def __call__(self, data: bytes) -> None:
        said = self._conversation.feed(data)
        if said:
            self._line.send(said)


class Attendance:
    """Puts somebody to each line, and takes them off while the outside holds it."""

    def __init__(self, modem: Modem, lines: dict[str, Line]) -> None:
        self.modem = modem
        self._lines = {name: line for name, line in lines.items() if line.path}
        self._modes = {name: "table" if name in MODEM_LINES else "held" for name in self._lines}
        self._relays: dict[str, PortRelay] = {}

    def set_modem_mode(self, mode: str) -> None:
        """Bring the modem into a mode: table, silent, held by whoever takes its ttys, or absent."""
        if mode not in MODES:
            raise ValueError(f"no such modem mode: {mode}")
        for name in MODEM_LINES:
            line = self._lines.get(name)
            if line is None:
                continue
            if mode == "absent":
                self._modes[name] = "table"
                line.hang_up()
                continue
            self._modes[name] = mode
            line.connect()
            self.attend(name)

    def relay(self, name: str, relay: PortRelay) -> None:
        """Connect the line NAME with a port of the PC while nobody else speaks on it."""
        self._relays[name] = relay
        self.attend(name)

    def attend(self, name: str) -> None:
        """Put to the line NAME whoever belongs there; nothing said before is left."""
        line = self._lines[name]
        mode = self._modes[name]
        relay = self._relays.get(name)
        if mode == "silent":
            line.listen(lambda data: None)
        elif mode == "table":
            line.listen(Answerer(Conversation(self.modem), line))
        elif relay:
            line.listen(relay.send)
            relay.listen(lambda data: self._from_port(line, data))
        else:
            line.listen(None)

    def leave(self, name: str) -> None:
        """Take everybody off the line NAME; whoever holds its master speaks there."""
        self._lines[name].listen(None)
        if name in self._relays:
            self._relays[name].listen(None)

    @staticmethod
    def _from_port(line: Line, data: bytes) -> None:
        try:
            line.send(data)
        except NoLine:
            # As on a cable that is not plugged in.
            pass
