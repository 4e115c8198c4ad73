"""A simulated handset: made, started, driven and taken down from Python."""

import json
import re
import signal as signals
from dataclasses import dataclass
from pathlib import Path
from types import TracebackType
from typing import Any, Mapping, Sequence

from . import program as programs
from . import root
from .client import Client
from .errors import HandsetError
from .kinds import DEFAULT_CONFIG, KINDS, LINE_KEYS, config_text
from .line import AppLine, Line
from .log import Log
from .root import Content
from .rundir import RunDirectory
from .sandbox import END_SECONDS, Sandbox
from .usb import Usb
from .waiting import scaled, wait_until

MODEM_MODES = ("table", "silent", "held", "absent")
RESTART_SECONDS = 0.3
RECORD = re.compile(r"^\S+ (?P<what>start|exit) #(?P<number>\d+) pid (?P<pid>\d+): (?P<how>.*)$")


@dataclass(frozen=True)
class Completed:
    """A command that ran in the handset; a status below 0 is the signal that ended it."""

    status: int
    stdout: bytes
    stderr: bytes


@dataclass(frozen=True)
class ProcessInfo:
    """A look at a process of the handset."""

    pid: int
    command: list[str]
    state: str
    # Thread id to its name, state and the kernel function that it waits in.
    threads: dict[int, dict[str, str]]
    descriptors: dict[int, str]
    children: list[int]
    resident_kib: int
    policy: int


