"""The pages of what was: runs found, sorted and paged, and a run whole."""

from __future__ import annotations

import json
import re
from datetime import datetime
from html.parser import HTMLParser
from http.client import HTTPConnection, HTTPResponse
from pathlib import Path
from typing import Any, Iterator
from urllib.parse import urlencode

import pytest
from line_documents import NOON, exchange, record, step, utc, value

from amt_line.drawing.days import share_text
from amt_line.store import Store, StoreAway
from amt_line.view.web.address import Address
from amt_line.view.web.search import BadQuery, read_query
from amt_line.view.web.server import Page

HOSTILE = "<script>alert(1)</script>\u202e\"'&<img src=x onerror=alert(2)>"


class Served:
    """A page of records, and the store behind it."""

    def __init__(self, folder: Path) -> None:
        self.url = f"sqlite:///{folder / 'line.sqlite'}"
        self.store = Store.open(self.url)
        self.page = Page(Address(port=0), store=lambda: Store.open(self.url))

    def get(self, path: str, **query: str) -> tuple[HTTPResponse, str]:
        """A page as a browser asks for it."""
        connection = HTTPConnection("127.0.0.1", self.page.port, timeout=60)
        connection.request("GET", f"{path}?{urlencode(query)}" if query else path,
                           headers={"Accept": "text/html"})
        response = connection.getresponse()
        text = response.read().decode()
        connection.close()
        return response, text

    def duts(self, **query: str) -> list[str]:
        """The handsets that a search finds, in their order."""
        response, text = self.get("/runs", **query)
        assert response.status == 200
        return re.findall(r'<th scope="row"><a href="/runs/[0-9a-f-]{36}">([^<]*)</a>', text)

    def close(self) -> None:
        """End the page."""
        self.page.close()
        self.store.close()


@pytest.fixture
def served(tmp_path: Path) -> Iterator[Served]:
    """An empty store, served."""
    pages = Served(tmp_path)
    yield pages
    pages.close()


class Tags(HTMLParser):
    """The tags and texts of a page."""

    def __init__(self, text: str) -> None:
        super().__init__()
        self.tags: list[str] = []
        self.attributes: set[str] = set()
        self.text = ""
        self.feed(text)

    def handle_starttag(self, tag: str, attrs: list[tuple[str, str | None]]) -> None:
        self.tags.append(tag)
        self.attributes |= {name for name, _ in attrs}

    def handle_data(self, data: str) -> None:
        self.text += data


def local(moment: datetime) -> str:
    """The day on the wall's calendar."""
    return moment.astimezone().strftime("%Y-%m-%d")


def test_without_a_line_the_first_page_is_that_of_the_runs(served: Served) -> None:
    response, _ = served.get("/")
    assert (response.status, response.headers["Location"]) == (302, "/runs")
    text = served.get("/runs")[1]
    assert 'href="/statistics"' in text and 'href="/"' not in text
    assert "No run fits this search." in text
    for path in ("/live", "/answer", "/picture/x"):
        assert served.get(path)[0].status == 404


def test_runs_are_found(served: Served) -> None:
    served.store.put(record(1, "PASS"))
    served.store.put(record(2, "FAIL", reason="battery ADC: 5 is less than 100", station="other"))
    served.store.put(record(3, None, slot="9"))
    served.store.put(record(4, "ABORTED", plan={**record()["plan"], "title": "Incoming"}))
    first, second, third, fourth = (f"KEL{number:010d}" for number in (1, 2, 3, 4))
    assert served.duts() == [fourth, third, second, first], "the newest first"
    assert served.duts(dut="0000001") == [first]
    assert served.duts(text="less than") == [second]
    assert served.duts(verdict="FAIL") == [second]
    assert served.duts(verdict="UNFINISHED") == [third]
    assert served.duts(plan="Incoming") == [fourth]
    assert served.duts(station="other") == [second]
    assert served.duts(slot="9") == [third]
    assert served.duts(since=local(NOON), until=local(NOON)) == [fourth, third, second, first]
    assert served.duts(until="2026-01-29") == [] and served.duts(since="2026-02-02") == []
    assert served.duts(sort="dut") == [first, second, third, fourth]
    assert served.duts(sort="-dut", verdict="PASS", dut="KEL") == [first]


def test_runs_come_in_pages(served: Served) -> None:
    served.store.put_new(json.dumps(record(number)) for number in range(120))
    seen: list[str] = []
    path = "/runs?dut=KEL"
    while path:
        text = served.get(path)[1]
        seen += re.findall(r">(KEL\d{10})</a>", text)
        found = re.search(r'rel="next" href="([^"]+)"', text)
        path = found[1].replace("&amp;", "&") if found else ""
        assert not path or "dut=KEL" in path, "what was searched for stays"
    assert seen == [f"KEL{number:010d}" for number in reversed(range(120))]
    assert "Runs found: 120" in text and "Page 3 of 3" in text
    assert 'rel="prev" href="/runs?dut=KEL&amp;page=2"' in text


