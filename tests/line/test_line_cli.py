"""The commands check, run, show, report and schema, as they are typed."""

from __future__ import annotations

import json
import os
import signal
import subprocess
from pathlib import Path
from typing import Any
from xml.etree import ElementTree

import jsonschema
import pytest
from line_bench import ADC, Script, adc, write_plan
from station_peer import ROOT, Peer, Run, station_command, station_environment

from amt_station.wire import ACKNOWLEDGEMENT

INPUTS = ('dut = "${sn}"\n[input.sn]\npattern = \'KEL\\d{3}\'\n[input.imei]\nformat = "imei"\n'
          '[input.power]\nformat = "int"\ndefault = 15\n')
IMEI = "490154203237518"
GIVEN = ["--set=sn=KEL001", f"--set=imei={IMEI}"]
WRITES = "[[step]]\ncommand = 'imei write'\nwith = { imei = '${imei}' }\n"


def battery(value: int) -> Script:
    return Script(requests={224: [[ACKNOWLEDGEMENT, adc(value)]]})


def only_record(folder: Path) -> dict[str, Any]:
    (path,) = folder.glob("*.json")
    document: dict[str, Any] = json.loads(path.read_text(encoding="utf-8"))
    return document


def test_check(tmp_path: Path, run_station: Run) -> None:
    path = str(write_plan(tmp_path, ADC))
    result = run_station("check", path)
    assert (result.returncode, result.stdout) == (0, f"{path}: a good plan of 1 steps\n")
    assert json.loads(run_station("check", path, "--json").stdout)["steps"] == 1


def test_check_tells_every_problem(tmp_path: Path, run_station: Run) -> None:
    path = write_plan(tmp_path, "x = 1\n[[step]]\nat = 3\n")
    result = run_station("check", str(path))
    assert result.returncode == 2 and result.stdout == ""
    first, second = result.stderr.splitlines()
    assert first.startswith(f"{path}: x: unknown key")
    assert second == f"amt-station: {path}: step 1: at: 3 is no text"


def test_run_passes_and_keeps_a_record(tmp_path: Path, peer: Peer, run_station: Run,
                                       records: Path) -> None:
    peer.script = battery(15)
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--records",
                         str(records), "--station", "S 1", "--operator", "me", "--dut", "D1")
    assert result.returncode == 0, result.stderr
    lines = result.stdout.splitlines()
    assert lines[0] == "[1/1] adc ..." and lines[1].startswith("[1/1] adc: pass  ")
    assert lines[1].endswith("  adc 15") and lines[-1].startswith("D1: line: PASS (1 pass) after")
    record = only_record(records)
    assert (record["station"], record["operator"], record["dut"], record["port"]) == (
        "S 1", "me", "D1", peer.path)
    assert result.stderr == f"record: {next(records.glob('*.json'))}\n"


def test_run_fails_with_the_first_failure_and_what_to_do(tmp_path: Path, peer: Peer,
                                                         run_station: Run) -> None:
    peer.script = battery(99)
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--json")
    assert result.returncode == 1
    record = json.loads(result.stdout)
    assert record["verdict"] == "FAIL" and record["exit_status"] == 1
    lines = result.stderr.splitlines()
    assert "first: adc: adc 99 is above 20" in lines
    assert any(line.startswith("what to do: ") for line in lines)
    assert any("####" in line for line in lines), "the verdict is large"
    assert only_record(tmp_path / "state" / "amt-station" / "records") == record


def test_no_records(tmp_path: Path, peer: Peer, run_station: Run) -> None:
    peer.script = battery(15)
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), "--no-records")
    assert result.returncode == 0 and not (tmp_path / "state").exists()


