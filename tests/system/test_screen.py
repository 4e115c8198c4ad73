"""The display: its acknowledged request (29), and the picture that a handshake puts on the screen.

The picture comes 3 seconds after the handshake. Handsets that differ in one thing wait for it
together.
"""

import signal
import time
from functools import cache
from pathlib import Path
from typing import Any, Mapping

import pytest
from PIL import Image

from conftest import HandsetFactory
from amt_simulator import Handset, screen
from amt_simulator.waiting import scaled, wait_until
from support.channels import AppChannel, PcChannel, integer, packet
from support.handler import HandlerTrace, done
from support.moments import Patience
from test_handshake import shake_hands

SHOW_LCD, SHOW_HANDLER = 29, "amt_device_lcd_color"

IMAGE = (Path(__file__).resolve().parents[2] / "amt" / "amt-device" / "embed"
         / "handshake-picture.png")
WIDTH, HEIGHT = 346, 390
PAUSE = 3.0
PATTERN = b"\xa5"

CONSOLE = "ioctl(tty0, KDSETMODE, 1) = "
FIXED, VARIABLE = "ioctl(fb0, FBIOGET_FSCREENINFO) = ", "ioctl(fb0, FBIOGET_VSCREENINFO) = "
LAYER_OFF, LAYER_ON = (f"ioctl(fb0, SARVOFB_IOCTL_EN_LAYER, {state}) = " for state in (0, 1))
FORMAT = "ioctl(fb0, SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, 1) = "
PREPARED = [CONSOLE + "0", FIXED + "0", VARIABLE + "0"]

LAYER_FAILED = "fb ioctl SARVOFB_IOCTL_EN_LAYER failed \\n"
MAPPING_FAILED = "fb mapping failed!\\n"


def pan(offset: int) -> str:
    """The request that shows the page at OFFSET."""
    return f"ioctl(fb0, FBIOPUT_VSCREENINFO, yoffset={offset}) = "


def shown_page(offset: int) -> list[str]:
    """The requests of a picture that is shown at OFFSET."""
    return [LAYER_OFF + "0", FORMAT + "0", pan(offset) + "0", LAYER_ON + "0"]


# what is to be seen


@cache
def picture_rows() -> list[bytes]:
    """The rows of the repository's picture as the screen's memory has them."""
    with Image.open(IMAGE) as image:
        assert image.size == (WIDTH, HEIGHT)
        pixels = list(image.convert("RGB").getdata())
    data = b"".join((red >> 3 << 11 | green >> 2 << 5 | blue >> 3).to_bytes(2, "little")
                    for red, green, blue in pixels)
    return [data[row * WIDTH * 2:(row + 1) * WIDTH * 2] for row in range(HEIGHT)]


def drawn(before: bytes, size: tuple[int, int], offset: int) -> bytes:
    """The memory of a screen of this SIZE with the picture on the page at OFFSET."""
    width, height = size
    memory = bytearray(before)
    page = offset * width * 4
    memory[page:page + width * height * 2] = bytes(width * height * 2)
    # Halves are cut towards 0; a screen that is too small is not spared.
    left, top = int((width - WIDTH) / 2), int((height - HEIGHT) / 2)
    first = page + (left + top * width) * 2
    for number, row in enumerate(picture_rows()):
        start = first + number * width * 2
        memory[start:start + len(row)] = row
    assert len(memory) == len(before), "the expectation itself leaves the memory"
    return bytes(memory)


def state_text(size: tuple[int, int], **changes: int) -> str:
    """The state of the screen's driver at the start."""
    width, height = size
    state = {"xres": width, "yres": height, "xres_virtual": width, "yres_virtual": 2 * height,
             "xoffset": 0, "yoffset": 0, "bits_per_pixel": 32, "line_length": 4 * width,
             "smem_len": 0, "layer_enabled": 1, "layer_format": 0, **changes}
    return "".join(f"{key} = {value}\n" for key, value in state.items())


