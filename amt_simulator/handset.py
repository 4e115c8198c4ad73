"""A simulated handset: made, started and taken down from Python."""

from pathlib import Path
from types import TracebackType
from typing import Any

from amt_simulator.control import HandsetControl
from amt_simulator.errors import HandsetError
from amt_simulator.kinds import KINDS, LINE_KEYS, settings
from amt_simulator.options import Options, furnish
from amt_simulator.ports import APP_LINE, STATION_LINE, open_port
from amt_simulator.program import find_program
from amt_simulator.rundir import RunDirectory
from amt_simulator.sandbox import END_SECONDS, Sandbox
from amt_simulator.waiting import scaled, wait_until


class Handset(HandsetControl):
    """A handset with the unmodified daemon in it. A context manager: entered, it is up.

    The keyword arguments are those of `options.Options`, which explains them.
    """

    def __init__(self, path: str = "pc", build: str | Path | None = "release",
                 **others: Any) -> None:
        self.options = Options(path, build, **others)
        self.kind = self.options.kind
        self.program = find_program(build, self.options.daemon)
        self._run: RunDirectory | None = None
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
        try:
            self._run = RunDirectory()
            self.attach(self._run.path)
            furnish(self.directory, self.options, self.program)
            self._sandbox = Sandbox(self.directory, self.kind.program, self._shared())
            self._open_ports()
        except OSError as error:
            self.down()
            where = f" ({error.filename})" if error.filename else ""
            raise HandsetError(f"cannot make the handset: {error.strerror}{where}") from None
        except BaseException:
            self.down()
            raise

    def down(self) -> None:
        """Take the handset down: every process, mount and file of it."""
        if self._run is None:
            return
        run, self._run = self._run, None
        try:
            if self._sandbox is not None:
                for line in (self.pc, self.modem, self.mux, self.app):
                    line.forget()
                self._end_sandbox(self._sandbox)
        finally:
            run.close(self.options.keep)

    def _shared(self) -> dict[str, Path]:
        """Directories of the PC that the handset may write to: none but those asked for."""
        shared = dict(self.options.shared)
        if self.program.counts_coverage and self.program.build is not None:
            # Such a daemon adds its counts to files beside its objects.
            build = self.program.build.resolve()
            shared[str(build)] = build
        return shared

    def _open_ports(self) -> None:
        if not self.options.ports:
            return
        names = [APP_LINE]
        if self.options.plugged:
            names.append(STATION_LINE)
        if self.options.modem == "held":
            names += ["modem", "mux"]
        configured = settings(self.options.config)
        for name in (name for name in names if LINE_KEYS[name] in configured):
            open_port(self.client, name, self.directory)

    def _end_sandbox(self, sandbox: Sandbox) -> None:
        try:
            self.client.ask("shutdown")
        except HandsetError:
            # It is down already, or its init does not listen any more.
            pass
        else:
            sandbox.wait_end(scaled(END_SECONDS))
        sandbox.kill()

    def wait_ready(self, timeout: float | None = None, path: str = "") -> None:
        """Wait until the daemon that runs, or is being started, serves its lines.

        PATH names the kind of start whose lines these are, when it is not the handset's own.
        """
        kind = KINDS[path] if path else self.kind
        reader = self.log.reader()
        logged: set[tuple[int, str]] = set()

        def attempt() -> bool:
            logged.update((record.pid, text) for record in reader.more() for text in kind.ready
                          if text in record.text)
            # Another daemon that runs now is not yet there because the last one was.
            return bool(logged) and {(self.pid, text) for text in kind.ready} <= logged

        wait_until(attempt, f"the daemon to serve ({kind.ready})", timeout, self.story)
        if kind.name == "packet":
            wait_until(lambda: bool(self.client.ask("app_publication")["publication"]),
                       "the app line to be published", timeout, self.story)
        else:
            self.usb.wait_listener(timeout)

    # the handset itself

    @property
    def powered_off(self) -> bool:
        """Whether the handset has been powered off."""
        return self._sandbox is not None and self._sandbox.powered_off

    @property
    def death(self) -> str:
        """How the handset's sandbox has died; empty when it is up, powered off or taken down."""
        return self._sandbox.death if self._sandbox is not None else ""

    @property
    def is_up(self) -> bool:
        """Whether the handset is there: not powered off, not taken down."""
        return self._sandbox is not None and self._sandbox.status is None

    def wait_power_off(self, timeout: float | None = None) -> None:
        """Wait until the handset has powered itself off."""
        wait_until(lambda: not self.is_up or None, "the power-off", timeout, self.log.tail)
        if not self.powered_off:
            raise HandsetError("the handset ended, but not by power-off")
