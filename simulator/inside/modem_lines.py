"""The simulated modem on the handset's modem ttys: it answers, is mute, is away, or is replaced."""

from .lines import Line
from .modem import Modem, Session

MODEM_LINES = ("modem", "mux")
MODES = ("table", "silent", "held", "absent")


class ModemLines:
    """Puts the modem on its ttys and takes it off them."""

    def __init__(self, modem: Modem, lines: dict[str, Line]) -> None:
        self.modem = modem
        self._lines = {name: lines[name] for name in MODEM_LINES if lines[name].path}
        self._modes = dict.fromkeys(MODEM_LINES, "table")

    def owns(self, name: str) -> bool:
        """Whether the line NAME is one of the modem's."""
        return name in self._lines

    def set_mode(self, mode: str) -> None:
        """Bring the modem into a mode: table, silent, held by whoever takes its ttys, or absent."""
        if mode not in MODES:
            raise ValueError(f"no such modem mode: {mode}")
        for name, line in self._lines.items():
            if mode == "absent":
                self._modes[name] = "table"
                line.hang_up()
                continue
            self._modes[name] = mode
            line.connect()
            self.attend(name)

    def attend(self, name: str, mode: str = "") -> None:
        """Do on the tty NAME what the modem's mode asks for; nothing said before is left."""
        line = self._lines[name]
        mode = mode or self._modes[name]
        if mode == "held":
            line.listen(None)
        elif mode == "silent":
            line.listen(lambda data: None)
        else:
            line.listen(self._answerer(line))

    def _answerer(self, line: Line) -> "Answerer":
        return Answerer(Session(self.modem), line)


class Answerer:
    """Hears one tty for the modem and says its answers."""

    def __init__(self, session: Session, line: Line) -> None:
        self._session = session
        self._line = line

    def __call__(self, data: bytes) -> None:
        said = self._session.feed(data)
        if said:
            self._line.send(said)
