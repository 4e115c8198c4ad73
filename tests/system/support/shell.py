"""A shell of the handset that fails at commands of a test's choice."""

from contextlib import contextmanager
from typing import Iterator

from amt_simulator import Handset

# system() runs /bin/sh, and a link of the root leads it to the PC's.
BIN, SHELL, COUNT = "/bin", "/bin/sh", "/tmp/shell-failures"
SCRIPT = """#!/usr/bin/sh
case "$*" in
*'{text}'*)
    left=$(cat {count})
    if [ "$left" -gt 0 ]; then
        echo $((left - 1)) > {count}
        exit 1
    fi
    ;;
esac
exec /usr/bin/sh "$@"
"""


@contextmanager
def break_shell(handset: Handset, text: str, failures: int) -> Iterator[None]:
    """The first FAILURES commands that hold TEXT fail with status 1 and are not run."""
    link = handset.path(BIN)
    target = link.readlink()
    handset.place(COUNT, f"{failures}\n")
    link.unlink()
    try:
        handset.place(SHELL, (SCRIPT.format(text=text, count=COUNT), 0o755))
        yield
    finally:
        handset.place(BIN, None)
        link.symlink_to(target)
