"""One self-contained HTML page of one or many records; it opens without a network."""

from __future__ import annotations

from typing import Any, Mapping, Sequence

from amt_line.drawing.value_bar import value_bar
from amt_line.report.records import counts, limits_text, verdict_word
from amt_line.report.template import environment_of


def html_page(records: Sequence[Mapping[str, Any]]) -> str:
    """The page; several records have a list in front that leads to each."""
    return environment_of("amt_line.report").get_template("report.html").render(
        records=records, bar=value_bar, limits_text=limits_text, verdict=verdict_word,
        counts=counts)