# how it gets there


class Operator:
    """Somebody with a handset of a certain kind, who waits for the picture."""

    def __init__(self, make_handset: HandsetFactory, size: tuple[int, int] = (480, 800),
                 state: Mapping[str, int] | None = None, memory: int | None = None,
                 without: str = "", **options: Any) -> None:
        length = 8 * size[0] * size[1] if memory is None else memory
        self.size = size
        self.before = PATTERN * length
        self._threads: set[int] = set()
        self.handset: Handset = make_handset(
            "usb-inserted", ready=False, restart=False, screen=size,
            files={screen.STATE: state_text(size, **(state or {})),
                   screen.FRAMEBUFFER: self.before}, **options)
        if without:
            assert self.handset.run(["/usr/bin/rm", without]).status == 0

    def shake_hands(self) -> None:
        """Have the handshake done; the picture's thread is started."""
        self.handset.wait_ready()
        self._threads = set(self.handset.inspect().threads)
        shake_hands(self.handset)
        self.handset.log.wait("pthread_create() amt_handle_load_image_for_handshake success.")

    def wait_thread_gone(self) -> None:
        """Wait until the picture's thread has ended; others of before may have ended as well."""
        wait_until(lambda: set(self.handset.inspect().threads) <= self._threads or None,
                   "the end of the picture's thread", explain=self.handset.log.tail)

    @property
    def thread(self) -> int:
        """The picture's thread."""
        (tid,) = set(self.handset.inspect().threads) - self._threads
        return tid

    @property
    def requests(self) -> list[str]:
        """The requests on the devices, in order."""
        return [call for call in self.handset.calls() if call.startswith("ioctl(")]

    @property
    def memory(self) -> bytes:
        """The screen's memory."""
        return self.handset.read(screen.FRAMEBUFFER)

    @property
    def complaints(self) -> list[str]:
        """What was logged without a tag."""
        return self.handset.log.texts("(null)")

    @property
    def opened(self) -> list[str]:
        """The devices that the daemon holds open."""
        return sorted(path for path in self.handset.inspect().descriptors.values()
                      if path.startswith("/handset/devices/"))

    def expect_shown(self, offset: int, requests: list[str]) -> None:
        """The picture is on the page at OFFSET, and these were the REQUESTS behind the first."""
        assert self.requests == requests
        assert self.memory == drawn(self.before, self.size, offset), self.size
        assert self.opened == [screen.FRAMEBUFFER]

    def expect_untouched(self, requests: list[str], *complaints: str) -> None:
        """Nothing was drawn, everything was closed again, and these are the COMPLAINTS."""
        assert self.requests == requests
        assert self.memory == self.before
        assert self.opened == []
        assert self.complaints == list(complaints)


def together(operators: Mapping[str, Operator]) -> None:
    """All of them shake hands, and wait until the pictures' threads are gone."""
    for operator in operators.values():
        operator.shake_hands()
    for operator in operators.values():
        operator.wait_thread_gone()


# the station's request


def test_show_request_is_acknowledged_only(app: AppChannel) -> None:
    for atoms in ((), (integer(15, 0),)):
        trace = HandlerTrace(app.handset)
        assert app.request(SHOW_LCD, *atoms) == done(SHOW_LCD)
        trace.expect_handler(SHOW_HANDLER)
        assert trace.calls() == []
    app.send(bytes.fromhex("0600bb1d0000"))
    assert app.line.read_exactly(15) == bytes.fromhex("0f00bb1e0900" "ee01010400" "00000000")


# the picture


