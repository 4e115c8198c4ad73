"""The `amt-handset` command: up in one process, everything else from others or at its prompt."""

import json
import os
import select
import signal
import stat
import subprocess
import time
from pathlib import Path
from typing import Callable

import pytest

from amt_simulator.running import find
from amt_station import wire
from support.command import COMMAND, PATIENCE, PROJECT, handset, output
from support.modem_desk import OK

pytestmark = pytest.mark.usefixtures("base")


def talk(port: str, data: bytes, until: bytes) -> bytes:
    """Write DATA to a port as any program does, read up to UNTIL."""
    fd = os.open(port, os.O_RDWR | os.O_NOCTTY)
    try:
        os.write(fd, data)
        said = b""
        while until not in said:
            assert select.select([fd], [], [], PATIENCE)[0], said
            said += os.read(fd, 4096)
        return said
    finally:
        os.close(fd)


def wait_for(condition: Callable[[], bool]) -> None:
    """Wait until something is so."""
    end = time.monotonic() + PATIENCE
    while not condition():
        assert time.monotonic() < end
        time.sleep(0.05)


def test_a_whole_visit(up, tmp_path: Path) -> None:
    """A person's way: up, talk, look, steer, down."""
    process = up("--screen", "120x90", "--property", "a.b=c", "--config", "vx.mode.file=/amt/m",
                 "--answer", "ldt_btCtrl=-1", "--answer", "ldt_btCtrl=0", "--card", "2M",
                 "--modem-answer", "AT+CSQ", r"\r\nweak\r\n\r\nOK\r\n")
    status = json.loads(output("status", "--json"))
    for name in ("pc", "app", "log", "files"):
        assert status[name] in process.introduction
    assert talk(status["pc"], b"AT^DMSN\r", OK) == b"\r\n^DMSN: KEL0000000000001\r\n" + OK
    assert talk(status["pc"], b"AT+CSQ\r", OK) == b"\r\nweak\r\n" + OK
    assert talk(status["pc"], b"AT^DBTCTRL=1\r", b"ERROR\r\n") == b"\r\nERROR\r\n"
    assert talk(status["pc"], b"AT^DBTCTRL=1\r", OK) == OK
    assert "ldt_btCtrl(1) = -1\nldt_btCtrl(1) = 0\n" in output("calls")
    assert "amt_handle_init()" in output("log")
    assert " /system/etc/vx-kel-amt.cfg\n" in output("files")
    assert "vx.mode.file = /amt/m\n" in output("show", "/system/etc/vx-kel-amt.cfg")
    assert output("get", "a.b") == "c\n"
    output("set", "a.b", "d")
    assert output("get", "a.b") == "d\n"
    assert output("show", "usb") == "CONFIGURED\n"
    target = tmp_path / "screen.png"
    assert output("screen", str(target)) == f"{target}\n"
    assert target.read_bytes().startswith(b"\x89PNG")
    output("answer", "ldt_wifiCheck", "-1")
    assert talk(status["pc"], b"AT^DDEVCONNCHK=0\r", b"ERROR\r\n") == b"\r\nERROR\r\n"
    output("modem", "answer", "AT", "none")
    output("modem", "say", r"\r\n^RING\x21\r\n")
    assert talk(status["pc"], b"ATI\r", OK).startswith(b"\r\n^RING!\r\n")
    output("card", "none")
    output("down")
    assert process.wait(PATIENCE) == 0
    assert not Path(status["directory"]).exists()


def test_usb_and_restart(up) -> None:
    """Unplugging ends the service, init starts it again, the port stays and works."""
    up()
    status = json.loads(output("status", "--json"))
    assert talk(status["pc"], b"AT\r", OK) == OK
    output("unplug")
    assert output("show", "usb") == "DISCONNECTED\n"
    wait_for(lambda: json.loads(output("status", "--json"))["daemon_exits"] == [0])
    output("plug")
    output("configure")
    assert output("show", "usb") == "CONFIGURED\n"
    assert talk(status["pc"], b"AT\r", OK) == OK


