"""Sessions between a station, the daemon and the modem, each a text file in `dialogues/`.

A file tells one session, a statement a line, in order; a `#` begins a comment.

    channel app | pc              the line on which the station speaks; the first statement
    handset fresh                 a handset of its own: needed when the session leaves something
                                  behind (a refused request on the pc channel, an ended daemon)

    station says MESSAGE          one write on the channel
    station hears MESSAGE         exactly these bytes come next on the channel
    modem hears MESSAGE           exactly these bytes come next on the modem's line
    modem says MESSAGE            one read of the daemon; the next line is not done before it
                                  (of more than 1024 bytes nobody waits for the last read)
    modem adds MESSAGE            the same, but nobody waits for it to be read
    modem dies | returns          its line goes away, and is back
    daemon ends STATUS            the daemon ends by itself
    station opens BYTES           its port; so a trace begins, and means nothing here
    handset off                   the handset powers off
    file PATH is BYTES            a file of the handset, byte for byte; `file PATH absent`: none
    property NAME is BYTES        a system property; `property NAME absent`: none
    log BYTES                     a log text, since the last `log` statement or the start; the next
                                  line is not done before it
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

import pytest

from conftest import HandsetFactory
from amt_station import wire
from amt_station.trace.dialogue import DialogueError, Step, parse
from support.channels import integer
from support.session import PATHS, Session

FOLDER = Path(__file__).with_name("dialogues")
FILES = sorted(FOLDER.glob("*.txt"))


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
