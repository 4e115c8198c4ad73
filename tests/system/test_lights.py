"""The LCD's brightness (57), the button backlight (37) and the vibrator (35)."""

import pytest

from support.channels import AppChannel, flag, integer, raw
from support.handler import (IS_DIRECTORY, NO_ENTRY, NO_SPACE, HandlerTrace, device_error, done,
                             refused)
from support.trace import Wanted

LCD, LCD_HANDLER = 57, "amt_device_lcd_brightness"
LCD_FILE = "/sys/class/leds/lcd-backlight/brightness"
SHOW_LCD = 29
DEFAULT_LEVEL = 200

BUTTON, BUTTON_HANDLER = 37, "amt_device_button_backlight"
BUTTON_FILE = "/sys/class/leds/button-backlight/brightness"

VIBRATOR, VIBRATOR_HANDLER = 35, "amt_device_vibrator"
VIBRATOR_FILE = "/sys/class/timed_output/vibrator/enable"
SWITCH = 15


def levels(requested: int, before: int) -> list[str]:
    """The two lines of a brightness request."""
    return [f"{LCD_HANDLER} lcd_brightness: {requested}",
            f"{LCD_HANDLER} src_lcd_brightness: {before}"]


def open_failure(handler: str, path: str, errno: int, text: str) -> list[Wanted]:
    """The lines of a file that cannot be opened."""
    return [device_error(handler, -118, errno), f'Open file "{path}" fail: {errno} - {text}']


def full_write(handler: str) -> list[Wanted]:
    """The lines of a number that finds no room."""
    return [device_error(handler, -118, NO_SPACE),
            "fprintf() return: -1; 28 - No space left on device"]


# brightness


def set_level(app: AppChannel, level: int, before: int, written: int) -> None:
    """Ask for LEVEL when the first level was BEFORE; WRITTEN is then in the file."""
    trace = HandlerTrace(app.handset)
    assert app.request(LCD, integer(26, level)) == done(LCD)
    trace.expect_handler(LCD_HANDLER, *levels(level, before))
    assert app.handset.text(LCD_FILE) == str(written)


def test_brightness_restores_the_first_level(app: AppChannel) -> None:
    app.handset.place(LCD_FILE, "128\n")
    for level in (10, 0, 255, 1):
        set_level(app, level, before=128, written=level)
    # Compared as unsigned: everything below 0 lies above 255.
    for level in (256, -1, 0x7FFFFFFF, -0x80000000, 257):
        app.handset.place(LCD_FILE, "77\n")
        set_level(app, level, before=128, written=128)
    # The level is read once, whatever the file holds later.
    assert app.request(LCD) == done(LCD), "an absent level is 0"
    assert app.handset.text(LCD_FILE) == "0"
    set_level(app, 256, before=128, written=128)


@pytest.mark.parametrize("content, before, written", [
    ("0", 0, 0), ("255 of 255\n", 255, 255), ("256\n", 256, DEFAULT_LEVEL),
    ("1000", 1000, DEFAULT_LEVEL), ("4294967301", 5, 5)])
def test_brightness_restores_only_a_level(app: AppChannel, content: str, before: int,
                                          written: int) -> None:
    app.handset.place(LCD_FILE, content)
    set_level(app, 256, before, written)
    app.handset.place(LCD_FILE, "33")
    set_level(app, -1, before, written)


def test_brightness_that_was_never_read(app: AppChannel) -> None:
    for content, count in (("", -1), ("dark", 0), ("", -1)):
        app.handset.place(LCD_FILE, content)
        trace = HandlerTrace(app.handset)
        assert app.request(LCD, integer(26, 256)) == done(LCD)
        trace.expect_handler(LCD_HANDLER, device_error(LCD_HANDLER, -118, 0),
                             f"fscanf() return: {count}; 0 - Success", *levels(256, -1))
        assert app.handset.text(LCD_FILE) == str(DEFAULT_LEVEL)
    # A level below 0 is none; the next request reads again.
    app.handset.place(LCD_FILE, "-7")
    set_level(app, -1, before=-7, written=DEFAULT_LEVEL)
    app.handset.place(LCD_FILE, "99")
    set_level(app, 20, before=99, written=20)
    set_level(app, 256, before=99, written=99)


def test_brightness_file_appears_with_the_first_level(app: AppChannel) -> None:
    app.handset.place(LCD_FILE, None)
    trace = HandlerTrace(app.handset)
    assert app.request(LCD, integer(26, 40)) == done(LCD)
    trace.expect_handler(
        LCD_HANDLER, *open_failure(LCD_HANDLER, LCD_FILE, NO_ENTRY, "No such file or directory"),
        *levels(40, -1))
    set_level(app, 256, before=40, written=40)