class Handset:
    """A handset with the unmodified daemon in it. A context manager: entered, it is up.

    path          how the daemon is started: "pc", "packet", "simplified", "usb-inserted"
    build         a preset's name or a build directory; None together with `daemon`
    daemon        another program in the daemon's place, for tests of the simulator
    args          further arguments for the daemon
    config        configuration settings that differ from the usual ones; None takes one out
    files         files to place, path in the handset to content: text, bytes, (content, mode),
                  a Path of the PC to copy, or None for no such file
    properties    system properties; None takes one away
    answers       scripted answers of stand-ins: function to a line or a list of lines
    modem         "table": answers by its table; "silent": hears, never answers; "held": its ttys
                  wait for the test to speak; "absent": there are no modem ttys
    modem_answers whole command line to the raw answer that replaces the table's
    restart       whether init starts the daemon again when it has ended
    start         whether init starts the daemon at all; `start()` does it later
    screen        width and height of the framebuffer
    card          size of the memory card in bytes; None: no card
    usb_state     the USB link's state when the handset comes up; None: as the path wants it
    env           further environment of the daemon
    shared        directories of the PC that the handset may write to, by their path inside
    keep          leave the directory in place when the handset is taken down
    """

    def __init__(self, path: str = "pc", build: str | Path | None = "release", *,
                 daemon: Path | None = None, args: Sequence[str] = (),
                 config: Mapping[str, str | None] | None = None,
                 files: Mapping[str, Content] | None = None,
                 properties: Mapping[str, str | None] | None = None,
                 answers: Mapping[str, str | list[str] | None] | None = None,
                 modem: str = "table", modem_answers: Mapping[str, str] | None = None,
                 restart: bool = True, start: bool = True, screen: tuple[int, int] = (480, 800),
                 card: int | None = 64 << 20, usb_state: str | None = None,
                 env: Mapping[str, str] | None = None,
                 shared: Mapping[str, Path] | None = None, keep: bool = False) -> None:
        if path not in KINDS:
            raise HandsetError(f"no such path: {path}; there are {', '.join(KINDS)}")
        if modem not in MODEM_MODES:
            raise HandsetError(f"no such modem mode: {modem}; there are {', '.join(MODEM_MODES)}")
        self.kind = KINDS[path]
        self.program = programs.find_program(build, daemon)
        self._args = tuple(args)
        self._config = dict(config or {})
        self._files = dict(files or {})
        self._properties = dict(properties or {})
        self._answers = dict(answers or {})
        self._modem_mode = modem
        self._modem_answers = dict(modem_answers or {})
        self._restart = restart
        self._start = start
        self._screen = screen
        self._card = card
        self._usb_state = usb_state or self.kind.usb_state
        self._env = dict(env or {})
        self._shared = dict(shared or {})
        self._keep = keep
        self._directory: RunDirectory | None = None
        self._sandbox: Sandbox | None = None

    # coming up and going down

    def __enter__(self) -> "Handset":
        self.up()
        return self

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        self.down()

    def up(self) -> None:
        """Bring the handset up; its init serves, and has started the daemon, when this returns."""
        self._directory = RunDirectory()
        try:
            self._furnish(self.directory)
            self.client = Client(self.directory / "control")
            self.log = Log(self.directory / root.STATE / "log.txt")
            self.pc = Line(self.client, "pc")
            self.modem = Line(self.client, "modem")
            self.mux = Line(self.client, "mux")
            self.app = AppLine(self.client)
            self.usb = Usb(self.client, self.log.tail)
            self._sandbox = Sandbox(self.directory, self.kind.program, self._shared)
        except BaseException:
            self.down()
            raise

    def down(self) -> None:
        """Take the handset down: every process, mount and file of it."""
        if self._directory is None:
            return
        if self._sandbox is not None:
            for line in (self.pc, self.modem, self.mux, self.app):
                line.forget()
            self._end_sandbox(self._sandbox)
        self._directory.close(self._keep)
        self._directory = None

    def _end_sandbox(self, sandbox: Sandbox) -> None:
        try:
            self.client.ask("shutdown")
        except (HandsetError, TimeoutError):
            # It is down already, or its init does not listen any more.
            pass
        else:
            sandbox.wait_end(scaled(END_SECONDS))
        sandbox.kill()

    def _furnish(self, directory: Path) -> None:
        root.build_root(directory)
        root.build_devices(directory, *self._screen)
        programs.install(directory, self.program)
        root.place(directory, self.kind.config, config_text(self._config))
        root.place(directory, self.kind.program, ("", 0o755))
        root.place(directory, "/sys/class/android_usb/android0/state", self._usb_state + "\n")
        properties: dict[str, str | None] = {
            **root.PROPERTIES, **self.kind.properties, **self._properties}
        root.write_properties(directory, properties)
        root.write_answers(directory, self._answers)
        for inside, content in self._files.items():
            root.place(directory, inside, content)
        root.place(directory, "/handset/init.json", json.dumps(self._specification(), indent=1))
        for name in ("log.txt", "calls.txt", "stdout.txt", "stderr.txt", "init.txt"):
            root.place(directory, f"/handset/{name}", b"")

    def _specification(self) -> dict[str, Any]:
        settings: dict[str, str | None] = {**DEFAULT_CONFIG, **self._config}
        return {
            "daemon": {"argv": [self.kind.program, *self.kind.args, *self._args],
                       "program": self.kind.program, "env": self.environment(),
                       "no_randomize": self.program.sanitizer == "tsan"},
            "start": self._start, "restart": self._restart, "restart_pause": RESTART_SECONDS,
            "lines": {name: settings[key] or "" for name, key in LINE_KEYS.items()},
            "modem": self._modem_mode, "modem_answers": self._modem_answers, "card": self._card,
        }

    def environment(self) -> dict[str, str]:
        """The environment in which init starts the daemon."""
        env = {"PATH": "/system/bin:/usr/sbin:/usr/bin:/sbin:/bin", "HOME": "/", "TZ": "UTC0",
               "LD_LIBRARY_PATH": "/system/lib"}
        for name, place in (("LOG", "log.txt"), ("PROPERTIES", "properties"),
                            ("CALLS", "calls.txt"), ("ANSWERS", "answers"),
                            ("DEVICES", "devices")):
            env[f"VX_HOST_{name}"] = f"/handset/{place}"
        if self.program.has_preload:
            env["LD_PRELOAD"] = f"/system/lib/{programs.PRELOAD}"
        if self.program.sanitizer:
            env.update(programs.sanitizer_environment())
        return {**env, **self._env}

    # what there is to see

    @property
    def directory(self) -> Path:
        """The handset's directory on the PC."""
        if self._directory is None:
            raise HandsetError("the handset is not up")
        return self._directory.path

    def path(self, inside: str) -> Path:
        """Where on the PC the handset's file INSIDE lies."""
        return root.host_path(self.directory, inside)

    def read(self, inside: str) -> bytes:
        """The content of a file of the handset."""
        return self.path(inside).read_bytes()

    def text(self, inside: str) -> str:
        """The content of a file of the handset as text."""
        return self.read(inside).decode("utf-8", "surrogateescape")

    def place(self, inside: str, content: Content) -> None:
        """Place a file while the handset is up; None takes it away."""
        root.place(self.directory, inside, content)

    def wait_file(self, inside: str, content: "bytes | str | None" = None,
                  timeout: float | None = None) -> bytes:
        """Wait until a file exists and, when given, has this content; returns the content."""
        wanted = content.encode() if isinstance(content, str) else content
        path = self.path(inside)

        def attempt() -> tuple[bytes] | None:
            try:
                data = path.read_bytes()
            except OSError:
                return None
            return (data,) if wanted is None or data == wanted else None

        what = inside if wanted is None else f"{inside} to hold {wanted!r}"
        return wait_until(attempt, what, timeout, self.log.tail)[0]

    def stdout(self) -> bytes:
        """What the daemon has printed, all its starts together."""
        return self.read("/handset/stdout.txt")

    def stderr(self) -> bytes:
        """What the daemon has printed on standard error."""
        return self.read("/handset/stderr.txt")

    def calls(self) -> list[str]:
        """The recorded calls of the stand-ins, a line each."""
        return self.text("/handset/calls.txt").splitlines()

    def get_property(self, name: str) -> str | None:
        """A system property; None when it is not set."""
        try:
            return self.text(f"/handset/properties/{name}")
        except FileNotFoundError:
            return None

    def set_property(self, name: str, value: str | None) -> None:
        """Set a system property; None takes it away."""
        root.write_properties(self.directory, {name: value})

    def answer(self, function: str, *lines: str) -> None:
        """Script what a stand-in function answers from now on; no line: as if never scripted."""
        root.write_answers(self.directory, {function: list(lines) or None})

    # the daemon

    def wait_ready(self, timeout: float | None = None) -> None:
        """Wait until the daemon that runs, or is being started, serves its lines."""
        pid = self.pid or wait_until(lambda: self.pid or None, "the daemon to run", timeout)

        def attempt() -> bool:
            texts = [record.text for record in self.log.records() if record.pid == pid]
            return all(any(text in line for line in texts) for text in self.kind.ready)

        wait_until(attempt, f"the daemon to serve ({self.kind.ready})", timeout, self._story)
        if self.kind.name == "packet":
            wait_until(lambda: bool(self.client.ask("app_publication")["publication"]),
                       "the app line to be published", timeout, self._story)
        else:
            self.usb.wait_listener(timeout)

    @property
    def pid(self) -> int:
        """The daemon's process id in the handset; 0 while it does not run."""
        return int(self.client.ask("daemon")["pid"])

    def start(self) -> int:
        """Have init start the daemon unless it runs; returns its process id."""
        return int(self.client.ask("start")["pid"])

    def signal(self, number: int, tid: int = 0, pid: int = 0) -> None:
        """Send a signal to the daemon (or the process PID), or to one of its threads."""
        self.client.ask("signal", signal=int(number), tid=tid, pid=pid)

    def stop(self, number: int = signals.SIGTERM, timeout: float | None = None) -> int:
        """End the daemon by a signal, for good; returns its exit status."""
        self.set_restart(False)
        ended = len(self.exits())
        self.signal(number)
        return self.wait_exit(ended, timeout)

    def set_restart(self, on: bool) -> None:
        """Whether init starts the daemon again when it has ended."""
        self.client.ask("restart", on=on)

    def inspect(self, pid: int = 0) -> ProcessInfo:
        """Look at the daemon, or at the process PID: threads, descriptors, children, memory."""
        answer = self.client.ask("inspect", pid=pid)
        for name in ("threads", "descriptors"):
            answer[name] = {int(key): value for key, value in answer[name].items()}
        return ProcessInfo(**answer)

    def processes(self) -> dict[int, list[str]]:
        """Every process of the handset with its command line."""
        found = self.client.ask("processes")["processes"]
        return {int(pid): command for pid, command in found.items()}

    def exits(self) -> list[int]:
        """The exit statuses of the daemon so far, in order; below 0: ended by that signal."""
        records = [match for line in self.text("/handset/init.txt").splitlines()
                   if (match := RECORD.match(line))]
        numbers = {record["number"] for record in records
                   if record["what"] == "start" and record["how"].startswith("daemon: ")}
        statuses = []
        for record in records:
            if record["what"] == "exit" and record["number"] in numbers:
                kind, value = record["how"].split()
                statuses.append(int(value) if kind == "status" else -int(value))
        return statuses

    def wait_exit(self, after: int = 0, timeout: float | None = None) -> int:
        """Wait for the daemon's exit that follows the first AFTER ones; returns its status."""
        def attempt() -> tuple[int] | None:
            exits = self.exits()
            return (exits[after],) if len(exits) > after else None

        return wait_until(attempt, f"exit {after + 1} of the daemon", timeout, self._story)[0]

    def run(self, argv: Sequence[str], *, program: str = "", env: Mapping[str, str] | None = None,
            directory: str = "/", timeout: float = 10.0) -> Completed:
        """Run a command in the handset, in the daemon's environment, and wait for its end.

        PROGRAM is the file to execute when ARGV's first word is not its path.
        """
        answer = self.client.ask_slowly(
            "run", timeout, argv=list(argv), program=program, directory=directory,
            env={**self.environment(), **(env or {})},
            no_randomize=self.program.sanitizer == "tsan")
        return Completed(answer["status"], self.read(answer["output"] + ".out"),
                         self.read(answer["output"] + ".err"))

    # the handset itself

    @property
    def powered_off(self) -> bool:
        """Whether the handset has been powered off."""
        return self._sandbox is not None and self._sandbox.powered_off

    @property
    def is_up(self) -> bool:
        """Whether the handset is there: not powered off, not taken down."""
        return self._sandbox is not None and self._sandbox.status is None

    def wait_power_off(self, timeout: float | None = None) -> None:
        """Wait until the handset has powered itself off."""
        wait_until(lambda: not self.is_up or None, "the power-off", timeout, self.log.tail)
        if not self.powered_off:
            raise HandsetError("the handset ended, but not by power-off")

    def set_card(self, size: int | None) -> None:
        """Put a memory card of SIZE bytes in, or (None) take it out."""
        self.client.ask("card", size=size)

    def set_modem(self, mode: str) -> None:
        """Bring the modem into another mode."""
        self.client.ask("modem_mode", mode=mode)

    def answer_modem(self, command: str, answer: str | None) -> None:
        """Replace the modem's answer to a whole command line; None: as its table says."""
        self.client.ask("modem_answer", command=command, answer=answer)

    def sanitizer_reports(self) -> dict[str, str]:
        """What a sanitizer has reported, by file."""
        directory = self.path("/handset")
        return {path.name: path.read_text("utf-8", "replace")
                for path in sorted(directory.glob("sanitizer.*"))}

    def _story(self) -> str:
        return "\n".join((self.log.tail(), "init's record:", self.text("/handset/init.txt")))
