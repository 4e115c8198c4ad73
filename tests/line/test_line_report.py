"""Reports: made from records, true, and harmless whatever stands in them."""

from __future__ import annotations

import csv
import io
import re
from html.parser import HTMLParser
from pathlib import Path
from typing import Any
from xml.etree import ElementTree

import pytest
from line_bench import ADC, OK, Bench, Script, adc, load
from station_peer import Peer

from amt_line.report.bars import bar_for
from amt_line.report.csv_file import COLUMNS, csv_text
from amt_line.report.html_file import html_page
from amt_line.report.junit import junit_xml
from amt_line.report.records import limits_text, value_text
from amt_station.wire import ACKNOWLEDGEMENT

HOSTILE = "\x1b[2J\u202e\x9b31m<script>alert(1)</script>&\"'"


@pytest.fixture(name="record")
def make_record(tmp_path: Path, peer: Peer, records: Path) -> dict[str, Any]:
    """A run with every verdict of a step."""
    peer.script = Script(
        requests={224: [[ACKNOWLEDGEMENT, adc(15)], [ACKNOWLEDGEMENT, adc(25)]]},
        texts={"AT+H": [HOSTILE.encode() + b"\r\n" + OK], "AT+F": [b"=1+1\r\n" + OK]})
    near = ADC.replace("max = 20", "max = 20, marginal = { max = 12 }")
    plan = load(tmp_path, "title = 'Ende \U0001f4a1 <b>'\n" + near + ADC + "[[step]]\nat = 'AT+H'\n"
                "[[step]]\nat = 'AT+F'\n[[step]]\nask = 'Well?'\n[[step]]\nat = 'AT'\n"
                "when = 'passed'\n[input.sn]\n")
    return Bench(plan, peer, {"sn": "<i>"}, records=records).run()


def test_junit(record: dict[str, Any]) -> None:
    suite = ElementTree.fromstring(junit_xml([record, record]))[1]
    counted = {name: suite.attrib[name] for name in ("tests", "failures", "errors", "skipped")}
    assert counted == {"tests": "6", "failures": "1", "errors": "1", "skipped": "1"}
    assert re.fullmatch(r"2\d{3}-\d\d-\d\dT[\d:.]+", suite.attrib["timestamp"])
    properties = {item.attrib["name"]: item.attrib["value"] for item in suite.iter("property")}
    assert properties["input.sn"] == "<i>" and properties["verdict"] == "ERROR"
    cases = suite.findall("testcase")
    assert cases[0].attrib["classname"] == "Ende \U0001f4a1 <b>.step"
    assert [[child.tag for child in case] for case in cases] == [
        ["system-out"], ["failure", "system-out"], ["system-out"], ["system-out"], ["error"],
        ["skipped"]]
    assert cases[1][0].attrib["message"] == "adc 25 is above 20"
    assert cases[0][0].text == "adc 15"


def test_junit_says_it_wherever_a_collector_looks(record: dict[str, Any]) -> None:
    suite = ElementTree.fromstring(junit_xml([record]))[0]
    cases = suite.findall("testcase")
    names = [(case.attrib["classname"], case.attrib["name"]) for case in cases]
    assert names[:2] == [(names[0][0], "adc"), (names[0][0], "adc (2)")]
    assert len(set(names)) == len(names), "a second of one name would take the first one's place"
    assert re.fullmatch(r"\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d", suite.attrib["timestamp"])
    assert (cases[1][0].text or "").splitlines() == [
        "adc 25 is above 20", record["steps"][1]["advice"]]
    assert (cases[4][0].text or "").startswith("there is nobody to ask")
    assert all(out.text for out in suite.iter("system-out"))


def test_junit_of_a_run_that_never_began_is_an_error(record: dict[str, Any]) -> None:
    broken = {**record, "steps": record["steps"][-1:], "verdict": "ERROR", "reason": "no port"}
    suite = ElementTree.fromstring(junit_xml([broken]))[0]
    assert suite.attrib["errors"] == "1"
    running = {**broken, "verdict": None, "reason": "", "seconds": None}
    assert ElementTree.fromstring(junit_xml([running]))[0].attrib["errors"] == "1"


def test_csv_has_a_line_a_value(record: dict[str, Any]) -> None:
    rows = list(csv.DictReader(io.StringIO(csv_text([record, record]))))
    assert len(rows) == 2 * sum(len(step["values"]) for step in record["steps"])
    first = rows[0]
    assert tuple(first) == COLUMNS
    assert (first["value"], first["number"], first["min"], first["max"], first["value_verdict"],
            first["marginal"]) == ("adc", "15", "10", "20", "pass", "yes")
    texts = [row["text"] for row in rows]
    assert "'=1+1" in texts, "a spreadsheet would carry it out"
    assert all(text.isprintable() for text in texts)


class _Page(HTMLParser):
    """Collects what a browser would load or carry out."""

    def __init__(self) -> None:
        super().__init__()
        self.tags: list[str] = []
        self.links: list[str] = []
        self.text = ""

    def handle_starttag(self, tag: str, attrs: list[tuple[str, str | None]]) -> None:
        self.tags.append(tag)
        self.links += [value or "" for name, value in attrs
                       if name in ("src", "href") or name.startswith("on")]

    def handle_data(self, data: str) -> None:
        self.text += data


def test_html_is_one_harmless_file(record: dict[str, Any]) -> None:
    page = _Page()
    text = html_page([record])
    page.feed(text)
    assert not {"script", "link", "img", "iframe", "b1"} & set(page.tags) and not page.links
    assert "http" not in text.replace("http-equiv", "").replace("http://www.w3.org", "")
    assert "[2J\\u202e\\x9b31m<script>alert(1)</script>" in page.text
    assert all(character.isprintable() or character == "\n" for character in text)
    assert "svg" in page.tags and "details" in page.tags and "ERROR" in page.text


def test_html_of_many_leads_to_each(record: dict[str, Any]) -> None:
    page = _Page()
    page.feed(html_page([record] * 3))
    assert page.links == ["#run-1", "#run-2", "#run-3"]


@pytest.mark.parametrize("number, limits, low, high, mark, beyond", [
    (15, {"min": 10, "max": 20}, 20, 80, 50, False),
    (10, {"min": 10, "max": 20}, 20, 80, 20, False),
    (99, {"min": 10, "max": 20}, 20, 80, 98.5, True), (5, {"min": 5, "max": 5}, 50, 50, 50, False),
    (0, {"min": 0}, 20, 100, 20, False), (-4, {"max": 0}, 0, 80, 32, False)])
def test_bars(number: float, limits: dict[str, float], low: float, high: float, mark: float,
              beyond: bool) -> None:
    bar = bar_for({"value": number, "limits": limits})
    assert bar is not None
    assert (bar.low, bar.high) == (low, high)
    assert bar.mark == pytest.approx(mark) and bar.beyond is beyond


@pytest.mark.parametrize("value", [
    {"value": "x", "limits": {"min": 1}}, {"value": 1}, {"value": 1, "limits": {"one_of": [1]}}])
def test_no_bar_without_numbers(value: dict[str, Any]) -> None:
    assert bar_for(value) is None


def test_values_and_limits_for_people() -> None:
    assert value_text({"value": 4.012345, "unit": "V"}) == "4.012345 V"
    assert value_text({"value": 16, "word": "software"}) == "software (16)"
    assert limits_text({"unit": "V", "limits": {"min": 3.6, "max": 4.4}}) == "3.6 to 4.4 V"
    assert limits_text({"limits": {"max": 2, "matches": "\x07"}}) == "at most 2, matches \\x07"
