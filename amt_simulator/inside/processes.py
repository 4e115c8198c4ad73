"""The processes that the handset's init starts: the daemon as a service, and single commands."""

import os
import resource
import signal
import sys
import time
from typing import Callable, NamedTuple, NoReturn

from amt_simulator.inside.loop import Loop

RECORD = "/handset/init.txt"


class Process:
    """A process that init started, and how it ended."""

    def __init__(self, number: int, pid: int, on_exit: Callable[["Process"], None]) -> None:
        self.number = number
        self.pid = pid
        self.on_exit = on_exit
        self.returncode: int | None = None
        # It was ended because it took too long.
        self.is_late = False


class Launch(NamedTuple):
    """How to start a process."""

    argv: list[str]
    program: str
    env: dict[str, str]
    stdout: str
    stderr: str
    directory: str = "/"
    no_randomize: bool = False


def _become(launch: Launch) -> NoReturn:
    """In the new process: be as a fresh process of the handset is, then run the program."""
    for number in (signal.SIGPIPE, signal.SIGINT, signal.SIGTERM, signal.SIGHUP, signal.SIGCHLD):
        signal.signal(number, signal.SIG_DFL)
    signal.pthread_sigmask(signal.SIG_SETMASK, [])
    # A group of its own, but no session: a session leader would take the ttys it opens as its
    # controlling terminal, and their hang-up would end it.
    os.setpgid(0, 0)
    resource.setrlimit(resource.RLIMIT_RTPRIO, (0, 0))
    resource.setrlimit(resource.RLIMIT_CORE, (0, 0))
    if launch.no_randomize:
        import ctypes
        ctypes.CDLL(None).personality(0x0040000)
    append = os.O_WRONLY | os.O_CREAT | os.O_APPEND
    for target, path, flags in ((0, "/dev/null", os.O_RDONLY), (1, launch.stdout, append),
                                (2, launch.stderr, append)):
        fd = os.open(path, flags, 0o644)
        os.dup2(fd, target)
        if fd > 2:
            os.close(fd)
    os.chdir(launch.directory)
    os.umask(0o022)
    os.execve(launch.program or launch.argv[0], launch.argv, launch.env)


def spawn(launch: Launch) -> int:
    """Start a process; returns its id."""
    sys.stderr.flush()
    pid = os.fork()
    if pid == 0:
        try:
            _become(launch)
        except OSError as error:
            os.write(2, f"{launch.program or launch.argv[0]}: {error.strerror}\n".encode())
        finally:
            os._exit(127)
    return pid


class Processes:
    """Starts processes, reaps them and everybody's orphans, and keeps the record of it."""

    def __init__(self, loop: Loop) -> None:
        self._loop = loop
        self._known: dict[int, Process] = {}
        self._count = 0
        self._unwritten = ""
        wake_read, wake_write = os.pipe2(os.O_NONBLOCK | os.O_CLOEXEC)
        signal.set_wakeup_fd(wake_write, warn_on_full_buffer=False)
        signal.signal(signal.SIGCHLD, lambda *_: None)
        self._wake = wake_read
        loop.watch(wake_read, self._reap)

    def start(self, what: str, launch: Launch, on_exit: Callable[[Process], None]) -> Process:
        """Start a process, WHAT in the record; ON_EXIT is told when it has ended."""
        self._count += 1
        pid = spawn(launch)
        process = Process(self._count, pid, on_exit)
        self._known[pid] = process
        self._record(f"start #{process.number} pid {pid}: {what}: {' '.join(launch.argv)}")
        return process

    def _reap(self) -> None:
        try:
            os.read(self._wake, 4096)
        except BlockingIOError:
            pass
        while True:
            try:
                pid, status = os.waitpid(-1, os.WNOHANG)
            except ChildProcessError:
                return
            if pid == 0:
                return
            process = self._known.pop(pid, None)
            if process is None:
                continue
            process.returncode = os.waitstatus_to_exitcode(status)
            how = (f"status {process.returncode}" if process.returncode >= 0
                   else f"signal {-process.returncode}")
            self._record(f"exit #{process.number} pid {pid}: {how}")
            process.on_exit(process)

    def _record(self, text: str) -> None:
        now = time.time()
        stamp = time.strftime("%H:%M:%S", time.gmtime(now)) + f".{int(now * 1000) % 1000:03d}"
        self._unwritten += f"{stamp} {text}\n"
        try:
            with open(RECORD, "a", encoding="utf-8") as stream:
                stream.write(self._unwritten)
        except OSError:
            # The disk is full: the next record may find room for this one too.
            return
        self._unwritten = ""


class Service:
    """The daemon as init knows it: started, watched, and started again when it has ended."""

    def __init__(self, loop: Loop, processes: Processes, launch: Launch, restart: bool,
                 pause: float, on_end: Callable[[], None]) -> None:
        self.restart = restart
        self._loop = loop
        self._processes = processes
        self._launch = launch
        self._pause = pause
        self._on_end = on_end
        self._current: Process | None = None
        self._due = False

    @property
    def pid(self) -> int:
        """The daemon's process id, 0 when it does not run."""
        return self._current.pid if self._current else 0

    @property
    def number(self) -> int:
        """The number under which the record lists the running daemon, 0 when it does not run."""
        return self._current.number if self._current else 0

    def start(self) -> int:
        """Start the daemon unless it runs; returns its process id."""
        if not self._current:
            self._current = self._processes.start("daemon", self._launch, self._ended)
        return self._current.pid

    def _ended(self, _process: Process) -> None:
        self._current = None
        self._on_end()
        if self.restart and not self._due:
            self._due = True
            self._loop.after(self._pause, self._again)

    def _again(self) -> None:
        self._due = False
        if self.restart:
            self.start()
