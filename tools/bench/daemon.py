"""The daemon of a simulated handset as the benchmarks see it from outside."""

from pathlib import Path
import os
import re
import sys

from amt_simulator import Handset
from tools.project import PROJECT

BUILD = PROJECT / "build" / "release"
DAEMON = "vx-kel-amt"
# The head of a mapping in /proc/PID/smaps: addresses, rights, offset, device, inode, path.
MAPPING = re.compile(r"^[0-9a-f]+-[0-9a-f]+ \S+ \S+ \S+ \S+ *(.*)$")
# So much of a log's end is looked at; a request's records are far less.
TAIL_BYTES = 8192


def _read(path: Path) -> str:
    """What a file of /proc says; nothing when its process has gone."""
    try:
        return path.read_text("utf-8", "replace")
    except OSError:
        return ""


def _descendants(pid: int) -> list[int]:
    """Every process below PID."""
    found = []
    for children in Path(f"/proc/{pid}/task").glob("*/children"):
        for child in map(int, _read(children).split()):
            found += [child, *_descendants(child)]
    return found


def daemon_pid(handset: Handset, inside_pid: int = 0) -> int:
    """The process id out here of the HANDSET's daemon, or of the one that is INSIDE_PID in it.

    No other handset is up.
    """
    wanted = inside_pid or handset.pid
    for pid in _descendants(os.getpid()):
        place = Path(f"/proc/{pid}")
        inside = re.search(r"^NSpid:.*\s(\d+)$", _read(place / "status"), re.MULTILINE)
        if inside and int(inside[1]) == wanted and _read(place / "comm").strip() == DAEMON:
            return pid
    sys.exit("dev: the handset's daemon is not to be found")


def log_tail(path: Path, count: int) -> list[str]:
    """The texts of a log file's last COUNT records."""
    with open(path, "rb") as stream:
        stream.seek(max(0, path.stat().st_size - TAIL_BYTES))
        lines = stream.read().decode("utf-8", "replace").splitlines()
    return [line.partition(": ")[2] for line in lines[-count:]]


def resident(pid: int) -> dict[str, int]:
    """KiB of the resident set by what is mapped: the file's name, or what the kernel calls it."""
    kib: dict[str, int] = {}
    name = ""
    for line in _read(Path(f"/proc/{pid}/smaps")).splitlines():
        if mapping := MAPPING.match(line):
            name = Path(mapping[1]).name if mapping[1].startswith("/") else mapping[1]
        elif line.startswith("Rss:"):
            what = name or "memory without a file"
            kib[what] = kib.get(what, 0) + int(line.split()[1])
    return {what: size for what, size in sorted(kib.items(), key=lambda pair: -pair[1]) if size}