@pytest.mark.parametrize("arguments, words", [
    (["--set", "sn=KEL001"], "no value for imei: give --set or --inputs"),
    (["--set", "sn=KEL001", "--set", "imei=1"], "input imei: '1': an IMEI has 15 digits"),
    (["--set", "sn=XEL001", "--set", f"imei={IMEI}"], "'XEL001' is not of the form"),
    (["--set", "colour=1"], "the plan has no input 'colour'"),
    (["--set", "sn"], "--set 'sn': a name, '=' and a value are needed"),
    (["--set", "sn=KEL001", "--set", "sn=KEL002"], "'sn' is given twice"),
    (["--answer", "screen=yes"], "--answer: the plan has no operator step 'screen'"),
    (["--inputs", "inputs.csv"], "--inputs needs --dut"),
    (["--inputs", "inputs.csv", "--dut", "D9"], "no row for dut 'D9'"),
    (["--inputs", "inputs.csv", "--dut", "D3"], "2 rows for dut 'D3'"),
    (["--inputs", "none.csv", "--dut", "D3"], "none.csv: No such file"),
    (["--records", "r", "--no-records"], "contradict each other"),
    (["--app"], "the plan is for the pc channel, --app contradicts it"),
    (["--junit", "same", "--html", "same", *GIVEN], "one file"),
    (["--junit", "no/such/file", *GIVEN], "No such file"),
    (["--records", "inputs.csv/x", *GIVEN], "no record can be written into"),
])
def test_usage_is_told_and_nothing_is_sent(tmp_path: Path, peer: Peer, arguments: list[str],
                                           words: str) -> None:
    (tmp_path / "inputs.csv").write_text("dut,sn\nD3,KEL001\nD3,KEL002\n", encoding="utf-8")
    plan = write_plan(tmp_path, "channel = 'pc'\n" + INPUTS + WRITES)
    result = subprocess.run(
        station_command("-p", peer.path, "run", str(plan), *arguments), cwd=tmp_path,
        env=station_environment(XDG_STATE_HOME=str(tmp_path / "state"), PYTHONPATH=str(ROOT)),
        stdin=subprocess.DEVNULL, capture_output=True, text=True, timeout=300, check=False)
    assert result.returncode == 2, result.stderr
    assert words in result.stderr and peer.raw == b""
    assert {path.name for path in tmp_path.iterdir()} == {"inputs.csv", "line.toml"}
    assert len(result.stderr.splitlines()) == 1


def test_inputs_from_a_file(tmp_path: Path, peer: Peer, run_station: Run, records: Path) -> None:
    peer.script = Script()
    table = tmp_path / "inputs.csv"
    table.write_text(f"\ufeffdut,sn,imei,power,box\r\nD1,KEL001,{IMEI},,7\r\nD2,,,,\r\n",
                     encoding="utf-8")
    plan = str(write_plan(tmp_path, INPUTS + WRITES))
    result = run_station("-p", peer.path, "run", plan, "--inputs", str(table), "--dut", "D1",
                         "--set", "sn=KEL009", "--records", str(records))
    assert result.returncode == 0, result.stderr
    assert only_record(records)["inputs"] == {"sn": "KEL009", "imei": IMEI, "power": 15}
    assert only_record(records)["dut"] == "KEL009"


def test_no_port_is_status_3_and_recorded(tmp_path: Path, run_station: Run, records: Path) -> None:
    result = run_station("-p", "/dev/no-such-port", "run", str(write_plan(tmp_path, ADC)),
                         "--records", str(records))
    assert result.returncode == 3 and "first: no port /dev/no-such-port" in result.stdout
    assert only_record(records)["steps"][0]["verdict"] == "skipped"


def test_reports_at_once_and_later(tmp_path: Path, peer: Peer, run_station: Run,
                                   records: Path) -> None:
    peer.script = battery(99)
    names = {kind: str(tmp_path / f"report.{kind}") for kind in ("junit", "csv", "html")}
    Path(names["junit"]).write_text("what stood here is longer " * 1000, encoding="utf-8")
    options = [word for kind, name in names.items() for word in (f"--{kind}", name)]
    result = run_station("-p", peer.path, "run", str(write_plan(tmp_path, ADC)), *options,
                         "--records", str(records))
    assert result.returncode == 1
    first = {kind: Path(name).read_bytes() for kind, name in names.items()}
    assert ElementTree.fromstring(first["junit"])[0].attrib["failures"] == "1"
    assert b"FAIL" in first["html"] and b"adc" in first["csv"]
    result = run_station("report", str(records), *options)
    assert result.returncode == 0, result.stderr
    assert {kind: Path(name).read_bytes() for kind, name in names.items()} == first
    path = str(next(records.glob("*.json")))
    shown = run_station("show", path, "--exchanges")
    assert shown.stdout.startswith("FAIL  no name\n")
    assert "adc: 99  [fail: 10 to 20]" in shown.stdout
    assert json.loads(run_station("show", path, "--json").stdout)["verdict"] == "FAIL"


@pytest.mark.parametrize("content, words", [
    ("{}", "no record"), ("[", "no record"), ('{"record": 99}', "this program knows 1"),
    ("\udcff", "no record")])
def test_what_is_no_record(tmp_path: Path, run_station: Run, content: str, words: str) -> None:
    path = tmp_path / "x.json"
    path.write_text(content, encoding="utf-8", errors="surrogateescape")
    result = run_station("show", str(path))
    assert result.returncode == 2 and words in result.stderr


