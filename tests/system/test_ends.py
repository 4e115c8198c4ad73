"""Every way in which the daemon ends: always with status 0, soon, and with its things put away."""

import signal
from contextlib import suppress

import pytest

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.errors import HandsetError
from amt_simulator.waiting import scaled, wait_until
from support.channels import AppChannel, PcChannel
from support.moments import Patience
from support.trace import TAG, Trace

NAMES = {2: "SIGINT", 15: "SIGTERM", 11: "SIGSEGV", 7: "SIGBUS", 12: "SIGUSR2"}
SOON = 1.0
APP_LINK = "/dev/ttyAPP0"


def end_by(handset: Handset, number: int, tid: int = 0) -> Trace:
    """End the daemon by a signal; it must be gone, with status 0, within a second."""
    trace = Trace(handset)
    handset.set_restart(False)
    ended = len(handset.exits())
    with Patience() as patience:
        handset.signal(number, tid)
        assert handset.wait_exit(ended) == 0
        assert patience.seconds < scaled(SOON)
    trace.expect("signal_treatment()", f"receive signal: {number} - {NAMES[number]}",
                 "amt_deinit_resource()", "amt_handle_deinit()",
                 "deleteTimer success, timerId[-1]", "deleteTimer success, timerId[-1]")
    return trace


def workers(handset: Handset, count: int) -> list[int]:
    """The daemon's own workers, COUNT of them; a sanitizer's thread is older than they are."""
    return sorted(handset.inspect().threads)[-count:]


def link_exists(handset: Handset) -> bool:
    """Whether the app's link is there."""
    return handset.run(["/usr/bin/test", "-L", APP_LINK]).status == 0


# signals


@pytest.mark.parametrize("number", NAMES)
def test_signal_ends_the_pc_path(pc_handset: Handset, number: int) -> None:
    end_by(pc_handset, number)


@pytest.mark.parametrize("number", NAMES)
def test_signal_ends_the_packet_path(packet_handset: Handset, number: int) -> None:
    assert link_exists(packet_handset)
    end_by(packet_handset, number)
    assert not link_exists(packet_handset)


@pytest.mark.parametrize("number", NAMES)
@pytest.mark.parametrize("index", range(4))
def test_signal_on_any_thread(pc_handset: Handset, number: int, index: int) -> None:
    end_by(pc_handset, number, [pc_handset.pid, *workers(pc_handset, 3)][index])


@pytest.mark.parametrize("number", NAMES)
def test_signal_on_the_app_reader(packet_handset: Handset, number: int) -> None:
    end_by(packet_handset, number, *workers(packet_handset, 1))
    assert not link_exists(packet_handset)


@pytest.mark.parametrize("number", NAMES)
def test_signal_while_a_tty_is_waited_for(make_handset: HandsetFactory, number: int) -> None:
    handset = make_handset("pc", ready=False, modem="absent")
    handset.log.wait('(1/60)try to open device "/dev/ttyMODEM0"')
    end_by(handset, number)


def test_signal_while_the_modem_is_asked_for_silence(make_handset: HandsetFactory) -> None:
    handset = make_handset("packet", ready=False, modem="held")
    handset.mux.read_until(b"AT^DLKS=0\r")
    end_by(handset, signal.SIGTERM)
    assert not link_exists(handset)


@pytest.mark.parametrize("on_reader", [False, True])
@pytest.mark.parametrize("number", NAMES)
def test_signal_while_a_handler_waits_for_the_modem(make_handset: HandsetFactory, number: int,
                                                    on_reader: bool) -> None:
    handset = make_handset("packet", modem="silent", ready=False)
    handset.mux.read_until(b"AT^DLKS=0\r")
    handset.mux.write(b"\r\nOK\r\n")
    handset.wait_ready()
    app = AppChannel(handset)
    app.send_packet(85)
    handset.mux.read_until(b"AT^DMSN\r")
    end_by(handset, number, workers(handset, 1)[0] if on_reader else 0)
    assert not link_exists(handset)


@pytest.mark.parametrize("number", NAMES)
def test_signal_while_the_station_reads_nothing(make_handset: HandsetFactory, number: int) -> None:
    handset = make_handset("pc", modem="held")
    handset.pc.open()
    handset.modem.open()
    mark = handset.log.mark()
    for _ in range(30):
        handset.modem.write(b"x" * 1024)
    # The modem reader hangs in its write: it has read more than the PC's line takes.
    handset.log.wait("receive Modem data: ", after=mark)
    wait_until(lambda: any(thread["waits_in"] in ("wait_woken", "n_tty_write")
                           for thread in handset.inspect().threads.values()), "a full line")
    end_by(handset, number)


def test_two_signals_at_once_end_once(pc_handset: Handset) -> None:
    trace = Trace(pc_handset)
    pc_handset.set_restart(False)
    with suppress(HandsetError):  # the daemon may be gone before the last of them
        for number in (signal.SIGTERM, signal.SIGSEGV, signal.SIGINT):
            pc_handset.signal(number)
    assert pc_handset.wait_exit() == 0
    assert trace.texts().count("amt_handle_deinit()") == 1


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGSEGV])
def test_signals_under_load(make_handset: HandsetFactory, number: int) -> None:
    handset = make_handset("pc")
    pc = PcChannel(handset)
    handset.set_restart(False)
    request = b"AT^DBTADDR=?\r"
    for _ in range(20):
        pc.send(request)
        handset.pc.read_until(b"OK\r\n")
    for _ in range(5):
        pc.send(request)
    handset.signal(number, workers(handset, 3)[0])
    assert handset.wait_exit() == 0
    assert handset.log.texts(TAG).count("amt_handle_deinit()") == 1


def test_other_signals_keep_their_meaning(pc_handset: Handset) -> None:
    pc_handset.set_restart(False)
    pc_handset.signal(signal.SIGSYS)
    assert pc_handset.wait_exit() == -signal.SIGSYS


def test_stray_thread_signal_does_no_harm(pc_handset: Handset) -> None:
    # The main thread is no worker: what ends workers passes it by.
    pc_handset.signal(signal.SIGUSR1, pc_handset.pid)
    PcChannel(pc_handset).at("AT^DBTADDR=?", "\r\nOK\r\n")


# the lines go


def test_pc_line_lost_ends_the_daemon(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", restart=False)
    trace = Trace(handset)
    handset.pc.hang_up()
    assert handset.wait_exit() == 0
    trace.expect("amt_handle_deinit()")
    assert not handset.log.find("receive signal"), "its reader ends it"


def test_usb_disconnect_ends_the_daemon(make_handset: HandsetFactory) -> None:
    handset = make_handset("pc", restart=False)
    trace = Trace(handset)
    handset.usb.unplug()
    assert handset.wait_exit() == 0
    trace.expect("amt_handle_monitor_usb_loop usb_status:[USB_STATE=DISCONNECTED]",
                 "amt_handle_monitor_usb_loop get usb disconnect event",
                 "amt_handle_monitor_usb_loop get usb disconnect event, will exit amt service",
                 "amt_handle_deinit()")


def test_init_starts_it_again(pc_handset: Handset) -> None:
    first = pc_handset.pid
    pc_handset.signal(signal.SIGTERM)
    assert pc_handset.wait_exit() == 0
    wait_until(lambda: pc_handset.pid not in (0, first) or None, "another start")
    pc_handset.wait_ready()
    PcChannel(pc_handset).at("AT^DWIFIADDR=?", "\r\nOK\r\n")
