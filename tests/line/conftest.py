"""Fixtures of the line's tests: a scripted handset, and what a run needs."""

from __future__ import annotations

import json
import os
import subprocess
import sys
from pathlib import Path
from typing import Iterator

import pytest
from hypothesis import HealthCheck, configuration, settings

sys.path.append(str(Path(__file__).resolve().parents[1] / "station"))

from postgresql import Cluster  # noqa: E402
from station_peer import ROOT, Peer, Run, station_command, station_environment  # noqa: E402

from amt_station.wire.decoder import BareDecoder, EnvelopeDecoder  # noqa: E402

settings.register_profile("line", deadline=None, database=None, print_blob=True,
                          suppress_health_check=[HealthCheck.too_slow],
                          derandomize=bool(os.environ.get("CI")))
settings.load_profile("line")
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
def records(tmp_path: Path) -> Iterator[Path]:
    """A directory for records; every record that is in it at the end is held to the schema."""
    from jsonschema import Draft202012Validator

    from amt_line.run.record_schema import record_schema

    folder = tmp_path / "records"
    yield folder
    validator = Draft202012Validator(record_schema())
    for path in folder.glob("*.json"):
        validator.validate(json.loads(path.read_text(encoding="utf-8")))
    assert not list(folder.glob(".*")), "nothing half written is left"


@pytest.fixture
def run_station(tmp_path: Path) -> Run:
    """Run ``amt-station`` in a process of its own; its state goes below the test's directory."""
    def run(*arguments: str, **environment: str) -> subprocess.CompletedProcess[str]:
        state = {"XDG_STATE_HOME": str(tmp_path / "state"), **environment}
        return subprocess.run(station_command(*arguments), env=station_environment(**state),
                              cwd=ROOT, capture_output=True, text=True, timeout=300, check=False,
                              stdin=subprocess.DEVNULL)
    return run


@pytest.fixture(scope="session")
def postgresql() -> Iterator[Cluster]:
    """A PostgreSQL server. Tests that use it belong to one group, so that one serves them all."""
    cluster = Cluster()
    yield cluster
    cluster.close()


@pytest.fixture(params=["sqlite", pytest.param(
    "postgresql", marks=pytest.mark.xdist_group("postgresql"))])
def store_url(request: pytest.FixtureRequest, tmp_path: Path) -> str:
    """The URL of an empty database, of either kind."""
    if request.param == "sqlite":
        return f"sqlite:///{tmp_path}/line.sqlite"
    cluster: Cluster = request.getfixturevalue("postgresql")
    return cluster.new_database()
