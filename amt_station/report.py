"""Reports of a test plan: a table, JSON, and JUnit XML for whatever collects results."""

from __future__ import annotations

import re
from collections import Counter
from typing import Sequence
from xml.etree import ElementTree

from amt_station.cli import console
from amt_station.plan import Plan
from amt_station.plan_run import StepResult, Verdict
from amt_station.render import Json, columns
from amt_station.text import plain, printable

_NOT_XML = re.compile("[^\t\n\r\x20-\ud7ff\ue000-\ufffd\U00010000-\U0010ffff]")


def verdict_table(results: Sequence[StepResult]) -> list[str]:
    """A line a step: its verdict, its time, its name, and its values or its reason."""
    lines = columns([(result.verdict.value, f"{result.seconds * 1000:.0f} ms", result.name,
                      _remark(result)) for result in results])
    return [_coloured(result.verdict) + line[len(result.verdict.value):]
            for result, line in zip(results, lines)]


def _coloured(verdict: Verdict) -> str:
    word = str(verdict.value)
    if verdict is Verdict.SKIPPED:
        return word
    return console.good(word) if verdict is Verdict.PASS else console.bad(word)


def _remark(result: StepResult) -> str:
    if result.reason:
        return printable(result.reason)
    return ", ".join(f"{name} {printable(str(value).strip())}"
                     for name, value in result.values.items() if name != "result" and value != "")


def summary(plan: Plan, results: Sequence[StepResult]) -> str:
    """The plan's verdict in one line."""
    counts = Counter(result.verdict for result in results)
    parts = [f"{counts[verdict]} {verdict.value}" for verdict in Verdict if counts[verdict]]
    verdict = "PASS" if counts[Verdict.PASS] == len(results) else "FAIL"
    return f"{plan.title}: {verdict} ({', '.join(parts)})"


def plan_json(plan: Plan, results: Sequence[StepResult]) -> Json:
    """The whole run."""
    return {"ok": all(result.verdict is Verdict.PASS for result in results), "title": plan.title,
            "steps": [{"name": result.name, "verdict": result.verdict.value,
                       "values": {name: plain(value) if isinstance(value, str) else value
                                  for name, value in result.values.items()},
                       "reason": result.reason or None, "seconds": round(result.seconds, 6)}
                      for result in results]}


def junit_xml(plan: Plan, results: Sequence[StepResult]) -> str:
    """The run as a JUnit test suite."""
    counts = Counter(result.verdict for result in results)
    suite = ElementTree.Element(
        "testsuite", name=_xml(plan.title), tests=str(len(results)),
        failures=str(counts[Verdict.FAIL]), errors=str(counts[Verdict.ERROR]),
        skipped=str(counts[Verdict.SKIPPED]),
        time=f"{sum(result.seconds for result in results):.3f}")
    for result in results:
        case = ElementTree.SubElement(suite, "testcase", name=_xml(result.name),
                                      time=f"{result.seconds:.3f}")
        tag = {Verdict.FAIL: "failure", Verdict.ERROR: "error",
               Verdict.SKIPPED: "skipped"}.get(result.verdict)
        if tag is not None:
            ElementTree.SubElement(case, tag, message=_xml(result.reason))
        elif result.values:
            ElementTree.SubElement(case, "system-out").text = _xml(_remark(result))
    return ElementTree.tostring(suite, encoding="unicode", xml_declaration=True) + "\n"


def _xml(text: str) -> str:
    return _NOT_XML.sub("?", text)