def test_the_port_goes_with_the_cable(up) -> None:
    """A program that holds it sees the hang-up; plugged in, it is there again under its name."""
    up()
    up_handset = find(None)
    status = json.loads(output("status", "--json"))
    for number, again in enumerate(("plug", "configure")):
        assert talk(status["pc"], b"AT\r", OK) == OK
        held = os.open(status["pc"], os.O_RDWR | os.O_NOCTTY)
        output("unplug")
        assert not os.path.lexists(status["pc"])
        poller = select.poll()
        poller.register(held, 0)
        assert poller.poll(PATIENCE * 1000)[0][1] & select.POLLHUP
        with pytest.raises(OSError):
            os.write(held, b"AT\r")
        os.close(held)
        output(again)
        # The daemon that the unplugging ends may still take a text, and take it along.
        assert up_handset.wait_exit(number) == 0
        assert talk(status["pc"], b"AT\r", OK) == OK
        # What is plugged in already stays as it is.
        before = os.readlink(status["pc"])
        output("configure")
        assert os.readlink(status["pc"]) == before


def test_the_packet_path_has_the_port_of_the_app_only(up) -> None:
    """The station's one comes with the cable."""
    process = up("--path", "packet")
    assert "app's port" in process.introduction
    assert "station's port" not in process.introduction
    status = json.loads(output("status", "--json"))
    assert "app" in status and "pc" not in status
    assert not os.path.lexists(f"{status['directory']}/pc")
    output("plug")
    assert stat.S_ISCHR(os.stat(f"{status['directory']}/pc").st_mode)


def test_who_writes_to_a_handset_that_does_not_read_waits(up) -> None:
    """As at a real port; and what the modem is to say has a bound."""
    up("--no-start", "--modem", "silent")
    status = json.loads(output("status", "--json"))
    fd = os.open(status["pc"], os.O_RDWR | os.O_NOCTTY | os.O_NONBLOCK)
    written = 0
    while select.select([], [fd], [], 2)[1]:
        written += os.write(fd, b"x" * 1000)
        assert written < 1 << 20
    os.close(fd)
    for _ in range(8):
        done = handset("modem", "say", "x" * 30000)
    assert done.returncode == 1
    assert done.stderr.startswith("amt-handset: nobody reads modem: ")
    assert done.stderr.endswith(" bytes are waiting already\n")


def test_modem_hangs_up_and_comes_back(up) -> None:
    """While it is away nothing answers."""
    up("--path", "packet")
    status = json.loads(output("status", "--json"))
    request = wire.Packet(85).encode()
    board = b"KEL0000000000001"
    assert board in talk(status["app"], request, board)
    output("modem", "hangup")
    output("modem", "back")
    assert board in talk(status["app"], request, board)


def test_the_app_port_follows_its_programs(up) -> None:
    """A program that closes the port is an app that ends; the next one is served."""
    up("--path", "packet")
    status = json.loads(output("status", "--json"))
    for visits in range(1, 6):
        assert talk(status["app"], wire.Packet(29).encode(), b"\x1e")
        # A port that is closed and opened within a moment may look as if it had stayed open.
        wait_for(lambda: output("log").count("pty disconnect: pts name") == visits)


def test_a_person_speaks_as_the_modem(up) -> None:
    """A held modem's ttys are ports too."""
    up("--modem", "held")
    status = json.loads(output("status", "--json"))
    pc = os.open(status["pc"], os.O_RDWR | os.O_NOCTTY)
    os.write(pc, b"ATX\r")
    assert talk(status["modem"], b"hello", b"ATX\r") == b"ATX\r"
    assert select.select([pc], [], [], PATIENCE)[0] and os.read(pc, 100) == b"hello"
    os.close(pc)


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM, signal.SIGHUP])
def test_signals_take_it_down(up, base: Path, number: int) -> None:
    """Ctrl-C and its relatives clean up everything; that is no failure."""
    process = up()
    process.send_signal(number)
    assert process.wait(PATIENCE) == 0
    assert list(base.iterdir()) == []


def test_power_off_is_told(up, base: Path) -> None:
    """The launcher ends too and says why."""
    process = up()
    status = json.loads(output("status", "--json"))
    assert talk(status["pc"], b"AT^DAMTOFF\r", OK) == OK
    assert process.wait(PATIENCE) == 0
    assert "the handset has been powered off" in process.stderr.read()
    assert list(base.iterdir()) == []


