"""A dialogue that is being held with a handset: the station's part, the modem's, and the files.

`test_dialogues.py` says what the statements mean.
"""

from contextlib import ExitStack
from typing import Callable

from amt_simulator import Handset, Line
from amt_simulator.waiting import wait_until
from amt_station import wire
from amt_station.trace.dialogue import Dialogue, Step
from support.channels import AppChannel, Channel, PcChannel, packet
from support.modem_desk import FENCE, NOT_SERVED, refusal, standing_still
from support.trace import Trace, Wanted, error_line
from support.traffic import PcTrace

# What a session finds untouched, whatever the one before it did.
FACTORY_FILES = ("/amt/amt_result.txt", "/amt/product.txt", "/amt/power_usb_amt.txt")
AWAITED = 1024
# How the daemon is started that speaks on a channel.
PATHS = {"app": "packet", "pc": "pc"}


class Session:
    """A dialogue that is being held."""

    def __init__(self, handset: Handset, dialogue: Dialogue, cleanup: ExitStack) -> None:
        self.handset = handset
        self.is_pc = dialogue.channel == "pc"
        self.channel: Channel = PcChannel(handset) if self.is_pc else AppChannel(handset)
        self.modem: Line = (handset.modem if self.is_pc else handset.mux).open()
        self.trace = Trace(handset)
        self.said: PcTrace | None = None
        self.logged: list[Wanted] = []
        # Every message that was expected and came, with the name of its line.
        self.heard: list[tuple[str, bytes]] = []
        self._cleanup = cleanup
        self._is_over = False
        for path in FACTORY_FILES:
            self._place(path, None)

    def hold(self, dialogue: Dialogue) -> None:
        """Do every step; a failure names its line."""
        for step in dialogue.steps:
            try:
                self._do(step)
            except Exception as problem:
                raise AssertionError(
                    f"{dialogue.path.name}:{step.line}: {step.action}: {problem}") from problem
        self._expect_all_heard()

    def _do(self, step: Step) -> None:
        name = step.action.replace(" ", "_")
        act: Callable[..., None] = getattr(self, f"_do_{name}")
        arguments = [word for word in (step.subject,) if word]
        if step.argument is not None:
            arguments.append(step.argument)  # type: ignore[arg-type]
        act(*arguments)

    # the station

    def _encode(self, message: "wire.Packet | bytes") -> bytes:
        if isinstance(message, bytes):
            return message
        return wire.encode_envelope(message) if self.is_pc else message.encode()

    def _do_station_says(self, message: "wire.Packet | bytes") -> None:
        self._expect_all_heard()
        if self.is_pc:
            self.said = PcTrace(self.handset)
        self.channel.send(self._encode(message))

    def _do_station_hears(self, message: "wire.Packet | bytes") -> None:
        self._expect(self.channel.line, message)

    def _expect(self, line: Line, message: "wire.Packet | bytes") -> None:
        wanted = self._encode(message)
        got = line.read_exactly(len(wanted))
        self.heard.append((line.name, got))
        assert got == wanted, f"{self._shown(got)} instead of {self._shown(wanted)}"

    def _shown(self, data: bytes) -> str:
        try:
            return str(wire.decode_envelope(data) if self.is_pc else wire.Packet.decode(data))
        except wire.WireError:
            return repr(data)

    def _expect_all_heard(self) -> None:
        if self._is_over:
            return
        if self.said is not None:
            self.said.wait_served()
        elif not self.is_pc:
            # Were there more to hear, it would come before this.
            self.channel.send(packet(FENCE).encode())
            self._do_station_hears(refusal(FENCE, NOT_SERVED))
        self.channel.line.expect_silence(0)
        self.modem.expect_silence(0)

    def _do_station_opens(self, name: str) -> None:
        pass  # the line is there from the beginning

    # the modem

    def _do_modem_hears(self, message: "wire.Packet | bytes") -> None:
        self._expect(self.modem, message)

    def _do_modem_says(self, message: "wire.Packet | bytes") -> None:
        data = self._encode(message)
        if len(data) > AWAITED:
            # The kernel hands it over as one piece, but for what no terminal holds at once.
            with standing_still(self.handset, len(data)):
                self.modem.write(data)
            return
        mark = self.handset.log.mark()
        self.modem.write(data)
        read = "receive Modem data: : (data_len = {})" if self.is_pc else "read_at read_len_ptr[{}]"
        self.handset.log.wait(read.format(len(data)), after=mark)

    def _do_modem_adds(self, message: "wire.Packet | bytes") -> None:
        self.modem.write(self._encode(message))

    def _do_modem_dies(self) -> None:
        self.modem.hang_up()

    def _do_modem_returns(self) -> None:
        self.modem.come_back(held=True)

    # ends

    def _do_daemon_ends(self, status: int) -> None:
        assert self.handset.wait_exit() == status
        self._is_over = True

    def _do_handset_off(self) -> None:
        self.handset.wait_power_off()
        self._is_over = True

    # surroundings

    def _place(self, path: str, content: bytes | None) -> None:
        place = self.handset.path(path)
        before = place.read_bytes() if place.is_file() else None
        self._cleanup.callback(self.handset.place, path, before)
        self.handset.place(path, content)

    def _do_file_becomes(self, path: str, content: bytes) -> None:
        self._place(path, content)

    def _do_file_vanishes(self, path: str) -> None:
        self._place(path, None)

    def _do_file_is(self, path: str, content: bytes) -> None:
        assert self.handset.read(path) == content

    def _do_file_absent(self, path: str) -> None:
        assert not self.handset.path(path).exists()

    def _do_property_becomes(self, name: str, value: str) -> None:
        self._cleanup.callback(self.handset.set_property, name, self.handset.get_property(name))
        self.handset.set_property(name, value)

    def _do_property_is(self, name: str, value: str) -> None:
        assert self.handset.get_property(name) == value

    def _do_property_absent(self, name: str) -> None:
        assert self.handset.get_property(name) is None

    def _do_call_answers(self, name: str, line: str) -> None:
        self._cleanup.callback(self.handset.answer, name)
        self.handset.answer(name, line)

    def _do_log(self, wanted: "str | tuple[str, int]") -> None:
        self.logged.append(wanted if isinstance(wanted, str) else error_line(*wanted))
        wait_until(lambda: self.trace.has(*self.logged), f"{self.logged[-1]!r} in its place",
                   explain=lambda: "\n".join(self.trace.texts()))
