"""Fixtures of the system tests: handsets, made as a test wants them and gone after it."""

from pathlib import Path
from typing import Any, Callable, Iterator

import pytest

from simulator import Handset
from support.channels import AppChannel, PcChannel

HandsetFactory = Callable[..., Handset]
FAKE_DAEMON = Path(__file__).with_name("support") / "fake_daemon.py"
HANDSETS = pytest.StashKey[list[Handset]]()


def pytest_addoption(parser: pytest.Parser) -> None:
    """The build that the tests run against."""
    parser.addoption("--handset-build", default="release",
                     help="preset or directory of the build whose daemon is tested "
                          "(default: %(default)s)")


@pytest.fixture(scope="session")
def handset_build(request: pytest.FixtureRequest) -> "str | Path":
    """The build under test."""
    name = str(request.config.getoption("--handset-build"))
    return Path(name).resolve() if "/" in name else name


@pytest.fixture
def make_handset(request: pytest.FixtureRequest,
                 handset_build: "str | Path") -> Iterator[HandsetFactory]:
    """Make handsets: `make_handset("pc", ready=True, **options of Handset)`.

    With `ready`, the daemon serves its lines when the handset is returned. After the test every
    handset is taken down; a report of a sanitizer fails the test.
    """
    made = request.node.stash.setdefault(HANDSETS, [])

    def make(path: str = "pc", ready: bool = True, **options: Any) -> Handset:
        if "daemon" not in options:
            options.setdefault("build", handset_build)
        handset = Handset(path, **options)
        handset.up()
        made.append(handset)
        if ready:
            handset.wait_ready()
        return handset

    yield make
    reports: dict[str, str] = {}
    for handset in made:
        try:
            reports.update(_end(handset))
        finally:
            handset.down()
    made.clear()
    assert not reports, "\n".join(["sanitizer reports:", *reports.values()])


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
        for number, handset in enumerate(item.stash.get(HANDSETS, [])):
            report.sections.append((f"handset {number}", handset.story()))


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
