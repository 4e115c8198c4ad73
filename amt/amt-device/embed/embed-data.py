#!/usr/bin/python3
"""Turns a data file into a C++ source that the daemon carries as constant data.

Usage: embed-data.py picture INPUT.png OUTPUT.cpp
       embed-data.py script INPUT.sh OUTPUT.cpp

picture: a PNG (8 bits a channel, RGB, not interlaced) becomes little-endian RGB565 pixels in a gzip
         member without a date, so that the same picture always gives the same bytes.
script:  a text becomes a zero-terminated array of characters.

Needs nothing but Python itself.
"""

import struct
import sys
import zlib
from collections.abc import Iterator
from pathlib import Path

PNG_SIGNATURE = b"\x89PNG\r\n\x1a\n"
PNG_FORM = (8, 2, 0, 0, 0)
CHANNEL_COUNT = 3

GZIP_WINDOW_BITS = 31
BYTES_A_LINE = 20


def read_chunks(png: bytes) -> Iterator[tuple[bytes, bytes]]:
    """The name and content of each chunk of a PNG file."""
    if not png.startswith(PNG_SIGNATURE):
        raise ValueError("not a PNG file")
    position = len(PNG_SIGNATURE)
    while position < len(png):
        length, name = struct.unpack_from(">I4s", png, position)
        yield name, png[position + 8:position + 8 + length]
        position += length + 12


def predict(kind: int, left: int, above: int, corner: int) -> int:
    """What a row filter of the PNG format adds to a byte."""
    if kind == 4:
        guess = left + above - corner
        return min((left, above, corner), key=lambda value: abs(guess - value))
    return (0, left, above, (left + above) // 2)[kind]


def unfilter_row(kind: int, row: bytes, above: bytes) -> bytes:
    """One row of a PNG without its filter; above is the row before it."""
    out = bytearray()
    for index, value in enumerate(row):
        is_first = index < CHANNEL_COUNT
        left = 0 if is_first else out[index - CHANNEL_COUNT]
        corner = 0 if is_first else above[index - CHANNEL_COUNT]
        out.append((value + predict(kind, left, above[index], corner)) & 0xFF)
    return bytes(out)


def read_pixels(png: bytes) -> bytes:
    """The pixels of a PNG file, three bytes each."""
    chunks = list(read_chunks(png))
    width, height, *form = struct.unpack(">IIBBBBB", dict(chunks)[b"IHDR"])
    if tuple(form) != PNG_FORM:
        raise ValueError("not an RGB picture of 8 bits a channel without interlacing")
    data = zlib.decompress(b"".join(content for name, content in chunks if name == b"IDAT"))
    row_size = width * CHANNEL_COUNT
    above = bytes(row_size)
    rows = []
    for start in range(0, height * (row_size + 1), row_size + 1):
        above = unfilter_row(data[start], data[start + 1:start + 1 + row_size], above)
        rows.append(above)
    return b"".join(rows)


def to_rgb565(pixels: bytes) -> bytes:
    """Three bytes a pixel become two."""
    values = [
        red >> 3 << 11 | green >> 2 << 5 | blue >> 3
        for red, green, blue in zip(pixels[0::3], pixels[1::3], pixels[2::3])
    ]
    return struct.pack(f"<{len(values)}H", *values)


def pack_member(data: bytes) -> bytes:
    """A complete gzip member, without a name and a date."""
    packer = zlib.compressobj(9, zlib.DEFLATED, GZIP_WINDOW_BITS)
    return packer.compress(data) + packer.flush()


def format_bytes(data: bytes) -> str:
    """The inside of an array's initializer."""
    lines = [data[start:start + BYTES_A_LINE] for start in range(0, len(data), BYTES_A_LINE)]
    return "\n".join("    " + ", ".join(str(byte) for byte in line) + "," for line in lines)


HEADER = '#include "amt/amt-device/embed/embedded-data.h"\n\n'


def picture_source(content: bytes) -> str:
    """The source that holds a picture."""
    member = pack_member(to_rgb565(read_pixels(content)))
    return (
        f"{HEADER}const uint8_t g_handshake_picture_a[] = {{\n{format_bytes(member)}\n}};\n"
        "const uint32_t g_handshake_picture_length = sizeof(g_handshake_picture_a);\n"
    )


def script_source(content: bytes) -> str:
    """The source that holds the text of the radio test script, which must be plain ASCII."""
    content.decode("ascii")
    data = format_bytes(content + b"\0")
    return f"{HEADER}const char g_wifi_radio_test_script_a[] = {{\n{data}\n}};\n"


SOURCES = {"picture": picture_source, "script": script_source}


def main() -> int:
    """Writes the source that the arguments ask for."""
    if len(sys.argv) != 4 or sys.argv[1] not in SOURCES:
        print(__doc__, file=sys.stderr)
        return 2
    kind, source, target = sys.argv[1:]
    Path(target).write_text(SOURCES[kind](Path(source).read_bytes()), encoding="ascii")
    return 0


if __name__ == "__main__":
    sys.exit(main())
