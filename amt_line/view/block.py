"""A word in letters of half blocks: three lines high, read from two metres."""

from __future__ import annotations

from amt_line.view.banner import ROWS, banner

_HALVES = {(False, False): " ", (True, False): "▀", (False, True): "▄", (True, True): "█"}
BLOCK_ROWS = (ROWS + 1) // 2


def half_block(word: str) -> list[str]:
    """The word in lines of half blocks."""
    rows = banner(word, wide=False)
    width = max(len(row) for row in rows)
    cells = [row.ljust(width) for row in (*rows, "")]
    return ["".join(_HALVES[cells[line][column] == "#", cells[line + 1][column] == "#"]
                    for column in range(width)) for line in range(0, ROWS + 1, 2)]


def block_of(word: str, height: int, ascii_only: bool) -> list[str]:
    """The word as large as ``height`` lines allow."""
    if height >= ROWS:
        return banner(word, "#" if ascii_only else "█", wide=False)
    if height >= BLOCK_ROWS and not ascii_only:
        return half_block(word)
    return [word]
