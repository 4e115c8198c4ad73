"""The store as it is typed: --store of a run, store sync, store check."""

from __future__ import annotations

import json
import resource
import signal
import subprocess
import sys
from dataclasses import dataclass
from pathlib import Path
from typing import Any, Callable

import pytest
from line_bench import ADC, Script, adc, write_plan
from station_peer import ROOT, Peer, Run, station_command, station_environment
from store_bench import keep, record, runs_of, unfinished, until

from amt_line.store import Search, Store, checked_url, default_store_url, shown_url
from amt_line.store.migrate import VERSION_TABLE
from amt_line.store.tables import METADATA
from amt_line.store.url import without_secrets
from amt_station.cli.main import run
from amt_station.errors import UsageProblem
from amt_station.wire import ACKNOWLEDGEMENT


def battery() -> Script:
    return Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})


@pytest.fixture
def home(tmp_path: Path) -> Path:
    """Where ``run_station`` keeps its state."""
    return tmp_path / "state" / "amt-station"


@dataclass(frozen=True)
class Said:
    """What a command in this process ended with."""

    returncode: int
    stdout: str
    stderr: str


RunStore = Callable[..., Said]


@pytest.fixture
def run_store(home: Path, capsys: pytest.CaptureFixture[str],
              monkeypatch: pytest.MonkeyPatch) -> RunStore:
    """Run ``amt-station store`` in this process, which is quicker."""
    monkeypatch.setenv("XDG_STATE_HOME", str(home.parent))
    monkeypatch.delenv("AMT_STATION_STORE", raising=False)

    def run_in_process(*arguments: str) -> Said:
        status = run(["store", *arguments])
        return Said(status, *capsys.readouterr())
    return run_in_process


def stored(url: str) -> list[Any]:
    with Store.open(url, create=False) as store:
        return list(store.runs(Search(sort="began")).rows)


def test_a_run_goes_to_the_default_store(tmp_path: Path, peer: Peer, run_station: Run,
                                         home: Path) -> None:
    peer.script = battery()
    plan = str(write_plan(tmp_path, ADC))
    for _ in range(2):
        result = run_station("-p", peer.path, "run", plan, "--dut", "D1")
        assert result.returncode == 0 and len(result.stderr.splitlines()) == 1, result.stderr
    rows = stored(f"sqlite:///{home}/line.sqlite")
    assert [row.verdict for row in rows] == ["PASS", "PASS"]
    assert {row.run for row in rows} == runs_of(home / "records")
    result = run_station("store", "check")
    assert (result.returncode, result.stderr) == (0, "")
    assert result.stdout == (f"{home}/records: 2 files, 2 in the database as they are, 0 missing, "
                             "0 differing, 0 only in the database, 0 no records\n")


def test_the_store_may_be_named(tmp_path: Path, peer: Peer, run_station: Run,
                                records: Path, home: Path) -> None:
    peer.script = battery()
    plan, url = str(write_plan(tmp_path, ADC)), f"sqlite:///{tmp_path}/a/b.sqlite"
    common = ("-p", peer.path, "run", plan, "--records", str(records))
    assert run_station(*common, "--store", url).returncode == 0
    assert run_station(*common, AMT_STATION_STORE=url).returncode == 0
    assert len(stored(url)) == 2 and not (home / "line.sqlite").exists()


@pytest.mark.parametrize("arguments, words", [
    (["--store", "mysql://u:secret@h/d"], "'mysql://u:***@h/d' is no database that can be used"),
    (["--store", "sqlite://"], "is no database that can be used; give sqlite:///FILE or postgre"),
    (["--store", "sqlite:///:memory:"], "a file is needed"),
    (["--store", "sqlite:///a?password=secret"], "'sqlite:///a?password=***': a file is needed"),
    (["--store", "sqlite:///a", "--no-records"], "contradict each other")])
def test_a_store_that_cannot_be(tmp_path: Path, peer: Peer, run_station: Run,
                                arguments: list[str], words: str) -> None:
    plan = str(write_plan(tmp_path, ADC))
    result = run_station("-p", peer.path, "run", plan, *arguments)
    assert result.returncode == 2 and words in result.stderr and "secret" not in result.stderr
    assert peer.raw == b"" and not (tmp_path / "state").exists()


def test_no_records_means_no_store(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    peer.script = battery()
    plan = str(write_plan(tmp_path, ADC))
    result = run_station("-p", peer.path, "run", plan, "--no-records", AMT_STATION_STORE="nonsense")
    assert result.returncode == 0 and not (tmp_path / "state").exists()


def test_a_store_out_of_order_changes_no_verdict(tmp_path: Path, peer: Peer, run_station: Run,
                                                 records: Path) -> None:
    peer.script = battery()
    (tmp_path / "bad.sqlite").write_text("this is no database" * 100, encoding="utf-8")
    url = f"sqlite:///{tmp_path}/bad.sqlite"
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--records",
                         str(records), "--store", url)
    assert result.returncode == 0 and "PASS (1 pass)" in result.stdout
    assert result.stderr.splitlines()[1:] == [
        f"store: 1 record is still to be delivered: {url}: file is not a database; the next run "
        "does it, or `amt-station store sync`"]


