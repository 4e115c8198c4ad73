"""The sandbox of the handset: what is in it, what it cannot reach, how it ends."""

import os
import re
from pathlib import Path

import pytest

from amt_simulator import Handset, HandsetError, HandsetTimeout
from amt_simulator.root import STAND_INS
from amt_simulator.waiting import scaled

SHELL = "/bin/sh"
FAKE_DAEMON = Path(__file__).with_name("support") / "fake_daemon.py"
PLATFORM = Path(__file__).resolve().parents[2] / "platform"
DEVICE_MODES = {name: os.stat(f"/dev/{name}").st_mode for name in ("null", "zero", "tty")}


def output(handset: Handset, script: str) -> str:
    """What a shell script prints in the handset."""
    return handset.run([SHELL, "-c", script]).stdout.decode()


def test_the_daemon_sees_its_real_paths(fake: Handset) -> None:
    """Working directory, user and program are those of a handset."""
    info = fake.inspect()
    assert info.command[-1] == "/system/bin/vx-kel-amt"
    assert output(fake, "pwd; id -u; hostname").split() == ["/", "0", "handset"]
    assert output(fake, "readlink /dev/ptmx").strip() == "pts/ptmx"


@pytest.mark.parametrize("path, program, config", [
    ("pc", "/system/bin/vx-kel-amt", "/system/etc/vx-kel-amt.cfg"),
    ("simplified", "/data/local/vx-kel-amt", "/data/local/vx-kel-amt.cfg"),
    ("usb-inserted", "/system/bin/vx-kel-amt", "/system/etc/vx-kel-amt.cfg"),
])
def test_paths(make_fake, path: str, program: str, config: str) -> None:
    """Each path has its program and its configuration where the daemon looks for them."""
    handset = make_fake(path, config={"vx.tty.pc": "/dev/ttyGS0", "x.y": "z"})
    argv = handset.inspect().command[1:]
    assert argv == [program] + (["-u"] if path == "usb-inserted" else [])
    assert "vx.tty.pc = /dev/ttyGS0\n" in handset.text(config)
    assert handset.text(config).endswith("x.y = z\n")


def test_options_place_and_remove(make_fake) -> None:
    """Files, properties, answers and settings are in place when the daemon starts."""
    handset = make_fake(
        files={"/amt/imei.txt": "123", "/amt/tool": (b"\0\1", 0o755),
               "/sys/devinfo/emmc_info": None, "/data/copy": Path(__file__)},
        properties={"a.b": "c", "ro.build.display.id": None},
        answers={"ldt_btCtrl": ["-1", "0"], "enter_idle": "3"},
        config={"vx.mode.file": None})
    assert output(handset, "cat /amt/imei.txt") == "123"
    assert output(handset, "stat -c %a /amt/tool").strip() == "755"
    assert handset.run(["/usr/bin/test", "-e", "/sys/devinfo/emmc_info"]).status == 1
    assert handset.read("/data/copy") == Path(__file__).read_bytes()
    assert handset.get_property("a.b") == "c"
    assert handset.get_property("ro.build.display.id") is None
    assert handset.text("/handset/answers/ldt_btCtrl") == "-1\n0\n"
    assert handset.text("/handset/answers/enter_idle") == "3\n"
    assert "vx.mode.file" not in handset.text("/system/etc/vx-kel-amt.cfg")


def test_nothing_of_the_pc_can_be_written(fake: Handset, tmp_path: Path) -> None:
    """Neither programs, nor the kernel's settings, nor device nodes change."""
    tried = fake.run([SHELL, "-c", f"""
        touch /usr/x && echo usr
        echo 1 > /proc/sys/kernel/printk && echo sysctl
        chmod 600 /dev/null /dev/zero /dev/tty && echo devices
        touch {tmp_path}/x && echo outside
        echo > /system/bin/vx-kel-amt && echo daemon
        touch /run/handset/x && echo modules
        true"""])
    assert (tried.status, tried.stdout) == (0, b"")
    for name, mode in DEVICE_MODES.items():
        assert os.stat(f"/dev/{name}").st_mode == mode


def test_the_network_and_the_processes_are_private(fake: Handset) -> None:
    """There is no network but an own one, and no process but the handset's."""
    assert output(fake, "cat /proc/net/dev").count(":") == 1
    processes = fake.processes()
    assert 1 in processes and fake.pid in processes
    assert len(processes) == 2


def test_no_real_time_priority(fake: Handset) -> None:
    """A daemon that asks for real-time scheduling does not get it."""
    assert fake.run(["/usr/bin/chrt", "-f", "95", "/bin/true"]).status == 1


def test_the_card_is_a_real_file_system(make_fake) -> None:
    """Its size is what was asked for; it can be taken out and put in."""
    handset = make_fake(card=8 << 20)
    figures = "df --output=size,target /storage/sdcard1 | tail -1"
    assert output(handset, figures).split() == ["8192", "/storage/sdcard1"]
    handset.set_card(None)
    assert "/storage/sdcard1" not in output(handset, "cat /proc/mounts")
    handset.set_card(1 << 20)
    assert output(handset, figures).split() == ["1024", "/storage/sdcard1"]
    without = make_fake(card=None)
    assert "/storage/sdcard1" not in output(without, "cat /proc/mounts")


