"""The simulated modem by itself, on a pseudo-terminal: what an exchange costs without a daemon."""

import os
import subprocess
import sys
import tempfile
from contextlib import contextmanager
from pathlib import Path
from typing import Iterator

from amt_simulator.inside.attendance import Answerer
from amt_simulator.inside.lines import Line
from amt_simulator.inside.loop import Loop
from amt_simulator.inside.modem import Conversation, Modem

UP = b"up\n"


def serve(path: str) -> None:
    """Serve a tty under PATH, with the parts that serve the handset's, until the process ends."""
    loop = Loop()
    line = Line(loop, "mux", path)
    line.connect()
    line.listen(Answerer(Conversation(Modem()), line))
    os.write(1, UP)
    loop.run()


@contextmanager
def bare_modem() -> Iterator[int]:
    """The handset's end of a modem in a process of its own: a descriptor to write and read."""
    with tempfile.TemporaryDirectory() as folder:
        path = Path(folder) / "mux"
        with subprocess.Popen([sys.executable, "-m", "tools.bench.bare_modem", str(path)],
                              stdout=subprocess.PIPE) as process:
            try:
                assert process.stdout is not None
                if process.stdout.readline() != UP:
                    raise SystemExit("dev: the bare modem did not come up")
                line = os.open(path, os.O_RDWR | os.O_NOCTTY)
                try:
                    yield line
                finally:
                    os.close(line)
            finally:
                process.terminate()


if __name__ == "__main__":
    serve(sys.argv[1])
