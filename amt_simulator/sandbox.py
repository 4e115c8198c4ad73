"""The sandbox around a handset: private namespaces by bubblewrap, and what its end means."""

import os
import select
import shutil
import signal
import socket
import subprocess
import time
from concurrent.futures import Future, ThreadPoolExecutor
from functools import lru_cache
from pathlib import Path
from typing import IO, Mapping

from amt_simulator.client import socket_address
from amt_simulator.errors import HandsetError, how_it_ended
from amt_simulator.program import DAEMON_COPY, INSIDE, MODULE_DIRECTORY
from amt_simulator.root import DEVICE_FILES
from amt_simulator.tree import PROC_DRIVER, ROOT, STATE
from amt_simulator.waiting import is_ready, scaled

# Init needs the standard library only: what is installed beside it is not even looked for.
PYTHON = ("/usr/bin/python3", "-s", "-S")
UP_SECONDS = 40.0
END_SECONDS = 10.0

# The status with which the sandbox ends when the handset's kernel was told to power off: the end
# of its process 1 is then reported as one by SIGINT, which process 1 ignores otherwise.
SIGNAL = 128
POWERED_OFF = SIGNAL + signal.SIGINT
TAKEN_DOWN = 0

NO_BUBBLEWRAP = ("bubblewrap is not installed; it is the sandbox of the handset: "
                 "apt-get install bubblewrap")
# What bubblewrap says when the system refuses it the namespaces or what belongs to them.
NAMESPACE_SIGNS = ("namespace", "uid map", "Can't mount proc", "Failed to mount")
NO_NAMESPACES = ("this system does not let {who} make user namespaces, which the handset lives in; "
                 "allow them (sysctl user.max_user_namespaces, kernel.unprivileged_userns_clone=1, "
                 "kernel.apparmor_restrict_unprivileged_userns=0), or, in a container, start it "
                 "with the right to make them")


def command(directory: Path, program: str, shared: Mapping[str, Path], control: int,
            ready: int) -> list[str]:
    """The command line that enters the handset in DIRECTORY, the daemon at PROGRAM."""
    words = [
        "bwrap", "--unshare-user", "--unshare-pid", "--unshare-net", "--unshare-ipc",
        "--unshare-uts", "--hostname", "handset", "--uid", "0", "--gid", "0", "--cap-add", "ALL",
        "--as-pid-1", "--die-with-parent", "--clearenv", "--setenv", "PYTHONPATH", INSIDE,
        "--setenv", "PYTHONDONTWRITEBYTECODE", "1",
        "--bind", f"{directory / ROOT}", "/",
        "--ro-bind", "/usr", "/usr",
        # Its /dev comes with a devpts of its own and ptmx as a link into it.
        "--dev", "/dev",
        # Root of the PC would be root enough for some of the kernel's settings: none can be set.
        "--proc", "/proc", "--remount-ro", "/proc",
        "--bind", f"{directory / PROC_DRIVER}", "/proc/driver",
        "--bind", f"{directory / STATE}", "/handset",
        "--ro-bind", f"{directory / MODULE_DIRECTORY}", INSIDE,
        "--ro-bind", f"{directory / DAEMON_COPY}", program,
    ]
    for inside, outside in shared.items():
        words += ["--bind", f"{outside}", inside]
    for node, stand_in in DEVICE_FILES.items():
        words += ["--symlink", stand_in, node]
    words += ["--chdir", "/", *PYTHON, "-m", "amt_simulator.inside.supervisor",
              f"{control}", f"{ready}"]
    return words


@lru_cache(maxsize=1)
def _spawner(_process: int) -> ThreadPoolExecutor:
    """The thread that starts the sandboxes of this process.

    A sandbox ends with the thread that started it, so that one stays as long as the process does.
    """
    return ThreadPoolExecutor(max_workers=1, thread_name_prefix="handsets")


