"""``amt-station stats`` as one types it."""

from __future__ import annotations

import csv
import io
import json
import re
from html.parser import HTMLParser
from pathlib import Path
from typing import Any, Callable, NamedTuple

import pytest
from station_peer import Run
from store_bench import record, step, value

from amt_line.report.statistics_data import COLUMNS, YIELD_FIGURES, statistics_csv
from amt_line.report.statistics_file import statistics_page
from amt_line.store import Store
from amt_line.store.figures import gather
from amt_line.view.statistics import plain_lines, show
from amt_station.cli.main import run

DAY = 86_400.0
HOSTILE = "\x1b[2J\u202e<script>alert(1)</script>&\"'"


def near(number: float) -> dict[str, Any]:
    return value("adc", number, unit="mV", verdict="pass" if 10 <= number <= 20 else "fail",
                 limits={"min": 10, "max": 20, "marginal_max": 19},
                 **({"marginal": True} if 19 < number <= 20 else {}))


@pytest.fixture(name="url")
def make_store(tmp_path: Path) -> str:
    """Five runs. K1 passes; K2 fails and passes an hour later; K3 fails the next day at B."""
    failed = [step(1, values=[near(25)], verdict="fail")]
    url = f"sqlite:///{tmp_path}/line.sqlite"
    with Store.open(url) as store:
        for document in (
                record(0, dut="K1", steps=[step(1, values=[near(14)])]),
                record(60, dut="K2", verdict="FAIL", steps=failed),
                record(3660, dut="K2", steps=[step(1, values=[near(19.5)])]),
                record(DAY, dut="K3", verdict="FAIL", station="B", steps=failed),
                record(DAY + 60, dut="K4", verdict="ERROR", steps=[
                    step(1, name="radio", verdict="error", values=[])])):
            store.put(document)
    return url


class Said(NamedTuple):
    """What a command came to."""

    returncode: int
    stdout: str
    stderr: str


Station = Callable[..., Said]


@pytest.fixture(name="station")
def make_station(capsys: pytest.CaptureFixture[str], monkeypatch: pytest.MonkeyPatch,
                 tmp_path: Path) -> Station:
    """Carry a command line out here: a process of its own takes longer than its work."""
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))
    monkeypatch.delenv("AMT_STATION_STORE", raising=False)

    def station(*arguments: str) -> Said:
        status = run(arguments)
        return Said(status, *capsys.readouterr())
    return station


def rows(text: str) -> dict[tuple[str, ...], str]:
    found = list(csv.DictReader(io.StringIO(text)))
    assert found and tuple(found[0]) == COLUMNS
    return {(row["about"], row["plan"] or row["station"] or row["day"], row["step"],
             row["figure"]): row["number"] for row in found}


def test_json(station: Station, url: str) -> None:
    result = station("stats", "--store", url, "--json")
    assert result.returncode == 0, result.stderr
    found = json.loads(result.stdout)
    assert found["ok"] is True and found["store"] == url
    whole = found["all"]
    assert tuple(whole) == YIELD_FIGURES
    assert (whole["runs"], whole["handsets"], whole["retests"], whole["errors"]) == (5, 3, 1, 1)
    assert whole["first_pass_yield"] == pytest.approx(1 / 3)
    assert whole["final_yield"] == pytest.approx(2 / 3)
    assert [day["day"] for day in found["days"]] == ["2026-11-20", "2026-11-21"]
    assert [day["final_yield"] for day in found["days"]] == [1.0, 0.0]
    assert found["failures"] == [
        {"plan": "line", "step": "step 1", "runs": 2, "failed": 2, "errors": 0},
        {"plan": "line", "step": "radio", "runs": 0, "failed": 0, "errors": 1}]
    adc, = found["values"]
    # 14, 25, 19.5, 25: mean 20.875, squares 47.265625 + 17.015625 + 1.890625 + 17.015625
    # = 83.1875, over 3: deviation 5.26585. Cpk (20 - 20.875) / 15.7976 = -0.05539.
    assert adc["mean"] == 20.875 and adc["deviation"] == pytest.approx(5.26585, abs=1e-5)
    assert adc["cpk"] == pytest.approx(-0.05539, abs=1e-5)
    assert (adc["count"], adc["marginal"], adc["failed"], adc["unit"]) == (4, 1, 2, "mV")
    assert found["steps"][0]["median"] == 0.5


def test_filters(station: Station, url: str) -> None:
    def counted(*arguments: str) -> tuple[int, int]:
        result = station("stats", "--store", url, "--json", *arguments)
        assert result.returncode == 0, result.stderr
        whole = json.loads(result.stdout)["all"]
        return whole["runs"], whole["handsets"]

    assert counted("--since", "2026-11-21") == (2, 1)
    assert counted("--until", "2026-11-20", "--station", "bench 1") == (3, 2)
    assert counted("--since", "2026-11-20T06:30") == (3, 1)
    assert counted("--since", "2026-11-20T14:30", "--zone", "Asia/Shanghai") == (3, 1)
    assert counted("--plan", "other") == (0, 0)


