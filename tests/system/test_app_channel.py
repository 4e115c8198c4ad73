"""The app's line on the running daemon: dispatch, refusals, and an app that comes and goes."""

import re

from conftest import HandsetFactory
from amt_simulator import Handset
from amt_simulator.waiting import wait_until
from support.channels import AppChannel, integer, packet
from support.threads import threads_of, wait_calm
from support.trace import Trace, error_line
from support.traffic import APP_IN, APP_OUT, dump

VOLTAGE = "/sys/class/power_supply/battery/voltage_now"
PTY_TAG = "vx-kel-pub"
CLEARED = dump(APP_OUT, packet(10, integer(5, 3987000), integer(1, 0)).encode())


def link(handset: Handset, path: str = "/dev/ttyAPP0") -> str:
    """Where the published name leads; empty when there is none."""
    return handset.run(["/usr/bin/readlink", path]).stdout.decode().strip()


def test_request_answer_and_their_log(app: AppChannel) -> None:
    trace = Trace(app.handset)
    answer = app.request(9)
    assert answer == packet(10, integer(5, 3987000), integer(1, 0))
    app.handset.log.wait(CLEARED)
    trace.expect(dump(APP_IN, packet(9).encode()), "handle_amt_app_req()",
                 "receive command id: 9(0x09) - AMT_READ_BATTERY_CMD", CLEARED)
    # No envelope, no acknowledgement, and a mode that packets of the app do not change.
    trace.expect_none("amt_convert_app_2_pc()", "mark to enter amt1")


def test_ids_without_a_handler_are_refused(app: AppChannel) -> None:
    for number, name in ((0, "AMT_NONE_CMD"), (2, "AMT_READFLASH_RSPCMD"), (191, "(undefined)"),
                         (200, "(undefined)"), (254, "(undefined)")):
        trace = Trace(app.handset)
        refusal = packet(number + 1, integer(1, 1))
        assert app.request(number, integer(5, 1)) == refusal
        app.handset.log.wait(dump(APP_OUT, refusal.encode()))
        trace.expect(f"receive command id: {number}(0x{number:02X}) - {name}",
                     error_line("handle_amt_app_req", -100),
                     f"unregistered AMT request id: {number}",
                     dump(APP_OUT, refusal.encode()))


def test_id_255_is_unknown(app: AppChannel) -> None:
    trace = Trace(app.handset)
    assert app.request(255) == packet(0, integer(1, 1))
    trace.expect("receive command id: 255(0xFF) - (undefined)",
                 error_line("handle_amt_app_req", -100), "unknown AMT request id: 255")
    assert app.request(254) == packet(255, integer(1, 1))


def test_refused_request_is_cleared(app: AppChannel) -> None:
    app.handset.place(VOLTAGE, None)
    assert app.request(9) == packet(10, integer(1, 1))
    app.handset.place(VOLTAGE, "3987000\n")
    trace = Trace(app.handset)
    assert app.request(9) == packet(10, integer(5, 3987000), integer(1, 0))
    # The second request came alone.
    trace.expect(dump(APP_IN, packet(9).encode()))


def test_pc_requests_are_not_the_apps(app: AppChannel) -> None:
    for number in (191, 193, 224, 226, 236, 244, 246):
        assert app.request(number) == packet(number + 1, integer(1, 1))
    assert app.handset.is_up


def test_bare_packets_only(app: AppChannel) -> None:
    # An envelope is no packet: its fourth byte is what is taken for the id.
    app.send(b"\xaa\xbb\xcc\xdd\x0e\0\0\0\2\0\0\0" + packet(9).encode() + b"\0\0\0\0")
    # 221 is the modem's: the block it gives is empty, and the tunnel refuses.
    assert app.read_packet().command == 222
    assert app.request(9).result == 0


# the app goes and comes back


def test_app_closes_and_reopens(app: AppChannel) -> None:
    handset = app.handset
    for _ in range(3):
        assert app.request(9).result == 0
        mark = handset.log.mark()
        before = link(handset)
        trace = Trace(handset)
        handset.app.close()
        disconnected = f"pty disconnect: pts name({before}), pts mapping name(/dev/ttyAPP0)"
        handset.log.wait(disconnected, after=mark)
        handset.app.open()
        assert app.request(9).result == 0
        trace.expect(disconnected, dump(APP_IN, packet(9).encode()))
        texts = handset.log.texts(PTY_TAG, mark)
        closed = texts.index("pub_pty_close pub_pty_delete_mapping ret_val[0]")
        assert re.fullmatch(r"pub_pty_open m_ptm_fd\[-1\]", texts[closed + 1])
        after = link(handset)
        assert f"create_pts_mapping symlink({after}, /dev/ttyAPP0) ret_val[0]" in texts
        state = handset.run(["/usr/bin/stat", "-Lc", "%a", "/dev/ttyAPP0"]).stdout.decode()
        assert state.strip() == "660"
    # One descriptor for the line, however often it was made anew.
    masters = [name for name in handset.inspect().descriptors.values() if "ptmx" in name]
    assert len(masters) == 1


def test_app_that_leaves_without_its_answer(app: AppChannel) -> None:
    handset = app.handset
    mux = handset.mux.open()
    app.send_packet(85)
    assert mux.read_exactly(8) == b"AT^DMSN\r"
    mark = handset.log.mark()
    handset.app.close()
    # Its answer goes nowhere, and the next app does not get it.
    mux.write(b"\r\n^DMSN: 77\r\n\r\nOK\r\n")
    handset.log.wait("pty disconnect: pts name(", after=mark)
    handset.app.open()
    assert app.request(9) == packet(10, integer(5, 3987000), integer(1, 0))


def test_app_line_that_cannot_be_made_again(make_handset: HandsetFactory) -> None:
    folder = "/data/app"
    handset = make_handset("packet", files={f"{folder}/note": ""}, restart=False,
                           config={"vx.tty.app": f"{folder}/ttyAPP0"})
    app = AppChannel(handset)
    assert app.request(9).result == 0
    wait_calm(handset)
    # Away goes the folder that the link lies in, and then the app.
    handset.path(folder).rename(handset.path("/data/other"))
    handset.path(folder).write_text("in its place\n")
    handset.app.close()
    handset.log.wait("pty disconnect: pts name(")
    wait_until(lambda: len(handset.inspect().threads) == threads_of(handset) - 1 or None,
               "the end of the app's reader")
    texts = handset.log.texts(PTY_TAG)
    assert [text for text in texts if text.endswith("failed")]
    # It is closed once more, though it is by then.
    assert "FUNC-pub_pty_close(), error_code=-101" in texts[-2]
    assert texts[-1] == "0, 1"
    assert not handset.log.find("sys call: read() failed!"), "of a line that is not there"
    # The daemon itself goes on, and ends as ever.
    assert handset.exits() == []
    assert handset.stop() == 0


def test_what_another_left_at_the_links_place_is_replaced(make_handset: HandsetFactory) -> None:
    # A daemon that was killed leaves its link behind.
    handset = make_handset("packet", config={"vx.tty.app": "/data/ttyAPP0"},
                           files={"/data/ttyAPP0": "stale\n"})
    assert link(handset, "/data/ttyAPP0").startswith("/dev/pts/")
    assert AppChannel(handset).request(9).result == 0


def test_mapping_name_is_cut(make_handset: HandsetFactory) -> None:
    name = "/data/" + "t" * 30
    handset = make_handset("packet", ready=False, config={"vx.tty.app": name})
    handset.log.wait("amt_handle_read_app_loop()")
    assert link(handset, name[:27]).startswith("/dev/pts/")