def test_report_wants_to_know_what(tmp_path: Path, run_station: Run) -> None:
    assert run_station("report", str(tmp_path)).returncode == 2
    result = run_station("report", str(tmp_path), "--csv", str(tmp_path / "x.csv"))
    assert result.returncode == 2 and "no records in this directory" in result.stderr


@pytest.mark.parametrize("what", ["plan", "record"])
def test_the_schemas_are_schemas(run_station: Run, what: str) -> None:
    schema = json.loads(run_station("schema", what).stdout)
    jsonschema.validators.validator_for(schema).check_schema(schema)
    assert schema["title"]


@pytest.mark.parametrize("number, status", [(signal.SIGINT, 130), (signal.SIGTERM, 143)])
def test_a_signal_ends_the_run_in_order(tmp_path: Path, peer: Peer, records: Path,
                                        number: signal.Signals, status: int) -> None:
    script = Script(texts={"AT+SILENT": []})
    peer.script = script
    plan = write_plan(tmp_path, "[[step]]\nat = 'AT+SILENT'\ntimeout = 300\n" + ADC
                      + "[[always]]\nat = 'AT+LAST'\n")
    command = station_command("-p", peer.path, "run", str(plan), "--records", str(records),
                              "--junit", str(tmp_path / "junit.xml"))
    with subprocess.Popen(command, cwd=ROOT, env=station_environment(), stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True) as process:
        while "SILENT" not in str(peer.next()):
            pass
        process.send_signal(number)
        out, talk = process.communicate(timeout=300)
    assert process.returncode == status, talk
    assert script.asked[-1] == "AT+LAST" and "ABORTED" in out
    record = only_record(records)
    assert (record["state"], record["exit_status"]) == ("aborted", status)
    assert [step["verdict"] for step in record["steps"]] == ["error", "skipped", "pass"]
    assert ElementTree.parse(tmp_path / "junit.xml").getroot()[0].attrib["errors"] == "1"


def test_the_second_signal_leaves_at_once(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = Script(texts={"AT+SILENT": []})
    plan = write_plan(tmp_path, "[[step]]\nat = 'AT+SILENT'\ntimeout = 300\n"
                      "[[always]]\nat = 'AT+SILENT'\n[[always]]\nat = 'AT+LAST'\n")
    command = station_command("-p", peer.path, "run", str(plan), "--records", str(records))
    with subprocess.Popen(command, cwd=ROOT, env=station_environment(), stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True) as process:
        while "SILENT" not in str(peer.next()):
            pass
        process.send_signal(signal.SIGINT)
        process.send_signal(signal.SIGINT)
        process.communicate(timeout=300)
    # Two signals of one number may arrive as one.
    assert process.returncode == 130
    assert only_record(records)["state"] == "aborted"


def test_a_killed_run_leaves_what_was_done(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]}, texts={"AT+SILENT": []})
    plan = write_plan(tmp_path, ADC + "[[step]]\nwait = 1\n[[step]]\nat = 'AT+SILENT'\n")
    command = station_command("-p", peer.path, "run", str(plan), "--records", str(records))
    with subprocess.Popen(command, cwd=ROOT, env=station_environment(), stdin=subprocess.DEVNULL,
                          stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL) as process:
        while "SILENT" not in str(peer.next()):
            pass
        process.kill()
    record = only_record(records)
    assert record["state"] == "running" and record["verdict"] is None
    assert record["steps"][0]["verdict"] == "pass"
    for path in records.glob(".*"):
        path.unlink()


def test_output_in_ascii_and_output_that_is_closed(tmp_path: Path, peer: Peer,
                                                   run_station: Run) -> None:
    peer.script = battery(15)
    plan = str(write_plan(tmp_path, ADC.replace('"adc"', '"Größe \\u4e2d"')))
    result = run_station("-p", peer.path, "run", plan, "--no-records", PYTHONIOENCODING="ascii",
                         LC_ALL="C")
    assert result.returncode == 0 and "Gr\\xf6\\xdfe \\u4e2d" in result.stdout
    read, write = os.pipe()
    os.close(read)
    ended = subprocess.run(station_command("-p", peer.path, "run", plan, "--no-records"), cwd=ROOT,
                           env=station_environment(), stdout=write, stderr=subprocess.PIPE,
                           stdin=subprocess.DEVNULL, timeout=300, check=False)
    os.close(write)
    assert b"Traceback" not in ended.stderr
