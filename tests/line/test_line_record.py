"""The record: whole at every moment, and never lost in silence."""

from __future__ import annotations

import json
import resource
import shutil
import subprocess
from pathlib import Path
from typing import Any

import pytest
from line_bench import ADC, OK, Bench, Script, adc, load, verdicts, write_plan
from station_peer import ROOT, Peer, station_command, station_environment

from amt_line.report.records import load_record
from amt_line.run.record_file import RecordFile, RecordLost, file_name
from amt_station.wire import ACKNOWLEDGEMENT

WRITE_VERDICT = ("[[always]]\ncommand = 'test-result write'\n"
                 "with = { station = 3, verdict = '${verdict}' }\n")


def battery() -> Script:
    return Script(requests={224: [[ACKNOWLEDGEMENT, adc(15)]]})


def sent_verdict(step: dict[str, Any]) -> int:
    atoms = step["exchanges"][-1]["sent_decoded"][0]["packet"]["atoms"]
    return int(next(atom["value"] for atom in atoms if atom["name"] == "verdict"))


def test_the_record_is_whole_after_each_step(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = battery()
    seen: list[tuple[str, int]] = []

    def look(event: dict[str, Any]) -> None:
        if event["event"] == "step-began":
            bench.file.flush()  # type: ignore[union-attr]
            record = load_record(bench.file.path)  # type: ignore[union-attr]
            seen.append((record["state"], len(record["steps"])))

    bench = Bench(load(tmp_path, ADC * 3), peer, records=records, on_event=look)
    document = bench.run()
    assert seen == [("running", 0), ("running", 1), ("running", 2)]
    assert load_record(bench.file.path) == document  # type: ignore[union-attr]


def test_a_vanished_directory_ends_the_run_in_order(tmp_path: Path, peer: Peer,
                                                    records: Path) -> None:
    peer.script = battery()

    def remove(event: dict[str, Any]) -> None:
        if event["event"] == "step-ended" and event["number"] == 1:
            bench.file.flush()  # type: ignore[union-attr]
            shutil.rmtree(records)

    bench = Bench(load(tmp_path, ADC + "[[step]]\nwait = 0.5\n" + ADC + WRITE_VERDICT), peer,
                  records=records, on_event=remove)
    document = bench.run()
    assert verdicts(document) == ["pass", "pass", "skipped", "pass"]
    assert (document["verdict"], document["exit_status"]) == ("ERROR", 7)
    assert sent_verdict(document["steps"][-1]) == 2, "no pass is stored without its record"
    assert bench.runner is not None and bench.runner.record_problem is not None
    assert "can no longer be written: No such file" in document["reason"]


def test_a_full_disk_leaves_the_record_on_standard_error(tmp_path: Path, peer: Peer) -> None:
    peer.script = battery()
    plan = write_plan(tmp_path, ADC * 30 + WRITE_VERDICT)
    folder = tmp_path / "records"
    result = subprocess.run(
        station_command("-p", peer.path, "run", str(plan), "--records", str(folder)), cwd=ROOT,
        env=station_environment(PYTHONDONTWRITEBYTECODE="1"), stdin=subprocess.DEVNULL,
        capture_output=True, text=True, timeout=300, check=False,
        preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (8192, 8192)))
    assert result.returncode == 7, result.stderr
    document, _, complaint = result.stderr.rpartition("}\n")
    record = json.loads(document + "}")
    assert complaint.startswith("amt-station: the record ") and "File too large" in complaint
    assert record["verdict"] == "ERROR" and sent_verdict(record["steps"][-1]) == 2
    assert len(record["steps"]) == 31
    (path,) = folder.iterdir()
    assert load_record(path)["state"] == "running", "the last whole one stays"


def test_a_lost_record_is_told_though_the_output_is_lost_too(tmp_path: Path, peer: Peer) -> None:
    peer.script = battery()
    plan = write_plan(tmp_path, ADC * 30)
    with open("/dev/full", "w", encoding="utf-8") as full:
        result = subprocess.run(
            station_command("-p", peer.path, "run", str(plan), "--json", "--records",
                            str(tmp_path / "records")), cwd=ROOT, stdout=full,
            env=station_environment(PYTHONDONTWRITEBYTECODE="1"), stdin=subprocess.DEVNULL,
            stderr=subprocess.PIPE, text=True, timeout=300, check=False,
            preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (8192, 8192)))
    assert result.returncode == 7, result.stderr
    begin = result.stderr.index("{\n")
    record, _ = json.JSONDecoder().raw_decode(result.stderr[begin:])
    assert record["verdict"] == "ERROR" and len(record["steps"]) == 30


@pytest.mark.parametrize("dut, name", [
    ("KEL 1/..", "KEL_1_-20261121T190000Z-12345678.json"),
    ("", "unnamed-20261121T190000Z-12345678"),
    ("../../etc/passwd", "_etc_passwd-"), (".hidden", "_hidden-"), ("a" * 300, "a" * 64 + "-2026")])
def test_names_of_files(dut: str, name: str) -> None:
    made = file_name(dut, "2026-11-21T19:00:00.123Z", "12345678-aaaa")
    assert made.startswith(name) and "/" not in made and made.endswith(".json")


def test_the_writer_takes_the_newest_and_tells_a_failure(tmp_path: Path) -> None:
    folder = tmp_path / "r"
    file = RecordFile(folder, "a.json", "0")
    for number in range(50):
        file.put(str(number))
    file.flush()
    assert file.path.read_text(encoding="utf-8") == "49"
    assert [path.name for path in folder.iterdir()] == ["a.json"]
    shutil.rmtree(folder)
    with pytest.raises(RecordLost, match="No such file"):
        file.put("50")
        file.flush()
    with pytest.raises(RecordLost):
        file.put("51")
    file.close()


def test_what_was_forced_is_named(tmp_path: Path, peer: Peer, records: Path) -> None:
    peer.script = Script()
    text = "[[step]]\ncommand = 'imei write'\nwith = { imei = '490154203237519' }\nforce = true\n"
    document = Bench(load(tmp_path, text), peer, records=records).run()
    assert document["verdict"] == "PASS" and "check digit" in document["steps"][0]["forced"][0]


def test_what_a_handset_says_is_kept_as_it_came(tmp_path: Path, peer: Peer, records: Path) -> None:
    odd = "\x1b[31m\u202e\x9b<script>&\udcff".encode("utf-8", "surrogateescape")
    peer.script = Script(texts={"AT+X": [odd + b"\r\n" + OK]})
    document = Bench(load(tmp_path, "[[step]]\nat = 'AT+X'\n"), peer, records=records).run()
    received = document["steps"][0]["exchanges"][0]["received"]
    assert b"".join(bytes.fromhex(item["bytes"]) for item in received) == odd + b"\r\n" + OK
