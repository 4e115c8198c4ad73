"""What holds for every request that waits for the modem's final result, whatever it says."""

import pytest

from conftest import HandsetFactory
from amt_station import wire
from support.channels import AppChannel, integer, packet
from support.modem_desk import ERRORS, NOT_SERVED, OK, ModemDesk, refusal
from support.modem_kinds import KINDS, Kind
from support.trace import Trace, error_line

AREA_SIZE = 4096
SILENCE = b"AT^DLKS=0\r"
# As much as is read at a time while silence is asked for: nothing behind it is taken along.
SILENCED = OK.rjust(18, b".")
UNSOLICITED = b"\r\n+CREG: 1,\"00C3\"\r\n", b"\r\n^DSIMST: 1\r\n\r\n+CSQ: 22,99\r\n"


@pytest.fixture
def desk(share_handset: HandsetFactory) -> ModemDesk:
    """An app and the modem it asks."""
    return ModemDesk(share_handset("packet"))


@pytest.fixture(params=KINDS)
def kind(request: pytest.FixtureRequest) -> Kind:
    """Each kind of request."""
    return KINDS[request.param]


def succeed(desk: ModemDesk, kind: Kind) -> None:
    """The request is served as ever."""
    desk.ask(kind.request, kind.command)
    desk.mux.write(kind.whole)
    desk.expect(kind.reply)


def say_split(desk: ModemDesk, kind: Kind, said: bytes, place: int,
              *reply: wire.Packet) -> None:
    """The modem says something in two pieces. What comes after the end is of no consequence."""
    first, second = said[:place], said[place:]
    desk.ask(kind.request, kind.command)
    if not kind.decided(first):
        desk.say(first, second)
        desk.expect(*reply)
        return
    desk.say(first)
    desk.expect(*reply)
    desk.mux.write(second)
    succeed(desk, kind)


def test_answer_split_at_every_byte(desk: ModemDesk, kind: Kind) -> None:
    for place in range(1, len(kind.whole)):
        say_split(desk, kind, kind.whole, place, kind.reply)


def test_answer_byte_by_byte(desk: ModemDesk, kind: Kind) -> None:
    end = kind.whole.index(kind.ok) + len(kind.ok)
    desk.exchange(kind.request, kind.command,
                  [kind.whole[place:place + 1] for place in range(end)], [kind.reply])
    desk.mux.write(kind.whole[end:])
    succeed(desk, kind)


def test_answer_after_unsolicited_lines(desk: ModemDesk, kind: Kind) -> None:
    desk.exchange(kind.request, kind.command, [*UNSOLICITED, kind.whole], [kind.reply])
    desk.exchange(kind.request, kind.command, [b"".join(UNSOLICITED) + kind.whole], [kind.reply])
    # Said before it was asked, and not heard until then.
    desk.mux.write(UNSOLICITED[1])
    succeed(desk, kind)


def test_only_the_final_result(desk: ModemDesk, kind: Kind) -> None:
    desk.exchange(kind.request, kind.command, [OK], kind.without)


@pytest.mark.parametrize("error", ERRORS, ids=["ERROR", "CME", "CMS"])
def test_error_results(desk: ModemDesk, kind: Kind, error: bytes) -> None:
    for place in range(1, len(error)):
        say_split(desk, kind, error, place, kind.refusal)
    trace = Trace(desk.handset)
    desk.exchange(kind.request, kind.command, [UNSOLICITED[0], error], [kind.refusal])
    trace.expect(f"{kind.function}()", error_line(r"\w+", -100))


def test_what_only_begins_like_a_result(desk: ModemDesk, kind: Kind) -> None:
    desk.exchange(kind.request, kind.command,
                  [b"\r\nERRORS\r\n\r\n+CME\r\n ERROR", b"\r\n+cme error: 1\r\n\r\nok\r\n",
                   kind.whole], [kind.reply])


def test_any_bytes_before_the_answer(desk: ModemDesk, kind: Kind) -> None:
    desk.exchange(kind.request, kind.command,
                  [bytes(range(256)), b"\0\r\n\0\0", kind.whole], [kind.reply])