def _spawn(words: list[str], messages: IO[bytes],
           passed: tuple[int, ...]) -> "subprocess.Popen[bytes]":
    """Start a sandbox."""
    def start() -> "subprocess.Popen[bytes]":
        return subprocess.Popen(words, stdin=subprocess.DEVNULL, stdout=messages, stderr=messages,
                                pass_fds=passed, start_new_session=True)

    def end(late: "Future[subprocess.Popen[bytes]]") -> None:
        if not late.exception():
            late.result().kill()

    started = _spawner(os.getpid()).submit(start)
    try:
        return started.result()
    except BaseException:
        # Interrupted: nobody will know of it.
        started.add_done_callback(end)
        raise


class Sandbox:
    """One handset's sandbox, from its start to its end."""

    def __init__(self, directory: Path, program: str, shared: Mapping[str, Path]) -> None:
        if shutil.which("bwrap") is None:
            raise HandsetError(NO_BUBBLEWRAP)
        self._messages = directory / "sandbox.txt"
        ready_read, ready_write = os.pipe()
        try:
            try:
                self._process = self._start(directory, program, shared, ready_write)
            finally:
                os.close(ready_write)
            try:
                self._wait_up(ready_read)
            except BaseException:
                self.kill()
                raise
        finally:
            os.close(ready_read)

    def _start(self, directory: Path, program: str, shared: Mapping[str, Path],
               ready: int) -> "subprocess.Popen[bytes]":
        with socket.socket(socket.AF_UNIX, socket.SOCK_SEQPACKET) as listener:
            # It listens before the handset's init exists: nobody who asks comes too early.
            with socket_address(directory / "control") as address:
                listener.bind(address)
            listener.listen(64)
            with open(self._messages, "wb") as messages:
                return _spawn(command(directory, program, shared, listener.fileno(), ready),
                              messages, (listener.fileno(), ready))

    def _wait_up(self, ready: int) -> None:
        if not is_ready(ready, select.POLLIN, scaled(UP_SECONDS)):
            raise HandsetError(f"the handset's init is not up after {scaled(UP_SECONDS):.0f} s")
        if not os.read(ready, 16):
            self._process.wait()
            raise HandsetError(self._why())

    def _why(self) -> str:
        text = self._messages.read_text("utf-8", "replace").strip()
        if any(sign in text for sign in NAMESPACE_SIGNS):
            who = "root" if os.getuid() == 0 else "an ordinary user"
            return f"{NO_NAMESPACES.format(who=who)} (bubblewrap says: {text.splitlines()[-1]})"
        return f"the handset did not come up: {self._last_message() or 'no message'}"

    @property
    def status(self) -> int | None:
        """The status with which the sandbox ended, None while it is there."""
        return self._process.poll()

    @property
    def powered_off(self) -> bool:
        """Whether the handset ended by power-off."""
        return self.status == POWERED_OFF

    @property
    def death(self) -> str:
        """What there is to say when it ended neither by power-off nor because it was asked to."""
        status = self.status
        if status is None or status in (TAKEN_DOWN, POWERED_OFF):
            return ""
        # Of a process 1 that a signal ended, bubblewrap tells as a shell does.
        how = how_it_ended(SIGNAL - status if status > SIGNAL else status)
        text = self._last_message()
        return f"the sandbox has ended with {how}" + (f": {text}" if text else "")

    def _last_message(self) -> str:
        text = self._messages.read_text("utf-8", "replace").strip()
        return text.splitlines()[-1] if text else ""

    def wait_end(self, timeout: float) -> bool:
        """Wait until the sandbox has ended; False when it has not in time."""
        end = time.monotonic() + timeout
        while self.status is None and time.monotonic() < end:
            time.sleep(0.002)
        return self.status is not None

    def kill(self) -> None:
        """End the sandbox and everything in it, at once."""
        # Process 1 dies with the process that entered the sandbox, all others with process 1.
        self._process.kill()
        self._process.wait()
