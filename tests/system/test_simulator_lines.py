"""The lines of the handset: raw, exact, hung up and brought back, taken and given back."""

import os
import time

import pytest

from amt_simulator import Handset, HandsetError, HandsetTimeout
from amt_simulator.line import Line

EVERY_BYTE = bytes(range(256))


def test_every_byte_passes(make_fake) -> None:
    """The lines are raw: no byte is changed, swallowed or echoed, in either direction."""
    handset = make_fake(modem="held")
    handset.pc.write(EVERY_BYTE)
    assert handset.modem.read_exactly(256) == EVERY_BYTE
    handset.modem.write(EVERY_BYTE)
    assert handset.pc.read_exactly(256) == EVERY_BYTE
    handset.pc.expect_silence(0.1)


def test_a_chunk_stays_a_chunk(make_fake) -> None:
    """What is written at once arrives at once."""
    handset = make_fake(modem="held")
    for size in (1, 22, 500, 1500):
        handset.pc.write(b"x" * size)
        assert len(handset.modem.read()) == size


def test_reading_until(make_fake) -> None:
    """What follows the pattern stays on the line."""
    handset = make_fake(modem="held")
    handset.modem.write(b"one\r\ntwo\r\nthree")
    assert handset.pc.read_until(b"\r\n") == b"one\r\n"
    assert handset.pc.read_exactly(2) == b"tw"
    assert handset.pc.read_all(0.1) == b"o\r\nthree"
    with pytest.raises(HandsetTimeout, match="got 3 bytes: b'end'"):
        handset.modem.write(b"end")
        handset.pc.read_until(b"\r\n", timeout=0.3)
    with pytest.raises(HandsetTimeout, match="nothing arrived"):
        handset.pc.read(timeout=0.05)


def test_silence_can_be_broken(make_fake) -> None:
    """An expectation of silence fails when something comes."""
    handset = make_fake(modem="held")
    handset.modem.write(b"x")
    with pytest.raises(AssertionError, match="expected silence"):
        handset.pc.expect_silence(0.5)


def test_writing_to_a_daemon_that_does_not_read(make_fake) -> None:
    """A full line is an error with a deadline, not a hang."""
    handset = make_fake(ready=False, start=False)
    start = time.monotonic()
    with pytest.raises(HandsetTimeout, match="nobody reads"):
        handset.pc.write(b"x" * 100000, timeout=0.3)
    assert time.monotonic() - start < 5


def test_hang_up_of_the_pc_line(fake: Handset) -> None:
    """The daemon gets EIO or the end of data, the name is gone; later it is back."""
    assert fake.run(["/usr/bin/test", "-e", "/dev/ttyGS0"]).status == 0
    fake.set_restart(False)
    fake.pc.open()
    fake.pc.hang_up()
    assert fake.wait_exit() in (5, 6)
    assert fake.run(["/usr/bin/test", "-e", "/dev/ttyGS0"]).status == 1
    with pytest.raises(HandsetError, match="pc is hung up"):
        fake.pc.open()
    fake.pc.come_back()
    fake.start()
    fake.wait_ready()
    fake.pc.write(b"AT\r")
    assert fake.pc.read_until(b"OK\r\n") == b"\r\nOK\r\n"


def test_hang_up_of_a_blocked_read_is_eio(make_fake) -> None:
    """A program that sits in read() on the line gets EIO, as from a real tty."""
    handset = make_fake(ready=False, start=False, modem="held")
    handset.place("/tmp/reader.py", "import os\nfd = os.open('/dev/ttyMODEM0', os.O_RDWR)\n"
                                    "open('/tmp/open', 'w').close()\n"
                                    "try:\n    os.read(fd, 1)\nexcept OSError as error:\n"
                                    "    open('/tmp/error.tmp', 'w').write(str(error.errno))\n"
                                    "    os.rename('/tmp/error.tmp', '/tmp/error')\n")
    handset.client.ask("run", argv=["/usr/bin/python3", "/tmp/reader.py"], env={}, background=True)
    handset.wait_file("/tmp/open")
    reader = next(pid for pid, command in handset.processes().items()
                  if command[-1] == "/tmp/reader.py")
    _wait_for(lambda: handset.inspect(reader).threads[reader]["waits_in"] == "wait_woken")
    handset.modem.hang_up()
    handset.wait_file("/tmp/error", "5")


def _wait_for(condition) -> None:
    end = time.monotonic() + 10
    while not condition():
        assert time.monotonic() < end
        time.sleep(0.002)


