"""The init of the simulated handset: process 1 inside, told by /handset/init.json what to do."""

import json
import os
import signal
import sys
from typing import Any

from amt_simulator.inside import mounts
from amt_simulator.inside.attendance import MODEM_LINES, Attendance
from amt_simulator.inside.control import ControlServer
from amt_simulator.inside.lines import AppLine, Line
from amt_simulator.inside.loop import Loop
from amt_simulator.inside.modem import Modem
from amt_simulator.inside.operations import Operations
from amt_simulator.inside.processes import Launch, Processes, Service

ORDERS = "/handset/init.json"


def _make_lines(loop: Loop, paths: dict[str, str]) -> dict[str, Line]:
    lines = {name: Line(loop, name, paths[name]) for name in ("pc", *MODEM_LINES)}
    if lines["pc"].path:
        lines["pc"].connect()
    return lines


def _launch(given: dict[str, Any]) -> Launch:
    return Launch(argv=given["argv"], program=given["program"], env=given["env"],
                  stdout="/handset/stdout.txt", stderr="/handset/stderr.txt",
                  no_randomize=given["no_randomize"])


def _bring_up() -> Loop:
    """Bring the handset up; whoever runs the loop serves it."""
    control_fd, ready_fd = int(sys.argv[1]), int(sys.argv[2])
    # Process 1 gets only the signals it asks for; the sandbox is ended from outside.
    for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
        signal.signal(number, signal.SIG_IGN)
    os.set_inheritable(ready_fd, False)
    with open(ORDERS, encoding="utf-8") as stream:
        orders = json.load(stream)
    mounts.protect_devices()
    loop = Loop()
    lines = _make_lines(loop, orders["lines"])
    attendance = Attendance(Modem(orders["modem_answers"]), lines)
    attendance.set_modem_mode(orders["modem"])
    if orders["card"] is not None:
        mounts.insert_card(orders["card"])
        if orders["card_full"]:
            mounts.fill_card()

    def forget_input() -> None:
        for line in lines.values():
            line.discard_input()

    processes = Processes(loop)
    service = Service(loop, processes, _launch(orders["daemon"]),
                      orders["restart"], orders["restart_pause"], forget_input)
    operations = Operations(loop, processes, service, lines, attendance,
                            AppLine(orders["lines"]["app"]),
                            orders["start_on_plug"], orders["ports"])
    # The loop holds the server through its callbacks.
    ControlServer(loop, control_fd, operations.table())
    if orders["start"]:
        service.start()
    os.write(ready_fd, b"up\n")
    os.close(ready_fd)
    return loop


def main() -> None:
    """Bring the handset up and serve it until the sandbox ends."""
    try:
        loop = _bring_up()
    except OSError as error:
        where = f" ({error.filename})" if error.filename else ""
        sys.exit(f"{error.strerror}{where}")
    loop.run()


if __name__ == "__main__":
    main()
