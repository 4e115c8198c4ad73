"""The guide to the line: its slots file is read, and it names what there is."""

from __future__ import annotations

import re
from pathlib import Path

import pytest
from station_peer import ROOT

from amt_line.cli.line import line
from amt_line.cli.slots import check_slots, slots_of_file
from amt_line.run.events import STATES

GUIDE = (ROOT / "docs" / "line.md").read_text(encoding="utf-8")
EVENTS = ("slot-state", "run-began", "step-began", "step-again", "step-ended", "notice",
          "question", "answer", "run-ended")
COMMON = {"--port", "--serial", "--vid-pid", "--pc", "--app", "--timeout", "--baud", "--trace",
          "--json"}


def test_the_slots_file_of_the_guide(tmp_path: Path) -> None:
    found = re.search(r"```toml\n(\[\[slot\]\].*?)```", GUIDE, re.DOTALL)
    assert found
    (tmp_path / "slots.toml").write_text(found.group(1), encoding="utf-8")
    slots = slots_of_file(tmp_path / "slots.toml", 115200)
    check_slots(slots)
    assert [(slot.name, slot.port, slot.stays) for slot in slots] == [
        ("left", "usb:1-2.3", None), ("right", "/dev/ttyUSB0", True)]


def test_the_guide_names_every_option() -> None:
    options = {name for parameter in line.params for name in parameter.opts
               if name.startswith("--")} - COMMON
    rows = "\n".join(row for row in GUIDE.splitlines() if row.startswith("| `--"))
    assert len(options) > 12
    for option in options:
        assert f"`{option}" in rows, option


@pytest.mark.parametrize("word", STATES + tuple(f"`{event}`" for event in EVENTS))
def test_the_guide_names_every_state_and_event(word: str) -> None:
    assert re.search(rf"^\| .*{re.escape(word)}.* \|", GUIDE, re.MULTILINE)