def test_a_test_takes_the_place_of_the_modem(fake: Handset) -> None:
    """It speaks as the modem while it holds the line; then the modem answers again."""
    fake.modem.open()
    fake.pc.write(b"AT\r")
    assert fake.modem.read() == b"AT\r"
    fake.modem.write(b"my answer")
    assert fake.pc.read_exactly(9) == b"my answer"
    fake.modem.close()
    fake.pc.write(b"AT\r")
    assert fake.pc.read_exactly(6) == b"\r\nOK\r\n"


@pytest.mark.parametrize("mode", ["silent", "held"])
def test_a_modem_that_says_nothing(make_fake, mode: str) -> None:
    """A silent modem hears everything; one that is held leaves it to whoever takes the line."""
    handset = make_fake(modem=mode)
    handset.pc.write(b"AT\r")
    handset.pc.expect_silence()
    if mode == "held":
        assert handset.modem.read() == b"AT\r"
        handset.modem.close()
    handset.set_modem("table")
    handset.pc.write(b"AT\r")
    assert handset.pc.read_exactly(6) == b"\r\nOK\r\n"


def test_an_absent_modem_comes(make_fake) -> None:
    """Without a modem its ttys do not exist; when it comes, it answers."""
    handset = make_fake(ready=False, start=False, modem="absent")
    assert handset.run(["/bin/ls", "/dev/ttyMODEM0", "/dev/ttyMUX0"]).status == 2
    handset.modem.come_back()
    assert handset.run(["/bin/ls", "/dev/ttyMODEM0"]).status == 0
    handset.start()
    handset.wait_ready()
    handset.pc.write(b"AT\r")
    assert handset.pc.read_exactly(6) == b"\r\nOK\r\n"


def test_coming_back_held(fake: Handset) -> None:
    """A tty can come back with the test as its modem, so that nothing is answered before."""
    fake.set_restart(False)
    fake.modem.hang_up()
    fake.wait_exit()
    fake.modem.come_back(held=True)
    fake.start()
    fake.wait_ready()
    fake.pc.write(b"AT\r")
    assert fake.modem.read() == b"AT\r"


def test_configured_names(make_fake) -> None:
    """The ttys stand where the configuration says, in a directory of their own if need be."""
    handset = make_fake(ready=False, start=False, config={
        "vx.tty.pc": "/dev/usb/serial7", "vx.tty.modem": "/dev/ttyS1", "vx.tty.at.mux": None})
    listing = handset.run(["/bin/ls", "/dev/usb/serial7", "/dev/ttyS1"])
    assert listing.status == 0
    with pytest.raises(HandsetError, match="no such line: mux"):
        handset.mux.open()


def test_unread_input_does_not_outlive_the_daemon(make_fake) -> None:
    """The next daemon does not read what the last one left, as on a tty that was closed."""
    handset = make_fake(modem="held")
    handset.pc.write(b"!exit 0")
    handset.wait_exit()
    handset.wait_ready()
    handset.pc.write(b"fresh")
    assert handset.modem.read() == b"fresh"


def test_the_app_comes_and_goes(make_fake) -> None:
    """Its close is heard by the daemon at once; its return finds the new publication."""
    handset = make_fake("packet")
    for turn in range(5):
        mark = handset.log.mark()
        handset.app.write(b"hello")
        assert handset.app.read_exactly(5) == b"hello"
        handset.app.close()
        assert handset.log.wait("app gone", after=mark).text == "app gone 5", turn


def test_the_app_waits_for_its_line(make_fake) -> None:
    """Opening ends when the line is published, also by a daemon that comes later."""
    handset = make_fake("packet", ready=False, start=False)
    with pytest.raises(HandsetTimeout, match="app line to be published"):
        handset.app.open(timeout=0.1)
    handset.start()
    handset.app.write(b"x")
    assert handset.app.read() == b"x"


def test_the_app_sees_the_daemon_go(make_fake) -> None:
    """When the daemon dies, the app reads the end; a stale link is not taken for a line."""
    handset = make_fake("packet")
    handset.app.open()
    handset.stop(9)
    assert handset.app.read() == b""
    handset.app.close()
    with pytest.raises(HandsetTimeout):
        handset.app.open(timeout=0.2)
    with pytest.raises(HandsetError, match="belongs to the daemon"):
        handset.app.hang_up()


def test_nobody_else_holds_the_lines(fake: Handset) -> None:
    """The descriptors that the daemon inherits are its standard ones; init's stay init's."""
    inherited = fake.run(["/bin/ls", "/proc/self/fd"]).stdout.split()
    assert inherited == [b"0", b"1", b"2", b"3"]


def test_a_line_is_a_descriptor(fake: Handset) -> None:
    """It works with whatever wants a descriptor, and is taken by the first use."""
    assert not fake.pc.is_open
    os.write(fake.pc.fileno(), b"AT\r")
    assert fake.pc.is_open and isinstance(fake.pc, Line)
    assert fake.pc.read_until(b"OK\r\n")
