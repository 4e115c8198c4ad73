"""The control socket of the handset: one JSON request a message, one JSON answer, descriptors too.

An answer is `{"ok": true, ...}` or `{"ok": false, "error": "..."}`.
"""

import json
import os
import socket
from typing import Any, Callable

from amt_simulator.inside.loop import Loop

MESSAGE_SIZE = 1 << 18

Request = dict[str, Any]


class Refused(Exception):
    """A request that cannot be served; the text says why."""


class Reply:
    """Where the answer to one request goes, at once or later."""

    def __init__(self, client: socket.socket) -> None:
        self._client = client

    def __call__(self, answer: dict[str, object] | None = None, fd: int = -1) -> None:
        """Answer; FD, when given, travels along and stays the caller's."""
        self._send({"ok": True, **(answer or {})}, fd)

    def refuse(self, text: str) -> None:
        """Say that it cannot be done, and why."""
        self._send({"ok": False, "error": text}, -1)

    def _send(self, answer: dict[str, object], fd: int) -> None:
        data = json.dumps(answer).encode()
        try:
            if fd >= 0:
                socket.send_fds(self._client, [data], [fd])
            else:
                self._client.send(data)
        except OSError:
            # Whoever asked has gone; nobody is left to be told.
            pass


Operation = Callable[[Request, Reply], None]


class ControlServer:
    """Accepts clients on an inherited listening socket and hands their requests to operations."""

    def __init__(self, loop: Loop, listener_fd: int, operations: dict[str, Operation]) -> None:
        self._loop = loop
        self._operations = operations
        os.set_inheritable(listener_fd, False)
        self._listener = socket.socket(fileno=listener_fd)
        self._listener.setblocking(False)
        self._clients: dict[int, socket.socket] = {}
        loop.watch(listener_fd, self._accept)

    def _accept(self) -> None:
        try:
            client, _ = self._listener.accept()
        except BlockingIOError:
            return
        client.setblocking(False)
        self._clients[client.fileno()] = client
        self._loop.watch(client.fileno(), lambda: self._serve(client))

    def _serve(self, client: socket.socket) -> None:
        try:
            message, fds, _, _ = socket.recv_fds(client, MESSAGE_SIZE, 2,
                                                 socket.MSG_CMSG_CLOEXEC)
        except BlockingIOError:
            return
        except OSError:
            message, fds = b"", []
        if not message:
            self._loop.watch(client.fileno(), None)
            del self._clients[client.fileno()]
            client.close()
            return
        reply = Reply(client)
        # An operation that keeps descriptors takes them out.
        left = list(fds)
        try:
            request = json.loads(message)
            request["fds"] = left
            operation = self._operations.get(request.get("op", ""))
            if operation is None:
                raise Refused(f"no such operation: {request.get('op')}")
            operation(request, reply)
        except Refused as refusal:
            reply.refuse(str(refusal))
        except OSError as error:
            reply.refuse(error.strerror or str(error))
        except (KeyError, TypeError, ValueError) as error:
            reply.refuse(f"bad request: {error!r}")
        finally:
            for fd in left:
                os.close(fd)
