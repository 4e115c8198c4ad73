"""The handset's files, found as the handset finds them: no link of it leads out of its root.

What runs in the handset may lay links. Followed by the PC's kernel they would lead to the PC's own
files; so each step of a path is opened by itself, and a link is resolved from the handset's root.
"""

import errno
import os
import shutil
import stat
import uuid
from contextlib import contextmanager
from pathlib import Path
from typing import BinaryIO, Iterator, Union

from amt_simulator.errors import HandsetError

# A file to place: its content, content and mode, a file of the PC to copy, or None for no file.
Content = Union[str, bytes, Path, tuple[Union[str, bytes], int], None]

# A handset's directory on the PC: its root, and what is mounted into it.
ROOT, STATE, PROC_DRIVER = "root", "state", "proc-driver"
MOUNTS = {"/": ROOT, "/handset": STATE, "/proc/driver": PROC_DRIVER}
# Part of the handset only while it is up, and only inside; what is mounted there is seen here too.
INSIDE_ONLY = ("/proc", "/dev", "/usr", "/storage/sdcard1")
MOST_LINKS = 40
STEP = os.O_PATH | os.O_DIRECTORY | os.O_NOFOLLOW | os.O_CLOEXEC
LAST = os.O_NOFOLLOW | os.O_CLOEXEC | os.O_NONBLOCK
FILE_MODE = 0o644


def _names(path: str) -> list[str]:
    return [name for name in path.split("/") if name not in ("", ".")]


def _is_under(place: str, top: str) -> bool:
    return place == top or place.startswith(top + "/")


class _Walk:
    """One way through the tree: an open directory for each step from the root on."""

    def __init__(self, directory: Path, inside: str) -> None:
        if not inside.startswith("/"):
            raise HandsetError(f"{inside}: a path in the handset begins with /")
        self._directory = directory
        self._inside = inside
        self._links = 0
        self._left = _names(inside)
        self._steps: list[tuple[str, int]] = []
        self._enter_root()

    @property
    def fd(self) -> int:
        """The directory in which the walk stands."""
        return self._steps[-1][1]

    def host_path(self) -> Path:
        """Where on the PC the walk stands, and what is left of its way."""
        place = os.path.join(self._steps[-1][0], *self._left)
        mount = max((mount for mount in MOUNTS if mount == "/" or _is_under(place, mount)), key=len)
        return self._directory / MOUNTS[mount] / place[len(mount):].lstrip("/")

    def close(self) -> None:
        """Leave the tree."""
        while self._steps:
            os.close(self._steps.pop()[1])

    def go(self, make: bool, follow: bool) -> str:
        """Go to the directory of the last name, which is returned; MAKE directories on the way.

        With FOLLOW, a last name that is a link is followed too.
        """
        while self._left:
            name, *others = self._left
            is_last = not others
            place = os.path.join(self._steps[-1][0], name)
            self._check(place, is_last)
            if name == "..":
                if len(self._steps) > 1:
                    os.close(self._steps.pop()[1])
            elif place in MOUNTS:
                self._steps.append((place, os.open(self._directory / MOUNTS[place], STEP)))
            elif (not is_last or follow) and (target := self._link(name)) is not None:
                others = _names(target) + others
            elif is_last:
                return name
            else:
                self._enter(place, name, make)
            self._left = others
        return "."

    def _check(self, place: str, is_last: bool) -> None:
        """Refuse what is not on the PC, but for the way to what is mounted below it."""
        is_way = not is_last and any(_is_under(mount, place) for mount in MOUNTS)
        if any(_is_under(place, top) for top in INSIDE_ONLY) and not is_way and not any(
                _is_under(place, mount) for mount in MOUNTS if mount != "/"):
            raise HandsetError(f"{self._inside} exists only inside the handset: use its commands")

    def _link(self, name: str) -> str | None:
        """Where the link NAME leads, None when it is none."""
        try:
            target = os.readlink(name, dir_fd=self.fd)
        except OSError:
            return None
        self._links += 1
        if self._links > MOST_LINKS:
            raise OSError(errno.ELOOP, os.strerror(errno.ELOOP), self._inside)
        if target.startswith("/"):
            self.close()
            self._enter_root()
        return target

    def _enter_root(self) -> None:
        self._steps.append(("/", os.open(self._directory / ROOT, STEP)))

    def _enter(self, place: str, name: str, make: bool) -> None:
        if make:
            try:
                os.mkdir(name, dir_fd=self.fd)
            except FileExistsError:
                pass
        self._steps.append((place, os.open(name, STEP, dir_fd=self.fd)))


