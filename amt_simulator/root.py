"""The handset's root file system: what lies where when it comes up."""

import os
from pathlib import Path
from typing import Mapping, Sequence

from amt_simulator.errors import HandsetError
from amt_simulator.tree import PROC_DRIVER, ROOT, STATE, host_path, place

DIRECTORIES = (
    "amt", "data/etc", "data/local", "data/misc/wifi", "data/orla/current", "dev", "etc",
    "handset", "mnt/opl/nvm", "proc", "run/handset", "storage/sdcard0", "storage/sdcard1",
    "sys/class/android_usb/android0", "sys/class/leds/button-backlight",
    "sys/class/leds/lcd-backlight", "sys/class/power_supply/ac", "sys/class/power_supply/battery",
    "sys/class/timed_output/vibrator", "sys/devinfo", "sys/sarvo", "system/bin",
    "system/etc/wifi", "system/lib/hw", "system/media/audio/amt", "tmp", "usr",
)

LINKS = {"bin": "usr/bin", "sbin": "usr/sbin", "lib": "usr/lib", "lib64": "usr/lib64"}

# The ordinary content of a handset's files. What a driver gives ends in a line feed.
FILES: dict[str, str | bytes] = {
    "/etc/passwd": "root:x:0:0:root:/:/bin/sh\nsystem:x:1000:1000:system:/:/bin/sh\n",
    "/etc/group": "root:x:0:\nsystem:x:1000:\nradio:x:1001:\n",
    "/etc/nsswitch.conf": "passwd: files\ngroup: files\n",
    "/sys/class/leds/button-backlight/brightness": "0\n",
    "/sys/class/leds/lcd-backlight/brightness": "128\n",
    "/sys/class/power_supply/ac/online": "0\n",
    "/sys/class/power_supply/battery/temp": "315\n",
    "/sys/class/power_supply/battery/voltage_now": "3987000\n",
    "/sys/class/timed_output/vibrator/enable": "0\n",
    "/sys/devinfo/emmc_info": "HW8G-0031 7456 MiB rev 5\n",
    "/sys/sarvo/board_info": "KEL board rev C\n",
    "/data/orla/current/cust.prop": "ro.carrier.code=001\nro.carrier.name=Freenet\n",
    "/system/etc/wifi/nvram.txt":
        "# calibration of the radio\nmanfid=0x2d0\nprodid=0x492\nvendid=0x14e4\ndevid=0x4343\n"
        "boardtype=0x0598\nboardrev=0x1307\nmacaddr=00:90:4c:c5:12:38\nccode=ALL\nregrev=0\n",
}

# A sound file without a sound.
SILENCE = (b"RIFF\x24\0\0\0WAVEfmt \x10\0\0\0\1\0\1\0\x44\xac\0\0\x88\x58\1\0\2\0\x10\0"
           b"data\0\0\0\0")

PROPERTIES = {
    "ro.build.customer": "KELCO",
    "ro.product.manufacturer": "Kelco",
    "ro.build.display.id": "KEL-1_4.2.1",
    "ro.build.version.incremental": "1.0.17",
    "ro.build.factory.id": "F01",
    "sys.usb.config": "serial,adb",
}

# What the stand-ins can be told to answer: functions of libraries, requests to drivers, programs.
STAND_INS = (
    "ldt_btCtrl", "ldt_btCheck", "ldt_wifiCtrl", "ldt_wifiCheck", "ldt_TxTest", "ldt_RxTest",
    "ldt_gpsCtrl", "ldt_gpsCheck",
    "create_devinfo", "enter_idle", "amt_usb_charger_enable", "amt_check_system_sanity",
    "codec_loop_test", "property_set",
    "FBIOGET_FSCREENINFO", "FBIOGET_VSCREENINFO", "FBIOPUT_VSCREENINFO", "SARVOFB_IOCTL_EN_LAYER",
    "SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT", "KDSETMODE", "VIDIOC_S_INPUT",
    "SARVOCAM_IOCTL_PREVIEW", "SARVOCAM_IOCTL_SELF_TEST", "sarvo_battery",
    "amt-audio", "sync",
)

# Device nodes of the handset, and the plain files that stand for them.
DEVICE_FILES = {
    "/dev/graphics/fb0": "/handset/devices/fb0",
    "/dev/tty0": "/handset/devices/tty0",
    "/dev/video0": "/handset/devices/video0",
}
SCREEN_BYTES_A_PIXEL = 4


def build_root(directory: Path) -> None:
    """Make the root with everything that does not depend on how the handset is started."""
    root = directory / ROOT
    for name in DIRECTORIES:
        (root / name).mkdir(parents=True, exist_ok=True)
    for name, target in LINKS.items():
        (root / name).symlink_to(target)
    for name in ("properties", "answers", "devices", "run"):
        (directory / STATE / name).mkdir(parents=True)
    (directory / PROC_DRIVER).mkdir()
    for inside, content in FILES.items():
        place(directory, inside, content)
    (root / "tmp").chmod(0o1777)


def build_devices(directory: Path, width: int, height: int) -> None:
    """Make the files that stand for device nodes, and the state of the screen before its use."""
    line = width * SCREEN_BYTES_A_PIXEL
    state = {"xres": width, "yres": height, "xres_virtual": width, "yres_virtual": 2 * height,
             "xoffset": 0, "yoffset": 0, "bits_per_pixel": 32, "line_length": line,
             "smem_len": 0, "layer_enabled": 1, "layer_format": 0}
    place(directory, "/handset/devices/framebuffer",
          "".join(f"{key} = {value}\n" for key, value in state.items()))
    for name in DEVICE_FILES.values():
        place(directory, name, b"")
    os.truncate(host_path(directory, DEVICE_FILES["/dev/graphics/fb0"]), 2 * height * line)
    place(directory, "/proc/driver/sarvo_battery", b"")


def write_properties(directory: Path, properties: Mapping[str, str | None]) -> None:
    """Set system properties; None takes one away."""
    for name, value in properties.items():
        if not name or "/" in name or name.startswith("."):
            raise HandsetError(f"{name!r} is no property name")
        place(directory, f"/handset/properties/{name}", value)


def write_answers(directory: Path, answers: Mapping[str, "str | Sequence[str] | None"]) -> None:
    """Script what stand-in functions answer: a line, or a list of lines, for a function."""
    for function, lines in answers.items():
        if function not in STAND_INS:
            raise HandsetError(f"{function!r} is no function name; the stand-ins have "
                               f"{', '.join(STAND_INS)}")
        if isinstance(lines, str):
            lines = [lines]
        place(directory, f"/handset/answers/{function}",
              None if lines is None else "".join(f"{line}\n" for line in lines))