def test_a_full_disk_changes_no_verdict(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = battery()
    command = station_command("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--records",
                              str(records))
    environment = station_environment(XDG_STATE_HOME=str(tmp_path / "state"),
                                      PYTHONDONTWRITEBYTECODE="1")
    # Enough for a record, and too little for a database.
    result = subprocess.run(
        command, cwd=ROOT, env=environment, stdin=subprocess.DEVNULL, capture_output=True,
        text=True, timeout=300, check=False,
        preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (20_000, 20_000)))
    assert result.returncode == 0, result.stderr
    assert "1 record is still to be delivered: sqlite:///" in result.stderr
    assert subprocess.run(command, cwd=ROOT, env=environment, stdin=subprocess.DEVNULL,
                          capture_output=True, timeout=300, check=False).returncode == 0
    url = f"sqlite:///{tmp_path}/state/amt-station/line.sqlite"
    assert {row.run for row in stored(url)} == runs_of(records) and len(stored(url)) == 2


def test_a_run_that_is_killed_is_in_the_store_with_the_next(
        tmp_path: Path, peer: Peer, run_station: Run, records: Path) -> None:
    peer.script = battery()
    waiting = write_plan(tmp_path, ADC + "[[step]]\nwait = 300\n")
    url = f"sqlite:///{tmp_path}/line.sqlite"
    killed = subprocess.Popen(
        station_command("-p", peer.path, "run", str(waiting), "--records", str(records),
                        "--store", url), cwd=ROOT, stdin=subprocess.DEVNULL,
        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
        env=station_environment(XDG_STATE_HOME=str(tmp_path / "state")))
    until(lambda: any('"verdict": "pass"' in path.read_text(encoding="utf-8")
                      for path in records.glob("*.json")))
    killed.send_signal(signal.SIGKILL)
    killed.wait(300)
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--records",
                         str(records), "--store", url)
    assert result.returncode == 0, result.stderr
    assert [(row.state, row.verdict) for row in stored(url)] == [("running", ""),
                                                                 ("ended", "PASS")]
    for path in records.glob(".*"):
        path.unlink()  # half written when it was killed


def test_sync_delivers_in_order_and_names_what_is_none(tmp_path: Path, run_store: RunStore) -> None:
    folder, url = tmp_path / "kept", f"sqlite:///{tmp_path}/line.sqlite"
    documents = [record(2), unfinished(1), record(0)]
    for document in documents:
        keep(folder, document)
    (folder / "notes.json").write_text("{}", encoding="utf-8")
    where = ["--store", url, "--records", str(folder)]
    result = run_store("sync", *where)
    assert (result.returncode, result.stdout) == (1, f"{folder}: 4 files, 3 delivered\n")
    assert result.stderr == f"skipped {folder}/notes.json: no record of a run\n"
    assert [row.run for row in sorted(stored(url))] == [
        document["run"] for document in reversed(documents)]
    (folder / "notes.json").unlink()
    result = run_store("sync", *where, "--json")
    assert result.returncode == 0 and json.loads(result.stdout) == {
        "ok": True, "store": url, "records": str(folder), "files": 3, "delivered": 0,
        "skipped": {}}


def test_check_tells_every_difference(tmp_path: Path, run_store: RunStore) -> None:
    folder, url = tmp_path / "kept", f"sqlite:///{tmp_path}/line.sqlite"
    where = ["--store", url, "--records", str(folder)]
    changed, gone, same, went_on = record(0), record(1), record(2), unfinished(3)
    names = {document["run"]: keep(folder, document)
             for document in (changed, gone, same, went_on)}
    assert run_store("sync", *where).returncode == 0
    assert run_store("check", *where).returncode == 0
    keep(folder, {**changed, "reason": "changed"})
    names[gone["run"]].unlink()
    keep(folder, record(3, run=went_on["run"]))
    new = keep(folder, record(4))
    (folder / "notes.json").write_text("[", encoding="utf-8")
    # A copy under another name is no difference.
    (folder / "copy.json").write_bytes(names[same["run"]].read_bytes())
    result = run_store("check", *where, "--json")
    assert result.returncode == 1 and json.loads(result.stdout) == {
        "ok": False, "store": url, "records": str(folder), "files": 6, "stored": 2,
        "missing": [new.name],
        "differing": {
            names[changed["run"]].name: "the database has another record of this run",
            names[went_on["run"]].name: "the database has an earlier state of this run"},
        "unknown": [names[gone["run"]].name],
        "skipped": {"notes.json": "no record of a run: Expecting value: line 1 column 2 (char 1)"}}
    lines = run_store("check", *where).stdout.splitlines()
    assert f"{new.name}: missing in the database" in lines
    assert f"{names[gone['run']].name}: in the database, but not in the directory any more" in lines
    assert lines[-1] == (f"{folder}: 6 files, 2 in the database as they are, 1 missing, "
                         "2 differing, 1 only in the database, 1 no records")
    assert run_store("sync", *where).returncode == 1
    after = json.loads(run_store("check", *where, "--json").stdout)
    assert (after["missing"], list(after["differing"])) == ([], [names[changed["run"]].name])


