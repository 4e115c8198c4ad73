"""The rule file for the ports of handsets: carried out by udev itself, where it is there."""

from __future__ import annotations

import os
import re
import shutil
import subprocess
from pathlib import Path

import pytest

from amt_station.udev import RULE_FILE, rule

TTY = "devices/pci0/usb1/1-2/1-2.3/1-2.3:1.0/tty/ttyACM0"
# An operand, an operator, and a value in quotes.
TERM = re.compile(r'([A-Z_]+(?:\{[A-Za-z_/]+\})?)(==|!=|\+=|=)"([^"]*)"')
MATCHES = {"ACTION", "SUBSYSTEM", "SUBSYSTEMS", "KERNEL", "KERNELS", "ATTRS"}
ASSIGNMENTS = {"GROUP", "MODE", "ENV", "SYMLINK", "GOTO", "LABEL"}


def plug(system: Path, vid: str, pid: str) -> None:
    """A port of a USB device, as the kernel shows it below /sys."""
    tty = system / TTY
    interface, device = tty.parents[1], tty.parents[2]
    tty.mkdir(parents=True)
    for path, what, uevent in (
            (device, "bus/usb", "DEVTYPE=usb_device\nBUSNUM=001\nDEVNUM=004\n"),
            (interface, "bus/usb", "DEVTYPE=usb_interface\nDRIVER=cdc_acm\n"),
            (tty, "class/tty", "MAJOR=166\nMINOR=0\nDEVNAME=ttyACM0\n")):
        (system / what).mkdir(parents=True, exist_ok=True)
        (path / "subsystem").symlink_to(os.path.relpath(system / what, path))
        (path / "uevent").write_text(uevent, encoding="ascii")
    (device / "idVendor").write_text(f"{vid}\n", encoding="ascii")
    (device / "idProduct").write_text(f"{pid}\n", encoding="ascii")
    (system / "class/tty/ttyACM0").symlink_to(Path("../..") / TTY)
    (system / "dev/char").mkdir(parents=True)
    (system / "dev/char/166:0").symlink_to(Path("../..") / TTY)


def tried(folder: Path, text: str) -> "subprocess.CompletedProcess[str]":
    """What udev would do with the port; nothing of this computer's own is touched."""
    (folder / "rules").mkdir()
    (folder / "none").mkdir()
    (folder / "rules" / RULE_FILE).write_text(text, encoding="ascii")
    return subprocess.run(
        ["bwrap", "--bind", "/", "/", "--dev", "/dev", "--tmpfs", "/run",
         "--bind", str(folder / "sys"), "/sys", "--bind", str(folder / "none"),
         "/usr/lib/udev/rules.d", "--bind", str(folder / "rules"), "/etc/udev/rules.d",
         "--setenv", "SYSTEMD_DEVICE_VERIFY_SYSFS", "0", "--setenv", "SYSTEMD_LOG_LEVEL", "debug",
         "udevadm", "test", "--action=add", f"/sys/{TTY}"],
        capture_output=True, text=True, timeout=300, check=False)


def needs_udev(folder: Path) -> None:
    """Skip where udev cannot be tried."""
    if shutil.which("udevadm") is None or shutil.which("bwrap") is None:
        pytest.skip("udev or bubblewrap is not here")
    if not os.path.isdir("/etc/udev/rules.d") or not os.path.isdir("/usr/lib/udev/rules.d"):
        pytest.skip("udev has no directories for rules here")
    probe = subprocess.run(["bwrap", "--bind", "/", "/", "--tmpfs", "/run", "--bind", str(folder),
                            "/sys", "true"], capture_output=True, timeout=300, check=False)
    if probe.returncode:
        pytest.skip("this machine gives no namespace of its own for /sys and /run")


@pytest.mark.parametrize("ids, is_meant", [("", True), ("1D6B:5510", True), ("1d6b:5511", False)])
def test_what_udev_does_with_a_handset(ids: str, is_meant: bool, tmp_path: Path) -> None:
    needs_udev(tmp_path)
    plug(tmp_path / "sys", "1d6b", "5510")
    result = tried(tmp_path, rule(ids))
    assert result.returncode == 0, result.stderr
    assert f"Reading rules file: /etc/udev/rules.d/{RULE_FILE}" in result.stderr
    about_rules = [line for line in result.stderr.splitlines() if RULE_FILE in line]
    assert not [line for line in about_rules if re.search("invalid|unknown|error", line, re.I)]
    properties = result.stdout.splitlines()
    assert ("DEVLINKS=/dev/amt/1-2.3:1.0" in properties) is is_meant
    assert ("ID_MM_PORT_IGNORE=1" in properties) is is_meant
    assert ("ID_MM_DEVICE_IGNORE=1" in properties) is is_meant
    assert bool([line for line in about_rules if line.endswith("MODE 0660")]) is is_meant
    assert bool([line for line in about_rules if " GROUP " in line]) is is_meant


def test_udev_finds_no_fault_in_it(tmp_path: Path) -> None:
    if shutil.which("udevadm") is None or subprocess.run(
            ["udevadm", "verify", "--help"], capture_output=True, check=False).returncode:
        pytest.skip("this udev has no `verify` yet (it came with 254)")
    path = tmp_path / RULE_FILE
    path.write_text(rule(), encoding="ascii")
    result = subprocess.run(["udevadm", "verify", "--resolve-names=never", str(path)],
                            capture_output=True, text=True, check=False)
    assert result.returncode == 0, result.stdout + result.stderr


def test_every_line_is_a_rule() -> None:
    rules = [line for line in rule().splitlines() if line and not line.startswith("#")]
    labels, jumps = [], []
    for line in rules:
        terms = [TERM.fullmatch(term.strip()) for term in re.split(r",\s*(?=[A-Z])", line)]
        for term in terms:
            assert term is not None, line
            name, operator, value = term.groups()
            bare = name.partition("{")[0]
            assert bare in (MATCHES if operator in ("==", "!=") else ASSIGNMENTS), line
            labels += [value] * (name == "LABEL")
            jumps += [value] * (name == "GOTO")
    assert set(jumps) == set(labels) and len(labels) == len(set(labels))
    # What is jumped to stands behind.
    for label in labels:
        behind = next(n for n, line in enumerate(rules) if f'LABEL="{label}"' in line)
        assert all(n < behind for n, line in enumerate(rules) if f'GOTO="{label}"' in line)


def test_ids_narrow_it() -> None:
    narrow = rule("1D6B:5510")
    assert 'ATTRS{idVendor}=="1d6b", ATTRS{idProduct}=="5510"' in narrow
    assert '"?*"' in rule() and '"?*"' not in narrow
