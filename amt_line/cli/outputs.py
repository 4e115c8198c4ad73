"""Files that a command writes at its end: they are opened at its begin."""

from __future__ import annotations

from pathlib import Path
from typing import Any, Callable, Mapping, Sequence, TextIO

from amt_line.run.record_file import RecordLost
from amt_station.errors import UsageProblem

Records = Sequence[Mapping[str, Any]]


def _junit(records: Records) -> str:
    from amt_line.report.junit import junit_xml

    return junit_xml(records)


def _csv(records: Records) -> str:
    from amt_line.report.csv_file import csv_text

    return csv_text(records)


def _html(records: Records) -> str:
    from amt_line.report.html_file import html_page

    return html_page(records)


MAKERS: Mapping[str, Callable[[Records], str]] = {"junit": _junit, "csv": _csv, "html": _html}


class Outputs:
    """Report files of one command; what stood in them stays until there is something new."""

    def __init__(self, paths: Mapping[str, Path | None], read: Sequence[Path] = ()) -> None:
        """``paths`` by the name of what is made; ``UsageProblem`` when one cannot be opened.

        What the command has ``read`` is not to be lost for a report.
        """
        self._files: dict[str, TextIO] = {}
        self._paths = {name: path for name, path in paths.items() if path is not None}
        if len({path.resolve() for path in self._paths.values()}) != len(self._paths):
            raise UsageProblem("two reports would go into one file")
        for path in self._paths.values():
            if path.resolve() in {file.resolve() for file in read}:
                raise UsageProblem(f"{path}: a report would take the place of what is read")
        self._new = {name for name, path in self._paths.items() if not path.exists()}
        for name, path in self._paths.items():
            try:
                # Appending opens without emptying.
                self._files[name] = path.open("a", encoding="utf-8", newline="")
            except OSError as error:
                self.close()
                raise UsageProblem(f"{path}: {error.strerror}") from error

    def write(self, records: Records) -> None:
        """Make and write every report; the first that fails is told when all were tried."""
        failure: RecordLost | None = None
        for name, file in self._files.items():
            try:
                text = MAKERS[name](records)
                self._new.discard(name)
                if file.seekable():
                    file.seek(0)
                    file.truncate()
                file.write(text)
                file.flush()
            except OSError as error:
                failure = failure or RecordLost(f"{self._paths[name]}: {error.strerror}")
        if failure is not None:
            raise failure

    def close(self) -> None:
        """Give the files back; what was made only by opening goes away again."""
        for name, file in self._files.items():
            try:
                file.close()
                if name in self._new:
                    self._paths[name].unlink(missing_ok=True)
            except OSError:
                pass  # told by the writing
