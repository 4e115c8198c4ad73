"""Fixtures: handsets on pseudo-terminals, links to them, and the station in its own process."""

from __future__ import annotations

import os
import subprocess
from typing import Iterator

import pytest
from hypothesis import HealthCheck, configuration, settings
from station_peer import PATIENCE, ROOT, Peer, Run, station_command, station_environment

from amt_station.link import Link
from amt_station.port import FdPort
from amt_station.requests.model import Channel
from amt_station.wire.decoder import BareDecoder, EnvelopeDecoder

# New examples at a desk; the same ones every time where a machine judges a change.
settings.register_profile("station", deadline=None, database=None, print_blob=True,
                          suppress_health_check=[HealthCheck.too_slow],
                          derandomize=bool(os.environ.get("CI")))
settings.load_profile("station")
configuration.set_hypothesis_home_dir(str(ROOT / "build" / "hypothesis"))


@pytest.fixture
def peer() -> Iterator[Peer]:
    """A handset on the PC line."""
    handset = Peer(EnvelopeDecoder())
    yield handset
    handset.close()


@pytest.fixture
def app_peer() -> Iterator[Peer]:
    """A handset on the app channel."""
    handset = Peer(BareDecoder())
    yield handset
    handset.close()


@pytest.fixture
def link(peer: Peer) -> Iterator[Link]:
    """A link to the handset on the PC line."""
    with Link(FdPort(peer.slave), timeout=PATIENCE) as line:
        yield line


@pytest.fixture
def app_link(app_peer: Peer) -> Iterator[Link]:
    """A link to the handset on the app channel."""
    with Link(FdPort(app_peer.slave), Channel.APP, timeout=PATIENCE) as line:
        yield line


@pytest.fixture
def run_station() -> Run:
    """Run ``amt-station`` in a process of its own, without the settings of whoever tests."""
    def run(*arguments: str, **environment: str) -> subprocess.CompletedProcess[str]:
        return subprocess.run(station_command(*arguments), env=station_environment(**environment),
                              cwd=ROOT, capture_output=True, text=True, timeout=60, check=False)
    return run
