"""The words of the drawings; a page in another language brings its own."""

from __future__ import annotations

from dataclasses import dataclass


@dataclass(frozen=True)
class Words:
    """Texts in English; braces are filled with what they name."""

    histogram: str = "{name}: {count} values"
    histogram_more: str = "from {low} to {high}, mean {mean}"
    minimum: str = "min {number}"
    maximum: str = "max {number}"
    near: str = "near {number}"
    mean: str = "mean {number}"
    below: str = "{count} further down"
    above: str = "{count} further up"
    values: str = "values"
    bin: str = "{low} to {high}: {count}"
    yields: str = "Yield over the days"
    yields_by_week: str = "Yield over the weeks"
    yields_more: str = "{count} from {first} to {last}; the last: {latest}"
    first_pass: str = "first pass"
    final: str = "at the end"
    runs: str = "runs"
    week: str = "week from {day}"
    day: str = "{day}: first pass {first} and at the end {final} of {handsets}, {runs} runs"
    pareto: str = "Which step fails first"
    pareto_more: str = "{count} failed runs; most: {step}"
    pareto_row: str = "{step}: {count} runs, {share}; with those above {cumulated}"
    others: str = "{count} other steps"
    own_share: str = "runs that failed here first"
    cumulated: str = "with those above"
    nothing: str = "no runs"
    no_failure: str = "no run has failed"


ENGLISH = Words()