def test_other_directories_are_not_missed(tmp_path: Path, run_store: RunStore) -> None:
    url = f"sqlite:///{tmp_path}/line.sqlite"
    for number, name in enumerate(("A", "B")):
        keep(tmp_path / name, record(number))
        assert run_store("sync", "--store", url, "--records",
                         str(tmp_path / name)).returncode == 0
    assert len(stored(url)) == 2
    assert run_store("check", "--store", url, "--records",
                     str(tmp_path / "A")).returncode == 0


@pytest.mark.parametrize("arguments, status, words", [
    (["check"], 7, "no such database"), (["sync", "--records", "/no/such"], 2, "no such directory"),
    (["check", "--store", "x"], 2, "is no database that can be used"), (["mend"], 2, "No such"),
    ([], 2, "Missing command")])
def test_what_cannot_be_done(run_store: RunStore, arguments: list[str], status: int,
                             words: str) -> None:
    result = run_store(*arguments)
    assert result.returncode == status and words in result.stderr
    assert len(result.stderr.splitlines()) == 1 and result.stdout == ""


def test_sync_without_anything_makes_the_database(run_store: RunStore, home: Path) -> None:
    result = run_store("sync")
    assert (result.returncode, result.stdout) == (0, f"{home}/records: 0 files, 0 delivered\n")
    assert run_store("check").returncode == 0


def test_what_needs_no_database_imports_none() -> None:
    code = ("import sys; from amt_station.cli.lazy import COMMANDS, load; import amt_line.store;"
            "[load(COMMANDS[name]) for name in ('at', 'check', 'run', 'send', 'show')];"
            "print({'sqlalchemy', 'alembic', 'psycopg2'} & set(sys.modules))")
    assert subprocess.run([sys.executable, "-c", code], cwd=ROOT, capture_output=True, text=True,
                          check=True, timeout=300).stdout == "set()\n"
    code = ("import sys; from amt_station.cli.lazy import COMMANDS, load; load(COMMANDS['at']);"
            "print([name for name in sys.modules if name.startswith('amt_line')])")
    assert subprocess.run([sys.executable, "-c", code], cwd=ROOT, capture_output=True, text=True,
                          check=True, timeout=300).stdout == "[]\n"


@pytest.mark.parametrize("url, shown", [
    ("postgresql+psycopg2://u:p@h/d", "postgresql+psycopg2://u:***@h/d"),
    ("postgresql+psycopg2://u:p/w@x@h/d", "postgresql+psycopg2://u:***@h/d"),
    ("postgresql+psycopg2://u@h:5432/d?password=p&x=y",
     "postgresql+psycopg2://u@h:5432/d?password=***&x=y"),
    ("postgresql+psycopg2:///d?sslpassword=p", "postgresql+psycopg2:///d?sslpassword=***"),
    ("sqlite:////a/b", "sqlite:////a/b"), ("\x1b[31m", "\\x1b[31m")])
def test_how_urls_are_shown(url: str, shown: str) -> None:
    assert shown_url(url) == shown


def test_messages_lose_their_passwords() -> None:
    url = "postgresql+psycopg2://u:s%2Fecret@h/d"
    assert without_secrets("bad dsn\n s/ecret or s%2Fecret", url) == "bad dsn *** or ***"


def test_which_urls_are_taken(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.chdir(tmp_path)
    monkeypatch.delenv("AMT_STATION_STORE", raising=False)
    monkeypatch.setenv("XDG_STATE_HOME", "/s")
    assert checked_url(None) == default_store_url() == "sqlite:////s/amt-station/line.sqlite"
    assert checked_url("sqlite:///a.sqlite") == f"sqlite:///{tmp_path}/a.sqlite"
    assert checked_url("postgresql://u@h/d") == "postgresql+psycopg2://u@h/d"
    monkeypatch.setenv("AMT_STATION_STORE", "oracle://h")
    with pytest.raises(UsageProblem, match="AMT_STATION_STORE: 'oracle://h' is no database"):
        checked_url(None)
    assert checked_url("sqlite:////x") == "sqlite:////x"


def test_the_guide_knows_what_is_said() -> None:
    guide = (ROOT / "docs" / "line.md").read_text(encoding="utf-8")
    chapter = guide[guide.index("## The store"):]
    for words in ("missing in the database", "differs: the database has an earlier state of this "
                  "run", "differs: the database has another record of this run",
                  "in the database, but not in the directory any more", "no record of a run",
                  "AMT_STATION_STORE", "3 records are still to be delivered: postgresql",
                  *METADATA.tables, VERSION_TABLE):
        assert words in chapter, words
