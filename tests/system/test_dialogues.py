"""Sessions between a station, the daemon and the modem, each a text file in `dialogues/`.

A file tells one session, a statement a line, in order; a `#` begins a comment.

    channel app | pc              the line on which the station speaks; the first statement
    handset fresh                 a handset of its own: needed when the session leaves something
                                  behind (a refused request on the pc channel, an ended daemon)

    station says MESSAGE          one write on the channel
    station hears MESSAGE         exactly these bytes come next on the channel
    modem hears MESSAGE           exactly these bytes come next on the modem's line
    modem says MESSAGE            one read of the daemon; the next line is not done before it
                                  (up to 1024 bytes; more may take several reads)
    modem adds MESSAGE            the same, but nobody waits for it to be read
    modem dies | returns          its line goes away, and is back
    daemon ends STATUS            the daemon ends by itself
    station opens BYTES           its port; so a trace begins, and means nothing here
    handset off                   the handset powers off
    file PATH is BYTES            a file of the handset, byte for byte; `file PATH absent`: none
    property NAME is BYTES        a system property; `property NAME absent`: none
    log BYTES                     a log text, since the last `log` statement or the start
    log error FUNCTION CODE       the error line of a function
    file PATH becomes BYTES       done to the handset, until the end; `file PATH vanishes`
    property NAME becomes BYTES
    call NAME answers BYTES       scripts a stand-in of the platform

A MESSAGE is BYTES, `acknowledgement`, or `packet COMMAND ATOM...`, in its envelope on the pc
channel. A COMMAND is a number or a name of the catalogue, an ATOM is `ID=TYPE:VALUE` with the types
int, bool, str, bytes; values are a number or one of BYTES. BYTES are words that are joined: text in
quotes (`\\r \\n \\t \\0 \\\\ \\" \\xNN`), text with a count (`"x"*4096`), hexadecimal digits.

A line may begin with its time, as in a trace that `amt-station --trace` has written.

At each `station says` and at the end, nothing may be left unheard: not on the channel, not on the
modem's line. So a session shows every byte of both.
"""

from contextlib import ExitStack
from pathlib import Path
from typing import Callable

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset, Line
from amt_station import wire
from amt_station.trace.dialogue import Dialogue, DialogueError, Step, parse
from support.channels import AppChannel, Channel, PcChannel, integer, packet
from support.modem_desk import FENCE, NOT_SERVED, refusal
from support.trace import Trace, Wanted, error_line
from support.traffic import PcTrace

FOLDER = Path(__file__).with_name("dialogues")
FILES = sorted(FOLDER.glob("*.txt"))
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
        mark = self.handset.log.mark()
        self.modem.write(data)
        if len(data) <= AWAITED:
            read = "receive Modem data: : (data_len = {})" if self.is_pc else \
                "read_at read_len_ptr[{}]"
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
        self.trace.expect(*self.logged)


@pytest.mark.parametrize("path", FILES, ids=lambda path: path.stem)
def test_dialogue(path: Path, make_handset: HandsetFactory, share_handset: HandsetFactory) -> None:
    dialogue = parse(path, path.read_text("utf-8"))
    make = make_handset if dialogue.is_fresh else share_handset
    with ExitStack() as cleanup:
        Session(make(PATHS[dialogue.channel]), dialogue, cleanup).hold(dialogue)


def test_there_are_dialogues_on_both_channels() -> None:
    channels = [parse(path, path.read_text("utf-8")).channel for path in FILES]
    assert len(channels) >= 36 and min(channels.count(name) for name in PATHS) >= 12


# files that are no dialogues

HEAD = "channel app\nstation says packet 7\n"


