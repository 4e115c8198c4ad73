"""What a handset's daemon has logged and called since a moment, compared line by line."""

import re
from typing import Any, Sequence

from amt_simulator import Handset

TAG = "vx-kel-amt"
# A text or a compiled expression; Any, because a list of both counts as a list of objects.
Wanted = Any


def error_line(func: str, code: int, errno: int | None = None,
               source: str = "amt/amt-handle") -> "re.Pattern[str]":
    """The error line of FUNC; any ERRNO when none is given."""
    number = r"-?\d+" if errno is None else str(errno)
    return re.compile(rf"FILE-{source}, LINE-\d+, FUNC-{func}\(\), "
                      rf"error_code={code}, errno={number}")


def _is(text: str, wanted: Wanted) -> bool:
    return text == wanted if isinstance(wanted, str) else wanted.fullmatch(text) is not None


class Trace:
    """Everything that comes after its making."""

    def __init__(self, handset: Handset) -> None:
        self._handset = handset
        self._log_mark = handset.log.mark()
        self._call_mark = len(handset.calls())

    def texts(self) -> list[str]:
        """The daemon's log texts, in order."""
        return self._handset.log.texts(TAG, self._log_mark)

    def calls(self) -> list[str]:
        """The calls of the stand-ins, in order."""
        return self._handset.calls()[self._call_mark:]

    @property
    def syncs(self) -> int:
        """How often the file system was flushed."""
        return sum(call.startswith("sync(") for call in self.calls())

    def _missing(self, wanted: Sequence[Wanted]) -> list[Wanted]:
        """What of the texts WANTED is not there in this order; others may stand between them."""
        left = list(wanted)
        for text in self.texts():
            if left and _is(text, left[0]):
                del left[0]
        return left

    def has(self, *wanted: Wanted) -> bool:
        """Whether the texts WANTED are there already, as `expect` wants them."""
        return not self._missing(wanted)

    def expect(self, *wanted: Wanted) -> None:
        """The texts WANTED are there in this order; others may stand between them."""
        left = self._missing(wanted)
        assert not left, f"no {left[0]!r} in its place in:\n" + "\n".join(self.texts())

    def expect_none(self, *unwanted: Wanted) -> None:
        """None of the texts is there."""
        for text in self.texts():
            found = [entry for entry in unwanted if _is(text, entry)]
            assert not found, f"{text!r} was logged"
