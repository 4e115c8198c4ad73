"""Nothing is left behind by a request, however often it comes: descriptors, threads, children,
memory. Each request of both lines is repeated; those that pause, on handsets of their own
that pause together."""

from dataclasses import dataclass
from typing import Mapping, Sequence, Union

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.control import ProcessInfo
from amt_simulator.waiting import wait_until
from amt_station import wire
from support.channels import AppChannel, PcChannel, flag, integer, raw, string
from support.registrations import APP_ROWS, PC_ROWS
from support.threads import wait_calm

Channel = Union[AppChannel, PcChannel]

OFTEN, SELDOM, WARM_UP = 300, 100, 20
# For all repetitions of one request; pages that are touched for the first time cost as well. Pages
# of the program's and its libraries' files are no growth: the kernel maps and drops them by dozens.
GROWTH_KIB = 64

MAC = "00:11:22:33:44:55"
FILES = {"/data/local/wifi/keep": "", "/amt/BT/BT_Address.txt": f"{MAC}\n",
         "/amt/WIFI/WIFI_nvram.txt": f"{MAC}\n", "/amt/usb_serial": "KEL1", "/amt/sn-2.txt": "P1"}
# What no file and no library of a poor handset serves.
POOR: dict[str, str | None] = {path: None for path in (
    "/sys/class/power_supply/battery/voltage_now", "/sys/devinfo/emmc_info",
    "/system/lib/hw/amt.tq5530.misc.so", "/system/lib/hw/audio.primary.tq5530.amt.so",
    "/system/bin/amt-audio", "/sys/class/leds/button-backlight/brightness")}
FAILING = {name: "-1 EIO" for name in (
    "ldt_btCtrl", "ldt_btCheck", "ldt_wifiCtrl", "ldt_wifiCheck", "ldt_gpsCtrl", "ldt_gpsCheck",
    "SARVOCAM_IOCTL_PREVIEW", "VIDIOC_S_INPUT")}


@dataclass(frozen=True)
class Request:
    """A request to repeat, and how many packets answer it."""

    command: int
    atoms: Sequence[wire.Atom] = ()
    answers: int = 1

    def send(self, channel: Channel) -> None:
        """Send it."""
        channel.send_packet(self.command, *self.atoms)

    def expect_answers(self, channel: Channel, failing: bool = False) -> None:
        """Read what answers it."""
        # The modem answers what is passed on to it; nobody acknowledges that.
        if isinstance(channel, PcChannel) and self.command != 91:
            channel.expect_acknowledgement()
        for _ in range(self.answers):
            answer = channel.read_packet()
            assert failing or answer.result == 0, answer


def sub(number: int) -> wire.Atom:
    """A sub-command of the Wi-Fi radio test."""
    return raw(154, bytes([number]))


BOTH = (
    Request(170, answers=2), Request(172, [integer(110, 1)]), Request(172, [integer(110, 3)]),
    Request(174, [integer(140, 1)]), Request(174, [integer(140, 2)]), Request(176),
    Request(178, [integer(141, 3)]), Request(185), Request(185, [integer(152, 2)]),
    Request(187, [sub(1)]), Request(187, [sub(3), raw(155, b"\1"), raw(156, b"\1"),
                                          raw(157, b"\1")]),
    Request(187, [sub(6)]), Request(187, [sub(2)]), Request(240),
)
PC_FAST = (*BOTH, Request(45, [integer(19, 16)]), Request(91, [integer(20, 1)]),
           Request(191), Request(193, [flag(190, 1)]), Request(224), Request(244), Request(246))
PC_SLOW = (
    Request(172, [integer(110, 2), string(111, MAC)]), Request(219), Request(226),
    Request(185, [integer(152, 1), string(153, MAC)]),
    Request(193, [flag(190, 2), string(191, "P2")]),
    Request(191, [integer(160, 1), integer(162, 4), string(161, "KEL2")]),
)
APP_FAST = (
    *BOTH, Request(9), Request(29), Request(31), Request(33), Request(33, [flag(15, 0)]),
    Request(35), Request(37), Request(57, [integer(26, 90)]), Request(57, [integer(26, 256)]),
    Request(137), Request(139), Request(147), Request(180, [integer(112, 1)]), Request(238),
)
# They reach the modem, whose simulation answers the refused ones too; 195 ends the daemon.
APP_MODEM = tuple(Request(command, [integer(5, 1)]) for command in sorted(set(APP_ROWS))
                  if command not in {195} | {request.command for request in APP_FAST})
REFUSED = (
    *(Request(command) for command in (9, 31, 33, 139, 147, 172, 185, 187, 200, 238, 240)),
    Request(170, answers=2), Request(172, [integer(110, 3)]), Request(174), Request(178),
    Request(180, [integer(112, 1)]), Request(180), Request(185, [integer(152, 1)]),
    Request(187, [sub(1)]), Request(187, [sub(5)]),
)


