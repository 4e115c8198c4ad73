"""Statistics on a terminal, and as plain lines elsewhere."""

from __future__ import annotations

import os
from typing import TextIO

from amt_line.report import statistics_tables as tables
from amt_line.report.statistics_tables import Table
from amt_line.statistics.figures import Statistics
from amt_station.render import columns

# A terminal is no place for more; the files have all.
_MOST_DAYS, _MOST_STEPS, _MOST_VALUES = 14, 12, 30
_NARROWEST, _SHORT_WORD = 110, 10


def shown(found: Statistics) -> list[Table]:
    """The tables that are shown, none of them empty."""
    limited = tables.limited_values(found)
    values = tables.value_table(limited)
    others = len(found.values) - len(limited)
    if others:
        values = Table(values.title, values.columns, values.rows, values.words,
                       f"{values.note} Not shown: {others} without limits.".strip())
    found_tables = [*tables.group_tables(found), _first(tables.day_table(found), _MOST_DAYS),
                    _first(tables.failure_table(found), _MOST_STEPS),
                    _first(values, _MOST_VALUES), tables.step_table(found)]
    plans = {one.step.plan for one in found.steps}
    return [_without_plan(table) if len(plans) == 1 else table
            for table in found_tables if table.rows]


def _first(table: Table, most: int) -> Table:
    more = len(table.rows) - most
    if more <= 0:
        return table
    note = f"{table.note} {more} more rows: --html, --csv and --json have all.".strip()
    return Table(table.title, table.columns, table.rows[:most], table.words, note)


def _without_plan(table: Table) -> Table:
    """One plan need not be said in every row."""
    if table.columns[:2] != ("Plan", "Step"):
        return table
    return Table(table.title, table.columns[1:], [row[1:] for row in table.rows],
                 table.words - 1, table.note)


def show(found: Statistics, stream: TextIO) -> None:
    """Print the figures."""
    if stream.isatty() and os.environ.get("TERM") != "dumb":
        _show_rich(found, stream)
        return
    for line in plain_lines(found):
        encoding = stream.encoding or "ascii"
        print(line.encode(encoding, "backslashreplace").decode(encoding), file=stream)


def plain_lines(found: Statistics) -> list[str]:
    """The figures for what is no terminal."""
    lines = [tables.filter_text(found.filter), *tables.summary(found)]
    for table in shown(found):
        lines += ["", table.title, *columns([table.columns, *table.rows])]
        if table.note:
            lines.append(table.note)
    return lines


def _show_rich(found: Statistics, stream: TextIO) -> None:
    from rich import box
    from rich.console import Console
    from rich.table import Table as RichTable
    from rich.text import Text

    console = Console(file=stream, highlight=False)
    # Narrower than this, numbers would be cut off; a terminal breaks the lines instead.
    console.width = max(console.width, _NARROWEST)
    console.print(Text(tables.filter_text(found.filter), style="dim"))
    for index, line in enumerate(tables.summary(found)):
        console.print(Text(line, style="bold" if index < 2 else ""))
    for table in shown(found):
        drawn = RichTable(title=Text(table.title, style="bold"), title_justify="left",
                          box=box.SIMPLE_HEAD, pad_edge=False,
                          padding=(0, 1, 0, 0),
                          caption=Text(table.note) if table.note else None,
                          caption_justify="left")
        for index, name in enumerate(table.columns):
            is_word = index < table.words
            longest = max(len(row[index]) for row in table.rows)
            drawn.add_column(Text(name), justify="left" if is_word else "right",
                             overflow="fold", no_wrap=not is_word,
                             min_width=min(longest, _SHORT_WORD) if is_word else None)
        for row in table.rows:
            drawn.add_row(*map(Text, row))
        console.print(drawn)
