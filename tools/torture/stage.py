"""A handset whose daemon can be made to fail, and that is as new before each case."""

import os
import re
import signal
import time
from collections import Counter
from pathlib import Path
from typing import Any, Callable

from amt_simulator import Handset, Line
from amt_simulator.control import ProcessInfo
from amt_simulator.errors import HandsetError, HandsetTimeout
from amt_simulator.kinds import KINDS
from amt_simulator.program import PRELOAD
from amt_simulator.waiting import scaled, wait_until
from tools.torture.page import INSIDE, LIBRARY, PAGE_INSIDE, SIZE, Order, Page, Symbols

# What the daemon writes below, and what decides what it does.
FOLDERS = ("/amt", "/data", "/tmp", "/sys", "/handset/properties", "/handset/answers",
           "/handset/devices")
RECORDS = ("log.txt", "calls.txt", "stdout.txt")
# Only a daemon that hangs takes so long.
HANG_SECONDS = 40.0
# A daemon that waits for nobody logs or reads something within this time, but for its long pauses.
QUIET_SECONDS = 1.0
# On no machine longer: a daemon that waits for a silent modem logs every five seconds, for ever.
LOG_SECONDS = 4.0
# What is to end it does so at once, or by the handshake's timer.
END_SECONDS, LAST_SECONDS = 3.0, 12.0
STEP_SECONDS = 0.001
# A line that nobody reads takes what is said in this time, or not; a modem repeats it after that.
LINE_SECONDS, MODEM_SECONDS = 3.0, 8.0
READ_SIZE = 65536
# What the daemon asks of a modem whose line it has opened, and what a modem says.
SILENCE = b"AT^DLKS=0\r"
MODEM_OBEYS, MODEM_REFUSES = b"\r\nOK\r\n", b"\r\nERROR\r\n"
INIT = 1
# Asleep, or ended and not waited for.
RESTING = ("S", "Z", "X")
# The status of a daemon that has switched the handset off.
POWERED_OFF = 1000
# A tty of the handset; the app's is /dev/ptmx to the daemon.
PTS = re.compile(r"/dev/pts/\d+")
# The readers that wait for one, on the PC path.
PC_READERS = 2


NOBODY = ProcessInfo(0, [], "", {}, {}, [], resident_kib=0, anonymous_kib=0, policy=0)
# Paths, with their content and mode.
Files = dict[Path, tuple[bytes | None, int]]


def nobody_listens() -> None:
    """Nothing is heard."""


class Hang(Exception):
    """The daemon neither ended nor came to rest."""