def repeat(channel: Channel, request: Request, count: int, failing: bool = False) -> None:
    """Repeat a request, and compare the daemon with what it was before."""
    handset = channel.handset

    def serve(times: int) -> None:
        for _ in range(times):
            request.send(channel)
            request.expect_answers(channel, failing)

    serve(WARM_UP)
    before = wait_calm(handset)
    serve(count)
    compare(handset, before, f"{request}")


def compare(handset: Handset, before: ProcessInfo, what: str) -> None:
    """The daemon is what it was BEFORE."""
    after = wait_calm(handset)
    assert after.pid == before.pid
    assert after.descriptors == before.descriptors, what
    assert set(after.threads) == set(before.threads), what
    # A sanitizer keeps what was freed, and a daemon that counts coverage grows with each fork.
    if not handset.program.tells_at_exit:
        assert after.anonymous_kib - before.anonymous_kib <= GROWTH_KIB, what


def left_over(handset: Handset) -> Mapping[int, list[str]]:
    """The processes besides init and the daemon; one that has ended has no command line."""
    return {pid: command for pid, command in handset.processes().items()
            if pid not in (1, handset.pid)}


def settle_players(handset: Handset) -> None:
    """Wait until the players that were replaced or stopped are gone, and nothing else is there."""
    wait_until(lambda: not left_over(handset) or None, "the end of all other processes",
               explain=lambda: f"{left_over(handset)}")


def slices(requests: Sequence[Request], count: int) -> list[Sequence[Request]]:
    """The requests in COUNT shares."""
    return [requests[start::count] for start in range(count)]


def test_every_request_is_repeated() -> None:
    """The lists above leave none out but those that end the daemon or the handset."""
    assert {request.command for request in PC_FAST + PC_SLOW} == set(PC_ROWS) - {236}
    assert {request.command for request in APP_FAST + APP_MODEM} == set(APP_ROWS) - {195}


@pytest.mark.parametrize("share", slices(PC_FAST, 2), ids=["one", "two"])
def test_requests_of_the_pc(make_handset: HandsetFactory, share: Sequence[Request]) -> None:
    pc = PcChannel(make_handset("pc", files=FILES))
    pc.request(187, sub(1))
    for request in share:
        repeat(pc, request, OFTEN)
    settle_players(pc.handset)


def test_requests_of_the_pc_with_a_pause(make_handset: HandsetFactory) -> None:
    handsets = [make_handset("pc", ready=False, files=FILES) for _ in PC_SLOW]
    for handset in handsets:
        handset.wait_ready()
    pairs = [(request, PcChannel(handset)) for request, handset in zip(PC_SLOW, handsets)]

    def serve(times: int) -> None:
        for _ in range(times):
            for request, pc in pairs:
                request.send(pc)
            for request, pc in pairs:
                request.expect_answers(pc)

    serve(3)
    before = [wait_calm(handset) for handset in handsets]
    serve(SELDOM)
    for (request, pc), info in zip(pairs, before):
        compare(pc.handset, info, f"{request}")


@pytest.mark.parametrize("share", slices(APP_FAST, 2), ids=["one", "two"])
def test_requests_of_the_app(make_handset: HandsetFactory, share: Sequence[Request]) -> None:
    app = AppChannel(make_handset("packet", files=FILES))
    app.request(187, sub(1))
    for request in share:
        repeat(app, request, OFTEN)
    app.request(33, flag(15, 0))
    settle_players(app.handset)


def test_requests_of_the_app_to_the_modem(make_handset: HandsetFactory) -> None:
    # Most of them are one handler's: together they are repeated often.
    app = AppChannel(make_handset("packet", files=FILES))
    for request in APP_MODEM:
        repeat(app, request, WARM_UP, failing=True)


@pytest.mark.parametrize("share", slices(REFUSED, 2), ids=["one", "two"])
def test_refused_requests(make_handset: HandsetFactory, share: Sequence[Request]) -> None:
    app = AppChannel(make_handset("packet", files=POOR, answers=FAILING, card=None))
    for request in share:
        repeat(app, request, OFTEN, failing=True)
    settle_players(app.handset)


@pytest.mark.parametrize("command, library, other", [
    (31, "audio.primary.tq5530.amt.so", "amt.tq5530.misc.so"),
    (238, "amt.tq5530.misc.so", "audio.primary.tq5530.amt.so")])
def test_library_without_the_entry_stays_loaded_once(
        make_handset: HandsetFactory, command: int, library: str, other: str) -> None:
    handset = make_handset("packet")
    directory = "/system/lib/hw/"
    handset.place(directory + library, handset.path(directory + other))
    app = AppChannel(handset)
    repeat(app, Request(command), OFTEN, failing=True)
    maps = handset.run(["/usr/bin/cat", f"/proc/{handset.pid}/maps"]).stdout.decode().splitlines()
    starts = [line for line in maps if line.endswith(library) and line.split()[2] == "00000000"]
    assert len(starts) == 1
