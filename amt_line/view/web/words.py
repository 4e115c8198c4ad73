"""What the pages say about a value and its limits, in the browser's language."""

from __future__ import annotations

from typing import Any, Callable, Mapping

from amt_line.report.records import number_text
from amt_station.text import printable

Word = Callable[..., str]


def limits_words(value: Mapping[str, Any], word: Word) -> str:
    """The limits of a value for people."""
    limits, parts = value.get("limits", {}), []
    unit = f" {value['unit']}" if value.get("unit") else ""
    low = number_text(limits["min"]) + unit if "min" in limits else ""
    high = number_text(limits["max"]) + unit if "max" in limits else ""
    if low and high:
        parts.append(word("limits.between", low=number_text(limits["min"]), high=high))
    elif low:
        parts.append(word("limits.least", low=low))
    elif high:
        parts.append(word("limits.most", high=high))
    if "one_of" in limits:
        parts.append(word("limits.or").join(printable(str(item)) for item in limits["one_of"]))
    if "matches" in limits:
        parts.append(word("limits.matches", pattern=printable(limits["matches"])))
    return ", ".join(parts)
