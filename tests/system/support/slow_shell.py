"""A shell of the handset that holds the commands of a test's choice."""

from amt_simulator import Handset

# system() runs /bin/sh, and a link of the root leads it to the PC's.
BIN, SHELL = "/bin", "/bin/sh"
HOLD, WAITS, STATUS = "/tmp/shell-hold", "/tmp/shell-waits", "/tmp/shell-status"
LIBRARY_SIGNALS = 3 << 32 - 1
SCRIPT = """#!/usr/bin/sh
case "$*" in
*'{text}'*)
    if [ -e {hold} ]; then
        cat /proc/self/status > {status}
        : > {waits}
    fi
    while [ -e {hold} ]; do
        sleep 0.02
    done
    ;;
esac
exec /usr/bin/sh "$@"
"""


class SlowShell:
    """From `hold` on, commands that hold TEXT do not begin. Made before the daemon starts."""

    def __init__(self, handset: Handset, text: str) -> None:
        self._handset = handset
        handset.path(BIN).unlink()
        handset.place(SHELL, (SCRIPT.format(text=text, status=STATUS, waits=WAITS, hold=HOLD),
                              0o755))

    def hold(self) -> None:
        """Hold commands from now on."""
        self._handset.place(HOLD, "")

    def wait_held(self) -> None:
        """Wait until a command is held."""
        self._handset.wait_file(WAITS)

    def release(self) -> None:
        """Let all commands go on."""
        self._handset.place(HOLD, None)

    def status(self, key: str) -> int:
        """A mask of a held command: SigBlk, SigIgn or SigCgt.

        Two signals that the C library keeps for its own threads do not count.
        """
        lines = dict(line.split(":", 1) for line in self._handset.text(STATUS).splitlines()
                     if ":" in line)
        return int(lines[key], 16) & ~LIBRARY_SIGNALS