def test_picture_after_three_seconds(make_handset: HandsetFactory, tmp_path: Path) -> None:
    operator = Operator(make_handset)
    handset = operator.handset
    begun = time.monotonic()
    operator.shake_hands()
    with Patience() as patience:
        wait_until(lambda: operator.requests == PREPARED or None, "the preparation")
        assert operator.memory == operator.before
        assert f"mode = {1}\n" in handset.text("/handset/devices/console")
        # The reader goes on serving meanwhile.
        assert PcChannel(handset).request(176) == packet(175, integer(1, 0))
        wait_until(lambda: len(operator.requests) > len(PREPARED) or None, "the picture")
        assert PAUSE - 0.2 <= time.monotonic() - begun
        assert patience.seconds < scaled(PAUSE + 2.0)
    operator.wait_thread_gone()
    operator.expect_shown(800, PREPARED + shown_page(800))
    assert operator.complaints == []
    assert screen.read_state(handset.text(screen.STATE)) == {
        "xres": 480, "yres": 800, "xres_virtual": 480, "yres_virtual": 1600, "xoffset": 0,
        "yoffset": 800, "bits_per_pixel": 16, "line_length": 1920, "smem_len": 0,
        "layer_enabled": 1, "layer_format": 1}

    # What a person sees: the picture in the middle, black around it.
    target = tmp_path / "screen.png"
    screen.save(handset.path(screen.FRAMEBUFFER), handset.path(screen.STATE), target)
    with Image.open(target) as seen, Image.open(IMAGE) as picture:
        box = (67, 205, 67 + WIDTH, 205 + HEIGHT)
        middle = seen.crop(box)
        seen.paste((0, 0, 0), box)
        assert seen.getbbox() is None, "the border is not black"
        pairs = zip(middle.getdata(), picture.convert("RGB").getdata())
        assert all(abs(got - wanted) < 8 for pair in pairs for got, wanted in zip(*pair))


def test_screens_of_all_sizes(make_handset: HandsetFactory) -> None:
    sizes = ((WIDTH, HEIGHT), (800, 480), (1000, 1000), (347, 391), (501, 1003), (346, 600))
    operators = {f"{size}": Operator(make_handset, size) for size in sizes}
    together(operators)
    for size, operator in zip(sizes, operators.values()):
        operator.expect_shown(size[1], PREPARED + shown_page(size[1]))
        assert operator.complaints == []


def test_unusual_screens(make_handset: HandsetFactory) -> None:
    size = (480, 800)
    needed = 480 * 800 * 4 + 480 * 800 * 2
    operators = {
        # The page that is not visible now is the first one.
        "second page": Operator(make_handset, size, {"yoffset": 800}),
        "odd page": Operator(make_handset, size, {"yoffset": 1}),
        "exact memory": Operator(make_handset, size, {"smem_len": needed}),
        # Too small for the picture, which is drawn all the same where there is memory for it.
        "small": Operator(make_handset, (320, 240)),
        "narrow": Operator(make_handset, (345, 800)),
        "low": Operator(make_handset, (480, 389)),
    }
    together(operators)
    for name, offset in (("second page", 0), ("odd page", 0), ("exact memory", 800),
                         ("small", 240), ("narrow", 800), ("low", 389)):
        operators[name].expect_shown(offset, PREPARED + shown_page(offset))
        assert operators[name].complaints == [], name


def test_preparation_that_fails(make_handset: HandsetFactory) -> None:
    size = (480, 800)
    needed = 480 * 800 * 4 + 480 * 800 * 2
    operators = {
        "no screen": Operator(make_handset, without="/dev/graphics/fb0"),
        "fixed": Operator(make_handset, answers={"FBIOGET_FSCREENINFO": "-1 EIO"}),
        "variable": Operator(make_handset, answers={"FBIOGET_VSCREENINFO": "-1 EIO"}),
        "no memory": Operator(make_handset, memory=0),
        "a byte too little": Operator(make_handset, size, {"smem_len": needed - 1}),
        "no second page": Operator(make_handset, size, memory=480 * 800 * 2),
        # The picture would begin before the memory.
        "small": Operator(make_handset, (320, 240), {"yoffset": 240}),
    }
    together(operators)
    operators["no screen"].expect_untouched(PREPARED[:1], "fb open failed!\\n")
    operators["fixed"].expect_untouched(
        [PREPARED[0], FIXED + "-1 EIO"], "fb ioctl FBIOGET_FSCREENINFO failed \\n")
    operators["variable"].expect_untouched(
        [*PREPARED[:2], VARIABLE + "-1 EIO"], "fb ioctl FBIOGET_VSCREENINFO failed \\n")
    for name in ("no memory", "a byte too little", "no second page", "small"):
        operators[name].expect_untouched(PREPARED, MAPPING_FAILED)


