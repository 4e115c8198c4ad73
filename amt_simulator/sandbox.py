"""The sandbox around a handset: private namespaces by bubblewrap, and what its end means."""

import os
import select
import shutil
import signal
import socket
import subprocess
import time
from pathlib import Path
from typing import Mapping

from amt_simulator.client import socket_address
from amt_simulator.errors import HandsetError
from amt_simulator.program import DAEMON_COPY, INSIDE, MODULE_DIRECTORY
from amt_simulator.root import DEVICE_FILES
from amt_simulator.tree import PROC_DRIVER, ROOT, STATE
from amt_simulator.waiting import scaled

PYTHON = "/usr/bin/python3"
UP_SECONDS = 20.0
END_SECONDS = 10.0

# The status with which the sandbox ends when the handset's kernel was told to power off: the end
# of its process 1 is then reported as one by SIGINT, which process 1 ignores otherwise.
POWERED_OFF = 128 + signal.SIGINT

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
    words += ["--chdir", "/", PYTHON, "-s", "-m", "amt_simulator.inside.supervisor",
              f"{control}", f"{ready}"]
    return words


class Sandbox:
    """One handset's sandbox, from its start to its end."""

    def __init__(self, directory: Path, program: str, shared: Mapping[str, Path]) -> None:
        if shutil.which("bwrap") is None:
            raise HandsetError(NO_BUBBLEWRAP)
        self._messages = directory / "sandbox.txt"
        ready_read, ready_write = os.pipe()
        with socket.socket(socket.AF_UNIX, socket.SOCK_SEQPACKET) as listener:
            # It listens before the handset's init exists: nobody who asks comes too early.
            with socket_address(directory / "control") as address:
                listener.bind(address)
            listener.listen(64)
            with open(self._messages, "wb") as messages:
                self._process = subprocess.Popen(
                    command(directory, program, shared, listener.fileno(), ready_write),
                    stdin=subprocess.DEVNULL, stdout=messages, stderr=messages,
                    pass_fds=(listener.fileno(), ready_write), start_new_session=True)
        os.close(ready_write)
        try:
            self._wait_up(ready_read)
        except BaseException:
            self.kill()
            raise
        finally:
            os.close(ready_read)

    def _wait_up(self, ready: int) -> None:
        if not select.select([ready], [], [], scaled(UP_SECONDS))[0]:
            raise HandsetError(f"the handset's init is not up after {scaled(UP_SECONDS):.0f} s")
        if not os.read(ready, 16):
            self._process.wait()
            raise HandsetError(self._why())

    def _why(self) -> str:
        text = self._messages.read_text("utf-8", "replace").strip()
        if any(sign in text for sign in NAMESPACE_SIGNS):
            who = "root" if os.getuid() == 0 else "an ordinary user"
            return f"{NO_NAMESPACES.format(who=who)} (bubblewrap says: {text.splitlines()[-1]})"
        return f"the handset did not come up: {text.splitlines()[-1] if text else 'no message'}"

    @property
    def status(self) -> int | None:
        """The status with which the sandbox ended, None while it is there."""
        return self._process.poll()

    @property
    def powered_off(self) -> bool:
        """Whether the handset ended by power-off."""
        return self.status == POWERED_OFF

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
