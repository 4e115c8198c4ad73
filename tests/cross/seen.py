"""Holds a dialogue with a handset of its own, and takes down all that has come of it."""

import stat
from contextlib import ExitStack
from pathlib import Path
from typing import Any

from amt_simulator import Handset
from amt_simulator.tree import MOUNTS
from amt_simulator.waiting import wait_until
from amt_station.trace.dialogue import Dialogue
from support.session import PATHS, Session
from tools.cross.alike import Seen

LOG_FILE = "/handset/log.txt"
# What only the inside shows: the nodes of /dev, and what is mounted.
INSIDE = ("/bin/sh", "-c", "find /dev /storage -printf '%y %m %U:%G %p %l\\n' | sort;"
          "find /storage -type f -print0 | sort -z | xargs -0r tail -n +1 -v")

# A thread that waits there goes on by itself.
PAUSES = ("hrtimer_nanosleep", "do_nanosleep")


def settle(handset: Handset) -> None:
    """Wait until the daemon has nothing more to do: it waits for others, and logs nothing.

    Behind its answer it still logs, and a thread of it may end.
    """
    before: object = None

    def attempt() -> bool:
        nonlocal before
        daemon = handset.inspect()
        look = handset.log.mark(), daemon.threads
        is_at_rest = not daemon.children and all(
            thread["state"] == "S" and thread["waits_in"] not in PAUSES
            for thread in daemon.threads.values())
        is_same, before = look == before, look
        return is_at_rest and is_same

    wait_until(attempt, "the daemon to come to rest", explain=handset.story)


def _content(path: Path, mode: int) -> bytes:
    if stat.S_ISLNK(mode):
        return bytes(path.readlink())
    return path.read_bytes() if stat.S_ISREG(mode) else b""


def files(directory: Path) -> dict[str, tuple[str, bytes]]:
    """Every file below the handset's root but its log: kind, mode, owner and content."""
    found = {}
    for mount, place in MOUNTS.items():
        top = directory / place
        for path in sorted(top.rglob("*")):
            status = path.lstat()
            inside = f"{mount.rstrip('/')}/{path.relative_to(top)}"
            if inside != LOG_FILE:
                kind = f"{stat.filemode(status.st_mode)} {status.st_uid}:{status.st_gid}"
                found[inside] = (kind, _content(path, status.st_mode))
    return found


def threads(handset: Handset) -> list[list[str]]:
    """The log, a list for each thread of each process."""
    found: dict[tuple[int, int], list[str]] = {}
    for record in handset.log.records():
        text = f"{record.priority} {record.tag}: {record.text}"
        found.setdefault((record.pid, record.tid), []).append(text)
    return list(found.values())


def hold(dialogue: Dialogue, options: dict[str, Any]) -> Seen:
    """Hold a DIALOGUE with a handset of these OPTIONS, from its start until it is at rest.

    Where a dialogue ends the daemon, its shut-down is seen as far as that is sure: behind 800 ms,
    which an emulator on a busy machine needs, the daemon cuts it short itself.
    """
    seen = Seen()
    # One that was started again would be in the middle of something at the end.
    with Handset(PATHS[dialogue.channel], restart=False, **options) as handset:
        handset.wait_ready()
        with ExitStack() as cleanup:
            session = Session(handset, dialogue, cleanup)
            session.hold(dialogue)
            seen.heard = session.heard
            if handset.is_up and handset.pid:
                settle(handset)
                inside = handset.run(INSIDE)
                assert inside.status == 0, inside.stderr
                seen.files["the inside"] = ("", inside.stdout)
            seen.starts = handset.text("/handset/init.txt").count(": daemon: ")
            seen.exits = handset.exits()
            seen.files.update(files(handset.directory))
            seen.threads = threads(handset)
    return seen