def test_files_and_plain_text(run_station: Run, url: str, tmp_path: Path) -> None:
    page, table = tmp_path / "s.html", tmp_path / "s.csv"
    result = run_station("stats", "--store", url, "--html", str(page), "--csv", str(table))
    assert result.returncode == 0, result.stderr
    assert "first-pass yield 33.3 % (1 of 3), final yield 66.7 % (2 of 3), 1 retest" in \
        result.stdout
    assert re.search(r"^step 1 +adc +10 to 20 mV +4 +20.88 mV +5.27 +14 +25 +0.32\* +-0.06\* +1 "
                     "+2$", result.stdout, re.MULTILINE)
    found = rows(table.read_text(encoding="utf-8"))
    assert found[("all", "", "", "first_pass_yield")].startswith("0.333")
    assert found[("day", "2026-11-21", "", "final_yield")] == "0.0"
    assert found[("value", "line", "step 1", "marginal")] == "1"
    assert found[("failures", "line", "radio", "errors")] == "1"
    assert found[("station", "B", "", "takt")] == ""
    assert "<svg" in page.read_text(encoding="utf-8")


@pytest.mark.parametrize("arguments, status, said", [
    (("--since", "soon"), 2, "--since: 'soon' is no time"),
    (("--zone", "Mars"), 2, "--zone: 'Mars' is no time zone"),
    (("--since", "2026-11-22", "--until", "2026-11-20"), 2, "the period ends before it begins"),
    (("--html", "/"), 2, "is a directory"),
    (("--csv", "/dev/null/x"), 2, "/dev/null/x: Not a directory"),
    (("--html", "same", "--csv", "./same"), 2, "two reports would go into one file"),
    (("--store", "mysql://host/x"), 2, "is no database that can be used"),
    (("--store", "sqlite:////nowhere/x.sqlite"), 3, "there is no such database"),
    (("--store", "sqlite:////dev/null"), 7, "sqlite:////dev/null")])
def test_what_cannot_be_done_is_told(station: Station, url: str, arguments: tuple[str, ...],
                                     status: int, said: str,
                                     monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setenv("AMT_STATION_STORE", url)
    result = station("stats", "--json", *arguments)
    assert result.returncode == status, result.stdout + result.stderr
    assert said in result.stderr and not Path("same").exists()
    assert json.loads(result.stdout)["error"]["message"] in result.stderr


def test_nothing_is_made_where_nothing_is(station: Station, tmp_path: Path) -> None:
    result = station("stats", "--html", str(tmp_path / "s.html"))
    assert result.returncode == 3 and "line.sqlite: there is no such database" in result.stderr
    assert not [path for path in tmp_path.rglob("*") if path.is_file()]


class _Page(HTMLParser):
    """Collects what a browser would load or carry out."""

    def __init__(self) -> None:
        super().__init__()
        self.tags: set[str] = set()
        self.loaded: list[str] = []
        self.text = ""

    def handle_starttag(self, tag: str, attrs: list[tuple[str, str | None]]) -> None:
        self.tags.add(tag)
        self.loaded += [name for name, _ in attrs
                        if name in ("src", "href", "style") or name.startswith("on")]

    def handle_data(self, data: str) -> None:
        self.text += data


@pytest.fixture(name="hostile")
def make_hostile_store(tmp_path: Path) -> str:
    url = f"sqlite:///{tmp_path}/hostile.sqlite"
    plan = {**record()["plan"], "title": HOSTILE}
    with Store.open(url) as store:
        for number, verdict in enumerate(("PASS", "FAIL")):
            word = verdict.lower()
            store.put(record(number * 60, dut=HOSTILE, plan=plan, station=HOSTILE,
                             slot=f"={number}", verdict=verdict, steps=[step(
                                 1, name=HOSTILE, verdict=word,
                                 values=[{**near(11 + number), "name": HOSTILE}])]))
    return url


def test_hostile_texts_are_harmless(hostile: str) -> None:
    with Store.open(hostile) as store:
        found = gather(store)
    page = _Page()
    text = statistics_page(found)
    page.feed(text)
    assert not {"script", "link", "img", "iframe"} & page.tags and not page.loaded
    assert "http" not in text.replace("http-equiv", "").replace("http://www.w3.org", "")
    assert "<script>alert(1)</script>" in page.text
    assert all(character.isprintable() or character == "\n" for character in text)
    table = statistics_csv(found)
    assert "'=0" in table and all(one.isprintable() for one in table.replace("\r\n", ""))
    assert all(line.isprintable() for line in plain_lines(found))


def test_an_empty_store_makes_a_page(tmp_path: Path) -> None:
    with Store.open(f"sqlite:///{tmp_path}/empty.sqlite") as store:
        found = gather(store)
    assert "no runs" in statistics_page(found) and "no run has failed" in statistics_page(found)
    assert any("first-pass yield \u2013 (0 of 0)" in line for line in plain_lines(found))
    assert "all,,,,,,,,,,runs,0" in statistics_csv(found)


class _Terminal(io.StringIO):
    def isatty(self) -> bool:
        return True


def test_a_terminal_gets_tables(url: str, monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setenv("TERM", "xterm")
    monkeypatch.setenv("COLUMNS", "60")
    terminal = _Terminal()
    with Store.open(url) as store:
        show(gather(store), terminal)
    bare = re.sub(r"\x1b\[[0-9;]*m", "", terminal.getvalue())
    assert "\x1b[1m" in terminal.getvalue() and "first-pass yield 33.3 %" in bare
    # Narrow as it is, no number is cut off.
    assert re.search(r"step 1 +adc +10 to 20.* -0.06\* +1 +2", bare)
    monkeypatch.setenv("TERM", "dumb")
    plain = _Terminal()
    with Store.open(url) as store:
        show(gather(store), plain)
    assert "\x1b" not in plain.getvalue()
