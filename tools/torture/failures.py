"""How each function fails: plausibly, as data."""

import errno
from dataclasses import dataclass
from typing import Mapping


@dataclass(frozen=True)
class Failure:
    """A way to fail: what the function gives, and errno; or a part of what it was asked for."""

    name: str
    result: int = -1
    errno: int = 0
    short: bool = False


def _with(*names: str, result: int = -1) -> tuple[Failure, ...]:
    return tuple(Failure(name, result, getattr(errno, name)) for name in names)


def _returned(name: str) -> tuple[Failure, ...]:
    """Functions that give the number of the error instead of setting errno."""
    number = getattr(errno, name)
    return (Failure(name, number, number),)


NOTHING = Failure("nothing", 0)
SHORT = Failure("short", short=True)
# What was buffered is gone, or a half of it was written before.
LOST_HALF = Failure("half", -1, errno.ENOSPC, short=True)
# Results of the packing library.
_BAD_DATA, _NO_MEMORY = -3, -4
_STATUS_127 = 127 << 8

FAILURES: Mapping[str, tuple[Failure, ...]] = {
    "open": _with("ENOENT", "EMFILE"),
    "read": (*_with("EIO", "ENOMEM"), NOTHING, SHORT),
    "write": (*_with("EIO", "EAGAIN"), SHORT),
    "poll": (*_with("ENOMEM"), NOTHING),
    "ppoll": (*_with("ENOMEM", "EINTR"), NOTHING),
    "select": (*_with("ENOMEM", "EINTR"), NOTHING),
    "ioctl": _with("EIO", "ENODEV"),
    "fcntl": _with("EBADF"),
    "fopen": _with("EACCES", "EMFILE", result=0),
    "getc": (*_with("EIO"), Failure("end")),
    "fputs": _with("ENOSPC"),
    "fprintf": _with("ENOSPC"),
    "fflush": (*_with("ENOSPC"), LOST_HALF),
    "fclose": _with("EIO"),
    "tcgetattr": _with("EIO"),
    "tcsetattr": _with("EIO"),
    "stat": _with("EACCES"),
    "lstat": _with("EACCES"),
    "statfs64": _with("EIO"),
    "access": _with("EIO"),
    "mkdir": _with("ENOSPC"),
    "symlink": _with("ENOSPC", "EEXIST"),
    "unlink": _with("EROFS"),
    "chmod": _with("EPERM"),
    "fchmod": _with("EPERM"),
    "chown": _with("EPERM"),
    "ptsname_r": _returned("ENOTTY"),
    "unlockpt": _with("EINVAL"),
    "fork": _with("EAGAIN"),
    "waitpid": _with("EINTR"),
    "system": (*_with("EAGAIN"), Failure("status-127", _STATUS_127)),
    "sched_setscheduler": _with("EPERM"),
    "pthread_create": _returned("EAGAIN"),
    "timer_create": _with("EAGAIN"),
    "timer_settime": _with("EINVAL"),
    "malloc": _with("ENOMEM", result=0),
    "mmap": _with("ENOMEM"),
    "socket": _with("EMFILE"),
    "setsockopt": _with("ENOBUFS"),
    "bind": _with("EADDRINUSE"),
    "recv": (*_with("ENOBUFS"), NOTHING, SHORT),
    "dlopen": (Failure("missing"),),
    "dlsym": (Failure("missing"),),
    "inflateInit2_": (Failure("memory", _NO_MEMORY),),
    "inflate": (Failure("data", _BAD_DATA), Failure("memory", _NO_MEMORY)),
    "reboot": _with("EPERM"),
}