def test_area_full_without_a_final_result(desk: ModemDesk, kind: Kind) -> None:
    trace = Trace(desk.handset)
    desk.ask(kind.request, kind.command)
    desk.mux.write(b"x" * AREA_SIZE)
    desk.expect(kind.refusal)
    # No room is left to read into.
    trace.expect(error_line("read_at", -101), "0, 1, 0", error_line(r"\w+", -101))
    desk.exchange(kind.request, kind.command, [b"\n" * 1024] * 4, [kind.refusal])
    succeed(desk, kind)


def test_final_result_that_just_fits(desk: ModemDesk, kind: Kind) -> None:
    rest = AREA_SIZE - len(kind.whole)
    for size, reply in ((rest, kind.reply), (rest + 1, kind.refusal)):
        desk.ask(kind.request, kind.command)
        desk.mux.write(b"x" * size)
        desk.mux.write(kind.whole)
        # The tunnel has its result before the end of the line.
        desk.expect(kind.reply if kind.ok == b"OK" else reply)
    succeed(desk, kind)


@pytest.mark.parametrize("name", ["tunnel", "version", "read-result"])
def test_modem_dies_in_the_middle_and_comes_back(desk: ModemDesk, name: str) -> None:
    kind = KINDS[name]
    trace = Trace(desk.handset)
    desk.ask(kind.request, kind.command)
    half = len(kind.answer) // 2
    desk.say(kind.whole[:half])
    desk.mux.hang_up()
    desk.mux.come_back(held=True)
    # Silenced anew; what it had said before still counts.
    assert desk.mux.read_exactly(len(SILENCE)) == SILENCE
    desk.mux.write(SILENCED)
    desk.mux.write(kind.whole[half:])
    desk.expect(kind.reply)
    trace.expect(f"{kind.function}()", "write_at()", "read_at ret_val[-118]")
    succeed(desk, kind)


def test_modem_dies_between_requests_and_comes_back(desk: ModemDesk, kind: Kind) -> None:
    desk.mux.hang_up()
    desk.mux.come_back(held=True)
    desk.app.send(kind.request.encode())
    assert desk.mux.read_exactly(len(SILENCE)) == SILENCE
    desk.mux.write(ERRORS[0])
    assert desk.mux.read_exactly(len(kind.command)) == kind.command
    desk.mux.write(kind.whole)
    desk.expect(kind.reply)


def test_modem_dies_and_stays_away(make_handset: HandsetFactory) -> None:
    # Thirty attempts to open it, a second apart.
    desk = ModemDesk(make_handset("packet"))
    kind = KINDS["board"]
    trace = Trace(desk.handset)
    desk.ask(kind.request, kind.command)
    desk.say(kind.whole[:8])
    desk.mux.hang_up()
    assert desk.app.read_packet(60) == kind.refusal
    assert desk.app.request(55).result == 0
    trace.expect("read_at ret_val[-118]", error_line("read_at", -118),
                 error_line(kind.function, -118))


# without a modem

OTHERS = (195, 219, 232)
UNCONCERNED = {
    55: packet(56, integer(22, 315), integer(1, 0)),
    228: packet(229, integer(39, 0), integer(36, 0), integer(1, 0)),
    230: packet(231, integer(1, 0)),
}


def test_without_a_modem(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", config={"vx.tty.at.mux": None})
    assert handset.log.find("The AT device is not opened with modem.")
    app = AppChannel(handset)
    requests = [kind.request for kind in KINDS.values()]
    requests += [packet(command) for command in OTHERS]
    # Those of the version that need no modem are refused too.
    requests += [packet(45, integer(19, 1)), packet(45, integer(19, 2))]
    for request in requests:
        trace = Trace(handset)
        assert app.request(request.command, *request.atoms) == refusal(request.command,
                                                                       NOT_SERVED)
        trace.expect("WARNING !", "no CP.")
        trace.expect_none("write_at()")
    for command, answer in UNCONCERNED.items():
        assert app.request(command) == answer
