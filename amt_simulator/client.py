"""The outside's end of a handset's control socket."""

import json
import os
import socket
from contextlib import contextmanager
from pathlib import Path
from typing import Any, Iterator, Sequence

from amt_simulator.errors import HandsetError, HandsetTimeout
from amt_simulator.waiting import scaled

MESSAGE_SIZE = 1 << 18
ANSWER_SECONDS = 30.0


class Refused(HandsetError):
    """The handset's init answered that it cannot."""


@contextmanager
def socket_address(path: Path) -> Iterator[str]:
    """An address for the socket PATH that fits a socket address, however long the path is."""
    directory = os.open(path.parent, os.O_PATH | os.O_DIRECTORY | os.O_CLOEXEC)
    try:
        yield f"/proc/self/fd/{directory}/{path.name}"
    finally:
        os.close(directory)


class Client:
    """Asks the init of the handset whose control socket is PATH."""

    def __init__(self, path: Path) -> None:
        self.path = path

    def ask(self, operation: str, **request: Any) -> dict[str, Any]:
        """Have an operation done; returns its answer."""
        answer, fds = self._exchange(operation, request, ANSWER_SECONDS)
        for fd in fds:
            os.close(fd)
        return answer

    def ask_fd(self, operation: str, **request: Any) -> tuple[int, dict[str, Any]]:
        """Have an operation done that hands out a descriptor, which is the caller's then."""
        answer, fds = self._exchange(operation, request, ANSWER_SECONDS)
        if len(fds) != 1:
            raise HandsetError(f"{operation} handed out {len(fds)} descriptors")
        return fds[0], answer

    def give_fds(self, operation: str, fds: Sequence[int], **request: Any) -> dict[str, Any]:
        """Have an operation done that takes descriptors along; they stay the caller's too."""
        return self._exchange(operation, request, ANSWER_SECONDS, fds)[0]

    def ask_slowly(self, operation: str, seconds: float, **request: Any) -> dict[str, Any]:
        """Have an operation done that answers when something has ended, after SECONDS at most."""
        return self._exchange(operation, request, seconds + ANSWER_SECONDS)[0]

    def _exchange(self, operation: str, request: dict[str, Any],
                  timeout: float, given: Sequence[int] = ()) -> tuple[dict[str, Any], list[int]]:
        with socket.socket(socket.AF_UNIX, socket.SOCK_SEQPACKET) as connection:
            connection.settimeout(scaled(timeout))
            try:
                with socket_address(self.path) as address:
                    connection.connect(address)
                message = json.dumps({"op": operation, **request}).encode()
                socket.send_fds(connection, [message], given)
                data, fds, _, _ = socket.recv_fds(connection, MESSAGE_SIZE, 1,
                                                  socket.MSG_CMSG_CLOEXEC)
            except socket.timeout:
                raise HandsetTimeout(f"no answer to {operation} of the handset's init") from None
            except OSError as error:
                raise HandsetError(f"the handset is not up ({error.strerror})") from None
        if not data:
            raise HandsetError("the handset went down")
        answer = json.loads(data)
        if not answer.pop("ok"):
            raise Refused(answer["error"])
        return answer, list(fds)
