"""The handset's screen as a picture.

What the display controller shows: the visible page begins at its y offset times the driver's line
length, which has 4 bytes for each pixel of a line whatever the depth is; from there the controller
reads rows without gaps at the depth that is set, 16 bits (RGB565) or 32 (XRGB8888). So a page that
was drawn at 2 bytes a pixel is shown whole, though pages lie as far apart as 4 bytes ask for. A
disabled layer is black.
"""

from pathlib import Path

from PIL import Image

from amt_simulator.errors import HandsetError

FRAMEBUFFER = "/handset/devices/fb0"
STATE = "/handset/devices/framebuffer"


def read_state(text: str) -> dict[str, int]:
    """The state of the framebuffer driver: `key = value` lines."""
    pairs = (line.partition("=") for line in text.splitlines() if "=" in line)
    return {key.strip(): int(value) for key, _, value in pairs}


def picture(memory: bytes, state: dict[str, int]) -> Image.Image:
    """The picture that the controller makes of the framebuffer's MEMORY in this STATE."""
    size = (state["xres"], state["yres"])
    depth = state["bits_per_pixel"]
    if not state.get("layer_enabled", 1):
        return Image.new("RGB", size)
    decoders = {16: "BGR;16", 32: "BGRX"}
    if depth not in decoders:
        raise HandsetError(f"the screen's depth is {depth} bits, not 16 or 32")
    start = state["yoffset"] * state["line_length"] + state["xoffset"] * depth // 8
    length = size[0] * size[1] * depth // 8
    page = memory[start:start + length]
    if len(page) != length:
        raise HandsetError(f"the visible page lies behind the framebuffer's end "
                           f"({start} + {length} of {len(memory)} bytes)")
    return Image.frombytes("RGB", size, page, "raw", decoders[depth])


def save(directory_file: Path, state_file: Path, target: Path) -> None:
    """Save what the screen shows as the picture file TARGET."""
    try:
        image = picture(directory_file.read_bytes(), read_state(state_file.read_text("ascii")))
        image.save(target)
    except (OSError, ValueError) as error:
        raise HandsetError(f"cannot save the screen as {target}: {error}") from None
