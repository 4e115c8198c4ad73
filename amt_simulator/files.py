"""A handset's files, as a person and a test read and write them on the PC."""

from pathlib import Path

from amt_simulator import root, tree
from amt_simulator.log import Log
from amt_simulator.tree import Content
from amt_simulator.waiting import wait_until


class HandsetFiles:
    """The files of the handset in a directory: its root, and the state of its stand-ins."""

    directory: Path
    log: Log

    def attach(self, directory: Path) -> None:
        """Look at the handset in DIRECTORY."""
        self.directory = directory
        self.log = Log(directory / tree.STATE / "log.txt")

    def path(self, inside: str) -> Path:
        """Where on the PC the handset's file INSIDE lies; a link there is not followed."""
        return tree.host_path(self.directory, inside)

    def read(self, inside: str) -> bytes:
        """The content of a file of the handset."""
        return tree.read(self.directory, inside)

    def text(self, inside: str) -> str:
        """The content of a file of the handset as text."""
        return self.read(inside).decode("utf-8", "surrogateescape")

    def place(self, inside: str, content: Content) -> None:
        """Place a file while the handset is up; None takes it away."""
        tree.place(self.directory, inside, content)

    def wait_file(self, inside: str, content: "bytes | str | None" = None,
                  timeout: float | None = None) -> bytes:
        """Wait until a file exists and, when given, has this content; returns the content."""
        wanted = content.encode() if isinstance(content, str) else content

        def attempt() -> tuple[bytes] | None:
            try:
                data = self.read(inside)
            except OSError:
                return None
            return (data,) if wanted is None or data == wanted else None

        what = inside if wanted is None else f"{inside} to hold {wanted!r}"
        return wait_until(attempt, what, timeout, self.log.tail)[0]

    def stdout(self) -> bytes:
        """What the daemon has printed, all its starts together."""
        return self.read("/handset/stdout.txt")

    def stderr(self) -> bytes:
        """What the daemon has printed on standard error."""
        return self.read("/handset/stderr.txt")

    def calls(self) -> list[str]:
        """The recorded calls of the stand-ins, a line each."""
        return self.text("/handset/calls.txt").splitlines()

    def get_property(self, name: str) -> str | None:
        """A system property; None when it is not set."""
        try:
            return self.text(f"/handset/properties/{name}")
        except FileNotFoundError:
            return None

    def set_property(self, name: str, value: str | None) -> None:
        """Set a system property; None takes it away."""
        root.write_properties(self.directory, {name: value})

    def answer(self, function: str, *lines: str) -> None:
        """Script what a stand-in function answers from now on; no line: as if never scripted."""
        root.write_answers(self.directory, {function: list(lines) or None})

    def sanitizer_reports(self) -> dict[str, str]:
        """What a sanitizer has reported, by file."""
        names = sorted(path.name for path in self.path("/handset").glob("sanitizer.*"))
        return {name: self.read(f"/handset/{name}").decode("utf-8", "replace") for name in names}