def test_power_off_ends_the_handset(fake: Handset) -> None:
    """The real system call ends the sandbox, and the launcher can tell it from other ends."""
    assert fake.is_up and not fake.powered_off
    fake.pc.write(b"!off")
    fake.wait_power_off()
    assert fake.powered_off and not fake.is_up
    with pytest.raises(HandsetError, match="not up"):
        fake.start()


def test_a_shutdown_is_no_power_off(fake: Handset) -> None:
    """Only the system call counts as power-off."""
    fake.client.ask("shutdown")
    with pytest.raises(HandsetError, match="not by power-off"):
        fake.wait_power_off()


def test_it_costs_little() -> None:
    """Coming up and going down, in processor time; what takes time is the daemon's own pause."""
    with Handset(build=None, daemon=FAKE_DAEMON):
        pass
    before = os.times()
    for _ in range(3):
        with Handset(build=None, daemon=FAKE_DAEMON):
            pass
    spent = [sum(times[:4]) for times in (before, os.times())]
    assert (spent[1] - spent[0]) / 3 < scaled(1.0)


def test_files_of_the_kernel_are_out_of_reach(fake: Handset) -> None:
    """A path that exists only inside is refused with a reason, not looked up on the PC."""
    for inside in ("/proc/1/status", "/dev/null", "/storage/sdcard1/x", "/usr/bin/env"):
        with pytest.raises(HandsetError, match="only inside"):
            fake.path(inside)
    with pytest.raises(HandsetError, match="begins with /"):
        fake.path("amt/imei.txt")
    assert fake.path("/proc/driver/sarvo_battery").exists()


@pytest.mark.parametrize("options, text", [
    ({"path": "nowhere"}, "no such path: nowhere"),
    ({"modem": "drunk"}, "no such modem mode: drunk"),
    ({"build": "nonsense"}, "is not there; ./dev build"),
])
def test_bad_options_are_told(options: dict, text: str) -> None:
    """What cannot be made is refused with a clear line before anything is made."""
    with pytest.raises(HandsetError, match=text):
        Handset(**options)


@pytest.mark.parametrize("message, text", [
    ("bwrap: No permissions to create a new namespace, likely because the kernel does not allow "
     "non-privileged user namespaces.", "does not let .* make user namespaces"),
    ("bwrap: setting up uid map: Permission denied", "does not let .* make user namespaces"),
    ("bwrap: Can't mount proc on /newroot/proc: Operation not permitted", "in a container"),
    ("bwrap: Can't find source path /x: No such file or directory", "Can't find source path /x"),
])
def test_a_system_without_namespaces_is_told(make_fake, tmp_path: Path, message: str, text: str,
                                             monkeypatch: pytest.MonkeyPatch) -> None:
    """One clear line says what is missing."""
    stub = tmp_path / "bwrap"
    stub.write_text(f'#!/bin/sh\necho "{message}" >&2\nexit 1\n')
    stub.chmod(0o755)
    monkeypatch.setenv("PATH", f"{tmp_path}:{os.environ['PATH']}")
    with pytest.raises(HandsetError, match=text) as caught:
        make_fake()
    assert "\n" not in str(caught.value)


def test_the_names_of_the_stand_ins_are_theirs() -> None:
    """What can be scripted is what their sources ask an answer for, no more and no less."""
    host = PLATFORM / "host"
    text = "\n".join(path.read_text() for path in host.rglob("*.cpp"))
    macros = dict(re.findall(r'#define +(\w+) +"([^"]+)"', "\n".join(
        path.read_text() for path in (PLATFORM / "include").glob("*.h"))))
    asked = re.findall(r'(?:stand_in_take_answer|stand_in_answer_call|answer_number)\('
                       r'("[^"]+"|[A-Z_]+)', text)
    names = {word.strip('"') if word.startswith('"') else macros[word] for word in asked}
    names |= set(re.findall(r'\{\w+, "(\w+)", DEVICE_ARGUMENT', text))
    assert names == set(STAND_INS)


def test_a_build_that_is_not_whole(tmp_path: Path) -> None:
    """A build without one of its libraries is refused, not run into the ground."""
    (tmp_path / "bin").mkdir()
    (tmp_path / "bin" / "vx-kel-amt").touch()
    with pytest.raises(HandsetError, match="lib/liblog.so is not there; ./dev build"):
        Handset(build=tmp_path).up()


def test_a_daemon_that_does_not_start_is_told(tmp_path: Path) -> None:
    """What it printed on standard error is shown when the wait for it is in vain."""
    daemon = tmp_path / "daemon"
    daemon.write_text("#!/bin/sh\necho broken >&2\nexit 1\n")
    with Handset(build=None, daemon=daemon) as handset:
        with pytest.raises(HandsetTimeout, match=r"(?s)exit #\d+ .*: status 1.*broken"):
            handset.wait_ready(timeout=0.3)


def test_a_long_way_to_the_directory(make_fake, tmp_path: Path,
                                     monkeypatch: pytest.MonkeyPatch) -> None:
    """The directory may lie deeper than a socket's address is long."""
    monkeypatch.setenv("HANDSET_BASE", str(tmp_path / ("deep/" * 30)))
    assert make_fake().pid


def test_a_missing_bubblewrap_is_told(make_fake, tmp_path: Path,
                                      monkeypatch: pytest.MonkeyPatch) -> None:
    """And what to install."""
    monkeypatch.setenv("PATH", str(tmp_path))
    with pytest.raises(HandsetError, match="apt-get install bubblewrap"):
        make_fake()
