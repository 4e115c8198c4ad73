"""The build step that turns the handshake picture and the radio test script into constant data."""

import re
import subprocess
import sys
import zlib
from pathlib import Path

import pytest
from PIL import Image

ROOT = Path(__file__).parents[2]
EMBED = ROOT / "amt" / "amt-device" / "embed"
TOOL = EMBED / "embed-data.py"
PICTURE = EMBED / "handshake-picture.png"
SCRIPT = ROOT / "scripts" / "wifi-radio-test.sh"

SIZE = (346, 390)


def run_tool(kind: str, source: Path, target: Path) -> subprocess.CompletedProcess[str]:
    """Runs the build step."""
    return subprocess.run(
        [sys.executable, str(TOOL), kind, str(source), str(target)],
        capture_output=True, text=True, timeout=60, check=False,
    )


def embedded_bytes(kind: str, source: Path, folder: Path) -> bytes:
    """The bytes of the array in the source that the build step makes."""
    target = folder / "data.cpp"
    done = run_tool(kind, source, target)
    assert done.returncode == 0, done.stderr
    array = target.read_text().split("= {")[1].split("};")[0]
    return bytes(int(number) for number in re.findall(r"\d+", array))


def expected_pixels(image: Image.Image) -> bytes:
    """The picture in little-endian RGB565, by another road than the build step's."""
    pixels = bytearray()
    for red, green, blue in image.convert("RGB").getdata():
        value = (red // 8) * 2048 + (green // 4) * 32 + blue // 8
        pixels += value.to_bytes(2, "little")
    return bytes(pixels)


def test_picture_has_its_size() -> None:
    """The daemon counts on it."""
    with Image.open(PICTURE) as image:
        assert image.size == SIZE


def test_picture_becomes_a_gzip_member(tmp_path: Path) -> None:
    """A complete member without a name and a date, which holds exactly the picture's pixels."""
    member = embedded_bytes("picture", PICTURE, tmp_path)
    assert member[:2] == b"\x1f\x8b"
    assert member[3:8] == bytes(5)
    unpacker = zlib.decompressobj(31)
    pixels = unpacker.decompress(member)
    assert unpacker.eof and not unpacker.unused_data
    with Image.open(PICTURE) as image:
        assert pixels == expected_pixels(image)


@pytest.mark.parametrize("optimize", [False, True])
def test_every_row_filter_is_read(tmp_path: Path, optimize: bool) -> None:
    """A picture with smooth and noisy parts, saved in two ways, comes out as it went in."""
    image = Image.effect_noise((97, 61), 90).convert("RGB")
    for x in range(97):
        for y in range(30):
            image.putpixel((x, y), (2 * x, 4 * y, x + y))
    source = tmp_path / "picture.png"
    image.save(source, optimize=optimize)
    member = embedded_bytes("picture", source, tmp_path)
    assert zlib.decompress(member, 31) == expected_pixels(image)


def test_other_pictures_are_refused(tmp_path: Path) -> None:
    """Rather than read wrongly."""
    source = tmp_path / "picture.png"
    Image.new("L", (4, 4)).save(source)
    assert run_tool("picture", source, tmp_path / "data.cpp").returncode != 0
    assert run_tool("picture", SCRIPT, tmp_path / "data.cpp").returncode != 0


def test_script_is_carried_whole(tmp_path: Path) -> None:
    """Every byte of it and the terminating zero."""
    assert embedded_bytes("script", SCRIPT, tmp_path) == SCRIPT.read_bytes() + b"\0"


def test_same_input_gives_the_same_source(tmp_path: Path) -> None:
    """The build is reproducible."""
    for name in ("first.cpp", "second.cpp"):
        assert run_tool("picture", PICTURE, tmp_path / name).returncode == 0
    assert (tmp_path / "first.cpp").read_bytes() == (tmp_path / "second.cpp").read_bytes()


def test_usage() -> None:
    """Wrong arguments are told."""
    done = subprocess.run(
        [sys.executable, str(TOOL)], capture_output=True, text=True, timeout=60, check=False,
    )
    assert done.returncode == 2
    assert "Usage" in done.stderr
