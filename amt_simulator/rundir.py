"""The directory of a handset: made under one base, held by its owner, gone with its owner.

The base lies where every user of the PC may write, and what stands in it gets removed: so nobody
else may be able to lay anything there.
"""

import contextlib
import fcntl
import os
import shutil
import stat
import subprocess
import tempfile
import time
from pathlib import Path

from amt_simulator.errors import HandsetError

BASE_VARIABLE = "HANDSET_BASE"
BASE_MODE, EVERYBODY = 0o700, 0o777
LOCK = "owner"
KEPT = "kept"
NEW = ".new-"
# So long after its making a directory that has no name yet will not get one any more.
NEW_SECONDS = 3600.0

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


def _check_base(base: Path) -> None:
    """Refuse a base directory in which anybody else could lay or change something."""
    status = base.lstat()
    if stat.S_ISLNK(status.st_mode):
        wrong = "is a symbolic link"
    elif not stat.S_ISDIR(status.st_mode):
        wrong = "is no directory"
    elif status.st_uid != os.getuid():
        wrong = "belongs to another user"
    elif status.st_mode & EVERYBODY != BASE_MODE:
        wrong = f"has the mode {status.st_mode & EVERYBODY:04o}, not {BASE_MODE:04o}"
    else:
        return
    raise HandsetError(f"{base} {wrong}; set {BASE_VARIABLE} to a directory of your own that "
                       "nobody else may enter (chmod 700)")


def base_directory() -> Path:
    """Where this user's handsets live: a directory that only this user can change."""
    chosen = os.environ.get(BASE_VARIABLE)
    base = Path(chosen) if chosen else Path(tempfile.gettempdir()) / f"vx-handset-{os.getuid()}"
    try:
        # What is there already, a link too, is looked at, and not where it leads.
        with contextlib.suppress(FileExistsError):
            base.mkdir(mode=BASE_MODE, parents=True)
        _check_base(base)
    except OSError as error:
        raise HandsetError(f"cannot make {base}: {error.strerror}") from None
    return base


def _lock(directory: Path, flags: int = 0) -> int | None:
    """Take the directory's lock; None while its owner lives."""
    fd = os.open(directory / LOCK, os.O_RDWR | os.O_NOFOLLOW | os.O_CLOEXEC | flags, 0o600)
    try:
        fcntl.flock(fd, fcntl.LOCK_EX | fcntl.LOCK_NB)
    except BlockingIOError:
        os.close(fd)
        return None
    except OSError:
        os.close(fd)
        raise
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
        if directory.is_symlink():
            continue
        if directory.name.startswith(NEW):
            is_left = _age(directory) > NEW_SECONDS
        else:
            is_left = (directory / LOCK).exists() and not (directory / KEPT).exists()
        if is_left and not has_owner(directory):
            remove_tree(directory)


def _age(directory: Path) -> float:
    """The seconds since something was made in DIRECTORY, none when it has gone."""
    try:
        return time.time() - directory.stat().st_mtime
    except OSError:
        return 0.0


class RunDirectory:
    """A fresh directory that exists as long as its owner wants it, and never longer than it."""

    def __init__(self) -> None:
        base = base_directory()
        sweep(base)
        self.path = Path(tempfile.mkdtemp(prefix=f"{NEW}{os.getpid()}-", dir=base))
        self._lock = -1
        self._keeper: subprocess.Popen[bytes] | None = None
        try:
            self._hold()
        except BaseException:
            self.close()
            raise

    def _hold(self) -> None:
        """Take the directory's lock, give it the name under which it is found, and watch it."""
        lock = _lock(self.path, os.O_CREAT)
        if lock is None:
            raise HandsetError(f"cannot lock {self.path}")
        self._lock = lock
        # Only now, with the lock held, it gets a name that a sweep looks at.
        self.path = self.path.rename(self.path.with_name(self.path.name.removeprefix(NEW)))
        self._keeper = subprocess.Popen(
            ["/bin/sh", "-c", KEEPER, "handset-keeper", str(self.path)], stdin=subprocess.PIPE,
            stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, start_new_session=True,
            cwd="/", env={"PATH": "/usr/bin:/bin"})

    def close(self, keep: bool = False) -> None:
        """Give the directory up; KEEP leaves it to whoever wants to look into it."""
        try:
            if keep:
                (self.path / KEPT).touch()
            else:
                remove_tree(self.path)
        finally:
            if self._keeper is not None and self._keeper.stdin is not None:
                if keep:
                    self._keeper.stdin.write(b"keep\n")
                self._keeper.stdin.close()
                self._keeper.wait()
            if self._lock >= 0:
                os.close(self._lock)
                self._lock = -1
