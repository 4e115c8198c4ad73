"""Many stations and one PostgreSQL server, which is killed and started in the middle."""

from __future__ import annotations

import json
import signal
import socket
import subprocess
from pathlib import Path

import pytest
from line_bench import in_thread, write_plan
from postgresql import PASSWORD, Cluster
from station_peer import Run
from store_bench import keep, record, runs_of, until
from store_process import station

from amt_line.store import Delivery, Search, Store, StoreAway
from amt_line.store.gap import compare

pytestmark = pytest.mark.xdist_group("postgresql")
FAST = (0.01, 0.05)
PLAN = "[[step]]\nask = 'Is it white?'\nname = 'screen'\n"


@pytest.fixture(autouse=True)
def state(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    """The state directory is the test's."""
    monkeypatch.setenv("XDG_STATE_HOME", str(tmp_path / "state"))


@pytest.fixture
def url(postgresql: Cluster) -> str:
    """An empty database of the server."""
    return postgresql.new_database()


def assert_whole(url: str, *folders: Path) -> None:
    """Every record is there once, as it is on the disk, and in the order of its station."""
    with Store.open(url) as store:
        rows = sorted(store.runs(Search(size=10_000)).rows)
        assert sorted(row.run for row in rows) == sorted(
            run for folder in folders for run in runs_of(folder))
        for folder in folders:
            assert compare(store, folder).agree
        for name in {row.station for row in rows}:
            began = [row.began for row in rows if row.station == name]
            assert began == sorted(began)


def wait_for(stations: "list[subprocess.Popen[str]]", word: str) -> None:
    """Wait until every station has said this."""
    for process in stations:
        assert process.stdout is not None
        assert any(word in line for line in iter(process.stdout.readline, "")), "it has ended"


@pytest.mark.parametrize("how", [signal.SIGKILL, signal.SIGQUIT], ids=lambda how: how.name)
def test_two_stations_and_a_server_that_is_killed(postgresql: Cluster, url: str, tmp_path: Path,
                                                  how: signal.Signals) -> None:
    folders = [tmp_path / "A", tmp_path / "B"]
    stations = [station(url, folder, folder.name, 60) for folder in folders]
    try:
        wait_for(stations, "recorded 20")
        postgresql.end(how)
        wait_for(stations, "recorded 40")
        postgresql.start()
        for process in stations:
            assert process.communicate(timeout=300)[0].splitlines()[-1].strip() == "done"
    finally:
        for process in stations:
            process.kill()
            process.wait()
    assert_whole(url, *folders)


def test_a_server_that_comes_and_goes(postgresql: Cluster, url: str, tmp_path: Path) -> None:
    delivery = Delivery(url, tmp_path / "A", FAST)
    for number in range(4):
        delivery.recorded(keep(tmp_path / "A", record(number)))
        until(lambda: delivery.state == "ok" and not delivery.standing.behind)
        postgresql.end(signal.SIGQUIT)
        delivery.recorded(keep(tmp_path / "A", record(number + 0.5)))
        until(lambda: delivery.state.startswith("behind: 1 record, since "))
        assert PASSWORD not in delivery.state
        postgresql.start()
    until(lambda: delivery.state == "ok")
    delivery.close(300)
    assert_whole(url, tmp_path / "A")


def test_reading_goes_on_with_a_server_that_is_back(postgresql: Cluster, url: str) -> None:
    with Store.open(url) as store:
        store.put(record())
        postgresql.end(signal.SIGQUIT)
        with pytest.raises(StoreAway) as caught:
            store.runs()
        assert "No such file or directory" in str(caught.value) or "refused" in str(caught.value)
        postgresql.start()
        assert store.runs().total == 1 and store.put(record(1))


def test_a_run_while_the_server_is_away(postgresql: Cluster, url: str, tmp_path: Path,
                                        run_station: Run, records: Path) -> None:
    plan = str(write_plan(tmp_path, PLAN))

    def run() -> "subprocess.CompletedProcess[str]":
        return run_station("-p", "/dev/no-such-port", "run", plan, "--records", str(records),
                           AMT_STATION_STORE=url)

    result = run()
    assert result.returncode == 3 and "store" not in result.stderr
    postgresql.end(signal.SIGQUIT)
    for count in ("1 record is", "2 records are"):
        result = run()
        lines = result.stderr.splitlines()
        assert result.returncode == 3 and len(lines) == 2 and lines[0].startswith("record: ")
        assert lines[1].startswith(f"store: {count} still to be delivered: postgresql+psycopg2:"
                                   "//amt:***@/")
        assert lines[1].endswith("; the next run does it, or `amt-station store sync`")
    result = run_station("store", "sync", "--store", url, "--records", str(records), "--json")
    assert result.returncode == 7
    assert json.loads(result.stdout)["error"]["kind"] == "store-away"
    postgresql.start()
    result = run_station("store", "sync", "--store", url, "--records", str(records))
    assert result.stdout == f"{records}: 3 files, 2 delivered\n"
    assert_whole(url, records)


@pytest.mark.parametrize("wrong, words", [
    (("amt:", "nobody:"), 'password authentication failed for user "nobody"'),
    (("@/line", "@/other"), "does not exist")])
def test_no_password_is_ever_told(url: str, tmp_path: Path, run_station: Run, records: Path,
                                  wrong: tuple[str, str], words: str) -> None:
    asked = url.replace(*wrong)
    secrets = [PASSWORD, url.partition("//amt:")[2].partition("@")[0]]
    plan = str(write_plan(tmp_path, PLAN))
    for arguments in (["-p", "/dev/null", "run", plan], ["store", "sync", "--json"],
                      ["store", "check"]):
        result = run_station(*arguments, "--store", asked, "--records", str(records))
        said = result.stdout + result.stderr
        assert words in said and "***@/" in said
        assert not any(secret in said for secret in secrets)
    for path in tmp_path.rglob("*"):
        if path.is_file():
            content = path.read_text(encoding="utf-8", errors="replace")
            assert not any(secret in content for secret in secrets), path


def test_a_server_that_says_nothing(url: str, tmp_path: Path) -> None:
    with socket.create_server(("127.0.0.1", 0)) as silent:
        port = silent.getsockname()[1]
        delivery = Delivery(f"postgresql+psycopg2://amt@127.0.0.1:{port}/line", tmp_path / "A")
        delivery.recorded(keep(tmp_path / "A", record()))
        in_thread(delivery.close).join(300)
        (line,) = delivery.lines()
    assert "1 record is still to be delivered" in line
    delivery = Delivery(url, tmp_path / "A")
    delivery.close(300)
    assert_whole(url, tmp_path / "A")
