"""The memory card's capacity (137): a real file system, or none."""

from conftest import HandsetFactory
from amt_simulator import Handset
from support.channels import AppChannel, integer
from support.handler import IS_DIRECTORY, NO_ENTRY, HandlerTrace, device_error, done
from support.trace import Wanted, error_line

CARD = 137
HANDLER = "amt_device_tf_card"
CONFIG = "/data/etc/storage.config"
FIRST, SECOND = "/storage/sdcard0", "/storage/sdcard1"
KIB = 1024


def util_error(code: int, errno: int | None = None) -> Wanted:
    """The error line of the file system's figures."""
    return error_line("pub_util_get_mount_fs_info", code, errno, source="util/util")


def figures(path: str, capacity: int) -> list[Wanted]:
    """The lines of a card at PATH."""
    return [f"{HANDLER}--->external sd card path: {path}", "pub_util_get_mount_fs_info()",
            f"external tf card capability: {capacity} KB", f"tf card capability: {capacity} KB"]


def no_card(path: str) -> list[Wanted]:
    """The lines of an empty slot at PATH."""
    return [f"{HANDLER}--->external sd card path: {path}", "pub_util_get_mount_fs_info()",
            util_error(-104), f'file system "{path}" has not been mounted',
            "tf card capability: 0 KB"]


OPENING = f"{HANDLER}--->will open storage config file: {CONFIG}"
MISSING: list[Wanted] = [
    device_error(HANDLER, -118, NO_ENTRY),
    f'Open file "{CONFIG}" fail: 2 - No such file or directory',
    f"{HANDLER}--->storage config value: 0"]


def expect_card(app: AppChannel, capacity: int, *wanted: Wanted) -> None:
    """The answer tells CAPACITY, and the lines behind the opening one are WANTED."""
    trace = HandlerTrace(app.handset)
    assert app.request(CARD) == done(CARD, integer(55, capacity))
    trace.expect_handler(HANDLER, OPENING, *wanted)


def mount(handset: Handset, path: str, size: int) -> None:
    """Put another file system of SIZE bytes into the handset."""
    mounted = handset.run(["/usr/bin/mount", "-t", "tmpfs", "-o", f"size={size}", "card",
                           path])
    assert mounted.status == 0, mounted.stderr


def test_card_sizes(app: AppChannel) -> None:
    expect_card(app, 65536, *MISSING, *figures(SECOND, 65536))
    for size in (12 * KIB, 1 << 30, 32 << 30, (1 << 41) - 4 * KIB):
        app.handset.set_card(size)
        expect_card(app, size // KIB, *MISSING, *figures(SECOND, size // KIB))
    # The figure has 32 bits, the answer's number a sign as well.
    for kib in (1 << 31, (1 << 32) - 4, (1 << 32) + 8):
        app.handset.set_card(kib * KIB)
        figure = kib & 0xFFFFFFFF
        signed = figure - (1 << 32) if figure >= 1 << 31 else figure
        expect_card(app, signed, *MISSING, *figures(SECOND, figure))
    app.handset.set_card(None)
    expect_card(app, 0, *MISSING, *no_card(SECOND))


def test_no_card(make_handset: HandsetFactory) -> None:
    app = AppChannel(make_handset("packet", card=None))
    expect_card(app, 0, *MISSING, *no_card(SECOND))
    app.send(bytes.fromhex("0600bb890000"))
    assert app.line.read_exactly(24) == bytes.fromhex(
        "1800bb8a1200" "ee37010400" "00000000" "ee01010400" "00000000")


def setting_lines(setting: int) -> list[str]:
    """The lines of a setting that was read."""
    return [f"{HANDLER}--->getted storage config value: {setting}",
            f"{HANDLER}--->storage config value: {setting}"]


def test_setting_1_takes_the_first_slot(app: AppChannel) -> None:
    ones = ("1", "1\n", " 1 first\n", "+1", "01", "4294967297")
    for content in ones:
        app.handset.place(CONFIG, content)
        expect_card(app, 0, *setting_lines(1), *no_card(FIRST))
    mount(app.handset, FIRST, 8 << 20)
    for content in ones:
        app.handset.place(CONFIG, content)
        expect_card(app, 8192, *setting_lines(1), *figures(FIRST, 8192))


def test_any_other_setting_takes_the_second_slot(app: AppChannel) -> None:
    for content, setting in (("2\n", 2), ("0", 0), ("-1", -1), ("11", 11), ("4294967298", 2),
                             ("99999999999999999999", -1)):
        app.handset.place(CONFIG, content)
        expect_card(app, 65536, *setting_lines(setting), *figures(SECOND, 65536))


def test_setting_that_cannot_be_read(app: AppChannel) -> None:
    for content, count in (("", -1), ("first 1", 0), ("-", 0)):
        app.handset.place(CONFIG, content)
        expect_card(app, 65536, device_error(HANDLER, -118, 0),
                    f"fscanf() return: {count}; 0 - Success",
                    f"{HANDLER}--->storage config value: 0", *figures(SECOND, 65536))
    app.handset.place(CONFIG, None)
    app.handset.path(CONFIG).mkdir()
    expect_card(app, 65536, device_error(HANDLER, -118, IS_DIRECTORY),
                "fscanf() return: -1; 21 - Is a directory",
                f"{HANDLER}--->storage config value: 0", *figures(SECOND, 65536))


def test_mount_whose_figures_cannot_be_had(make_handset: HandsetFactory) -> None:
    # A mount below a path that only begins like the card's counts as the card being mounted.
    app = AppChannel(make_handset("packet", card=None))
    assert app.handset.run(["/usr/bin/mkdir", f"{SECOND}-copy"]).status == 0
    mount(app.handset, f"{SECOND}-copy", 4 << 20)
    assert app.handset.run(["/usr/bin/rmdir", SECOND]).status == 0
    expect_card(app, 0, *MISSING, f"{HANDLER}--->external sd card path: {SECOND}",
                "pub_util_get_mount_fs_info()", "sys call: statfs() failed! errno = 2",
                util_error(-1, NO_ENTRY), "tf card capability: 0 KB")
