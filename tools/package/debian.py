"""The Debian package, made by Debian's own tools and looked at by lintian."""

from pathlib import Path

from tools.package.source import VERSION, copy_rooms, run
from tools.project import note

ROOMS = ("CHANGELOG.md", "CMakeLists.txt", "LICENSE", "README.md", "amt", "amt_line",
         "amt_simulator", "amt_station", "cmake", "docs", "platform", "pub", "pyproject.toml",
         "scripts", "tools")
PACKAGING = "packaging/debian"
# Debian's own Python, whatever else the caller has.
PATH = "/usr/sbin:/usr/bin:/sbin:/bin"
LINTIAN = ("lintian", "--allow-root", "--fail-on", "error,warning", "--display-info", "--color",
           "never")


def source_tree(work: Path) -> Path:
    """The tree that Debian's tools build in, with their directory in it."""
    tree = work / f"vx-kel-amt-{VERSION}"
    copy_rooms(ROOMS, tree)
    copy_rooms((PACKAGING,), work)
    (work / PACKAGING).rename(tree / "debian")
    return tree


def make(work: Path) -> list[Path]:
    """The package for this machine."""
    tree = source_tree(work)
    run(["dpkg-buildpackage", "--build=binary", "--unsigned-changes", "--unsigned-buildinfo"],
        tree, {"DEB_BUILD_OPTIONS": "noautodbgsym", "PATH": PATH})
    (changes,) = work.glob("*.changes")
    for line in run([*LINTIAN, str(changes)], work).splitlines():
        note(line)
    return list(work.glob("*.deb"))
