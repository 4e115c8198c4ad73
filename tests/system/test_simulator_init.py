"""The handset's init: the daemon's starts and ends, and other commands."""

import signal
import threading

import pytest

from amt_simulator import Handset, HandsetError, HandsetTimeout


def test_the_daemon_is_started_again(fake: Handset) -> None:
    """As the init file says; its exit status is on record."""
    first = fake.pid
    fake.pc.write(b"!exit 7")
    assert fake.wait_exit() == 7
    fake.wait_ready()
    assert fake.pid != first
    fake.pc.write(b"!signal 9")
    assert fake.wait_exit(1) == -9
    assert fake.exits() == [7, -9]


def test_the_usb_service_is_not_started_again(make_fake) -> None:
    """It runs once for each cable: the next one starts it."""
    handset = make_fake("usb-inserted")
    handset.pc.write(b"!exit 0")
    assert handset.wait_exit() == 0
    handset.usb.unplug()
    assert handset.pid == 0
    mark = handset.log.mark()
    handset.usb.plug()
    handset.log.wait("read_pc_loop, read ready", after=mark)
    assert handset.pid != 0


def test_restart_can_be_switched_off(make_fake) -> None:
    """Then the daemon's end is final until it is started by hand."""
    handset = make_fake(restart=False)
    handset.pc.write(b"!exit 1")
    assert handset.wait_exit() == 1
    with pytest.raises(HandsetTimeout, match="waited in vain for exit 2"):
        handset.wait_exit(1, timeout=0.7)
    assert handset.pid == 0
    assert handset.start() == handset.pid != 0


def test_a_start_can_be_put_off(make_fake) -> None:
    """The handset comes up without the daemon; nothing has run until it is started."""
    handset = make_fake(ready=False, start=False)
    assert (handset.pid, handset.stdout()) == (0, b"")
    handset.start()
    handset.wait_ready()
    assert handset.stdout().startswith(b"fake ")


def test_stop_ends_for_good(fake: Handset) -> None:
    """The daemon ends by the wanted signal and is not started again."""
    assert fake.stop(signal.SIGUSR2) == -signal.SIGUSR2
    assert fake.pid == 0


def test_a_signal_to_one_thread(fake: Handset) -> None:
    """A thread is named by its id; one that is not there is refused."""
    with pytest.raises(HandsetError, match="No such process"):
        fake.signal(signal.SIGTERM, tid=4000)
    fake.signal(signal.SIGTERM, tid=fake.pid)
    assert fake.wait_exit() == -signal.SIGTERM


def test_standard_output_is_exact(fake: Handset) -> None:
    """Every byte that the daemon prints is kept, also without a line end."""
    before = fake.stdout()
    fake.pc.write("!print a\0é\r\n ".encode())
    fake.wait_file("/handset/stdout.txt", before + "a\0é\r\n ".encode())


def test_arguments(make_fake) -> None:
    """Further arguments reach the daemon behind those of the service."""
    handset = make_fake("usb-inserted", args=["-z", "a b"])
    assert handset.inspect().command[1:] == ["/system/bin/vx-kel-amt", "-u", "-z", "a b"]


def test_through_another_program(make_fake) -> None:
    """A program with its arguments stands before the daemon's words, which stay as they are."""
    handset = make_fake("usb-inserted", args=["-z"], through=["env", "X=a b"])
    assert handset.inspect().command[1:] == ["/system/bin/vx-kel-amt", "-u", "-z"]
    environment = handset.run(["/usr/bin/cat", f"/proc/{handset.pid}/environ"]).stdout
    assert b"X=a b" in environment.split(b"\0")
    assert ": daemon: /usr/bin/env X=a b /system/bin/vx-kel-amt -u -z\n" in handset.text(
        "/handset/init.txt")


@pytest.mark.parametrize("word", ["no-such-program", "/bin", "{tmp}/own"])
def test_through_a_program_that_the_handset_has_not(make_fake, tmp_path, word: str) -> None:
    """That is refused before anything starts, also where the PC has such a program."""
    own = tmp_path / "own"
    own.write_text("#!/bin/sh\n")
    own.chmod(0o755)
    with pytest.raises(HandsetError, match="cannot run the daemon: there is no such program below "
                                           "/usr, which is all that the handset has of the PC"):
        make_fake(through=[word.format(tmp=tmp_path), "-x"])


def test_commands_run_in_the_handset(fake: Handset) -> None:
    """With their output and status; in the daemon's environment; under another name if wanted."""
    done = fake.run(["/bin/sh", "-c", "echo $VX_HOST_LOG $X; echo no >&2; exit 4"],
                    env={"X": "y"}, directory="/data")
    assert (done.status, done.stdout, done.stderr) == (4, b"/handset/log.txt y\n", b"no\n")
    assert fake.run(["/system/bin/vx-kel-amt", "-x"]).status == 9
    assert fake.run(["/bin/sh", "-c", "kill -SEGV $$"]).status == -signal.SIGSEGV
    bare = fake.run(["bare", "-c", "cat /proc/$$/cmdline"], program="/bin/sh")
    assert bare.stdout.startswith(b"bare\0")
    missing = fake.run(["/no/such/program"])
    assert (missing.status, missing.stderr) == (127, b"/no/such/program: No such file or "
                                                     b"directory\n")


def test_a_command_that_does_not_end(fake: Handset) -> None:
    """The wait for it ends, the handset goes on."""
    with pytest.raises(HandsetTimeout):
        fake.run(["/usr/bin/sleep", "60"], timeout=0.2)
    assert fake.run(["/bin/true"]).status == 0
    assert not [command for command in fake.processes().values() if "60" in command]


def test_commands_run_beside_each_other(fake: Handset) -> None:
    """A command that waits holds up neither init nor other commands."""
    done = []
    waiting = threading.Thread(target=lambda: done.append(
        fake.run(["/bin/sh", "-c", "while ! test -e /tmp/go; do sleep 0.01; done"])))
    waiting.start()
    assert fake.run(["/bin/true"]).status == 0
    fake.place("/tmp/go", "")
    waiting.join(10)
    assert [command.status for command in done] == [0]


def test_a_look_at_the_daemon(fake: Handset) -> None:
    """Threads, descriptors, children and memory are the kernel's figures."""
    info = fake.inspect()
    assert info.threads[info.pid]["state"] in "SR"
    assert set(info.descriptors.values()) >= {"/dev/null", "/handset/stdout.txt"}
    assert info.children == []
    assert info.resident_kib > 1000 and 0 < info.anonymous_kib < info.resident_kib
    assert fake.inspect(1).command[-4:-2] == ["-m", "amt_simulator.inside.supervisor"]
    fake.set_restart(False)
    fake.stop()
    with pytest.raises(HandsetError, match="does not run"):
        fake.inspect()


def test_orphans_are_reaped(fake: Handset) -> None:
    """What a command leaves behind becomes init's, and no zombie of it stays."""
    fake.run(["/bin/sh", "-c", "(sleep 0.05; echo done > /tmp/orphan) & exit 0"])
    fake.wait_file("/tmp/orphan", "done\n")
    assert fake.run(["/bin/sh", "-c", "for n in 1 2 3 4 5 6 7 8 9 10; do "
                                      "grep -l 'State:.Z' /proc/[0-9]*/status || exit 0; "
                                      "sleep 0.05; done; exit 1"]).status == 0
