"""The verdict in letters that are read across a bench."""

from __future__ import annotations

from typing import Mapping

_LETTERS: Mapping[str, tuple[str, ...]] = {
    "A": (" ### ", "#   #", "#####", "#   #", "#   #"),
    "B": ("#### ", "#   #", "#### ", "#   #", "#### "),
    "D": ("#### ", "#   #", "#   #", "#   #", "#### "),
    "E": ("#####", "#    ", "#### ", "#    ", "#####"),
    "F": ("#####", "#    ", "#### ", "#    ", "#    "),
    "I": ("###", " # ", " # ", " # ", "###"),
    "L": ("#    ", "#    ", "#    ", "#    ", "#####"),
    "O": (" ### ", "#   #", "#   #", "#   #", " ### "),
    "P": ("#### ", "#   #", "#### ", "#    ", "#    "),
    "R": ("#### ", "#   #", "#### ", "#  # ", "#   #"),
    "S": (" ####", "#    ", " ### ", "    #", "#### "),
    "T": ("#####", "  #  ", "  #  ", "  #  ", "  #  "),
}
ROWS = 5


def banner(word: str, block: str = "#", wide: bool = True) -> list[str]:
    """The word in block letters, a line a row; twice as ``wide`` where there is room."""
    rows = ["  ".join(_LETTERS[letter][row] for letter in word) for row in range(ROWS)]
    if wide:
        rows = ["".join(cell * 2 for cell in row) for row in rows]
    return [row.replace("#", block).rstrip() for row in rows]
