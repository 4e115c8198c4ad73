"""Stations that only record, as processes of their own."""

from __future__ import annotations

import os
import subprocess
import sys
from pathlib import Path

from station_peer import ROOT, station_environment

HERE = Path(__file__).parent


def station(url: str, folder: Path, name: str, count: int) -> "subprocess.Popen[str]":
    """``store_station.py``, which keeps its state where the test does."""
    return subprocess.Popen(
        [sys.executable, str(HERE / "store_station.py"), url, str(folder), name, str(count)],
        env=station_environment(PYTHONPATH=f"{ROOT}:{HERE}",
                                XDG_STATE_HOME=os.environ["XDG_STATE_HOME"]),
        stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True)
