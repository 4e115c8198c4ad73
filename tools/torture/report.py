"""What a run of torture has to tell: a table of calls and outcomes, and what is not allowed."""

from collections import Counter
from typing import Sequence

from tools.torture.cases import Counted
from tools.torture.outcomes import Kind, Outcome

COLUMNS = tuple(kind for kind in Kind)


def _row(name: str, cells: Sequence[int]) -> str:
    shown = "".join(f"{cell or '-':>{len(column.value) + 2}}"
                    for cell, column in zip(cells, COLUMNS, strict=True))
    return f"{name:<20}{sum(cells):>7}{shown}"


def report(outcomes: Sequence[Outcome], counted: Sequence[Counted]) -> str:
    """The table, a row a function, and each case that went wrong."""
    by_function: dict[str, Counter[Kind]] = {}
    for outcome in outcomes:
        row = by_function.setdefault(outcome.case.place.function, Counter())
        row[outcome.verdict] += 1
    head = f"{'function':<20}{'cases':>7}" + "".join(f"  {column.value}" for column in COLUMNS)
    lines = [head, *(_row(name, [row[kind] for kind in COLUMNS])
                     for name, row in sorted(by_function.items()))]
    total: Counter[Kind] = Counter()
    for row in by_function.values():
        total.update(row)
    lines.append(_row("all", [total[kind] for kind in COLUMNS]))
    calls = sum(sum(one.counts.values()) for one in counted)
    possible = sum(len(one.cases()) for one in counted)
    lines.append(f"{len(counted)} scenes, {calls} calls in their good runs, {possible} cases in "
                 f"them, {len(outcomes)} played")
    for outcome in outcomes:
        if outcome.problems:
            lines += ["", f"./dev torture '{outcome.case}'",
                      *(f"   {problem}" for problem in outcome.problems)]
    lines.append("FAIL: outcomes that are not allowed" if total[Kind.WRONG] else "PASS")
    return "\n".join(lines)