def test_a_column_sorts_one_way_and_then_the_other(served: Served) -> None:
    served.store.put(record(1))
    text = served.get("/runs")[1]
    assert 'aria-sort="descending"><a href="/runs?sort=began"' in text
    assert 'aria-sort="none"><a href="/runs?sort=-dut"' in text
    assert 'aria-sort="descending"><a href="/runs?sort=dut"' in served.get("/runs", sort="-dut")[1]
    assert 'aria-sort="ascending"><a href="/runs?sort=-dut"' in served.get("/runs", sort="dut")[1]


@pytest.mark.parametrize("query, key", [
    ({"verdict": "pass"}, "query.verdict"), ({"sort": "reason"}, "query.sort"),
    ({"sort": "--dut"}, "query.sort"), ({"page": "0"}, "query.page"),
    ({"page": "\u0662"}, "query.page"), ({"page": "9" * 9}, "query.page"),
    ({"since": "yesterday"}, "query.date"), ({"until": "9999-12-31"}, "query.date"),
    ({"since": "2026-13-01"}, "query.date"), ({"since": "0001-01-01"}, "query.date")])
def test_a_query_that_cannot_be_meant_so_is_refused(query: dict[str, str], key: str) -> None:
    with pytest.raises(BadQuery, match=key):
        read_query(query)


def test_a_refused_query_says_why_and_keeps_what_was_asked(served: Served) -> None:
    response, text = served.get("/runs", since="31.1.2026", dut="KEL1")
    assert response.status == 400
    assert "A date is needed, such as 2026-01-31." in text and 'value="KEL1"' in text


def test_a_run_is_shown_whole(served: Served) -> None:
    document = record(
        7, "FAIL", reason="battery ADC: 4050 is more than 4000", advice="see to the battery",
        steps=[step(1, "battery ADC", "fail", values=[value(4050, 100, 4000)],
                    reason="adc is 4050 mV", exchanges=[exchange()],
                    earlier=[{"attempt": 1, "verdict": "error", "reason": "no answer"}]),
               step(2, "near", values=[value(150, 100, 4000, marginal=True)]),
               step(3, "label", "skipped", reason="battery ADC did not pass",
                    answer={"text": "yes", "by": "page"})],
        begin=[exchange("0d0a")])
    served.store.put(document)
    response, text = served.get(f"/runs/{document['run']}")
    tags = Tags(text)
    assert response.status == 200
    for said in ("FAIL", "KEL0000000007", "First that did not pass: battery ADC: 4050 is more",
                 "What to do: see to the battery", "4050 mV", "100 to 4000 mV", "near",
                 "Attempt 1: no answer", "answered: yes (page)", "battery ADC did not pass",
                 "SKIPPED", "Exchanges: 1", "7e 01", "4f 4b", "Before the first step", "Input sn"):
        assert said in tags.text, said
    assert tags.tags.count("details") == 3, "two lists of exchanges and the languages"
    assert text.count('class="value-bar"') == 2 and 'class="mark fail"' in text


def test_a_record_is_downloaded_as_it_is(served: Served) -> None:
    document = record(7, dut="../../etc/<x>\u202e")
    served.store.put(document)
    response, text = served.get(f"/runs/{document['run']}/record.json")
    assert (response.status, json.loads(text)) == (200, document)
    assert response.headers["Content-Type"] == "application/json; charset=utf-8"
    assert re.fullmatch(r'attachment; filename="[A-Za-z0-9_-]+\.json"',
                        response.headers["Content-Disposition"])


@pytest.mark.parametrize("path", [
    "/runs/00000000-0000-4000-8000-000000000000", "/runs/x", "/runs/../../etc/passwd",
    "/runs/00000000-0000-4000-8000-000000000000/record.json", "/runs/%00", "/runs/"])
def test_a_run_that_is_not_there_is_said_so(served: Served, path: str) -> None:
    response, text = served.get(path)
    assert response.status == 404 and "There is nothing here" in text


def test_whatever_a_handset_or_a_file_says_is_only_read(served: Served) -> None:
    document = record(
        1, "FAIL", reason=HOSTILE, advice=HOSTILE, dut=HOSTILE, station=HOSTILE, slot=HOSTILE,
        operator=HOSTILE, port=HOSTILE, inputs={HOSTILE: HOSTILE}, remarks=[HOSTILE],
        tool={"name": HOSTILE, "version": HOSTILE}, begin=[exchange(text=HOSTILE)],
        plan={**record()["plan"], "title": HOSTILE, "version": HOSTILE, "path": HOSTILE},
        steps=[step(1, HOSTILE, "fail", reason=HOSTILE, remarks=[HOSTILE], forced=[HOSTILE],
                    subject=HOSTILE, answer={"text": HOSTILE, "by": HOSTILE},
                    earlier=[{"attempt": 1, "verdict": "fail", "reason": HOSTILE}],
                    exchanges=[exchange(text=HOSTILE)],
                    values=[{"name": HOSTILE, "value": HOSTILE, "verdict": "fail",
                             "limits": {"matches": HOSTILE, "one_of": [HOSTILE]}}])])
    served.store.put(document)
    for path in ("/runs", f"/runs/{document['run']}", "/runs?" + urlencode({"dut": HOSTILE}),
                 "/runs?" + urlencode({"since": HOSTILE, "text": HOSTILE})):
        text = served.get(path)[1]
        tags = Tags(text)
        assert "script" not in tags.tags and "img" not in tags.tags
        assert not [name for name in tags.attributes if name.startswith("on") or name == "style"]
        assert "\u202e" not in tags.text


