"""What goes onto a handset, as an archive with a manifest."""

import hashlib
from dataclasses import dataclass
from pathlib import Path

from tools.package import archive
from tools.package.elf import interpreter, machine
from tools.package.handset_build import HandsetBuild
from tools.package.source import NAME, VERSION
from tools.project import PROJECT, note

# The users of a handset that its files belong to, by their fixed numbers.
ROOT, SHELL = (0, "root"), (2000, "shell")
DAEMON = "/system/bin/vx-kel-amt"
ANDROID = "platform/android/"
# Files of which a board's engineer takes what the board needs, and which lie nowhere on a handset.
BOARD = (f"{ANDROID}ueventd.vx-kel-amt.rc", f"{ANDROID}permissions.md")


@dataclass(frozen=True)
class Placed:
    """A file of the project and its place on a handset."""

    path: str
    source: str
    mode: int
    group: tuple[int, str] = ROOT


PLACES = (
    Placed("/init.vx-kel-amt.rc", f"{ANDROID}vx-kel-amt.rc", 0o750),
    Placed("/system/bin/wifi-radio-test.sh", "scripts/wifi-radio-test.sh", 0o755, SHELL),
    Placed("/system/etc/vx-kel-amt.cfg", f"{ANDROID}vx-kel-amt.cfg", 0o644),
)


def manifest(members: list[archive.Member], told: str) -> str:
    """A line for each file on the handset, and of the daemon what it runs on."""
    lines = [f"# {NAME} {VERSION} for a handset", f"# {DAEMON}: {told}",
             "# mode owner:group sha256 path"]
    lines += [f"{member.mode:04o} {member.user[1]}:{member.group[1]} "
              f"{hashlib.sha256(member.content).hexdigest()} {member.name}"
              for member in sorted(members, key=lambda member: member.name)]
    return "\n".join(lines) + "\n"


def make(work: Path, build: HandsetBuild) -> list[Path]:
    """The archive with the daemon of a build."""
    daemon = work / "daemon"
    build.put_stripped("bin/vx-kel-amt", daemon, 0o755)
    members = [archive.Member(DAEMON, daemon.read_bytes(), 0o755, ROOT, SHELL)]
    members += [archive.Member(placed.path, (PROJECT / placed.source).read_bytes(), placed.mode,
                               ROOT, placed.group) for placed in PLACES]
    loader = interpreter(daemon) or "no loader"
    text = manifest(members, f"{machine(daemon)}, {loader}")
    if loader.startswith("/lib"):
        note(f"the daemon in the bundle is for {machine(daemon)} and {loader}: it shows what a "
             "bundle is; a handset's own comes of --build android")
    name = f"{NAME}-{VERSION}-handset-{machine(daemon)}"
    inside = [archive.Member(f"{name}/root{member.name}", member.content, member.mode,
                             member.user, member.group) for member in members]
    inside += [archive.Member(f"{name}/board/{Path(source).name}", (PROJECT / source).read_bytes())
               for source in BOARD]
    inside += [archive.Member(f"{name}/LICENSE", (PROJECT / "LICENSE").read_bytes()),
               archive.Member(f"{name}/MANIFEST", text.encode())]
    path = work / f"{name}.tar.gz"
    archive.write(path, inside)
    return [path]
