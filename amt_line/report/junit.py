"""JUnit XML, for whatever collects results."""

from __future__ import annotations

import re
from collections import Counter
from typing import Any, Mapping, Sequence
from xml.etree import ElementTree

from amt_line.report.records import remark, verdict_word

_NOT_XML = re.compile("[^\t\n\r\x20-\x7e\xa0-\ud7ff\ue000-\ufffd\U00010000-\U0010ffff]"
                      "|[\u200e\u200f\u202a-\u202e\u2066-\u2069]")
# To the second, as the common schema of such files has it.
_SECOND = len("2026-11-21T19:00:00")
_TAGS = {"fail": "failure", "error": "error", "skipped": "skipped"}


def junit_xml(records: Sequence[Mapping[str, Any]]) -> str:
    """A suite a run, a case a step."""
    root = ElementTree.Element("testsuites")
    for record in records:
        _suite(root, record)
    ElementTree.indent(root)
    return ElementTree.tostring(root, encoding="unicode", xml_declaration=True) + "\n"


def _suite(root: ElementTree.Element, record: Mapping[str, Any]) -> None:
    title = _xml(record["plan"]["title"])
    suite = ElementTree.SubElement(
        root, "testsuite", name=title, timestamp=record["began"][:_SECOND],
        hostname=_xml(record["station"]))
    _properties(suite, record)
    taken: Counter[tuple[str, str]] = Counter()
    for step in record["steps"]:
        # Collectors know a case by its name: a second one would take the first one's place.
        taken[step["section"], step["name"]] += 1
        count = taken[step["section"], step["name"]]
        _case(suite, step, title, f" ({count})" if count > 1 else "")
    if _needs_verdict_case(record):
        case = ElementTree.SubElement(suite, "testcase", classname=title, name="the run",
                                      time="0.000")
        _failure(case, "error", verdict_word(record),
                 [record["reason"] or "the run has not ended", record["advice"]])
    for name, tag in (("tests", "testcase"), ("failures", "testcase/failure"),
                      ("errors", "testcase/error"), ("skipped", "testcase/skipped")):
        suite.set(name, str(len(suite.findall(tag))))
    suite.set("time", f"{record['seconds'] or 0:.3f}")


def _needs_verdict_case(record: Mapping[str, Any]) -> bool:
    """Whether no step tells that the run was no pass."""
    return record["verdict"] != "PASS" and not any(
        step["verdict"] in ("fail", "error") for step in record["steps"])


def _properties(suite: ElementTree.Element, record: Mapping[str, Any]) -> None:
    plan = record["plan"]
    entries = {"run": record["run"], "dut": record["dut"], "verdict": verdict_word(record),
               "operator": record["operator"], "port": record["port"],
               "channel": record["channel"], "slot": record["slot"],
               "plan.version": plan["version"], "plan.sha256": plan["sha256"],
               "tool.version": record["tool"]["version"],
               **{f"input.{name}": value for name, value in record["inputs"].items()}}
    properties = ElementTree.SubElement(suite, "properties")
    for name, value in entries.items():
        ElementTree.SubElement(properties, "property", name=_xml(name), value=_xml(str(value)))


def _case(suite: ElementTree.Element, step: Mapping[str, Any], title: str, count: str) -> None:
    case = ElementTree.SubElement(
        suite, "testcase", classname=f"{title}.{step['section']}",
        name=_xml(step["name"]) + count, time=f"{step['seconds']:.3f}")
    tag = _TAGS.get(step["verdict"])
    if tag == "skipped":
        ElementTree.SubElement(case, tag, message=_xml(step["reason"]))
        return
    if tag is not None:
        _failure(case, tag, step["kind"], [step["reason"], step["advice"]])
    text = _xml(remark({**step, "reason": ""}))
    if text:
        ElementTree.SubElement(case, "system-out").text = text


def _failure(case: ElementTree.Element, tag: str, kind: str, lines: Sequence[str]) -> None:
    """Some collectors show the message, others the text."""
    failure = ElementTree.SubElement(case, tag, message=_xml(lines[0]), type=kind)
    failure.text = _xml("\n".join(filter(None, lines)))


def _xml(text: str) -> str:
    return _NOT_XML.sub(lambda found: found.group().encode(
        "unicode_escape", "surrogatepass").decode("ascii"), text)
