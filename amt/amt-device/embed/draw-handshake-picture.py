#!/usr/bin/python3
"""Draws the handshake picture: a handset, a test pulse through it, "TEST MODE", hazard stripes.

Usage: draw-handshake-picture.py OUTPUT.png

The build does not run this: it takes the PNG beside this file. Needs python3-pil and
fonts-dejavu-core.
"""

import sys

from PIL import Image, ImageDraw, ImageFont

WIDTH = 346
HEIGHT = 390

# Drawn this much larger and scaled down, for smooth edges.
SCALE = 4

# Edges keep this many steps between two colours, so that the picture packs well.
SHADE_COUNT = 4

BLACK = (0, 0, 0)
WHITE = (255, 255, 255)
AMBER = (255, 190, 0)
GREEN = (0, 230, 90)

FONT_FILE = "/usr/share/fonts/truetype/dejavu/DejaVuSans-Bold.ttf"
TEXT = "TEST MODE"
TEXT_SIZE = 48
TEXT_MIDDLE = (WIDTH / 2, 311)

STRIPE_HEIGHT = 26
STRIPE_WIDTH = 28

PHONE = (112, 46, 234, 262)
PULSE = [
    (22, 154), (132, 154), (144, 138), (156, 154), (164, 154), (174, 92), (188, 214), (198, 154),
    (214, 154), (324, 154),
]


def scaled(point: tuple[float, float]) -> tuple[int, int]:
    """A point on the enlarged drawing."""
    return round(point[0] * SCALE), round(point[1] * SCALE)


def scaled_box(box: tuple[float, float, float, float]) -> tuple[int, int, int, int]:
    """A box on the enlarged drawing: its left, top, right and bottom."""
    return scaled(box[:2]) + scaled(box[2:])


def draw_stripes(draw: ImageDraw.ImageDraw, top: int) -> None:
    """A band of slanted stripes across the picture."""
    for left in range(-STRIPE_HEIGHT, WIDTH + STRIPE_HEIGHT, 2 * STRIPE_WIDTH):
        bottom = top + STRIPE_HEIGHT
        corners = [
            (left, bottom), (left + STRIPE_WIDTH, bottom),
            (left + STRIPE_WIDTH + STRIPE_HEIGHT, top), (left + STRIPE_HEIGHT, top),
        ]
        draw.polygon([scaled(corner) for corner in corners], fill=AMBER)


def draw_phone(draw: ImageDraw.ImageDraw) -> None:
    """The handset: its frame, its earpiece and its button."""
    draw.rounded_rectangle(scaled_box(PHONE), radius=20 * SCALE, outline=WHITE, width=11 * SCALE)
    draw.rounded_rectangle(scaled_box((156, 66, 190, 72)), radius=3 * SCALE, fill=WHITE)
    draw.ellipse(scaled_box((165, 234, 181, 250)), fill=WHITE)


def draw_pulse(draw: ImageDraw.ImageDraw) -> None:
    """The test pulse, from edge to edge, with a black rim that keeps it apart from the handset."""
    points = [scaled(point) for point in PULSE]
    for width, colour in ((20, BLACK), (10, GREEN)):
        draw.line(points, fill=colour, width=width * SCALE, joint="curve")
        for x, y in points:
            radius = width * SCALE // 2
            draw.ellipse((x - radius, y - radius, x + radius, y + radius), fill=colour)


def reduce_shades(value: int) -> int:
    """The nearest of the few steps that a colour channel keeps."""
    step = 255 / SHADE_COUNT
    return round(round(value / step) * step)


def draw_picture() -> Image.Image:
    """The whole picture in its final size."""
    image = Image.new("RGB", scaled((WIDTH, HEIGHT)), BLACK)
    draw = ImageDraw.Draw(image)
    draw_stripes(draw, 0)
    draw_stripes(draw, HEIGHT - STRIPE_HEIGHT)
    draw_phone(draw)
    draw_pulse(draw)
    font = ImageFont.truetype(FONT_FILE, TEXT_SIZE * SCALE)
    draw.text(scaled(TEXT_MIDDLE), TEXT, fill=WHITE, font=font, anchor="mm")
    return image.resize((WIDTH, HEIGHT), Image.Resampling.BOX).point(reduce_shades)


def main() -> int:
    """Writes the picture to the named file."""
    if len(sys.argv) != 2:
        print(__doc__, file=sys.stderr)
        return 2
    draw_picture().save(sys.argv[1], optimize=True)
    return 0


if __name__ == "__main__":
    sys.exit(main())
