"""Every dialogue with the emulated Arm daemon: the same bytes, files and log as on this machine."""

from pathlib import Path

import pytest

from amt_station.trace.dialogue import parse
from seen import hold
from tools.cross.alike import NOT_PLAYED, differences
from tools.cross.emulated import emulated, native
from tools.project import PROJECT

FILES = sorted((PROJECT / "tests/system/dialogues").glob("*.txt"))


@pytest.mark.parametrize("path", FILES, ids=lambda path: path.stem)
def test_a_dialogue_is_the_same(path: Path) -> None:
    if path.stem in NOT_PLAYED:
        pytest.skip(NOT_PLAYED[path.stem])
    dialogue = parse(path, path.read_text("utf-8"))
    found = differences(hold(dialogue, native()), hold(dialogue, emulated()))
    assert not found, "\n".join(found)