def test_following_the_log(up) -> None:
    """It shows what comes, and ends with the handset."""
    up()
    follower = subprocess.Popen([*COMMAND, "log", "-f"], cwd=PROJECT, text=True,
                                stdout=subprocess.PIPE)
    assert follower.stdout is not None
    for line in follower.stdout:
        if "read_modem_loop, read ready" in line:
            break
    last = output("log", "-n", "2").splitlines()
    assert last == output("log").splitlines()[-2:] and len(last) == 2
    assert output("log", "-n", "0") == ""
    output("down")
    assert follower.wait(PATIENCE) == 0
    follower.stdout.close()


@pytest.mark.parametrize("words, status, text", [
    (["status"], 3, "no handset is up"),
    (["--dir", "/nowhere", "status"], 3, "no handset is up in /nowhere"),
    (["frobnicate"], 2, "No such command"),
    (["up", "--path", "bus"], 2, "'bus' is not one of"),
    (["up", "--screen", "0x9"], 2, "'0x9' is not WIDTHxHEIGHT"),
    (["up", "--card", "big"], 2, "'big' is not SIZE|none"),
    (["up", "--property", "=x"], 2, "'=x' is not KEY=VALUE"),
    (["up", "--through", "env 'X=y"], 2, "Invalid value for '--through': \"env 'X=y\": "
     "No closing quotation"),
    (["up", "--through", "no-such-program -x"], 1, "no-such-program cannot run the daemon"),
    (["up", "--build", "nonsense"], 1, "is not there; ./dev build"),
    (["log", "-n", "-1"], 3, "no handset is up; `amt-handset up`"),
])
def test_errors_before_a_handset(words: list[str], status: int, text: str) -> None:
    """Each has its exit status and its line."""
    done = handset(*words)
    assert (done.returncode, done.stdout) == (status, "")
    assert text in done.stderr


def test_errors_with_a_handset(up) -> None:
    """What the handset refuses is told in one line."""
    up("--file", "/sys/devinfo/emmc_info", "--config", "vx.tty.at.mux")
    for words, text in (
            (["show", "/no/such"], "/no/such: No such file or directory"),
            (["show", "nothing"], "no file is called nothing"),
            (["show", "/dev/null"], "only inside the handset"),
            (["show", "/sys/devinfo/emmc_info"], "No such file"),
            (["files", "/no/such"], "/no/such is not there"),
            (["get", "no.such"], "the property no.such is not set"),
            (["set", "a/b", "c"], "'a/b' is no property name"),
            (["answer", "a b", "0"], "'a b' is no function name"),
            (["answer", "ldt_btCtr", "0"], "'ldt_btCtr' is no function name; the stand-ins have "
                                           "ldt_btCtrl, "),
            (["modem", "say", "x", "--line", "mux"], "no such line: mux"),
            (["screen", "/no/such/dir.png"], "cannot save the screen"),
            (["screen", "/tmp/picture.unknown"], "cannot save the screen")):
        done = handset(*words)
        assert (done.returncode, done.stdout) == (1, ""), words
        assert text in done.stderr and done.stderr.count("\n") == 1, done.stderr
        assert done.stderr.startswith("amt-handset: ")


def test_through_another_program(up) -> None:
    """The words are quoted as for a shell."""
    up("--through", "env 'X=a b'")
    told = output("show", "init")
    assert "daemon: /usr/bin/env X=a b /system/bin/vx-kel-amt\n" in told


def test_several_handsets(up) -> None:
    """Then one is chosen by its directory."""
    up("--no-start")
    directory = json.loads(output("status", "--json"))["directory"]
    up("--no-start", "--path", "packet")
    done = handset("status")
    assert done.returncode == 3 and "choose one with --dir" in done.stderr
    assert json.loads(output("--dir", directory, "status", "--json"))["path"] == "pc"


def test_what_is_kept(up) -> None:
    """On request the directory stays, and is told."""
    process = up("--keep", "--no-start")
    process.send_signal(signal.SIGINT)
    assert process.wait(PATIENCE) == 0
    told = process.stderr.read()
    directory = Path(told.partition("kept: ")[2].splitlines()[0])
    assert (directory / "state" / "init.json").exists()


@pytest.mark.parametrize("path", ["pc", "packet", "simplified", "usb-inserted"])
def test_every_path_serves(up, path: str) -> None:
    """The station is answered on three of them, the app on the fourth."""
    up("--path", path)
    status = json.loads(output("status", "--json"))
    assert status["path"] == path
    if path == "packet":
        assert talk(status["app"], wire.Packet(29).encode(), b"\x1e")
    else:
        assert talk(status["pc"], b"ATI\r", OK).endswith(OK)
