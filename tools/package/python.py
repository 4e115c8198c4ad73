"""The Python packages: a source archive, a wheel for every system, one with a build's daemon."""

import sys
from pathlib import Path

from tools.manual import write_completions, write_pages
from tools.package import archive
from tools.package.elf import platform_tag
from tools.package.handset_build import HandsetBuild
from tools.package.source import copy_rooms, put, run
from tools.project import PROJECT

ROOMS = ("pyproject.toml", "README.md", "LICENSE", "amt_line", "amt_simulator", "amt_station")
BUILD = (sys.executable, "-P", "-m", "build", "--no-isolation")
TAGGED = PROJECT / "packaging" / "platform-wheel" / "setup.py"


def _copy_tree(into: Path) -> None:
    copy_rooms(ROOMS, into)
    write_pages(into / "share")
    write_completions(into / "share")


def make_pure(work: Path) -> list[Path]:
    """The source archive, and the wheel that is made of it."""
    tree, made = work / "tree", work / "made"
    _copy_tree(tree)
    run([*BUILD, "--outdir", str(made), "."], tree)
    (source,) = made.glob("*.tar.gz")
    (wheel,) = made.glob("*.whl")
    again = work / source.name
    archive.written_again(source, again)
    return [again, wheel]


def make_platform(work: Path, build: HandsetBuild) -> list[Path]:
    """The wheel with the daemon of a build and its stand-ins."""
    tree, made = work / "tree", work / "made"
    _copy_tree(tree)
    files = build.put_all(tree / "amt_simulator" / "builds" / "release")
    put(TAGGED, tree / "setup.py")
    run([*BUILD, "--wheel", "--outdir", str(made), "."], tree,
        {"PLATFORM_TAG": platform_tag(files)})
    return list(made.iterdir())
