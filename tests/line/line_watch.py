"""A browser's side of the live stream, without the browser."""

from __future__ import annotations

import json
import socket
from typing import Any, Iterator

from amt_line.view.web.server import Page


class Watcher:
    """Reads server-sent events; without ``with``, whoever makes it closes it."""

    def __init__(self, page: Page, last_id: str = "", query: str = "") -> None:
        self._socket = socket.create_connection(("127.0.0.1", page.port), timeout=60)
        asked = [f"GET /live{query} HTTP/1.1", f"Host: 127.0.0.1:{page.port}",
                 *([f"Last-Event-ID: {last_id}"] if last_id else []), "", ""]
        self._socket.sendall("\r\n".join(asked).encode())
        self._file = self._socket.makefile("rb")
        self.status = int(self._file.readline().split()[1])
        while self._file.readline().strip():
            pass
        self.last_id = ""
        self.kind = ""
        self._events = self._read()

    def _read(self) -> Iterator[dict[str, Any]]:
        fields: dict[str, str] = {}
        for chunk in self._chunks():
            for line in chunk.decode().split("\n"):
                name, _, value = line.partition(": ")
                if name:
                    fields[name] = value
                elif fields:
                    self.last_id, self.kind = fields["id"], fields["event"]
                    data: dict[str, Any] = json.loads(fields["data"])
                    fields = {}
                    yield data

    def _chunks(self) -> Iterator[bytes]:
        """An event is one chunk: it is written at once."""
        while length := self._file.readline().strip():
            size = int(length, 16)
            if not size:
                return
            yield self._file.read(size)
            self._file.readline()

    def read(self, beats: bool = False) -> dict[str, Any]:
        """The next event; the beats between are no news."""
        for data in self._events:
            if beats or self.kind != "beat":
                return data
        raise EOFError

    def kinds(self) -> list[str]:
        """The kinds of all that comes until the end."""
        return [self.kind for _ in self._events]

    def close(self) -> None:
        """Go away."""
        self._file.close()
        self._socket.close()

    def __enter__(self) -> Watcher:
        return self

    def __exit__(self, *_error: object) -> None:
        self.close()