@pytest.mark.parametrize("text, problem", [
    ("", "bad.txt:0: the station says nothing at all"),
    ("# only this\n", "bad.txt:1: the station says nothing at all"),
    ("station says packet 7\n", "bad.txt:1: the channel comes first"),
    ("\nchannel usb\n", "bad.txt:2: channel app or pc"),
    (HEAD + "channel pc\n", "bad.txt:3: a second channel"),
    (HEAD + "station shouts packet 7\n", "bad.txt:3: no such statement; lines begin with call, "
     "channel, daemon, file, handset, log, modem, property, station"),
    (HEAD + "\n# x\nmodem hears \"AT\n", "bad.txt:5: a quote that is not closed"),
    (HEAD + "modem hears \"A\\q\"\n", "bad.txt:3: unknown escape \\q"),
    (HEAD + "modem hears AT\n", "bad.txt:3: AT is neither quoted text nor hexadecimal bytes"),
    (HEAD + "modem hears \"\u20ac\"\n", "bad.txt:3: \"\u20ac\": write bytes above 0x7F as \\xNN"),
    (HEAD + "modem hears\n", "bad.txt:3: no bytes"),
    (HEAD + "modem dies \"now\"\n", "bad.txt:3: nothing may follow, but there is \"now\""),
    (HEAD + "station says packet\n", "bad.txt:3: a packet without a command"),
    (HEAD + "station says packet AMT_NO_CMD\n", "bad.txt:3: no command AMT_NO_CMD"),
    (HEAD + "station says packet 256\n", "bad.txt:3: no command 256"),
    (HEAD + "station says packet 7 5=7\n", "bad.txt:3: 5=7 is not ATOM=int|str|bytes|bool:VALUE"),
    (HEAD + "station says packet 7 5=int:x\n", "bad.txt:3: x is no number"),
    (HEAD + "station says packet 7 300=int:1\n", "bad.txt:3: 300=int:1: atom id 300 is not a byte"),
    (HEAD + "daemon ends\n", "bad.txt:3: one word must follow"),
    (HEAD + "log error write_at\n", "bad.txt:3: log error FUNCTION CODE"),
])
def test_what_is_no_dialogue(text: str, problem: str) -> None:
    with pytest.raises(DialogueError) as caught:
        parse(Path("somewhere/bad.txt"), text)
    assert str(caught.value) == problem


def test_how_a_dialogue_is_read() -> None:
    text = ('# a session\nchannel pc  # on the serial line\nhandset fresh\n'
            'station says packet AMT_READIMEI_CMD 21=str:"a \\"b\\" # c" 4=bytes:00ff 5=int:-0x10 '
            '6=bool:1 7=str: 8=bytes:"x"*3  # six\n\n'
            'station hears acknowledgement\nstation hears "OK\\r\\n" 0d0a "z"*2 "\\x80\\0"\n'
            'file /amt/x is "1\\n"\nlog error write_at -118\n')
    dialogue = parse(Path("x.txt"), text)
    assert (dialogue.channel, dialogue.is_fresh) == ("pc", True)
    atoms = (wire.Atom.string(21, 'a "b" # c'), wire.Atom.raw(4, b"\0\xff"), integer(5, -16),
             wire.Atom.boolean(6, 1), wire.Atom.string(7, ""), wire.Atom.raw(8, b"xxx"))
    assert dialogue.steps == [
        Step(4, "station says", wire.Packet(7, atoms)),
        Step(6, "station hears", wire.ACKNOWLEDGEMENT),
        Step(7, "station hears", b"OK\r\n\r\nzz\x80\0"),
        Step(8, "file is", b"1\n", "/amt/x"), Step(9, "log", ("write_at", -118))]


def test_a_failure_names_its_line(share_handset: HandsetFactory) -> None:
    text = 'channel app\n\nstation says packet 200\nstation hears packet 201 1=int:2\n'
    dialogue = parse(Path("x.txt"), text)
    with ExitStack() as cleanup, pytest.raises(AssertionError, match=r"^x\.txt:4: station hears: "
                                               r"Packet\(command=201.* instead of Packet"):
        Session(share_handset("packet"), dialogue, cleanup).hold(dialogue)
