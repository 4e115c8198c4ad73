"""Who is at the far end of each tty: the modem, a port of the PC, or nobody."""

from amt_simulator.inside.lines import Line, NoLine
from amt_simulator.inside.modem import Conversation, Modem
from amt_simulator.inside.modem_table import MODES, SLOW_SECONDS
from amt_simulator.inside.relay import Port

MODEM_LINES = ("modem", "mux")


class Answerer:
    """Hears one tty for the modem and says its answers."""

    def __init__(self, conversation: Conversation, line: Line, seconds: float = 0.0) -> None:
        self._conversation = conversation
        self._line = line
        self._seconds = seconds

    def __call__(self, data: bytes) -> None:
        said = self._conversation.feed(data)
        if said and self._seconds:
            self._line.later(self._seconds, lambda: _say(self._line, said))
        elif said:
            _say(self._line, said)


def _say(line: Line, data: bytes) -> None:
    """Say DATA as on a cable: where nobody is, or nobody reads, it is lost."""
    try:
        line.send(data)
    except NoLine:
        pass


class Attendance:
    """Puts somebody to each line, and takes them off while the outside holds it."""

    def __init__(self, modem: Modem, lines: dict[str, Line]) -> None:
        self.modem = modem
        self._lines = {name: line for name, line in lines.items() if line.path}
        self._modes = {name: "table" if name in MODEM_LINES else "held" for name in self._lines}
        self._ports: dict[str, Port] = {}
        # The lines on which the outside speaks.
        self._left: set[str] = set()

    def set_modem_mode(self, mode: str) -> None:
        """Bring the modem into a mode of the table's."""
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

    @property
    def lines(self) -> list[str]:
        """The lines that the handset has."""
        return list(self._lines)

    def has_port(self, name: str) -> bool:
        """Whether the line NAME is connected with a port of the PC."""
        return name in self._ports

    def add_port(self, name: str, port: Port) -> None:
        """Connect the line NAME with a port of the PC while nobody else speaks on it."""
        self._ports[name] = port
        if name not in self._left:
            self.attend(name)

    def remove_port(self, name: str) -> None:
        """Take the port of the line NAME away, if it has one."""
        port = self._ports.pop(name, None)
        if port:
            port.close()
            if name not in self._left:
                self.attend(name)

    def attend(self, name: str) -> None:
        """Put to the line NAME whoever belongs there; nothing said before is left."""
        line = self._lines[name]
        mode = self._modes[name]
        port = self._ports.get(name)
        self._left.discard(name)
        if mode == "silent":
            line.listen(lambda data: None)
        elif mode in ("table", "slow", "refusing"):
            line.listen(Answerer(Conversation(self.modem, mode == "refusing"), line,
                                 SLOW_SECONDS if mode == "slow" else 0.0))
        elif port:
            line.listen(port.end.say)
            self._hear(name)
        else:
            line.listen(None)

    def leave(self, name: str) -> None:
        """Take everybody off the line NAME; whoever holds its master speaks there."""
        self._left.add(name)
        self._lines[name].listen(None)
        if name in self._ports:
            self._ports[name].end.listen(None)

    def _hear(self, name: str) -> None:
        """Pass on what programs write to the port of the line NAME, while the line has room."""
        if name in self._ports and name not in self._left:
            self._ports[name].end.listen(lambda data: self._from_port(name, data))

    def _from_port(self, name: str, data: bytes) -> None:
        line = self._lines[name]
        _say(line, data)
        if line.is_full:
            # Whoever writes to the port has to wait, as for a handset that does not read.
            self._ports[name].end.listen(None)
            line.when_said(lambda: self._hear(name))
