"""The PC as the checks see it: its processes, programs, users, clock and disks."""

from __future__ import annotations

import ctypes
import grp
import os
import pwd
import shutil
import subprocess
import time
from dataclasses import dataclass
from pathlib import Path
from typing import Callable

from amt_station.found_ports import PROC, Holder, holders, running

_PROGRAM_SECONDS = 20.0
_TIMEX_SIZE = 1024
_UNSYNCHRONISED = 5


class NotKnown(Exception):
    """Something that the system does not tell; the text says why."""


@dataclass(frozen=True)
class User:
    """Who runs the station: the groups of this process, and those that the system has noted."""

    name: str
    groups: frozenset[str]
    noted: frozenset[str]


def this_user() -> User:
    """The user of this process."""
    groups = frozenset(_group(number) for number in {os.getegid(), *os.getgroups()})
    try:
        entry = pwd.getpwuid(os.geteuid())
    except KeyError:
        return User(str(os.geteuid()), groups, groups)
    return User(entry.pw_name, groups, frozenset(
        _group(number) for number in os.getgrouplist(entry.pw_name, entry.pw_gid)))


def _group(number: int) -> str:
    try:
        return grp.getgrgid(number).gr_name
    except KeyError:
        return str(number)


def group_of(path: str) -> str:
    """The group that a file belongs to."""
    return _group(os.stat(path).st_gid)


def kernel_clock_is_kept() -> bool:
    """Whether something keeps the system's clock right, as the kernel has been told."""
    buffer = ctypes.create_string_buffer(_TIMEX_SIZE)
    try:
        # Zeros in the request change nothing.
        state = ctypes.CDLL(None, use_errno=True).adjtimex(buffer)
    except (OSError, AttributeError) as problem:
        raise NotKnown("this system does not tell whether its clock is kept") from problem
    if state < 0:
        raise NotKnown(f"the kernel does not tell of its clock: {os.strerror(ctypes.get_errno())}")
    return bool(state != _UNSYNCHRONISED)


@dataclass(frozen=True)
class Computer:
    """Where the checks look. ``search_path`` is where programs are, the environment's if None."""

    proc: Path = PROC
    search_path: str | None = None
    user: Callable[[], User] = this_user
    may_use: Callable[[str], bool] = lambda path: os.access(path, os.R_OK | os.W_OK)
    now: Callable[[], float] = time.time
    clock_is_kept: Callable[[], bool] = kernel_clock_is_kept
    free_bytes: Callable[[Path], int] = lambda path: shutil.disk_usage(path).free

    def holders(self, device: str) -> list[Holder]:
        """Who has a device open, of those that this user may look at."""
        return holders(device, self.proc)

    def running(self, *commands: str) -> list[Holder]:
        """The processes of these names; ``NotKnown`` where those of other users are hidden."""
        try:
            (self.proc / "1" / "comm").read_bytes()
        except OSError as problem:
            raise NotKnown("the processes of other users are hidden here") from problem
        return running(commands, self.proc)

    def has(self, program: str) -> bool:
        """Whether there is such a program."""
        return shutil.which(program, path=self.search_path) is not None

    def output(self, program: str, *arguments: str) -> str:
        """What a program prints, on both streams and whatever its exit status.

        ``NotKnown`` when it cannot be run.
        """
        path = shutil.which(program, path=self.search_path)
        if path is None:
            raise NotKnown(f"there is no {program} here")
        try:
            return subprocess.run(
                [path, *arguments], stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                stderr=subprocess.STDOUT, timeout=_PROGRAM_SECONDS, check=False,
                env={**os.environ, "LC_ALL": "C"}).stdout.decode("utf-8", "replace")
        except (OSError, subprocess.TimeoutExpired) as problem:
            raise NotKnown(f"{program} gives no answer: {problem}") from problem
