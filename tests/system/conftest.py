"""Fixtures of the system tests: handsets, made as a test wants them and gone after it."""

import subprocess
from pathlib import Path
from typing import Any, Callable, Iterator

import pytest

from amt_simulator import Handset
from amt_simulator.rundir import BASE_VARIABLE
from support.channels import AppChannel, PcChannel
from support.command import COMMAND, PATIENCE, PROJECT

HandsetFactory = Callable[..., Handset]
FAKE_DAEMON = Path(__file__).with_name("support") / "fake_daemon.py"
HANDSETS = pytest.StashKey[list[Handset]]()
# A test that takes so long hangs, on however busy a machine.
MOST_SECONDS = 900
PC_SIDE = ("test_doctor", "test_documents", "test_simulator_", "test_scenarios", "test_line_",
           "test_traces")
FAILED = pytest.StashKey[bool]()


def pytest_addoption(parser: pytest.Parser) -> None:
    """The build that the tests run against."""
    parser.addoption("--handset-build", default="release",
                     help="preset or directory of the build whose daemon is tested "
                          "(default: %(default)s)")


def pytest_collection_modifyitems(config: pytest.Config, items: list[pytest.Item]) -> None:
    """Each wait has its own deadline; a test of many waits may need longer than the usual limit.

    Tests of what runs on the PC are marked: they say nothing new on another build of the daemon.
    """
    for item in items:
        if item.path.name.startswith(PC_SIDE):
            item.add_marker(pytest.mark.pc_side)
    if config.pluginmanager.hasplugin("timeout"):
        for item in items:
            item.add_marker(pytest.mark.timeout(MOST_SECONDS))


@pytest.fixture(scope="session")
def handset_build(request: pytest.FixtureRequest) -> "str | Path":
    """The build under test."""
    name = str(request.config.getoption("--handset-build"))
    return Path(name).resolve() if "/" in name else name


class Workshop:
    """Makes handsets, keeps them in a node's stash for the reports, and takes them down."""

    def __init__(self, node: pytest.Item | pytest.Collector, build: "str | Path") -> None:
        none: list[Handset] = []
        self._made = node.stash.setdefault(HANDSETS, none)
        self._build = build

    def make(self, path: str = "pc", ready: bool = True, **options: Any) -> Handset:
        """Make one handset."""
        if "daemon" not in options:
            options.setdefault("build", self._build)
        handset = Handset(path, **options)
        handset.up()
        self._made.append(handset)
        if ready:
            handset.wait_ready()
        return handset

    def close(self) -> None:
        """Take every handset down; a report of a sanitizer is a failure."""
        reports: dict[str, str] = {}
        for handset in self._made:
            try:
                reports.update(_end(handset))
            finally:
                handset.down()
        self._made.clear()
        assert not reports, "\n".join(["sanitizer reports:", *reports.values()])


@pytest.fixture
def make_handset(request: pytest.FixtureRequest,
                 handset_build: "str | Path") -> Iterator[HandsetFactory]:
    """Make handsets: `make_handset("pc", ready=True, **options of Handset)`.

    With `ready`, the daemon serves its lines when the handset is returned. After the test every
    handset is taken down; a report of a sanitizer fails the test.
    """
    workshop = Workshop(request.node, handset_build)
    yield workshop.make
    workshop.close()


@pytest.fixture(scope="module")
def share_handset(request: pytest.FixtureRequest,
                  handset_build: "str | Path") -> Iterator[HandsetFactory]:
    """As `make_handset`, for tests that leave a handset as they found it.

    The tests of a module get the same handset for the same arguments, and a new one after a test
    that failed. All are taken down behind the last test, which a sanitizer's report fails.
    """
    workshop = Workshop(request.node, handset_build)
    shared: dict[str, Handset] = {}

    def share(path: str = "pc", ready: bool = True, **options: Any) -> Handset:
        if request.node.stash.get(FAILED, False):
            request.node.stash[FAILED] = False
            shared.clear()
        key = repr((path, ready, sorted(options.items())))
        if key not in shared:
            shared[key] = workshop.make(path, ready, **options)
        return shared[key]

    yield share
    workshop.close()


def _end(handset: Handset) -> dict[str, str]:
    """End an instrumented daemon properly: some of what it finds is only told at its exit."""
    if not handset.program.tells_at_exit:
        return {}
    if handset.is_up:
        handset.set_restart(False)
        if handset.pid:
            handset.stop()
    return handset.sanitizer_reports()


@pytest.fixture
def pc_handset(make_handset: HandsetFactory) -> Handset:
    """A handset that serves the PC and modem lines; its modem answers by its table."""
    return make_handset("pc")


@pytest.fixture
def packet_handset(make_handset: HandsetFactory) -> Handset:
    """A handset that serves the app line; its modem answers by its table."""
    return make_handset("packet")


@pytest.fixture
def pc(pc_handset: Handset) -> PcChannel:
    """The test station at the PC line of a handset."""
    return PcChannel(pc_handset)


@pytest.fixture
def app(packet_handset: Handset) -> AppChannel:
    """The test app at the app line of a handset."""
    return AppChannel(packet_handset)


@pytest.hookimpl(hookwrapper=True)
def pytest_runtest_makereport(item: pytest.Item) -> Iterator[None]:
    """Show with a failure what the handsets of the test have to tell."""
    outcome = yield
    report = outcome.get_result()  # type: ignore[attr-defined]
    if report.when == "call" and report.failed:
        made = [handset for node in item.listchain() for handset in node.stash.get(HANDSETS, [])]
        for number, handset in enumerate(made):
            report.sections.append((f"handset {number}", handset.story()))
    if report.failed:
        for node in item.listchain():
            node.stash[FAILED] = True


@pytest.fixture
def make_fake(make_handset: HandsetFactory) -> HandsetFactory:
    """Make handsets as `make_handset` does, with a fake daemon that needs no build."""
    def make(path: str = "pc", ready: bool = True, **options: Any) -> Handset:
        return make_handset(path, ready, build=None, daemon=FAKE_DAEMON, **options)

    return make


@pytest.fixture
def fake(make_fake: HandsetFactory) -> Handset:
    """A handset with a fake daemon on the PC path."""
    return make_fake()


@pytest.fixture
def base(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> Path:
    """A base directory of this test's own: other handsets are not found."""
    monkeypatch.setenv(BASE_VARIABLE, str(tmp_path / "base"))
    return tmp_path / "base"


@pytest.fixture
def up(base: Path, handset_build: "str | Path") -> Iterator[Callable[..., "subprocess.Popen[str]"]]:
    """Bring handsets up by the command, until the test ends."""
    started = []

    def bring_up(*options: str) -> "subprocess.Popen[str]":
        process = subprocess.Popen(
            [*COMMAND, "up", "--build", str(handset_build), *options], cwd=PROJECT, text=True,
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE)
        started.append(process)
        assert process.stdout is not None
        lines = [process.stdout.readline()]
        while lines[-1] and not lines[-1].startswith("  stand-ins"):
            lines.append(process.stdout.readline())
        process.introduction = "".join(lines)  # type: ignore[attr-defined]
        return process

    yield bring_up
    for process in started:
        process.terminate()
        process.communicate(timeout=PATIENCE)
