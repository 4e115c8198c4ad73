"""What the handset mounts itself: its memory card, and protection for the PC's device nodes."""

import ctypes
import os

CARD = "/storage/sdcard1"
READ_ONLY, REMOUNT, BIND, DETACH = 1, 32, 4096, 2
# The nodes that the sandbox took from the PC.
DEVICES = ("null", "zero", "full", "random", "urandom", "tty")


def _mount(source: str, target: str, kind: str, flags: int, data: str) -> None:
    library = ctypes.CDLL(None, use_errno=True)
    if library.mount(source.encode(), target.encode(), kind.encode(), ctypes.c_ulong(flags),
                     data.encode()) != 0:
        code = ctypes.get_errno()
        raise OSError(code, f"mount {target}: {os.strerror(code)}")


def protect_devices() -> None:
    """Keep mode and owner of the PC's device nodes from changing; they stay usable."""
    for name in DEVICES:
        node = f"/dev/{name}"
        if os.path.ismount(node):
            # What the mount forbids already must be forbidden again.
            kept = os.statvfs(node).f_flag & ~os.ST_RDONLY & 0xFFF
            _mount("", node, "", REMOUNT | BIND | READ_ONLY | kept, "")


def insert_card(size: int) -> None:
    """Put a card of SIZE bytes into the slot, in place of the one that is there."""
    remove_card()
    _mount("tmpfs", CARD, "tmpfs", 0, f"size={size}")


def fill_card() -> None:
    """Leave no free byte on the card."""
    space = os.statvfs(CARD)
    with open(f"{CARD}/full", "wb") as file:
        os.posix_fallocate(file.fileno(), 0, space.f_bavail * space.f_frsize)


def remove_card() -> None:
    """Take the card out, if there is one."""
    if not os.path.ismount(CARD):
        return
    library = ctypes.CDLL(None, use_errno=True)
    if library.umount2(CARD.encode(), DETACH) != 0:
        code = ctypes.get_errno()
        raise OSError(code, f"umount {CARD}: {os.strerror(code)}")