def test_show_that_fails(make_handset: HandsetFactory) -> None:
    def scripted(name: str, *lines: str) -> Operator:
        return Operator(make_handset, answers={name: lines})

    layer, layer_format = "SARVOFB_IOCTL_EN_LAYER", "SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT"
    operators = {
        "off": scripted(layer, "-1 EIO"), "format": scripted(layer_format, "-1 EINVAL"),
        "format and on": Operator(make_handset, answers={layer_format: "-1 EINVAL",
                                                         layer: ["0", "-1 EIO"]}),
        "pan": scripted("FBIOPUT_VSCREENINFO", "-1 EINVAL"),
        "on": scripted(layer, "0", "-1 EIO", "0"), "on again": scripted(layer, "0", "-1 EIO"),
    }
    together(operators)
    format_failed = "fb ioctl SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT failed \\n"
    begun = [LAYER_OFF + "0", FORMAT + "0"]
    for name, requests, complaints in (
            ("off", [LAYER_OFF + "-1 EIO"], [LAYER_FAILED]),
            ("format", [LAYER_OFF + "0", FORMAT + "-1 EINVAL", LAYER_ON + "0"], [format_failed]),
            ("format and on", [LAYER_OFF + "0", FORMAT + "-1 EINVAL", LAYER_ON + "-1 EIO"],
             [format_failed]),
            ("pan", [*begun, pan(800) + "-1 EINVAL", LAYER_ON + "0"], []),
            ("on", [*begun, pan(800) + "0", LAYER_ON + "-1 EIO", LAYER_ON + "0"],
             [LAYER_FAILED]),
            ("on again", [*begun, pan(800) + "0", LAYER_ON + "-1 EIO", LAYER_ON + "-1 EIO"],
             [LAYER_FAILED])):
        # Drawing comes before all of this.
        operators[name].expect_shown(800, PREPARED + requests)
        assert operators[name].complaints == complaints, name


def test_console_does_not_matter(make_handset: HandsetFactory) -> None:
    operators = {
        "none": Operator(make_handset, without="/dev/tty0"),
        "fails": Operator(make_handset, answers={"KDSETMODE": "-1 ENOTTY"})}
    together(operators)
    operators["none"].expect_shown(800, PREPARED[1:] + shown_page(800))
    operators["fails"].expect_shown(800, [CONSOLE + "-1 ENOTTY", *PREPARED[1:],
                                          *shown_page(800)])
    assert operators["none"].complaints == operators["fails"].complaints == []


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGSEGV])
@pytest.mark.parametrize("on_thread", [False, True])
def test_end_before_the_picture(make_handset: HandsetFactory, number: int,
                                on_thread: bool) -> None:
    operator = Operator(make_handset)
    if number == signal.SIGSEGV and operator.handset.program.sanitizer == "tsan":
        pytest.skip("a fault is treated where it happens, and the sanitizer forbids most calls "
                    "there")
    operator.shake_hands()
    wait_until(lambda: operator.requests == PREPARED or None, "the preparation")
    with Patience() as patience:
        operator.handset.signal(number, operator.thread if on_thread else 0)
        assert operator.handset.wait_exit() == 0
        assert patience.seconds < scaled(1.0)
    assert operator.memory == operator.before
