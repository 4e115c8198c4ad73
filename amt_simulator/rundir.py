"""The directory of a handset: made under one base, held by its owner, gone with its owner."""

import fcntl
import os
import shutil
import subprocess
import tempfile
from pathlib import Path

from amt_simulator.errors import HandsetError

BASE_VARIABLE = "HANDSET_BASE"
LOCK = "owner"
KEPT = "kept"
NEW = ".new-"

# Removes the directory when the owner's end of the pipe closes, however the owner ended. The
# processes of the sandbox die at that same moment, so a first attempt may come too early.
KEEPER = """
read -r word
test "$word" = keep && exit 0
for attempt in 1 2 3 4 5 6 7 8 9 10; do
    chmod -R u+rwX -- "$1" 2>/dev/null
    rm -rf -- "$1" 2>/dev/null && exit 0
    sleep 0.2
done
"""


def base_directory() -> Path:
    """Where this user's handsets live."""
    chosen = os.environ.get(BASE_VARIABLE)
    base = Path(chosen) if chosen else Path(tempfile.gettempdir()) / f"vx-handset-{os.getuid()}"
    try:
        base.mkdir(mode=0o700, parents=True, exist_ok=True)
        owner = base.stat().st_uid
    except OSError as error:
        raise HandsetError(f"cannot make {base}: {error.strerror}") from None
    if owner != os.getuid():
        raise HandsetError(f"{base} belongs to another user; set {BASE_VARIABLE} to a directory "
                           "of your own")
    return base


def _lock(directory: Path) -> int | None:
    """Take the directory's lock; None while its owner lives."""
    fd = os.open(directory / LOCK, os.O_RDWR | os.O_CREAT | os.O_CLOEXEC, 0o600)
    try:
        fcntl.flock(fd, fcntl.LOCK_EX | fcntl.LOCK_NB)
    except BlockingIOError:
        os.close(fd)
        return None
    return fd


def has_owner(directory: Path) -> bool:
    """Whether the process that made the directory is still there."""
    try:
        fd = _lock(directory)
    except OSError:
        return False
    if fd is None:
        return True
    os.close(fd)
    return False


def remove_tree(directory: Path) -> None:
    """Remove a directory, also where its content forbids it."""
    def permit(_function: object, path: str, error: tuple[object, BaseException, object]) -> None:
        if isinstance(error[1], FileNotFoundError):
            return  # somebody else sweeps here too
        os.chmod(os.path.dirname(path), 0o700)
        if os.path.isdir(path) and not os.path.islink(path):
            os.chmod(path, 0o700)
            shutil.rmtree(path, ignore_errors=True)
        else:
            os.unlink(path)

    if directory.exists():
        shutil.rmtree(directory, onerror=permit)


def sweep(base: Path) -> None:
    """Remove what owners left behind that did not even have the time to be cleaned up after."""
    for directory in base.iterdir():
        if directory.name.startswith(NEW) or not (directory / LOCK).exists() or (
                directory / KEPT).exists():
            continue
        if not has_owner(directory):
            remove_tree(directory)


class RunDirectory:
    """A fresh directory that exists as long as its owner wants it, and never longer than it."""

    def __init__(self) -> None:
        base = base_directory()
        sweep(base)
        made = Path(tempfile.mkdtemp(prefix=f"{NEW}{os.getpid()}-", dir=base))
        lock = _lock(made)
        if lock is None:
            raise HandsetError(f"cannot lock {made}")
        self._lock = lock
        # Only now, with the lock held, it gets a name that a sweep looks at.
        self.path = made.with_name(made.name.removeprefix(NEW))
        made.rename(self.path)
        self._keeper = subprocess.Popen(
            ["/bin/sh", "-c", KEEPER, "handset-keeper", str(self.path)], stdin=subprocess.PIPE,
            stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, start_new_session=True,
            cwd="/", env={"PATH": "/usr/bin:/bin"})

    def close(self, keep: bool = False) -> None:
        """Give the directory up; KEEP leaves it to whoever wants to look into it."""
        assert self._keeper.stdin is not None
        if keep:
            (self.path / KEPT).touch()
            self._keeper.stdin.write(b"keep\n")
        else:
            remove_tree(self.path)
        self._keeper.stdin.close()
        self._keeper.wait()
        os.close(self._lock)