@contextmanager
def _found(directory: Path, inside: str, make: bool = False,
           follow: bool = False) -> Iterator[tuple[int, str]]:
    """The directory in which the last name of INSIDE stands, and that name."""
    walk = _Walk(directory, inside)
    try:
        name = walk.go(make, follow)
        yield walk.fd, name
    finally:
        walk.close()


def host_path(directory: Path, inside: str) -> Path:
    """Where on the PC the handset's file INSIDE lies; a link there is not followed.

    It is so at this moment: what runs in the handset may lay links in the way later.
    """
    walk = _Walk(directory, inside)
    try:
        walk.go(make=False, follow=False)
    except (FileNotFoundError, NotADirectoryError):
        pass
    finally:
        path = walk.host_path()
        walk.close()
    if ".." in path.parts:
        raise HandsetError(f"{inside} is not there")
    return path


def _open_plain(fd: int, inside: str) -> BinaryIO:
    """The plain file FD as a stream that owns it."""
    stream = os.fdopen(fd, "rb")
    mode = os.fstat(fd).st_mode
    if not stat.S_ISREG(mode):
        stream.close()
        if stat.S_ISDIR(mode):
            raise IsADirectoryError(errno.EISDIR, os.strerror(errno.EISDIR), inside)
        raise HandsetError(f"{inside} is no plain file")
    return stream


def read(directory: Path, inside: str) -> bytes:
    """The content of the handset's file INSIDE."""
    with _found(directory, inside, follow=True) as (parent, name):
        with _open_plain(os.open(name, os.O_RDONLY | LAST, dir_fd=parent), inside) as stream:
            return stream.read()


def sizes(directory: Path, inside: str) -> dict[str, int]:
    """The plain files in and below the handset's directory (or file) INSIDE, with their sizes."""
    with _found(directory, inside, follow=True) as (parent, name):
        status = os.stat(name, dir_fd=parent, follow_symlinks=False)
        if stat.S_ISREG(status.st_mode):
            return {inside: status.st_size}
        found = {}
        for place, _, files, fd in os.fwalk(name, dir_fd=parent):
            for file in files:
                status = os.stat(file, dir_fd=fd, follow_symlinks=False)
                if stat.S_ISREG(status.st_mode):
                    way = os.path.relpath(os.path.join(place, file), name)
                    found[os.path.join(inside, way)] = status.st_size
        return found


def _copied(source: Path, inside: str) -> tuple[bytes, int]:
    """The bytes and the mode of a file of the PC."""
    try:
        with _open_plain(os.open(source, os.O_RDONLY | os.O_CLOEXEC | os.O_NONBLOCK),
                         str(source)) as stream:
            return stream.read(), stat.S_IMODE(os.fstat(stream.fileno()).st_mode)
    except OSError as error:
        raise HandsetError(f"cannot place {source} as {inside}: {error.strerror}") from None


def _remove(parent: int, name: str) -> None:
    try:
        is_directory = stat.S_ISDIR(os.stat(name, dir_fd=parent, follow_symlinks=False).st_mode)
    except FileNotFoundError:
        return
    if is_directory:
        shutil.rmtree(name, dir_fd=parent)
    else:
        os.unlink(name, dir_fd=parent)


def place(directory: Path, inside: str, content: Content) -> None:
    """Put a file into the handset, whole at once, in place of whatever stands there."""
    if content is None:
        try:
            with _found(directory, inside) as (parent, name):
                _remove(parent, name)
        except (FileNotFoundError, NotADirectoryError):
            pass
        return
    if isinstance(content, Path):
        content = _copied(content, inside)
    data, mode = content if isinstance(content, tuple) else (content, FILE_MODE)
    with _found(directory, inside, make=True) as (parent, name):
        if name == ".":
            raise HandsetError(f"{inside} is no place for a file")
        fresh = f".{uuid.uuid4().hex}"
        fd = os.open(fresh, os.O_WRONLY | os.O_CREAT | os.O_EXCL | LAST, 0o600, dir_fd=parent)
        try:
            with os.fdopen(fd, "wb") as stream:
                stream.write(data.encode("utf-8", "surrogateescape") if isinstance(data, str)
                             else data)
                os.fchmod(fd, mode)
            try:
                os.rename(fresh, name, src_dir_fd=parent, dst_dir_fd=parent)
            except IsADirectoryError:
                _remove(parent, name)
                os.rename(fresh, name, src_dir_fd=parent, dst_dir_fd=parent)
        except BaseException:
            os.unlink(fresh, dir_fd=parent)
            raise
