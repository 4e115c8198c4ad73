"""Statistics as one self-contained HTML page; it opens without a network."""

from __future__ import annotations

from amt_line.drawing.days import yield_over_days
from amt_line.drawing.histogram import value_histogram
from amt_line.drawing.pareto import failure_pareto
from amt_line.report import statistics_tables as tables
from amt_line.report.template import environment_of
from amt_line.run.clock import utc_now
from amt_line.statistics.figures import Statistics

# More pictures than anybody looks at make a file that no browser likes.
_MOST_HISTOGRAMS = 200


def statistics_page(found: Statistics) -> str:
    """The page."""
    limited = tables.limited_values(found)
    others = [one for one in found.values if not one.limited]
    return environment_of("amt_line.report").get_template("statistics.html").render(
        all=found.all, filter=tables.filter_text(found.filter), made=utc_now(),
        summary=tables.summary(found), yields=yield_over_days(found.days),
        pareto=failure_pareto(found.failures), failures=tables.failure_table(found),
        groups=tables.group_tables(found), days=tables.day_table(found),
        values=tables.value_table(limited), others=tables.value_table(others, "Other values"),
        histograms=[(one, value_histogram(one)) for one in limited[:_MOST_HISTOGRAMS]],
        not_drawn=max(len(limited) - _MOST_HISTOGRAMS, 0), steps=tables.step_table(found))
