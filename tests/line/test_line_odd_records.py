"""Records that somebody else wrote, or broke: read and reported, or refused with one clear line."""

from __future__ import annotations

import copy
import json
import os
from pathlib import Path
from typing import Any, Iterator
from xml.etree import ElementTree

import pytest
from hypothesis import HealthCheck, given, settings
from hypothesis import strategies as st
from line_bench import ADC, Bench, Script, adc, load, write_plan
from station_peer import Peer, Run

from amt_line.cli.show import record_lines
from amt_line.report.csv_file import csv_text
from amt_line.report.html_file import html_page
from amt_line.report.junit import junit_xml
from amt_line.report.records import load_record
from amt_station.errors import UsageProblem
from amt_station.wire import ACKNOWLEDGEMENT
from amt_station.wire.decoder import EnvelopeDecoder


@pytest.fixture(name="record", scope="module")
def make_record(tmp_path_factory: pytest.TempPathFactory) -> dict[str, Any]:
    """A record with a bit of everything."""
    peer = Peer(EnvelopeDecoder())
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]},
                         texts={"AT+NO": [b"\r\n+CME ERROR: 10\r\n"]})
    near = ADC.replace("max = 20", "max = 20, marginal = { max = 12 }")
    plan = load(tmp_path_factory.mktemp("odd"), "[input.sn]\n[[setup]]\nat = 'AT'\n" + near
                + "[[step]]\nat = 'AT+NO'\nretry = { times = 1 }\n"
                "[[step]]\nname = 's'\nask = 'x?'\n")
    document = Bench(plan, peer, {"sn": "K"}, answers={"s": "no"}).run()
    peer.close()
    return document


def places(value: Any, path: tuple[Any, ...] = ()) -> Iterator[tuple[Any, ...]]:
    """Every way into a document."""
    items = value.items() if isinstance(value, dict) else (
        enumerate(value) if isinstance(value, list) else ())
    for key, part in items:
        yield (*path, key)
        yield from places(part, (*path, key))


ODD: st.SearchStrategy[Any] = st.sampled_from([
    None, True, 0, -1, 1e308, 10**400, 10**4000, float("nan"), float("inf"), "",
    "\x00\x1b\u202e\ud800", "x" * 5000, [], {}, ["a"], {"a": 1}, "<script>", "]]>", "ff",
    "2026-11-21T19:00:00.000Z"])


@settings(max_examples=500, suppress_health_check=[HealthCheck.function_scoped_fixture])
@given(data=st.data())
def test_a_changed_record_is_reported_or_refused(record: dict[str, Any], data: Any,
                                                 tmp_path_factory: pytest.TempPathFactory) -> None:
    changed = copy.deepcopy(record)
    for *path, key in data.draw(st.lists(st.sampled_from(list(places(record))), min_size=1,
                                         max_size=2)):
        place = changed
        try:
            for part in path:
                place = place[part]
            place[key] = data.draw(ODD)
        except (KeyError, IndexError, TypeError):
            continue  # the first change took the place of the second away
    file = tmp_path_factory.getbasetemp() / "odd.json"
    file.write_text(json.dumps(changed), encoding="utf-8")
    try:
        read = load_record(file)
    except UsageProblem as problem:
        assert str(problem).startswith(str(file))
        return
    html_page([read, read]).encode()
    ElementTree.fromstring(junit_xml([read]))
    csv_text([read]).encode()
    assert all(line.isprintable() for line in record_lines(read, exchanges=True))


@pytest.mark.parametrize("path", ["/dev/zero", "/dev/null", ".", "pipe", "deep.json", "a\0b"])
def test_what_is_no_file_of_a_record(tmp_path: Path, path: str) -> None:
    os.mkfifo(tmp_path / "pipe")
    (tmp_path / "deep.json").write_text('{"a": ' * 900 + "1" + "}" * 900, encoding="utf-8")
    with pytest.raises(UsageProblem):
        load_record(tmp_path / path)


def test_no_report_takes_the_place_of_what_is_read(tmp_path: Path, peer: Peer, run_station: Run,
                                                   records: Path) -> None:
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})
    plan = write_plan(tmp_path, ADC)
    result = run_station("-p", peer.path, "run", str(plan), "--html", str(plan))
    assert result.returncode == 2 and "take the place of what is read" in result.stderr
    assert plan.read_text(encoding="utf-8") == ADC and peer.raw == b""
    assert run_station("-p", peer.path, "run", str(plan), "--records", str(records)).returncode == 0
    (record,) = records.iterdir()
    before = record.read_bytes()
    link = tmp_path / "link"
    link.symlink_to(record)
    for name in (record, link):
        result = run_station("report", str(records), "--csv", str(name))
        assert result.returncode == 2 and record.read_bytes() == before
