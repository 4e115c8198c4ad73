"""What can be asked of the handset's init over its control socket."""

from __future__ import annotations

import ctypes
import os
import signal

from amt_simulator.inside import mounts, procinfo, uevent
from amt_simulator.inside.attendance import Attendance
from amt_simulator.inside.control import Operation, Refused, Reply, Request
from amt_simulator.inside.lines import AppLine, Line, NoLine
from amt_simulator.inside.loop import Loop
from amt_simulator.inside.processes import Launch, Process, Processes, Service
from amt_simulator.inside.relay import AppRelay, Port

STATION_LINE = "pc"
DISCONNECTED = "DISCONNECTED"
TGKILL = {"x86_64": 234, "aarch64": 131, "armv7l": 268}


def _tgkill(pid: int, tid: int, number: int) -> None:
    libc = ctypes.CDLL(None, use_errno=True)
    if libc.syscall(TGKILL[os.uname().machine], pid, tid, number) != 0:
        code = ctypes.get_errno()
        raise OSError(code, os.strerror(code))


class Operations:
    """One method an operation; the method's name behind `_op_` is the operation's."""

    def __init__(self, loop: Loop, processes: Processes, service: Service,
                 lines: dict[str, Line], attendance: Attendance, app: AppLine,
                 start_on_plug: bool, has_ports: bool) -> None:
        self._loop = loop
        self._processes = processes
        self._service = service
        self._lines = lines
        self._attendance = attendance
        self._app = app
        self._start_on_plug = start_on_plug
        self._has_ports = has_ports
        self._runs = 0

    def table(self) -> dict[str, Operation]:
        """Every operation by its name."""
        return {name[4:]: getattr(self, name) for name in dir(self) if name.startswith("_op_")}

    def _line(self, request: Request) -> Line:
        line = self._lines.get(request["line"])
        if line is None or not line.path:
            raise Refused(f"no such line: {request['line']}")
        return line

    # lines

    def _op_relay(self, request: Request, reply: Reply) -> None:
        """Connect a port of the PC; its descriptors are init's from now on."""
        fds = request["fds"]
        if request["line"] == "app":
            master, watch = fds
            AppRelay(self._loop, master, watch, self._app)
        else:
            line = self._line(request)
            if self._attendance.has_port(line.name):
                raise Refused(f"{line.name} has its port already")
            master, slave = fds
            self._attendance.add_port(line.name, Port(self._loop, master, slave))
        fds.clear()
        reply()

    def _op_take(self, request: Request, reply: Reply) -> None:
        line = self._line(request)
        try:
            master = line.master()
        except NoLine as error:
            raise Refused(str(error)) from None
        self._attendance.leave(line.name)
        reply({"tty": os.readlink(line.path)}, master)

    def _op_give_back(self, request: Request, reply: Reply) -> None:
        line = self._line(request)
        self._attendance.attend(line.name)
        reply()

    def _op_hang_up(self, request: Request, reply: Reply) -> None:
        self._line(request).hang_up()
        reply()

    def _op_come_back(self, request: Request, reply: Reply) -> None:
        line = self._line(request)
        line.connect()
        if request.get("held"):
            self._attendance.leave(line.name)
        else:
            self._attendance.attend(line.name)
        reply()

    def _op_say(self, request: Request, reply: Reply) -> None:
        try:
            self._line(request).send(request["text"].encode("utf-8", "surrogateescape"))
        except NoLine as error:
            raise Refused(str(error)) from None
        reply()

    def _op_open_app(self, request: Request, reply: Reply) -> None:
        try:
            slave = self._app.open(request.get("passed", ""))
        except NoLine as error:
            raise Refused(str(error)) from None
        try:
            reply({"publication": self._app.identity()}, slave)
        finally:
            # Only the asker may hold the app's side: its close has to reach the daemon.
            os.close(slave)

    def _op_app_publication(self, _request: Request, reply: Reply) -> None:
        reply({"publication": self._app.identity()})

    # modem

    def _op_modem_mode(self, request: Request, reply: Reply) -> None:
        self._attendance.set_modem_mode(request["mode"])
        reply()

    def _op_modem_answer(self, request: Request, reply: Reply) -> None:
        self._attendance.modem.set_answer(request["command"], request["answer"])
        reply()

    # processes

    def _op_start(self, _request: Request, reply: Reply) -> None:
        reply({"pid": self._service.start(), "number": self._service.number})

    def _op_restart(self, request: Request, reply: Reply) -> None:
        self._service.restart = bool(request["on"])
        reply()

    def _op_daemon(self, _request: Request, reply: Reply) -> None:
        reply({"pid": self._service.pid, "number": self._service.number})

    def _op_signal(self, request: Request, reply: Reply) -> None:
        pid = request.get("pid") or self._service.pid
        if not pid:
            raise Refused("the daemon does not run")
        if request.get("tid"):
            _tgkill(pid, request["tid"], request["signal"])
        else:
            os.kill(pid, request["signal"])
        reply()

    def _op_inspect(self, request: Request, reply: Reply) -> None:
        pid = request.get("pid") or self._service.pid
        if not pid:
            raise Refused("the daemon does not run")
        reply(procinfo.describe(pid))

    def _op_processes(self, _request: Request, reply: Reply) -> None:
        reply({"processes": procinfo.processes()})

    def _op_run(self, request: Request, reply: Reply) -> None:
        self._runs += 1
        name = f"/handset/run/{self._runs}"
        launch = Launch(argv=request["argv"], program=request.get("program", ""),
                        env=request["env"], directory=request.get("directory", "/"),
                        stdout=f"{name}.out", stderr=f"{name}.err",
                        no_randomize=request.get("no_randomize", False))

        def ended(process: Process) -> None:
            if not request.get("background"):
                reply({"status": process.returncode, "output": name, "late": process.is_late})

        process = self._processes.start("command", launch, ended)
        if request.get("background"):
            reply({"pid": process.pid, "number": process.number, "output": name})
        elif request.get("timeout"):
            self._loop.after(request["timeout"], lambda: self._end_late(process))

    @staticmethod
    def _end_late(process: Process) -> None:
        """End a command that takes too long, with all that belongs to its group."""
        if process.returncode is None:
            process.is_late = True
            os.killpg(process.pid, signal.SIGKILL)

    # kernel and card

    def _op_uevent(self, request: Request, reply: Reply) -> None:
        uevent.send(request["strings"])
        reply()

    def _op_usb(self, request: Request, reply: Reply) -> None:
        state = request["state"]
        uevent.set_usb_state(state)
        if state == DISCONNECTED:
            # The PC sees its port go with the cable.
            self._attendance.remove_port(STATION_LINE)
        if state == "CONNECTED" and self._start_on_plug:
            self._service.start()
        reply({"has_ports": self._has_ports and STATION_LINE in self._attendance.lines,
               "has_port": self._attendance.has_port(STATION_LINE)})

    def _op_uevent_listeners(self, _request: Request, reply: Reply) -> None:
        reply({"listeners": uevent.listeners()})

    def _op_card(self, request: Request, reply: Reply) -> None:
        if request["size"] is None:
            mounts.remove_card()
        else:
            mounts.insert_card(request["size"])
        reply()

    def _op_shutdown(self, _request: Request, reply: Reply) -> None:
        reply()
        # The end of process 1 is the end of every process of the handset.
        os._exit(0)
