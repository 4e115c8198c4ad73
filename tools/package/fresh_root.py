"""The Debian package in a fresh Debian: installed with all that it wants, tried, taken away."""

import hashlib
import os
import shutil
import tempfile
from pathlib import Path

from tools.cross.sysroot import mirror, release
from tools.package.source import PackageFailed, run
from tools.project import note, say

# Removed packages leave what apt and dpkg keep for themselves.
KEPT = ("var/cache", "var/lib/apt", "var/lib/dpkg", "var/log", "tmp", "run", "dev", "proc")
# What each must say, as its user would try it.
TRIALS = (
    (("amt-station", "at", "--help"), "Usage: amt-station at"),
    (("amt-handset", "scenarios"), "weak-battery"),
    (("amt-handset", "run", "--", "amt-station", "at", "AT"), "OK"),
    (("amt-handset", "run", "--path", "packet", "--", "amt-station", "version", "--module",
      "product"), "version: "),
)
OWN = ("amt-station", "amt_station", "amt-handset", "amt_line", "amt_simulator", "vx_kel", "vx-kel")


def listing(root: Path, left_out: tuple[str, ...] = KEPT) -> dict[str, str]:
    """Every path below a root, and what is there."""
    found = {}
    for folder, folders, names in os.walk(root):
        place = Path(folder)
        folders[:] = [name for name in folders
                      if str((place / name).relative_to(root)) not in left_out]
        for name in [*folders, *names]:
            path = place / name
            if path.is_symlink():
                said = f"to {os.readlink(path)}"
            elif path.is_file():
                said = hashlib.sha256(path.read_bytes()).hexdigest()
            else:
                said = "no file"
            found[str(path.relative_to(root))] = f"{path.lstat().st_mode:o} {said}"
    return found


def differences(before: dict[str, str], after: dict[str, str]) -> list[str]:
    """The paths that have come, gone or changed."""
    return sorted(name for name in {*before, *after} if before.get(name) != after.get(name))


def enter(root: Path, *words: str) -> str:
    """Run a command in a root; what it says."""
    # The whole of /proc: a sandbox within the sandbox has one only where nothing of it is hidden.
    return run(["bwrap", "--bind", str(root), "/", "--dev", "/dev", "--dev-bind", "/proc", "/proc",
                "--die-with-parent", "--cap-add", "ALL", *words], root,
               {"DEBIAN_FRONTEND": "noninteractive", "HOME": "/root",
                "PATH": "/usr/sbin:/usr/bin:/sbin:/bin"})


def install(root: Path, package: Path) -> None:
    """Install it with all that it wants, and try what is in it."""
    enter(root, "apt-get", "install", "-y", "-q", f"/{package.name}")
    for words, wanted in TRIALS:
        said = enter(root, *words)
        if wanted not in said:
            raise PackageFailed(f"{' '.join(words)} says: {said}")


def purge(root: Path) -> dict[str, str]:
    """Take it away; what is there without it."""
    enter(root, "apt-get", "purge", "-y", "-q", "amt-station")
    left = listing(root)
    own = [name for name in left if any(word in name for word in OWN) and not
           name.endswith(".deb")]
    if own:
        raise PackageFailed(f"left behind: {' '.join(own)}")
    return left


def check(package: Path) -> None:
    """Install it in a root of debootstrap's, twice: the second time must change nothing."""
    if os.getuid() != 0:
        raise PackageFailed("--check needs root, as debootstrap does")
    say(f"{package.name} in a fresh Debian")
    with tempfile.TemporaryDirectory(prefix=".root-", dir=package.parent) as name:
        root = Path(name) / "root"
        codename = release()
        run(["debootstrap", "--variant=minbase", codename, str(root), mirror(codename)],
            package.parent)
        shutil.copy(package, root)
        enter(root, "apt-get", "update", "-q")
        install(root, package)
        before = purge(root)
        install(root, package)
        changed = differences(before, purge(root))
    if changed:
        raise PackageFailed(f"not as before: {' '.join(changed)}")
    note("installed, tried and removed without residue")
