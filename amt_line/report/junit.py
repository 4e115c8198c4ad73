"""JUnit XML, for whatever collects results."""

from __future__ import annotations

import re
from typing import Any, Mapping, Sequence
from xml.etree import ElementTree

from amt_line.report.records import remark, verdict_word

_NOT_XML = re.compile("[^\t\n\r\x20-\x7e\xa0-\ud7ff\ue000-\ufffd\U00010000-\U0010ffff]"
                      "|[\u200e\u200f\u202a-\u202e\u2066-\u2069]")
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
        root, "testsuite", name=title, timestamp=record["began"].removesuffix("Z"),
        hostname=_xml(record["station"]))
    _properties(suite, record)
    for step in record["steps"]:
        _case(suite, step, title)
    if _needs_verdict_case(record):
        case = ElementTree.SubElement(suite, "testcase", classname=title, name="the run",
                                      time="0.000")
        word = verdict_word(record)
        ElementTree.SubElement(case, "error", type=word,
                               message=_xml(record["reason"] or "the run has not ended"))
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


def _case(suite: ElementTree.Element, step: Mapping[str, Any], title: str) -> None:
    case = ElementTree.SubElement(
        suite, "testcase", classname=f"{title}.{step['section']}", name=_xml(step["name"]),
        time=f"{step['seconds']:.3f}")
    tag = _TAGS.get(step["verdict"])
    if tag is not None:
        attributes = {} if tag == "skipped" else {"type": step["kind"]}
        ElementTree.SubElement(case, tag, {"message": _xml(step["reason"]), **attributes})
    if step["values"] and tag != "skipped":
        text = remark({**step, "reason": ""})
        ElementTree.SubElement(case, "system-out").text = _xml(text)


def _xml(text: str) -> str:
    return _NOT_XML.sub(lambda found: found.group().encode(
        "unicode_escape", "surrogatepass").decode("ascii"), text)