def silent(app: AppChannel, *wanted: Wanted) -> None:
    """A brightness request is not answered at all; the lines are WANTED; the next one is."""
    trace = HandlerTrace(app.handset)
    app.send_packet(LCD, integer(26, 50))
    app.expect_silence(0.15)
    assert app.request(SHOW_LCD) == done(SHOW_LCD)
    trace.expect_handler(LCD_HANDLER, *wanted)


def test_brightness_that_cannot_be_written_is_silent(app: AppChannel) -> None:
    app.handset.place(LCD_FILE, None)
    app.handset.path(LCD_FILE).parent.rmdir()
    missing = open_failure(LCD_HANDLER, LCD_FILE, NO_ENTRY, "No such file or directory")
    silent(app, *missing, *levels(50, -1), *missing)

    app.handset.path(LCD_FILE).mkdir(parents=True)
    silent(app, device_error(LCD_HANDLER, -118, IS_DIRECTORY),
           "fscanf() return: -1; 21 - Is a directory", *levels(50, -1),
           *open_failure(LCD_HANDLER, LCD_FILE, IS_DIRECTORY, "Is a directory"))

    app.handset.place(LCD_FILE, "60")
    set_level(app, 61, before=60, written=61)
    app.handset.place(LCD_FILE, None)
    app.handset.path(LCD_FILE).symlink_to("/dev/full")
    silent(app, *levels(50, 60), *full_write(LCD_HANDLER))


# switches


def test_button_backlight(app: AppChannel) -> None:
    # The value replaces the low bytes of a 1.
    for atoms, value, word in (
            ((), 1, "open"), ((flag(SWITCH, 0),), 0, "close"), ((flag(SWITCH, 1),), 1, "open"),
            ((flag(SWITCH, 2),), 2, "close"), ((flag(SWITCH, 255),), 255, "close"),
            ((integer(SWITCH, 100000),), 100000, "close"), ((integer(SWITCH, -1),), -1, "close"),
            ((raw(SWITCH, b""),), 1, "open"), ((raw(SWITCH, b"\x02\x01"),), 258, "close")):
        trace = HandlerTrace(app.handset)
        assert app.request(BUTTON, *atoms) == done(BUTTON)
        assert app.handset.text(BUTTON_FILE) == str(value)
        trace.expect_handler(BUTTON_HANDLER, f"{word} button backlight")


def test_vibrator(app: AppChannel) -> None:
    for atoms, value, word in (
            ((), 3000, "start"), ((flag(SWITCH, 0),), 0, "stop"),
            ((flag(SWITCH, 1),), 3000, "start"), ((flag(SWITCH, 2),), 3000, "stop"),
            ((integer(SWITCH, -1),), 3000, "stop"), ((integer(SWITCH, 0x100),), 3000, "stop"),
            ((raw(SWITCH, b"\0\0\0"),), 0, "stop")):
        trace = HandlerTrace(app.handset)
        assert app.request(VIBRATOR, *atoms) == done(VIBRATOR)
        assert app.handset.text(VIBRATOR_FILE) == str(value)
        trace.expect_handler(VIBRATOR_HANDLER, f"{word} vibrator")


@pytest.mark.parametrize("command, handler, path", [
    (BUTTON, BUTTON_HANDLER, BUTTON_FILE), (VIBRATOR, VIBRATOR_HANDLER, VIBRATOR_FILE)])
@pytest.mark.parametrize("state", [0, 1])
def test_switch_that_cannot_be_written(app: AppChannel, command: int, handler: str, path: str,
                                       state: int) -> None:
    handset = app.handset

    handset.place(path, None)
    handset.path(path).mkdir()
    trace = HandlerTrace(handset)
    refused(app, command, flag(SWITCH, state))
    trace.expect_handler(handler, *open_failure(handler, path, IS_DIRECTORY, "Is a directory"))

    handset.place(path, None)
    handset.path(path).symlink_to("/dev/full")
    trace = HandlerTrace(handset)
    refused(app, command, flag(SWITCH, state))
    trace.expect_handler(handler, *full_write(handler))

    handset.place(path, None)
    handset.path(path).parent.rmdir()
    trace = HandlerTrace(handset)
    refused(app, command, flag(SWITCH, state))
    trace.expect_handler(handler, *open_failure(handler, path, NO_ENTRY,
                                                "No such file or directory"))
