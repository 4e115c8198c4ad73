"""The memory that the preloaded library and the tester share; tests/torture/page.h explains it."""

import mmap
import struct
import subprocess
from bisect import bisect_right
from dataclasses import dataclass
from pathlib import Path

NAME_SIZE, NAME_COUNT = 24, 64
FD_COUNT, CALL_COUNT = 64, 16384
MAGIC = 0x544F5254

_HEAD = struct.Struct("<II")
_ORDER = struct.Struct(f"<{NAME_SIZE}sIIIIii")
_WORD = struct.Struct("<I")
_CALL = struct.Struct("<III")
_NAMES = _HEAD.size
_ORDERED = _NAMES + NAME_SIZE * NAME_COUNT
_NTH = _ORDERED + _ORDER.size
_FIRED = _NTH + 4
_CONSUMED = _FIRED + 4
_WAITING = _CONSUMED + 4
_COUNT = _WAITING + 4 * FD_COUNT
_CALLS = _COUNT + 4
SIZE = _CALLS + _CALL.size * CALL_COUNT

# The library that gives the page its other side.
LIBRARY = "libfail-nth.so"
INSIDE, PAGE_INSIDE = f"/system/lib/{LIBRARY}", "/handset/torture"


@dataclass(frozen=True, order=True)
class Call:
    """A call of the daemon: of which function, from where in the program, on which thread."""

    function: str
    site: int
    thread: int


@dataclass(frozen=True)
class Order:
    """The Nth call that is to fail, and how."""

    function: str
    low: int
    high: int
    thread: int
    nth: int
    short: bool
    result: int
    errno: int


class Page:
    """The page of a handset, mapped by both sides."""

    def __init__(self, path: Path) -> None:
        with open(path, "r+b") as stream:
            self._map = mmap.mmap(stream.fileno(), SIZE)

    def close(self) -> None:
        """Leave it."""
        self._map.close()

    def _word(self, place: int) -> int:
        return int(_WORD.unpack_from(self._map, place)[0])

    def reset(self) -> None:
        """Nothing is to fail, and nothing has been counted."""
        for place in (_NTH, _FIRED, _CONSUMED, _COUNT):
            _WORD.pack_into(self._map, place, 0)

    def forget_waiting(self) -> None:
        """The daemon that runs next has not waited yet."""
        _WORD.pack_into(self._map, 0, 0)
        self._map[_WAITING:_COUNT] = bytes(4 * FD_COUNT)

    def arm(self, order: Order) -> None:
        """Count from now on, and let that call fail."""
        self.reset()
        _ORDER.pack_into(self._map, _ORDERED, order.function.encode(), order.low, order.high,
                         order.thread, int(order.short), order.result, order.errno)
        _WORD.pack_into(self._map, _NTH, order.nth)

    def disarm(self) -> None:
        """Nothing is to fail any more; what was counted stays."""
        _WORD.pack_into(self._map, _NTH, 0)

    @property
    def is_there(self) -> bool:
        """Whether the library has been loaded into the daemon."""
        return self._word(0) == MAGIC

    @property
    def fired(self) -> bool:
        """Whether the call has failed."""
        return self._word(_FIRED) != 0

    @property
    def consumed(self) -> int:
        """How many bytes reads have given."""
        return self._word(_CONSUMED)

    @property
    def count(self) -> int:
        """How many calls there were."""
        return self._word(_COUNT)

    def waiting(self) -> dict[int, int]:
        """How many threads wait for which descriptor."""
        counts = struct.unpack_from(f"<{FD_COUNT}I", self._map, _WAITING)
        return {fd: count for fd, count in enumerate(counts) if count}

    def calls(self) -> list[Call]:
        """What the daemon has called."""
        names = [self._map[place:place + NAME_SIZE].rstrip(b"\0").decode()
                 for place in range(_NAMES, _ORDERED, NAME_SIZE)]
        listed = min(self.count, CALL_COUNT)
        return [Call(names[function], site, thread) for function, site, thread in
                _CALL.iter_unpack(self._map[_CALLS:_CALLS + listed * _CALL.size])]


class Symbols:
    """The names of a program's places."""

    def __init__(self, program: Path) -> None:
        shown = subprocess.run(["nm", "-C", "-n", "--defined-only", program], check=True,
                               capture_output=True, text=True).stdout
        self._starts: list[int] = []
        self._names: list[str] = []
        for line in shown.splitlines():
            address, _kind, name = line.split(" ", 2)
            self._starts.append(int(address, 16))
            self._names.append(_short(name))

    def name(self, place: int) -> str:
        """The symbol that a place lies in."""
        return self._names[self._index(place)]

    def data(self, place: int) -> str:
        """The symbol and how far behind its beginning, for what is no function."""
        index = self._index(place)
        behind = place - self._starts[index]
        return self._names[index] + (f"+{behind}" if behind else "")

    def limits(self, place: int) -> tuple[int, int]:
        """From where to where the symbol goes that a place lies in."""
        index = self._index(place)
        end = index + 1
        while end < len(self._starts) and self._starts[end] == self._starts[index]:
            end += 1
        return self._starts[index], self._starts[end] if end < len(self._starts) else 1 << 31

    def _index(self, place: int) -> int:
        return max(bisect_right(self._starts, place) - 1, 0)


def _short(name: str) -> str:
    """A symbol without its parameters and its namespace."""
    name = name.replace("(anonymous namespace)::", "")
    return name.partition("(")[0].partition("[")[0].partition(" ")[0].partition(".")[0]