def test_a_database_that_is_away_is_said_so_and_asked_again(tmp_path: Path) -> None:
    Store.open(f"sqlite:///{tmp_path / 'line.sqlite'}").close()
    away = True

    def opened() -> Store:
        if away:
            raise StoreAway("the database cannot be reached")
        return Store.open(f"sqlite:///{tmp_path / 'line.sqlite'}")

    pages = Served(tmp_path)
    pages.page.close()
    pages.page = Page(Address(port=0), store=opened, delivery=lambda: "behind: 3 <b>records</b>")
    try:
        response, text = pages.get("/runs")
        assert response.status == 503 and "the database cannot be reached" in text
        assert "The database is behind: 3 &lt;b&gt;records&lt;/b&gt;" in text
        away = False
        assert pages.get("/runs")[0].status == 200
    finally:
        pages.close()


@pytest.mark.parametrize("accepted, code, words", [
    ("de-DE,de;q=0.9", "de", "Gefundene Prüfläufe: 1"), ("zh-CN", "zh-Hans", "找到记录：1"),
    ("fr", "en", "Runs found: 1")])
def test_a_page_is_in_the_browsers_language(served: Served, accepted: str, code: str,
                                            words: str) -> None:
    served.store.put(record(1))
    connection = HTTPConnection("127.0.0.1", served.page.port, timeout=60)
    connection.request("GET", "/runs", headers={"Accept-Language": accepted})
    text = connection.getresponse().read().decode()
    connection.close()
    assert f'<html lang="{code}">' in text and words in text


def test_the_switch_of_languages_is_remembered(served: Served) -> None:
    response, text = served.get("/runs", dut="a", lang="de")
    assert "Prüfläufe" in text and 'href="/runs?dut=a&amp;lang=en"' in text
    assert response.headers["Set-Cookie"].startswith("amt-language=de; HttpOnly; Max-Age=")
    assert served.get("/runs", lang="xx")[0].headers["Set-Cookie"] is None


def test_times_are_those_of_the_wall(served: Served) -> None:
    served.store.put(record(0))
    text = served.get("/runs")[1]
    assert NOON.astimezone().strftime("%Y-%m-%d %H:%M:%S") in text and utc(NOON) in text


def test_statistics_are_those_of_the_filter(served: Served) -> None:
    for number in range(12):
        good = number % 4 > 0
        served.store.put(record(
            number, "PASS" if good else "FAIL", station="one" if number < 8 else "two",
            steps=[step(1, HOSTILE, "pass" if good else "fail",
                        values=[value(3600 + number if good else 50, 100, 4000)])]))
    response, text = served.get("/statistics")
    tags = Tags(text)
    assert response.status == 200 and share_text(0.75) in text and "9 of 12 handsets" in text
    assert tags.tags.count("svg") == 3 and "script" not in tags.tags and "img" not in tags.tags
    assert not [name for name in tags.attributes if name.startswith("on") or name == "style"]
    assert "6 of 8 handsets" in served.get("/statistics", station="one")[1]
    assert "No run fits" in served.get("/statistics", until="2026-01-29")[1]
    response, text = served.get("/statistics", since="2026-01-31", until="2026-01-30")
    assert response.status == 400 and "The period ends before it begins." in text
    assert served.get("/statistics", since="x")[0].status == 400


@pytest.mark.parametrize("code", ["de", "zh-Hans"])
def test_every_word_of_the_statistics_is_told(served: Served, code: str) -> None:
    for number in range(8):
        served.store.put(record(
            number, "PASS" if number % 2 else "FAIL", station=str(number % 2),
            plan={**record()["plan"], "title": str(number % 2)}, steps=[
                step(1, "1", "pass" if number % 2 else "fail", values=[value(5, 1, 9, "2")])]))
    plain = Tags(served.get("/statistics", lang=code)[1]).text
    english = Tags(served.get("/statistics", lang="en")[1]).text
    for word in ("Failures by step", "Step times", "First pass", "Smallest", "With those above",
                 "values", "first pass", "Handsets", "median", "least capable"):
        assert word in english and word not in plain, word


def everything() -> Any:
    """What a record may hold at most is what its schema says."""
    from jsonschema import Draft202012Validator

    from amt_line.run.record_schema import record_schema

    return Draft202012Validator(record_schema())


def test_the_documents_of_these_tests_are_records() -> None:
    for document in (record(1), record(2, None), record(3, "ABORTED"), record(
            4, "FAIL", steps=[step(1, "x", "fail", values=[value(1, 2, 3)],
                                   exchanges=[exchange()])])):
        everything().validate(document)
