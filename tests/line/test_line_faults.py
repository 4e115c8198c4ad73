"""A disk that is full in the middle of a run: no pass, nothing lost, and the others go on."""

from __future__ import annotations

import errno
import json
from dataclasses import replace
from pathlib import Path
from typing import Any

from line_bench import ADC
from line_slots import Bench, battery

from amt_line.run.record_file import RecordFile
from amt_station.errors import StationError


def test_a_disk_that_gets_full_in_the_middle(tmp_path: Path, records: Path, monkeypatch: Any
                                             ) -> None:
    lost: list[tuple[str, str]] = []
    full = [True]
    write = RecordFile._write

    def failing(file: RecordFile, text: str) -> None:
        document = json.loads(text)
        if full[0] and document["slot"] == "A" and document["steps"]:
            raise OSError(errno.ENOSPC, "No space left on device")
        write(file, text)

    def note(error: StationError, text: str) -> None:
        lost.append((str(error), text))

    monkeypatch.setattr(RecordFile, "_write", failing)
    bench = Bench(tmp_path, ADC + "[[step]]\nat = 'AT'\n", ("A", "B"))
    bench.shop = replace(bench.shop, lost_record=note)
    for slot in bench.slots.values():
        slot._shop = bench.shop
    with bench:
        for socket in bench.sockets.values():
            socket.plug(battery(15))
        ended = bench.wait("run-ended", slot="A")
        assert (ended["verdict"], ended["exit_status"]) == ("ERROR", 7)
        assert bench.wait("run-ended", slot="B")["verdict"] == "PASS"
        bench.wait("slot-state", slot="A", state="verdict")
        ((reason, text),) = lost
        assert "No space left on device" in reason
        document = json.loads(text)
        assert (document["run"], document["verdict"]) == (ended["run"], "ERROR")
        full[0] = False
        bench.sockets["A"].pull()
        bench.sockets["A"].plug(battery(15))
        assert bench.wait("run-ended", 2, slot="A")["verdict"] == "PASS"
    left = bench.record(ended["run"])
    assert (left["state"], left["verdict"]) == ("running", None), "never taken for a pass"
