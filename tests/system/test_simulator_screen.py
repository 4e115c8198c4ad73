"""The picture of the screen: which page, which rows, which colours."""

from pathlib import Path

import pytest
from PIL import Image

from amt_simulator import Handset, HandsetError, screen

RED, GREEN, BLUE = (255, 0, 0), (0, 255, 0), (0, 0, 255)
RED16, GREEN16, BLUE16 = b"\x00\xf8", b"\xe0\x07", b"\x1f\x00"


def state(**changes: int) -> dict[str, int]:
    """The driver's state for a screen of 2 x 2 at 16 bits."""
    return {"xres": 2, "yres": 2, "xoffset": 0, "yoffset": 0, "bits_per_pixel": 16,
            "line_length": 8, "layer_enabled": 1, **changes}


def pixels(memory: bytes, **changes: int) -> list[tuple[int, int, int]]:
    """What is shown, row by row."""
    return list(screen.picture(memory.ljust(32, b"\0"), state(**changes)).getdata())


def test_rows_lie_without_gaps() -> None:
    """At 16 bits a row has 2 bytes a pixel, though the line length has 4."""
    assert pixels(RED16 + GREEN16 + BLUE16 + RED16) == [RED, GREEN, BLUE, RED]


def test_pages_lie_a_line_length_apart() -> None:
    """The second page begins at the y offset times 4 bytes a pixel."""
    assert pixels(b"\0" * 16 + GREEN16 * 4, yoffset=2) == [GREEN] * 4


def test_32_bits() -> None:
    """Blue comes first in memory."""
    memory = b"\x00\x00\xff\x00" * 3 + b"\xff\x00\x00\x00"
    assert pixels(memory, bits_per_pixel=32) == [RED, RED, RED, BLUE]


def test_a_disabled_layer_is_black() -> None:
    """Whatever the memory holds."""
    assert pixels(RED16 * 4, layer_enabled=0) == [(0, 0, 0)] * 4


@pytest.mark.parametrize("changes, text", [
    ({"bits_per_pixel": 24}, "depth is 24"), ({"yoffset": 4}, "behind the framebuffer's end"),
])
def test_states_without_a_picture(changes: dict[str, int], text: str) -> None:
    """What no controller could show is refused with the reason."""
    with pytest.raises(HandsetError, match=text):
        pixels(b"", **changes)


def test_the_screen_of_a_handset(make_fake, tmp_path: Path) -> None:
    """A fresh screen of the wanted size is black; what is drawn is seen."""
    handset: Handset = make_fake(ready=False, start=False, screen=(100, 60))
    target = tmp_path / "screen.png"
    memory = handset.path(screen.FRAMEBUFFER)
    assert memory.stat().st_size == 100 * 60 * 4 * 2
    screen.save(memory, handset.path(screen.STATE), target)
    with Image.open(target) as image:
        assert image.size == (100, 60) and image.getextrema() == ((0, 0), (0, 0), (0, 0))
    handset.run(["/bin/sh", "-c", "printf '\\377\\377\\377\\0' | dd of=/dev/graphics/fb0 "
                                  "conv=notrunc"])
    screen.save(memory, handset.path(screen.STATE), target)
    with Image.open(target) as image:
        assert image.getpixel((0, 0)) == (255, 255, 255)
        assert image.getpixel((1, 0)) == (0, 0, 0)
    with pytest.raises(HandsetError, match="cannot save the screen"):
        screen.save(memory, handset.path(screen.STATE), tmp_path / "no" / "such.png")