class Stage:
    """A handset of one kind, and the page it shares with the library."""

    def __init__(self, path: str, build: Path, symbols: Symbols, **options: Any) -> None:
        files = {INSIDE: build / "lib" / LIBRARY, PAGE_INSIDE: bytes(SIZE),
                 **options.pop("files", {})}
        preload = {"LD_PRELOAD": f"/system/lib/{PRELOAD}:{INSIDE}"}
        self.symbols = symbols
        self.handset = Handset(path, build, start=False, restart=False, files=files, env=preload,
                               **options)
        self._up()

    def _up(self) -> None:
        self.handset.up()
        self.page = Page(self.handset.path(PAGE_INSIDE))
        self._sent = 0
        self._ended_before = 0
        self._started_at = 0
        # The daemon goes on without the app's line.
        self.given_up = False
        # Takes what is heard: what is left on the line of a daemon that ends is lost.
        self.listen: Callable[[], None] = nobody_listens
        # Something that was said to it is unread, or lost.
        self.is_stale = False
        # The daemon that runs is as one that has just been started; then its files were these.
        self.is_new = False
        self.served: Files = {}
        self.first = self.files()

    def be_up(self) -> None:
        """Bring up a handset that has powered itself off, or that has died, like a new one."""
        if not self.handset.is_up:
            self.renew()

    def renew(self) -> None:
        """Take the handset down, and bring up another one."""
        self.close()
        self._up()

    def close(self) -> None:
        """Take it down."""
        self.page.close()
        self.handset.down()

    # files

    def files(self) -> Files:
        """What the daemon's files hold; None: a folder."""
        found: Files = {}
        for folder in FOLDERS:
            top = self.handset.path(folder)
            for path in [top, *sorted(top.rglob("*"))] if top.is_dir() else ():
                if not path.is_symlink() and (path.is_file() or path.is_dir()):
                    found[path] = (path.read_bytes() if path.is_file() else None,
                                   path.stat().st_mode & 0o7777)
        return found

    def put_back(self, wanted: Files) -> None:
        """Make the files what they were."""
        now = self.files()
        for path in sorted(set(now) - set(wanted), reverse=True):
            if path.is_dir():
                path.rmdir()
            else:
                path.unlink()
        for path, (content, mode) in wanted.items():
            if now.get(path) == (content, mode):
                continue
            if content is None:
                path.mkdir(exist_ok=True)
            else:
                path.write_bytes(content)
            path.chmod(mode)

    # the daemon

    @property
    def runs(self) -> bool:
        """Whether the daemon is there."""
        try:
            return int(self.handset.client.ask("daemon")["pid"]) != 0
        except HandsetError:
            if self.handset.is_up:
                wait_until(lambda: not self.handset.is_up, "the handset's end")
            return False

    def start(self) -> None:
        """Start the daemon; what is to fail has been ordered before."""
        if self.handset.log.mark() > 1 << 20:
            for name in RECORDS:
                self.handset.path(f"/handset/{name}").write_bytes(b"")
        self.page.forget_waiting()
        self._ended_before = len(self.handset.exits())
        self._started_at = self.handset.log.mark()
        self.given_up = self.is_stale = False
        self.handset.start()

    def status(self) -> int:
        """How the daemon has ended."""
        if self.handset.powered_off:
            return POWERED_OFF
        return self.handset.wait_exit(self._ended_before)

    def wait_serving(self) -> bool:
        """Wait until the daemon serves its lines; False when it has ended instead."""
        reader = self.handset.log.reader(self._started_at)
        missing = set(KINDS[self.handset.options.path].ready)
        begin = time.monotonic()
        asked = begin
        while time.monotonic() < begin + scaled(HANG_SECONDS):
            runs = self.runs
            texts = [record.text for record in reader.more()]
            missing -= {text for text in missing if any(text in logged for logged in texts)}
            if not missing:
                return True
            if not runs:
                return False
            if time.monotonic() > asked + scaled(MODEM_SECONDS) and self.awaits_modem():
                # An answer that was lost is waited for without end: the modem says it again.
                self.handset.client.ask("say", line="mux", text=MODEM_OBEYS.decode())
                asked = time.monotonic()
                self.is_stale = True
            time.sleep(STEP_SECONDS)
        raise Hang("neither serves nor ends")

    def stop(self) -> None:
        """End the daemon, if it runs, at once."""
        self.is_new = False
        if self.runs:
            self.handset.signal(signal.SIGKILL)
            self.status()

    def terminate(self) -> int:
        """End the daemon as init does; its status."""
        self.handset.signal(signal.SIGTERM)
        return self.status()

    def wait_end(self, seconds: float = LAST_SECONDS) -> None:
        """Wait until the daemon has ended, or has not in time."""
        end = time.monotonic() + scaled(seconds)
        while self.runs and time.monotonic() < end:
            time.sleep(STEP_SECONDS)

    def look(self) -> ProcessInfo:
        """What the daemon holds; nothing when it has just ended."""
        try:
            return self.handset.inspect()
        except HandsetError:
            return NOBODY

    # its lines

    def lay_lines(self) -> None:
        """Lines and a link as they are at first, with nothing on them and nobody of us there."""
        self.handset.app.forget()
        for line in (self.handset.pc, self.handset.modem, self.handset.mux):
            line.forget()
            line.come_back()
        self.take(self.handset.pc.open())
        self.handset.client.ask("usb", state=self.handset.options.first_usb_state)

    @property
    def is_app(self) -> bool:
        """Whether the station speaks on the app's line."""
        return self.handset.options.path == "packet"

    @property
    def station(self) -> Line:
        """The line on which the station speaks."""
        return self.handset.app if self.is_app else self.handset.pc

    @property
    def modem(self) -> Line:
        """The line on which the modem speaks."""
        return self.handset.mux if self.is_app else self.handset.modem

    def take(self, line: Line) -> bytes:
        """What has arrived on a line that is held; an app whose line is gone leaves it."""
        data = b""
        while line.is_open:
            try:
                piece = os.read(line.fileno(), READ_SIZE)
            except BlockingIOError:
                break
            except OSError:
                piece = b""
            if not piece:
                if self.is_app and line is self.station:
                    line.close()
                break
            data += piece
        return data

    def meet(self) -> bool:
        """Be at the station's line; False when the daemon has given up the app's for good."""
        end = time.monotonic() + scaled(HANG_SECONDS)
        while not self.given_up and self.runs and time.monotonic() < end:
            try:
                self.station.open(timeout=STEP_SECONDS)
                return True
            except HandsetTimeout:
                self.look_for_reader()
            except HandsetError:
                return False  # the PC's line has been taken away
        return False

    def look_for_reader(self) -> None:
        """Note whether the app's reader has ended: only the thread that takes signals is left."""
        self.given_up = self.is_app and len(self.look().threads) == 1

    def say(self, line: Line, data: bytes) -> None:
        """Say something to the daemon, and wait until it has done with it."""
        if line is self.station and not self.meet():
            return
        self._sent += len(data)
        try:
            line.write(data, timeout=LINE_SECONDS)
        except HandsetTimeout:
            pass  # nobody reads: what becomes of that shows in the end
        except OSError:
            pass  # the line is gone, with the daemon
        self.settle()

    def release(self) -> None:
        """The modem refuses what it is asked, until the app's reader waits for the app again."""
        end = time.monotonic() + scaled(HANG_SECONDS)
        while self.runs and self.awaits_modem() and time.monotonic() < end:
            asked = self.take(self.modem.open())
            self.say(self.modem, MODEM_OBEYS if asked.endswith(SILENCE) else MODEM_REFUSES)

    def arm(self, order: Order | None) -> None:
        """Count from here what is said and called; a call fails that was ordered to."""
        self.is_stale = self.is_stale or self._sent > self.page.consumed
        self._sent = 0
        self.page.reset()
        if order is not None:
            self.page.arm(order)

    def awaits_modem(self) -> bool:
        """Whether the app's reader waits for the modem instead of the app."""
        waiting = self.page.waiting()
        return self.is_app and any(fd in waiting and PTS.fullmatch(name) is not None
                                   for fd, name in self.look().descriptors.items())

    def _is_settled(self) -> bool:
        if self.page.consumed < self._sent:
            return False
        waiting = self.page.waiting()
        if self.is_app:
            return bool(waiting)
        names = self.look().descriptors
        return sum(PTS.fullmatch(names.get(fd, "")) is not None for fd in waiting) == PC_READERS

    def _is_busy(self) -> bool:
        """Whether any process of the handset runs, or would if the machine had the time."""
        try:
            pids = list(self.handset.processes())
        except HandsetError:
            return True  # it is going down
        for pid in pids:
            try:
                states = [thread["state"] for thread in self.handset.inspect(pid).threads.values()]
            except HandsetError:
                return True  # it has ended just now
            if pid != INIT and any(state not in RESTING for state in states):
                return True
        return False

    def settle(self, quiet: float = QUIET_SECONDS) -> None:
        """Wait until the daemon waits for its lines again, has ended, or does nothing at all."""
        end = time.monotonic() + scaled(HANG_SECONDS)
        mark, since = self.handset.log.mark(), time.monotonic()
        while self.runs and not self.given_up:
            self.listen()
            if self._is_settled():
                return
            now = time.monotonic()
            if self.handset.log.mark() != mark or self._is_busy():
                mark, since = self.handset.log.mark(), now
            elif now - since > min(scaled(quiet), LOG_SECONDS):
                # What it has not read until now was lost with a line, or waits for another request.
                self.is_stale = self.is_stale or self._sent > self.page.consumed
                self._sent = self.page.consumed
                return
            if now > end:
                raise Hang("never comes to rest")
            time.sleep(STEP_SECONDS)

    def wait_back(self, before: ProcessInfo, allowed: "Counter[str]",
                  seconds: float) -> "Counter[str]":
        """Wait until the daemon holds no more than BEFORE and what is ALLOWED; what it has more."""
        def excess() -> "Counter[str]":
            return self._more(before) - allowed

        try:
            wait_until(lambda: not excess() or None, "what was held to be given back", seconds)
        except HandsetTimeout:
            pass
        return excess()

    def _more(self, before: ProcessInfo) -> "Counter[str]":
        now = self.look()
        return Counter({name: max(0, len(getattr(now, name)) - len(getattr(before, name)))
                        for name in ("descriptors", "threads", "children")})
